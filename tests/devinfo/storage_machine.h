// Parts of a simulated PC that tests of the storage side are built from.
#pragma once

#include "bench/small_pcs.h"
#include "platform/setup_api.h"

namespace KelvoUHW {

using platform::simulated::Storage;
using Texts = std::vector<std::u16string>;

inline std::u16string Numbered(const char16_t* text, unsigned number, const char16_t* end = u"") {
  const std::string digits = std::to_string(number);
  return std::u16string(text).append(digits.begin(), digits.end()) + end;
}

inline void AddDevice(Machine& machine, const std::u16string& id, const std::u16string& parent) {
  machine.devices.push_back(testing_support::BareDevice(id, parent));
}

// What the storage requests answer for a path; deviceType is 0, the number that of a disk.
inline Storage& AddStorage(Machine& machine, const std::u16string& path, unsigned deviceNumber) {
  Storage& storage = machine.storage.emplace_back();
  storage.path = path;
  storage.deviceType = 0;
  storage.deviceNumber = platform::simulated::DeviceNumber{7, deviceNumber, 0};
  return storage;
}

inline void AddDrive(Machine& machine, char16_t letter, unsigned number,
                     std::uint32_t type = platform::kDRIVE_REMOVABLE) {
  machine.drives.push_back({letter, type, Numbered(u"\\Device\\HarddiskVolume", number), u""});
  AddStorage(machine, std::u16string(u"\\\\.\\") + letter + u":", number);
}

inline platform::simulated::Volume& AddVolume(Machine& machine, unsigned number, const Texts& paths,
                                              std::uint32_t type = platform::kDRIVE_REMOVABLE) {
  machine.volumes.push_back({Numbered(u"\\\\?\\Volume{", number, u"}\\"), u"", paths, {}, type, false, {}});
  return machine.volumes.back();
}

// A device with an interface of that path, and what storage requests to it answer.
inline Storage& AddStorageDevice(Machine& machine, const std::u16string& id, const std::u16string& parent,
                                 const platform::Guid& interfaceClass, const std::u16string& path, unsigned number) {
  AddDevice(machine, id, parent);
  machine.interfaces.push_back({interfaceClass, path, id});
  return AddStorage(machine, path, number);
}
inline Storage& AddDisk(Machine& machine, const std::u16string& id, const std::u16string& parent, unsigned number) {
  return AddStorageDevice(machine, id, parent, platform::GUID_DEVINTERFACE_DISK, Numbered(u"\\\\?\\disk", number),
                          number);
}
// A volume of the machine may name the device.
inline Storage& AddVolumeDevice(Machine& machine, const std::u16string& id, const std::u16string& parent,
                                unsigned number) {
  return AddStorageDevice(machine, id, parent, platform::GUID_DEVINTERFACE_VOLUME, Numbered(u"\\\\?\\vol", number),
                          number);
}

inline constexpr char16_t kVolumeManager[] = u"ROOT\\VOLMGR\\0000";

inline std::u16string StickId(unsigned number) { return Numbered(u"USB\\VID_0781&PID_5567\\S", number); }
inline std::u16string StickDiskId(unsigned number) { return Numbered(u"USBSTOR\\DISK&VEN_SANDISK\\S", number, u"&0"); }
inline std::u16string StickVolumeId(unsigned number) {
  return Numbered(u"STORAGE\\VOLUME\\_??_USBSTOR#DISK&VEN_SANDISK#S", number, u"&0#{53f56307}");
}

// A USB stick with one partition; letter 0: mounted nowhere.
inline void AddStick(Machine& machine, unsigned number, char16_t letter) {
  AddDevice(machine, StickId(number), u"");
  AddDisk(machine, StickDiskId(number), StickId(number), number);
  Storage& storage = AddVolumeDevice(machine, StickVolumeId(number), kVolumeManager, number);
  storage.vendor = "SanDisk ";
  storage.serial = "4C53";
  AddVolume(machine, number, letter ? Texts{std::u16string(1, letter) + u":\\"} : Texts{}).device =
      StickVolumeId(number);
  if (letter) AddDrive(machine, letter, number);
}

// A PC with a volume manager, and nothing else yet.
inline Machine EmptyPc() {
  Machine machine;
  AddDevice(machine, kVolumeManager, u"");
  return machine;
}

}  // namespace KelvoUHW
