// Parts of a simulated PC that tests of the storage side are built from.
#pragma once

#include <string>

#include "platform/setup_api.h"
#include "platform/simulated/machine.h"

namespace KelvoUHW {

using platform::simulated::Machine;

inline std::u16string Numbered(const char16_t* text, unsigned number) {
  const std::string digits = std::to_string(number);
  return std::u16string(text).append(digits.begin(), digits.end());
}

inline void AddDevice(Machine& machine, const std::u16string& id, const std::u16string& parent) {
  platform::simulated::Device device;
  device.id = id;
  device.parent = parent;
  machine.devices.push_back(device);
}

// What the storage requests answer for a path; deviceType is 0, the number that of a disk.
inline platform::simulated::Storage& AddStorage(Machine& machine, const std::u16string& path,
                                                unsigned deviceNumber) {
  platform::simulated::Storage storage;
  storage.path = path;
  storage.deviceType = 0;
  storage.deviceNumber = platform::simulated::DeviceNumber{7, deviceNumber, 0};
  machine.storage.push_back(storage);
  return machine.storage.back();
}

inline void AddDrive(Machine& machine, char16_t letter, unsigned deviceNumber,
                     std::uint32_t type = platform::kDRIVE_REMOVABLE) {
  platform::simulated::Drive drive;
  drive.letter = letter;
  drive.type = type;
  drive.dosDevice = Numbered(u"\\Device\\HarddiskVolume", deviceNumber);
  machine.drives.push_back(drive);
  AddStorage(machine, std::u16string(u"\\\\.\\") + letter + u":", deviceNumber);
}

inline platform::simulated::Volume& AddVolume(Machine& machine, unsigned number,
                                              const std::vector<std::u16string>& paths,
                                              std::uint32_t type = platform::kDRIVE_REMOVABLE) {
  platform::simulated::Volume volume;
  volume.name = Numbered(u"\\\\?\\Volume{", number) + u"}\\";
  volume.paths = paths;
  volume.driveType = type;
  machine.volumes.push_back(volume);
  return machine.volumes.back();
}

// A device with an interface of that path, and what storage requests to it answer.
inline platform::simulated::Storage& AddStorageDevice(Machine& machine, const std::u16string& id,
                                                      const std::u16string& parent,
                                                      const platform::Guid& interfaceClass,
                                                      const std::u16string& path,
                                                      unsigned deviceNumber) {
  AddDevice(machine, id, parent);
  machine.interfaces.push_back({interfaceClass, path, id});
  return AddStorage(machine, path, deviceNumber);
}
inline platform::simulated::Storage& AddDisk(Machine& machine, const std::u16string& id,
                                             const std::u16string& parent, unsigned number) {
  return AddStorageDevice(machine, id, parent, platform::GUID_DEVINTERFACE_DISK,
                          Numbered(u"\\\\?\\disk", number), number);
}
// A volume of the machine may name the device.
inline platform::simulated::Storage& AddVolumeDevice(Machine& machine, const std::u16string& id,
                                                     const std::u16string& parent,
                                                     unsigned number) {
  return AddStorageDevice(machine, id, parent, platform::GUID_DEVINTERFACE_VOLUME,
                          Numbered(u"\\\\?\\vol", number), number);
}

inline constexpr char16_t kVolumeManager[] = u"ROOT\\VOLMGR\\0000";

inline std::u16string StickId(unsigned number) {
  return Numbered(u"USB\\VID_0781&PID_5567\\S", number);
}
inline std::u16string StickDiskId(unsigned number) {
  return Numbered(u"USBSTOR\\DISK&VEN_SANDISK\\S", number) + u"&0";
}
inline std::u16string StickVolumeId(unsigned number) {
  return Numbered(u"STORAGE\\VOLUME\\_??_USBSTOR#DISK&VEN_SANDISK#S", number) +
         u"&0#{53f56307-b6bf-11d0-94f2-00a0c91efb8b}";
}

// A USB stick with one partition; letter 0: mounted nowhere.
inline void AddStick(Machine& machine, unsigned number, char16_t letter) {
  AddDevice(machine, StickId(number), u"");
  AddDisk(machine, StickDiskId(number), StickId(number), number);
  auto& storage = AddVolumeDevice(machine, StickVolumeId(number), kVolumeManager, number);
  storage.vendor = "SanDisk ";
  storage.serial = "4C53";
  auto& volume = AddVolume(machine, number, {});
  volume.device = StickVolumeId(number);
  if (letter == 0) return;
  volume.paths.push_back(std::u16string(1, letter) + u":\\");
  AddDrive(machine, letter, number);
}

// A PC with a volume manager, and nothing else yet.
inline Machine EmptyPc() {
  Machine machine;
  AddDevice(machine, kVolumeManager, u"");
  return machine;
}

}  // namespace KelvoUHW
