#include "platform/wrappers/intercepting_host.h"

#include <array>

namespace platform::wrappers {

std::u16string_view NameOf(Operation operation) noexcept {
  static constexpr std::array<std::u16string_view, kOperations> kNames = {
      u"OpenDevice",
      u"DeviceControl",
      u"CloseDevice",
      u"GetClassDevs",
      u"EnumDeviceInfo",
      u"EnumDeviceInterfaces",
      u"GetDeviceInterfaceDetail",
      u"GetDeviceInstanceId",
      u"GetDeviceRegistryProperty",
      u"DestroyDeviceInfoList",
      u"GetClassImageList",
      u"GetClassImageIndex",
      u"DestroyClassImageList",
      u"GetClassDescription",
      u"LocateRootDevNode",
      u"GetParent",
      u"GetChild",
      u"GetSibling",
      u"GetDeviceId",
      u"GetDevNodeRegistryProperty",
      u"FirstVolume",
      u"NextVolume",
      u"CloseVolumeSearch",
      u"VolumePathNames",
      u"VolumeNameForMountPoint",
      u"LogicalDriveStrings",
      u"DriveType",
      u"VolumeInformation",
      u"FirstMountPoint",
      u"NextMountPoint",
      u"CloseMountPointSearch",
      u"DosDeviceTarget",
      u"WriteDebugText",
  };
  return kNames[static_cast<std::size_t>(operation)];
}

bool IsReleasing(Operation operation) noexcept {
  switch (operation) {
    case Operation::CloseDevice:
    case Operation::DestroyDeviceInfoList:
    case Operation::DestroyClassImageList:
    case Operation::CloseVolumeSearch:
    case Operation::CloseMountPointSearch:
      return true;
    default:
      return false;
  }
}

bool IsConfigurationManager(Operation operation) noexcept {
  return operation >= Operation::LocateRootDevNode &&
         operation <= Operation::GetDevNodeRegistryProperty;
}

void InterceptingHost::AfterCall(const HostCall&, const Status&, const std::intptr_t*) noexcept {}

template <class Forward>
Status InterceptingHost::Ask(const HostCall& call, Forward forward) noexcept {
  Status status = BeforeCall(call);
  if (status || IsReleasing(call.operation)) status = forward();
  AfterCall(call, status, nullptr);
  return status;
}

template <class Forward>
Status InterceptingHost::AskForHandle(const HostCall& call, std::intptr_t& opened,
                                      Forward forward) noexcept {
  opened = kInvalidHandle;
  Status status = BeforeCall(call);
  if (status) status = forward();
  AfterCall(call, status, status ? &opened : nullptr);
  return status;
}

Status InterceptingHost::OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                                    FileHandle& handle) noexcept {
  return AskForHandle({.operation = Operation::OpenDevice, .path = path}, handle,
                      [&] { return m_base.OpenDevice(path, access, share, handle); });
}

Status InterceptingHost::DeviceControl(FileHandle handle, std::uint32_t code, const void* in,
                                       std::uint32_t inBytes, void* out, std::uint32_t outBytes,
                                       std::uint32_t& returnedBytes) noexcept {
  returnedBytes = 0;
  return Ask({Operation::DeviceControl, code, nullptr, handle, inBytes, outBytes}, [&] {
    return m_base.DeviceControl(handle, code, in, inBytes, out, outBytes, returnedBytes);
  });
}

Status InterceptingHost::CloseDevice(FileHandle handle) noexcept {
  return Ask({.operation = Operation::CloseDevice, .handle = handle},
             [&] { return m_base.CloseDevice(handle); });
}

Status InterceptingHost::GetClassDevs(const Guid* guid, std::uint32_t flags,
                                      DeviceSetHandle& set) noexcept {
  return AskForHandle({.operation = Operation::GetClassDevs, .code = flags}, set,
                      [&] { return m_base.GetClassDevs(guid, flags, set); });
}

Status InterceptingHost::EnumDeviceInfo(DeviceSetHandle set, std::uint32_t index,
                                        SP_DEVINFO_DATA& data) noexcept {
  return Ask({.operation = Operation::EnumDeviceInfo, .code = index, .handle = set},
             [&] { return m_base.EnumDeviceInfo(set, index, data); });
}

Status InterceptingHost::EnumDeviceInterfaces(DeviceSetHandle set, const Guid& interfaceClass,
                                              std::uint32_t index,
                                              SP_DEVICE_INTERFACE_DATA& data) noexcept {
  return Ask({.operation = Operation::EnumDeviceInterfaces, .code = index, .handle = set},
             [&] { return m_base.EnumDeviceInterfaces(set, interfaceClass, index, data); });
}

