#include "devinfo/disk_letters.h"

#include <algorithm>
#include <cstring>
#include <optional>

#include "devinfo/volume_table.h"
#include "platform/setup_api.h"
#include "platform/storage_ioctl.h"
#include "platform/text.h"
#include "records/device_set.h"
#include "records/devnode.h"
#include "records/received_text.h"

namespace KelvoUHW {
namespace {

constexpr std::uint32_t kDosNameChars = 260;
constexpr std::uint32_t kDetailBytes = 1024;

// The order of DiskLetterFinder's tables.
constexpr std::size_t kDisk = 0;
constexpr std::size_t kFloppy = 1;
constexpr std::size_t kCdrom = 2;
constexpr std::array<const platform::Guid*, 3> kInterfaceClasses{
    &platform::GUID_DEVINTERFACE_DISK, &platform::GUID_DEVINTERFACE_FLOPPY,
    &platform::GUID_DEVINTERFACE_CDROM};

std::optional<std::size_t> ClassOfDrive(std::uint32_t driveType, std::u16string_view dosName) {
  switch (driveType) {
    case platform::kDRIVE_REMOVABLE:
      return dosName.find(u"\\Floppy") != std::u16string_view::npos ? kFloppy : kDisk;
    case platform::kDRIVE_FIXED:
      return kDisk;
    case platform::kDRIVE_CDROM:
      return kCdrom;
    default:
      return {};
  }
}

std::optional<std::uint32_t> ReadDeviceNumber(platform::DeviceIo& io, const std::u16string& path) {
  DeviceFile device(io);
  if (!device.Open(path, 0, platform::kFILE_SHARE_READ | platform::kFILE_SHARE_WRITE)) return {};
  platform::STORAGE_DEVICE_NUMBER number{};
  std::uint32_t received = 0;
  const platform::Status status =
      io.DeviceControl(device.Get(), platform::kIOCTL_STORAGE_GET_DEVICE_NUMBER, nullptr, 0,
                       &number, sizeof number, received);
  // A short answer holds no number, and zero would be another disk's.
  if (!status || received < sizeof number) return {};
  return number.DeviceNumber;
}

// The detail of an interface that fits kDetailBytes, with the device it belongs to.
InterfaceDetail ReadShortDetail(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                                const platform::SP_DEVICE_INTERFACE_DATA& data,
                                platform::SP_DEVINFO_DATA& device) {
  std::uint32_t required = 0;
  std::vector<std::uint8_t> bytes(kDetailBytes);
  const std::uint32_t fixedPart = platform::kInterfaceDetailSize;
  std::memcpy(bytes.data(), &fixedPart, sizeof fixedPart);
  device.cbSize = sizeof device;
  if (!sets.GetDeviceInterfaceDetail(set, data, bytes.data(), kDetailBytes, &required, &device) ||
      required < platform::kInterfaceDetailPathOffset || required > kDetailBytes) {
    return {};
  }
  bytes.resize(required);
  return InterfaceDetail(bytes);
}

}  // namespace

void DiskLetterFinder::FindDriveLettersForDisk(const CZKUMInterfaceDeviceImpl& disk,
                                               std::vector<std::u16string>& roots) {
  if (!m_lettersRead) ReadLetters();
  const auto found = m_roots.find(platform::ToLower(disk.m_strDevInstId));
  if (found != m_roots.end()) roots.insert(roots.end(), found->second.begin(), found->second.end());
}

void DiskLetterFinder::ReadLetters() {
  m_roots.clear();
  // Opening a letter is expensive, and most are not there. A system that lists none is not
  // believed.
  const std::vector<std::u16string> present = ReadDriveRoots(m_host);
  const auto mayBeThere = [&present](char16_t letter) {
    return present.empty() || std::ranges::any_of(present, [letter](const std::u16string& root) {
             return platform::ToUpper(root.front()) == letter;
           });
  };
  for (char16_t letter = u'A'; letter <= u'Z'; ++letter) {
    if (!mayBeThere(letter)) continue;
    const platform::DevInst device = DeviceOfLetter(letter);
    if (device == 0) continue;
    m_roots[platform::ToLower(GetDeviceId(m_nodes, device))].push_back(
        std::u16string(1, letter).append(u":\\"));
  }
  m_lettersRead = true;
}

platform::DevInst DiskLetterFinder::DeviceOfLetter(char16_t letter) {
  const std::u16string drive = std::u16string(1, letter) + u":";
  const auto deviceNumber = ReadDeviceNumber(m_host, u"\\\\.\\" + drive);
  if (!deviceNumber) return 0;

  const std::uint32_t driveType = m_host.DriveType((drive + u"\\").c_str());
  std::array<char16_t, kDosNameChars> dosName{};
  if (!m_host.DosDeviceTarget(drive.c_str(), dosName.data(), kDosNameChars)) return 0;
  const auto dosText = ReceivedText(dosName);
  return dosText ? FindStorageDevInstByDeviceNumber(*deviceNumber, driveType, *dosText) : 0;
}

platform::DevInst DiskLetterFinder::FindStorageDevInstByDeviceNumber(
    std::uint32_t deviceNumber, std::uint32_t driveType, std::u16string_view dosDeviceName) {
  const auto classIndex = ClassOfDrive(driveType, dosDeviceName);
  if (!classIndex) return 0;
  const ClassDevices& devices = DevicesOf(*classIndex);
  const auto found = devices.ByNumber.find(deviceNumber);
  return found != devices.ByNumber.end() ? found->second : 0;
}

DiskLetterFinder::ClassDevices& DiskLetterFinder::DevicesOf(std::size_t classIndex) {
  ClassDevices& devices = m_classes[classIndex];
  if (!devices.Read) {
    devices.ByNumber.clear();
    ReadClass(*kInterfaceClasses[classIndex], devices);
    devices.Read = true;
  }
  return devices;
}

void DiskLetterFinder::ReadClass(const platform::Guid& interfaceClass, ClassDevices& devices) {
  DeviceSet set(m_host);
  if (!set.Open(&interfaceClass, platform::kDIGCF_PRESENT | platform::kDIGCF_DEVICEINTERFACE)) {
    return;
  }
  for (std::uint32_t index = 0; index < kMostElements; ++index) {
    platform::SP_DEVICE_INTERFACE_DATA data{};
    data.cbSize = sizeof data;
    if (!m_host.EnumDeviceInterfaces(set.Get(), interfaceClass, index, data)) return;
    platform::SP_DEVINFO_DATA device{};
    const InterfaceDetail detail = ReadShortDetail(m_host, set.Get(), data, device);
    if (!detail) continue;
    const auto deviceNumber = ReadDeviceNumber(m_host, detail.DevicePath());
    // The first interface with a number keeps it.
    if (deviceNumber) devices.ByNumber.emplace(*deviceNumber, device.DevInst);
  }
}

}  // namespace KelvoUHW
