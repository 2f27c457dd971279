// The seam (platform/host.h) implemented with Windows' own calls: the PC that the program runs on.
// This room has such a class for each interface of the seam. Besides it only platform/com.h
// includes windows.h in the component.
#pragma once

#include "platform/host.h"

namespace platform::windows {

// Each operation is the system's call of the same meaning and nothing more. An object holds no
// state, and serves any number of threads.
class WindowsHost final : public Host {
 public:
  Status OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                    FileHandle& handle) noexcept override;
  Status DeviceControl(FileHandle handle, std::uint32_t code, const void* in, std::uint32_t inBytes,
                       void* out, std::uint32_t outBytes,
                       std::uint32_t& returnedBytes) noexcept override;
  Status CloseDevice(FileHandle handle) noexcept override;

  Status GetClassDevs(const Guid* guid, std::uint32_t flags,
                      DeviceSetHandle& set) noexcept override;
  Status EnumDeviceInfo(DeviceSetHandle set, std::uint32_t index,
                        SP_DEVINFO_DATA& data) noexcept override;
  Status EnumDeviceInterfaces(DeviceSetHandle set, const Guid& interfaceClass, std::uint32_t index,
                              SP_DEVICE_INTERFACE_DATA& data) noexcept override;
  Status GetDeviceInterfaceDetail(DeviceSetHandle set, const SP_DEVICE_INTERFACE_DATA& data,
                                  void* detail, std::uint32_t detailBytes, std::uint32_t* required,
                                  SP_DEVINFO_DATA* device) noexcept override;
  Status GetDeviceInstanceId(DeviceSetHandle set, const SP_DEVINFO_DATA& data, char16_t* buffer,
                             std::uint32_t bufferChars, std::uint32_t* required) noexcept override;
  Status GetDeviceRegistryProperty(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                   std::uint32_t property, std::uint32_t* type, void* buffer,
                                   std::uint32_t bufferBytes,
                                   std::uint32_t* required) noexcept override;
  Status DestroyDeviceInfoList(DeviceSetHandle set) noexcept override;
  Status GetClassImageList(DeviceSetHandle& imageList) noexcept override;
  Status GetClassImageIndex(DeviceSetHandle imageList, const Guid& classGuid,
                            std::int32_t& index) noexcept override;
  Status DestroyClassImageList(DeviceSetHandle imageList) noexcept override;
  Status GetClassDescription(const Guid& classGuid, char16_t* buffer, std::uint32_t bufferChars,
                             std::uint32_t* required) noexcept override;

  Status LocateRootDevNode(DevInst& node) noexcept override;
  Status GetParent(DevInst node, DevInst& parent) noexcept override;
  Status GetChild(DevInst node, DevInst& child) noexcept override;
  Status GetSibling(DevInst node, DevInst& sibling) noexcept override;
  Status GetDeviceId(DevInst node, char16_t* buffer, std::uint32_t bufferChars) noexcept override;
  Status GetDevNodeRegistryProperty(DevInst node, std::uint32_t property, std::uint32_t* type,
                                    void* buffer, std::uint32_t& bytes) noexcept override;

  Status FirstVolume(char16_t* name, std::uint32_t nameChars, FindHandle& search) noexcept override;
  Status NextVolume(FindHandle search, char16_t* name, std::uint32_t nameChars) noexcept override;
  Status CloseVolumeSearch(FindHandle search) noexcept override;
  Status VolumePathNames(const char16_t* volumeName, char16_t* names, std::uint32_t namesChars,
                         std::uint32_t& required) noexcept override;
  Status VolumeNameForMountPoint(const char16_t* mountPoint, char16_t* name,
                                 std::uint32_t nameChars) noexcept override;
  std::uint32_t LogicalDriveStrings(std::uint32_t bufferChars, char16_t* buffer) noexcept override;
  std::uint32_t DriveType(const char16_t* path) noexcept override;
  Status VolumeInformation(const char16_t* path, char16_t* label, std::uint32_t labelChars,
                           std::uint32_t& serial, std::uint32_t& fileSystemFlags,
                           char16_t* fileSystem, std::uint32_t fileSystemChars) noexcept override;
  Status FirstMountPoint(const char16_t* volumeName, char16_t* mountPoint,
                         std::uint32_t mountPointChars, FindHandle& search) noexcept override;
  Status NextMountPoint(FindHandle search, char16_t* mountPoint,
                        std::uint32_t mountPointChars) noexcept override;
  Status CloseMountPointSearch(FindHandle search) noexcept override;
  Status DosDeviceTarget(const char16_t* name, char16_t* target,
                         std::uint32_t targetChars) noexcept override;

  void WriteDebugText(const char16_t* text) noexcept override;
};

}  // namespace platform::windows