Status InterceptingHost::GetDeviceInterfaceDetail(DeviceSetHandle set,
                                                  const SP_DEVICE_INTERFACE_DATA& data,
                                                  void* detail, std::uint32_t detailBytes,
                                                  std::uint32_t* required,
                                                  SP_DEVINFO_DATA* device) noexcept {
  return Ask(
      {.operation = Operation::GetDeviceInterfaceDetail, .handle = set, .outSize = detailBytes},
      [&] {
        return m_base.GetDeviceInterfaceDetail(set, data, detail, detailBytes, required, device);
      });
}

Status InterceptingHost::GetDeviceInstanceId(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                             char16_t* buffer, std::uint32_t bufferChars,
                                             std::uint32_t* required) noexcept {
  return Ask({.operation = Operation::GetDeviceInstanceId, .handle = set, .outSize = bufferChars},
             [&] { return m_base.GetDeviceInstanceId(set, data, buffer, bufferChars, required); });
}

Status InterceptingHost::GetDeviceRegistryProperty(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                                   std::uint32_t property, std::uint32_t* type,
                                                   void* buffer, std::uint32_t bufferBytes,
                                                   std::uint32_t* required) noexcept {
  return Ask({Operation::GetDeviceRegistryProperty, property, nullptr, set, 0, bufferBytes}, [&] {
    return m_base.GetDeviceRegistryProperty(set, data, property, type, buffer, bufferBytes,
                                            required);
  });
}

Status InterceptingHost::DestroyDeviceInfoList(DeviceSetHandle set) noexcept {
  return Ask({.operation = Operation::DestroyDeviceInfoList, .handle = set},
             [&] { return m_base.DestroyDeviceInfoList(set); });
}

Status InterceptingHost::GetClassImageList(DeviceSetHandle& imageList) noexcept {
  return AskForHandle({.operation = Operation::GetClassImageList}, imageList,
                      [&] { return m_base.GetClassImageList(imageList); });
}

Status InterceptingHost::GetClassImageIndex(DeviceSetHandle imageList, const Guid& classGuid,
                                            std::int32_t& index) noexcept {
  return Ask({.operation = Operation::GetClassImageIndex, .handle = imageList},
             [&] { return m_base.GetClassImageIndex(imageList, classGuid, index); });
}

Status InterceptingHost::DestroyClassImageList(DeviceSetHandle imageList) noexcept {
  return Ask({.operation = Operation::DestroyClassImageList, .handle = imageList},
             [&] { return m_base.DestroyClassImageList(imageList); });
}

Status InterceptingHost::GetClassDescription(const Guid& classGuid, char16_t* buffer,
                                             std::uint32_t bufferChars,
                                             std::uint32_t* required) noexcept {
  return Ask({.operation = Operation::GetClassDescription, .outSize = bufferChars},
             [&] { return m_base.GetClassDescription(classGuid, buffer, bufferChars, required); });
}

Status InterceptingHost::LocateRootDevNode(DevInst& node) noexcept {
  return Ask({.operation = Operation::LocateRootDevNode},
             [&] { return m_base.LocateRootDevNode(node); });
}

Status InterceptingHost::GetParent(DevInst node, DevInst& parent) noexcept {
  return Ask({.operation = Operation::GetParent, .handle = static_cast<std::intptr_t>(node)},
             [&] { return m_base.GetParent(node, parent); });
}

Status InterceptingHost::GetChild(DevInst node, DevInst& child) noexcept {
  return Ask({.operation = Operation::GetChild, .handle = static_cast<std::intptr_t>(node)},
             [&] { return m_base.GetChild(node, child); });
}

Status InterceptingHost::GetSibling(DevInst node, DevInst& sibling) noexcept {
  return Ask({.operation = Operation::GetSibling, .handle = static_cast<std::intptr_t>(node)},
             [&] { return m_base.GetSibling(node, sibling); });
}

Status InterceptingHost::GetDeviceId(DevInst node, char16_t* buffer,
                                     std::uint32_t bufferChars) noexcept {
  return Ask({.operation = Operation::GetDeviceId,
              .handle = static_cast<std::intptr_t>(node),
              .outSize = bufferChars},
             [&] { return m_base.GetDeviceId(node, buffer, bufferChars); });
}

Status InterceptingHost::GetDevNodeRegistryProperty(DevInst node, std::uint32_t property,
                                                    std::uint32_t* type, void* buffer,
                                                    std::uint32_t& bytes) noexcept {
  return Ask(
      {Operation::GetDevNodeRegistryProperty, property, nullptr, static_cast<std::intptr_t>(node),
       0, bytes},
      [&] { return m_base.GetDevNodeRegistryProperty(node, property, type, buffer, bytes); });
}

