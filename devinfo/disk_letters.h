// The drive letters of a disk, found through the device numbers that letters and disks answer with.
//
// Used by one thread at a time; the calls may block on drivers. What cannot be opened or does not
// answer is left out; only std::bad_alloc is thrown.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/host.h"
#include "records/interface_device.h"

namespace KelvoUHW {

// Asks the system at the first question, about each letter and each interface class once, and
// answers from memory after that: one object serves one pass and does not notice what changes
// afterwards.
class DiskLetterFinder {
 public:
  explicit DiskLetterFinder(platform::Host& host) noexcept : DiskLetterFinder(host, host) {}
  // Ids of device-manager nodes are asked of `nodes`.
  DiskLetterFinder(platform::Host& host, platform::DeviceManager& nodes) noexcept
      : m_host(host), m_nodes(nodes) {}

  // Appends the roots (X:\, A first) of the letters whose device has the record's instance id,
  // ignoring case.
  void FindDriveLettersForDisk(const CZKUMInterfaceDeviceImpl& disk,
                               std::vector<std::u16string>& roots);

  // The device of the first interface with that device number, in the interface class that a drive
  // of this type (platform::kDRIVE_...) and DOS device name belongs to; 0 when there is none. Of
  // the answer only the number counts, not device type and partition.
  platform::DevInst FindStorageDevInstByDeviceNumber(std::uint32_t deviceNumber,
                                                     std::uint32_t driveType,
                                                     std::u16string_view dosDeviceName);

 private:
  // The devices of one interface class by their device numbers.
  struct ClassDevices {
    bool Read = false;
    std::unordered_map<std::uint32_t, platform::DevInst> ByNumber;
  };

  void ReadLetters();
  platform::DevInst DeviceOfLetter(char16_t letter);
  ClassDevices& DevicesOf(std::size_t classIndex);
  void ReadClass(const platform::Guid& interfaceClass, ClassDevices& devices);

  platform::Host& m_host;
  platform::DeviceManager& m_nodes;
  std::array<ClassDevices, 3> m_classes;                                    // disk, floppy, CD
  std::unordered_map<std::u16string, std::vector<std::u16string>> m_roots;  // by lower-cased id
  bool m_lettersRead = false;
};

}  // namespace KelvoUHW
