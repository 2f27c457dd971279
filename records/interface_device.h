// The record of a volume or of a disk that no volume names.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/host.h"
#include "platform/storage_ioctl.h"
#include "records/device_set.h"
#include "records/node.h"

namespace KelvoUHW {

// A volume serial number that is not known; dumps show it as -1.
inline constexpr std::uint32_t kUnknownVolumeSerialNumber = 0xFFFFFFFF;

// Room for a storage descriptor and its texts, in bytes.
inline constexpr std::size_t kStorageDescriptorBytes = 512;

// Filled by one thread during a storage pass, only read afterwards. The base fields that it uses:
// instance id, device handles, parent instance id, the device-type name as the description, and the
// serial number of the storage descriptor where that has one.
class CZKUMInterfaceDeviceImpl final : public CZKUMUsbTreeNodeImpl {
 public:
  CZKUMInterfaceDeviceImpl() noexcept;
  void OwnLines(std::u16string& out, const std::u16string& indent) const override;

  // The path of the device interface; empty without a detail.
  const std::u16string& DevicePath() const noexcept { return Detail.DevicePath(); }
  // The first of the mount points; empty when there is none.
  std::u16string MountPoint() const { return MountPoints.empty() ? u"" : MountPoints.front(); }
  // The fixed part of the descriptor; zero as far as nothing was received.
  platform::STORAGE_DEVICE_DESCRIPTOR DescriptorHeader() const noexcept;

  // Drive roots such as E:\ and folders with a backslash at their end.
  std::vector<std::u16string> MountPoints;
  platform::SP_DEVICE_INTERFACE_DATA InterfaceData{};  // cbSize is set
  platform::SP_DEVINFO_DATA DeviceData{};
  InterfaceDetail Detail;
  // The texts of the storage descriptor with their blanks, one character for each byte.
  std::u16string StorageVendorId;
  std::u16string StorageProductId;
  std::u16string ProductRev;
  std::u16string MediaSerialNumber;
  std::uint32_t VolumeSerialNumber = kUnknownVolumeSerialNumber;
  std::u16string VolumeName;  // \\?\Volume{...}\, empty for a disk
  // A STORAGE_DEVICE_DESCRIPTOR and its texts as received, at most kStorageDescriptorBytes; empty
  // for a disk.
  std::vector<std::uint8_t> Descriptor;
  // The opened device path while it is being queried.
  std::optional<DeviceFile> DeviceHandle;

 private:
  void DevicePropertiesToString(std::u16string& out, const std::u16string& indent) const;
};

// The name of a storage device type such as "Direct Access Device"; all above 15 are
// "Unknown Device". Callable from every thread.
std::u16string_view StorageDeviceTypeName(std::uint8_t deviceType) noexcept;

}  // namespace KelvoUHW