Status InterceptingHost::FirstVolume(char16_t* name, std::uint32_t nameChars,
                                     FindHandle& search) noexcept {
  return AskForHandle({.operation = Operation::FirstVolume, .outSize = nameChars}, search,
                      [&] { return m_base.FirstVolume(name, nameChars, search); });
}

Status InterceptingHost::NextVolume(FindHandle search, char16_t* name,
                                    std::uint32_t nameChars) noexcept {
  return Ask({.operation = Operation::NextVolume, .handle = search, .outSize = nameChars},
             [&] { return m_base.NextVolume(search, name, nameChars); });
}

Status InterceptingHost::CloseVolumeSearch(FindHandle search) noexcept {
  return Ask({.operation = Operation::CloseVolumeSearch, .handle = search},
             [&] { return m_base.CloseVolumeSearch(search); });
}

Status InterceptingHost::VolumePathNames(const char16_t* volumeName, char16_t* names,
                                         std::uint32_t namesChars,
                                         std::uint32_t& required) noexcept {
  return Ask({.operation = Operation::VolumePathNames, .path = volumeName, .outSize = namesChars},
             [&] { return m_base.VolumePathNames(volumeName, names, namesChars, required); });
}

Status InterceptingHost::VolumeNameForMountPoint(const char16_t* mountPoint, char16_t* name,
                                                 std::uint32_t nameChars) noexcept {
  return Ask(
      {.operation = Operation::VolumeNameForMountPoint, .path = mountPoint, .outSize = nameChars},
      [&] { return m_base.VolumeNameForMountPoint(mountPoint, name, nameChars); });
}

std::uint32_t InterceptingHost::LogicalDriveStrings(std::uint32_t bufferChars,
                                                    char16_t* buffer) noexcept {
  std::uint32_t written = 0;
  Ask({.operation = Operation::LogicalDriveStrings, .outSize = bufferChars}, [&] {
    written = m_base.LogicalDriveStrings(bufferChars, buffer);
    return Status::Success();
  });
  return written;
}

std::uint32_t InterceptingHost::DriveType(const char16_t* path) noexcept {
  std::uint32_t type = kDRIVE_UNKNOWN;
  Ask({.operation = Operation::DriveType, .path = path}, [&] {
    type = m_base.DriveType(path);
    return Status::Success();
  });
  return type;
}

Status InterceptingHost::VolumeInformation(const char16_t* path, char16_t* label,
                                           std::uint32_t labelChars, std::uint32_t& serial,
                                           std::uint32_t& fileSystemFlags, char16_t* fileSystem,
                                           std::uint32_t fileSystemChars) noexcept {
  return Ask({.operation = Operation::VolumeInformation, .path = path, .outSize = labelChars}, [&] {
    return m_base.VolumeInformation(path, label, labelChars, serial, fileSystemFlags, fileSystem,
                                    fileSystemChars);
  });
}

Status InterceptingHost::FirstMountPoint(const char16_t* volumeName, char16_t* mountPoint,
                                         std::uint32_t mountPointChars,
                                         FindHandle& search) noexcept {
  return AskForHandle(
      {.operation = Operation::FirstMountPoint, .path = volumeName, .outSize = mountPointChars},
      search,
      [&] { return m_base.FirstMountPoint(volumeName, mountPoint, mountPointChars, search); });
}

Status InterceptingHost::NextMountPoint(FindHandle search, char16_t* mountPoint,
                                        std::uint32_t mountPointChars) noexcept {
  return Ask({.operation = Operation::NextMountPoint, .handle = search, .outSize = mountPointChars},
             [&] { return m_base.NextMountPoint(search, mountPoint, mountPointChars); });
}

Status InterceptingHost::CloseMountPointSearch(FindHandle search) noexcept {
  return Ask({.operation = Operation::CloseMountPointSearch, .handle = search},
             [&] { return m_base.CloseMountPointSearch(search); });
}

Status InterceptingHost::DosDeviceTarget(const char16_t* name, char16_t* target,
                                         std::uint32_t targetChars) noexcept {
  return Ask({.operation = Operation::DosDeviceTarget, .path = name, .outSize = targetChars},
             [&] { return m_base.DosDeviceTarget(name, target, targetChars); });
}

void InterceptingHost::WriteDebugText(const char16_t* text) noexcept {
  const HostCall call{.operation = Operation::WriteDebugText, .path = text};
  BeforeCall(call);
  m_base.WriteDebugText(text);
  AfterCall(call, Status::Success(), nullptr);
}

}  // namespace platform::wrappers
