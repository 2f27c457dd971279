// A host (platform/host.h) around another host. Before each platform call it asks whether to make
// it, and may refuse. The other wrappers in this room count calls, log them, or fail the n-th.
// Tests, benchmarks and fuzz targets use them; the component knows none of them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "platform/host.h"

namespace platform::wrappers {

enum class Operation : std::uint8_t {
  OpenDevice,
  DeviceControl,
  CloseDevice,
  GetClassDevs,
  EnumDeviceInfo,
  EnumDeviceInterfaces,
  GetDeviceInterfaceDetail,
  GetDeviceInstanceId,
  GetDeviceRegistryProperty,
  DestroyDeviceInfoList,
  GetClassImageList,
  GetClassImageIndex,
  DestroyClassImageList,
  GetClassDescription,
  LocateRootDevNode,
  GetParent,
  GetChild,
  GetSibling,
  GetDeviceId,
  GetDevNodeRegistryProperty,
  FirstVolume,
  NextVolume,
  CloseVolumeSearch,
  VolumePathNames,
  VolumeNameForMountPoint,
  LogicalDriveStrings,
  DriveType,
  VolumeInformation,
  FirstMountPoint,
  NextMountPoint,
  CloseMountPointSearch,
  DosDeviceTarget,
  WriteDebugText,
};
inline constexpr std::size_t kOperations = static_cast<std::size_t>(Operation::WriteDebugText) + 1;

// The operation's name as the interface spells it.
std::u16string_view NameOf(Operation operation) noexcept;

// CloseDevice, DestroyDeviceInfoList, DestroyClassImageList and the two closes of searches: they
// give something back, so nothing ever keeps them from the base.
bool IsReleasing(Operation operation) noexcept;

// Whether the operation's errors are CR_ codes.
bool IsConfigurationManager(Operation operation) noexcept;

// A call as the hooks see it. What an operation does not have is zero or null.
struct HostCall {
  Operation operation;
  std::uint32_t code = 0;          // the request code; a property's number; an index
  const char16_t* path = nullptr;  // the text handed in, until the call returns
  std::intptr_t handle = 0;        // file, set, image list, search or device-manager node
  std::uint32_t inBytes = 0;
  std::uint32_t outSize = 0;  // in the operation's own unit, bytes or characters
};

// Forwards every operation to `base`, which must outlive it, and asks the hooks of a derived class
// around it. As thread-safe as the base and the hooks. A refused call leaves its out values as a
// failed one does: no handle, no returned bytes, nothing written; LogicalDriveStrings returns 0 and
// DriveType kDRIVE_UNKNOWN. Refusals of releasing operations and of WriteDebugText are disregarded.
class InterceptingHost : public Host {
 public:
  explicit InterceptingHost(Host& base) noexcept : m_base(base) {}
  InterceptingHost(const InterceptingHost&) = delete;
  InterceptingHost& operator=(const InterceptingHost&) = delete;

  // DeviceIo
  Status OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                    FileHandle& handle) noexcept override;
  Status DeviceControl(FileHandle handle, std::uint32_t code, const void* in, std::uint32_t inBytes,
                       void* out, std::uint32_t outBytes,
                       std::uint32_t& returnedBytes) noexcept override;
  Status CloseDevice(FileHandle handle) noexcept override;

  // DeviceSets
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

  // DeviceManager
  Status LocateRootDevNode(DevInst& node) noexcept override;
  Status GetParent(DevInst node, DevInst& parent) noexcept override;
  Status GetChild(DevInst node, DevInst& child) noexcept override;
  Status GetSibling(DevInst node, DevInst& sibling) noexcept override;
  Status GetDeviceId(DevInst node, char16_t* buffer, std::uint32_t bufferChars) noexcept override;
  Status GetDevNodeRegistryProperty(DevInst node, std::uint32_t property, std::uint32_t* type,
                                    void* buffer, std::uint32_t& bytes) noexcept override;

  // VolumeManager
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

  // DebugOutput
  void WriteDebugText(const char16_t* text) noexcept override;

 protected:
  // Asked before each call; a failure refuses the call and is its outcome.
  virtual Status BeforeCall(const HostCall& call) noexcept = 0;
  // Told the outcome of each call, refused ones included. `opened` is the handle that a successful
  // call gave out, else null.
  virtual void AfterCall(const HostCall& call, const Status& status,
                         const std::intptr_t* opened) noexcept;

 private:
  template <class Forward>
  Status Ask(const HostCall& call, Forward forward) noexcept;
  template <class Forward>
  Status AskForHandle(const HostCall& call, std::intptr_t& opened, Forward forward) noexcept;

  Host& m_base;
};

}  // namespace platform::wrappers
