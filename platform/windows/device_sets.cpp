#include <memory>
#include <new>

#include "platform/windows/native_types.h"
#include "platform/windows/windows_host.h"

namespace platform::windows {

namespace {

::SP_DEVINFO_DATA* NativeElement(SP_DEVINFO_DATA* data) noexcept {
  return reinterpret_cast<::SP_DEVINFO_DATA*>(data);
}
// The calls that only read an element ask for a pointer that may write.
::SP_DEVINFO_DATA* NativeElement(const SP_DEVINFO_DATA& data) noexcept {
  return NativeElement(const_cast<SP_DEVINFO_DATA*>(&data));
}
::SP_DEVICE_INTERFACE_DATA* NativeInterface(const SP_DEVICE_INTERFACE_DATA& data) noexcept {
  return reinterpret_cast<::SP_DEVICE_INTERFACE_DATA*>(
      const_cast<SP_DEVICE_INTERFACE_DATA*>(&data));
}

// The system's record of an image list lives behind the handle.
SP_CLASSIMAGELIST_DATA* NativeImages(DeviceSetHandle imageList) noexcept {
  return reinterpret_cast<SP_CLASSIMAGELIST_DATA*>(imageList);
}
bool IsNone(DeviceSetHandle imageList) noexcept {
  return imageList == 0 || imageList == kInvalidHandle;
}

}  // namespace

Status WindowsHost::GetClassDevs(const Guid* guid, std::uint32_t flags,
                                 DeviceSetHandle& set) noexcept {
  return TakeHandle(SetupDiGetClassDevsW(Native(guid), nullptr, nullptr, flags), set);
}

Status WindowsHost::EnumDeviceInfo(DeviceSetHandle set, std::uint32_t index,
                                   SP_DEVINFO_DATA& data) noexcept {
  return FromBool(SetupDiEnumDeviceInfo(Native(set), index, NativeElement(&data)));
}

Status WindowsHost::EnumDeviceInterfaces(DeviceSetHandle set, const Guid& interfaceClass,
                                         std::uint32_t index,
                                         SP_DEVICE_INTERFACE_DATA& data) noexcept {
  return FromBool(SetupDiEnumDeviceInterfaces(Native(set), nullptr, Native(&interfaceClass), index,
                                              NativeInterface(data)));
}

Status WindowsHost::GetDeviceInterfaceDetail(DeviceSetHandle set,
                                             const SP_DEVICE_INTERFACE_DATA& data, void* detail,
                                             std::uint32_t detailBytes, std::uint32_t* required,
                                             SP_DEVINFO_DATA* device) noexcept {
  return FromBool(SetupDiGetDeviceInterfaceDetailW(
      Native(set), NativeInterface(data), static_cast<SP_DEVICE_INTERFACE_DETAIL_DATA_W*>(detail),
      detailBytes, Native(required), NativeElement(device)));
}

Status WindowsHost::GetDeviceInstanceId(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                        char16_t* buffer, std::uint32_t bufferChars,
                                        std::uint32_t* required) noexcept {
  return FromBool(SetupDiGetDeviceInstanceIdW(Native(set), NativeElement(data), Native(buffer),
                                              bufferChars, Native(required)));
}

Status WindowsHost::GetDeviceRegistryProperty(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                              std::uint32_t property, std::uint32_t* type,
                                              void* buffer, std::uint32_t bufferBytes,
                                              std::uint32_t* required) noexcept {
  return FromBool(SetupDiGetDeviceRegistryPropertyW(Native(set), NativeElement(data), property,
                                                    Native(type), static_cast<BYTE*>(buffer),
                                                    bufferBytes, Native(required)));
}

Status WindowsHost::DestroyDeviceInfoList(DeviceSetHandle set) noexcept {
  return FromBool(SetupDiDestroyDeviceInfoList(Native(set)));
}

Status WindowsHost::GetClassImageList(DeviceSetHandle& imageList) noexcept {
  imageList = kInvalidHandle;
  std::unique_ptr<SP_CLASSIMAGELIST_DATA> images(new (std::nothrow) SP_CLASSIMAGELIST_DATA{});
  if (images == nullptr) return Status::Failure(ERROR_NOT_ENOUGH_MEMORY);
  images->cbSize = sizeof *images;
  const Status status = FromBool(SetupDiGetClassImageList(images.get()));
  if (status) imageList = FromNative(images.release());
  return status;
}

Status WindowsHost::GetClassImageIndex(DeviceSetHandle imageList, const Guid& classGuid,
                                       std::int32_t& index) noexcept {
  if (IsNone(imageList)) return Status::Failure(ERROR_INVALID_HANDLE);
  INT found = 0;
  const Status status =
      FromBool(SetupDiGetClassImageIndex(NativeImages(imageList), Native(&classGuid), &found));
  if (status) index = found;
  return status;
}

Status WindowsHost::DestroyClassImageList(DeviceSetHandle imageList) noexcept {
  if (IsNone(imageList)) return Status::Failure(ERROR_INVALID_HANDLE);
  const std::unique_ptr<SP_CLASSIMAGELIST_DATA> images(NativeImages(imageList));
  return FromBool(SetupDiDestroyClassImageList(images.get()));
}

Status WindowsHost::GetClassDescription(const Guid& classGuid, char16_t* buffer,
                                        std::uint32_t bufferChars,
                                        std::uint32_t* required) noexcept {
  return FromBool(SetupDiGetClassDescriptionW(Native(&classGuid), Native(buffer), bufferChars,
                                              Native(required)));
}

}  // namespace platform::windows
