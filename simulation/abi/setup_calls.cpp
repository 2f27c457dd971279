// Device-information sets.
#include "simulation/abi/state.h"
#include "simulation/pc/class_table.h"

namespace abi_pc {
namespace {

// The sizes that the documentation names, of either width.
constexpr DWORD kElementSize = sizeof(void*) == 8 ? 32 : 28;
constexpr DWORD kInterfaceSize = sizeof(void*) == 8 ? 32 : 28;
constexpr DWORD kDetailSize = sizeof(void*) == 8 ? 8 : 6;
constexpr DWORD kImagesSize = sizeof(void*) == 8 ? 24 : 12;
constexpr std::size_t kPathOffset = 4;
static_assert(sizeof(SP_DEVINFO_DATA) == kElementSize &&
              sizeof(SP_DEVICE_INTERFACE_DATA) == kInterfaceSize &&
              sizeof(SP_DEVICE_INTERFACE_DETAIL_DATA_W) == kDetailSize &&
              sizeof(SP_CLASSIMAGELIST_DATA) == kImagesSize);

// What says to which set an element belongs, and where it stands there.
ULONG_PTR Reserved(HANDLE set, std::size_t position) {
  return reinterpret_cast<std::uintptr_t>(set) * 0x100 + position + 1;
}
std::size_t PositionIn(HANDLE set, ULONG_PTR reserved) { return reserved - Reserved(set, 0); }

void Fill(HANDLE set, const sim::SetContents& contents, std::size_t position,
          SP_DEVINFO_DATA& data) {
  std::memcpy(&data.ClassGuid, &contents.devices[position].classGuid, sizeof data.ClassGuid);
  data.DevInst = contents.devices[position].number;
  data.Reserved = Reserved(set, position);
}

// Overwrites all but the size.
template <class Record>
void SpoilRecord(Record* record) {
  if (record == nullptr) return;
  const DWORD size = record->cbSize;
  Spoil(record);
  record->cbSize = size;
}

HDEVINFO WINAPI GetClassDevs(const GUID* guid, PCWSTR enumerator, HWND window, DWORD flags) {
  const Call call("SetupDiGetClassDevsW");
  const auto refuse = [&](DWORD code) { return call.Refuse(code), INVALID_HANDLE_VALUE; };
  call.Want(enumerator == nullptr && window == nullptr, "an enumerator or a window");
  call.Want((flags & 0x02) != 0, "devices that are not there are asked for, too");
  call.Want((flags & ~0x1Eu) == 0, "a flag that does not exist");
  if (guid == nullptr && (flags & 0x04) == 0) {
    call.Breach("neither a class nor all of them");
    return refuse(ERROR_INVALID_PARAMETER);
  }
  call.Want(guid == nullptr || (flags & 0x04) == 0, "a class and all of them");
  if (call.Fails()) return refuse(ERROR_GEN_FAILURE);
  const platform::Guid* const wanted = guid == nullptr ? nullptr : &AsKey(*guid);
  const Index& index = call.Machine().index;
  return call.Opened(Set{(flags & 0x10) != 0 ? index.Interfaces(wanted) : index.Devices(wanted)});
}

BOOL WINAPI EnumDeviceInfo(HDEVINFO handle, DWORD index, PSP_DEVINFO_DATA data) {
  const Call call("SetupDiEnumDeviceInfo");
  const Set* const set = call.Find<Set>(handle);
  if (set == nullptr) return call.Refuse(ERROR_INVALID_HANDLE);
  if (data->cbSize != kElementSize)
    return call.Misused(ERROR_INVALID_USER_BUFFER, "the element's size");
  SpoilRecord(data);
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  if (index >= set->contents->devices.size()) return call.Refuse(ERROR_NO_MORE_ITEMS);
  Fill(handle, *set->contents, index, *data);
  return call.Done();
}

BOOL WINAPI EnumDeviceInterfaces(HDEVINFO handle, PSP_DEVINFO_DATA device, const GUID* guid,
                                 DWORD index, PSP_DEVICE_INTERFACE_DATA data) {
  const Call call("SetupDiEnumDeviceInterfaces");
  // The component enumerates what it got, also where that was no set. A list is over then.
  if (handle == INVALID_HANDLE_VALUE) return call.Refuse(ERROR_INVALID_HANDLE);
  const Set* const set = call.Find<Set>(handle);
  if (set == nullptr) return call.Refuse(ERROR_INVALID_HANDLE);
  call.Want(device == nullptr, "interfaces of one device");
  if (data->cbSize != kInterfaceSize)
    return call.Misused(ERROR_INVALID_USER_BUFFER, "the interface's size");
  SpoilRecord(data);
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  const auto found = set->contents->byClass.find(AsKey(*guid));
  if (found == set->contents->byClass.end() || index >= found->second.size())
    return call.Refuse(ERROR_NO_MORE_ITEMS);
  data->InterfaceClassGuid = *guid;
  data->Flags = SPINT_ACTIVE;
  data->Reserved = Reserved(handle, found->second[index]);
  return call.Done();
}

BOOL WINAPI GetInterfaceDetail(HDEVINFO handle, PSP_DEVICE_INTERFACE_DATA data,
                               PSP_DEVICE_INTERFACE_DETAIL_DATA_W detail, DWORD bytes,
                               PDWORD required, PSP_DEVINFO_DATA device) {
  const Call call("SetupDiGetDeviceInterfaceDetailW");
  const Set* const set = call.Find<Set>(handle);
  if (set == nullptr) return call.Refuse(ERROR_INVALID_HANDLE);
  if (data->cbSize != kInterfaceSize || (device != nullptr && device->cbSize != kElementSize)) {
    return call.Misused(ERROR_INVALID_USER_BUFFER, "the size of the interface or the element");
  }
  if (detail == nullptr ? bytes != 0 : bytes < kDetailSize || detail->cbSize != kDetailSize) {
    return call.Misused(ERROR_INVALID_USER_BUFFER,
                        "the size of the detail, or a size without a buffer");
  }
  const sim::SetContents& contents = *set->contents;
  const std::size_t position = PositionIn(handle, data->Reserved);
  if (position >= contents.interfaces.size() ||
      std::memcmp(&contents.interfaces[position].interfaceClass, &data->InterfaceClassGuid,
                  sizeof(GUID)) != 0) {
    return call.Misused(ERROR_INVALID_PARAMETER, "an interface of another set");
  }
  Spoil(required);
  SpoilRecord(device);
  if (detail != nullptr) {
    call.SpoilBytes(detail, bytes);
    detail->cbSize = kDetailSize;
  }
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  const auto& element = contents.interfaces[position];
  if (call.Machine().index.DeviceByNumber(contents.devices[element.device].number) == kNone) {
    return call.Refuse(ERROR_NO_SUCH_DEVINST);
  }
  const std::size_t pathBytes = (element.path.size() + 1) * sizeof(wchar_t);
  if (required != nullptr) *required = static_cast<DWORD>(kPathOffset + pathBytes);
  if (device != nullptr) Fill(handle, contents, element.device, *device);
  if (detail == nullptr || bytes < kPathOffset + pathBytes)
    return call.Refuse(ERROR_INSUFFICIENT_BUFFER);
  std::memcpy(detail->DevicePath, element.path.c_str(), pathBytes);
  return call.Done();
}

// The device of an element, as it is now; otherwise the code that the system gives.
const sim::Device* DeviceOf(const Call& call, HDEVINFO handle, const SP_DEVINFO_DATA& data,
                            DWORD& code) {
  code = ERROR_INVALID_HANDLE;
  const Set* const set = call.Find<Set>(handle);
  if (set == nullptr) return nullptr;
  code = ERROR_INVALID_USER_BUFFER;
  if (!call.Want(data.cbSize == kElementSize, "the element's size")) return nullptr;
  code = ERROR_INVALID_PARAMETER;
  const std::size_t position = PositionIn(handle, data.Reserved);
  const auto& devices = set->contents->devices;
  if (!call.Want(position < devices.size() && devices[position].number == data.DevInst,
                 "an element of another set")) {
    return nullptr;
  }
  code = ERROR_GEN_FAILURE;
  if (call.Fails()) return nullptr;
  code = ERROR_NO_SUCH_DEVINST;
  const Position device = call.Machine().index.DeviceByNumber(data.DevInst);
  return device == kNone ? nullptr : &call.Machine().machine.devices[device];
}

BOOL WINAPI GetInstanceId(HDEVINFO handle, PSP_DEVINFO_DATA data, PWSTR buffer, DWORD chars,
                          PDWORD required) {
  const Call call("SetupDiGetDeviceInstanceIdW");
  Spoil(required);
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  DWORD code = 0;
  const sim::Device* const device = DeviceOf(call, handle, *data, code);
  if (device == nullptr) return call.Refuse(code);
  if (required != nullptr) *required = static_cast<DWORD>(device->id.size() + 1);
  return GiveText(device->id, buffer, chars) ? call.Done() : call.Refuse(ERROR_INSUFFICIENT_BUFFER);
}

BOOL WINAPI GetRegistryProperty(HDEVINFO handle, PSP_DEVINFO_DATA data, DWORD property, PDWORD type,
                                PBYTE buffer, DWORD bytes, PDWORD required) {
  const Call call("SetupDiGetDeviceRegistryPropertyW");
  if (buffer == nullptr && bytes != 0)
    return call.Misused(ERROR_INVALID_PARAMETER, "a size without a buffer");
  Spoil(type, required);
  call.SpoilBytes(buffer, bytes);
  DWORD code = 0;
  const sim::Device* const device = DeviceOf(call, handle, *data, code);
  if (device == nullptr) return call.Refuse(code);
  const auto value = PropertyOf(*device, property);
  if (!value) return call.Refuse(ERROR_INVALID_DATA);
  if (type != nullptr) *type = value->first;
  if (required != nullptr) *required = static_cast<DWORD>(value->second.size());
  if (bytes < value->second.size()) return call.Refuse(ERROR_INSUFFICIENT_BUFFER);
  std::memcpy(buffer, value->second.data(), value->second.size());
  return call.Done();
}

BOOL WINAPI DestroyInfoList(HDEVINFO handle) {
  return Call("SetupDiDestroyDeviceInfoList").Close<Set>(handle);
}

BOOL WINAPI GetImageList(PSP_CLASSIMAGELIST_DATA data) {
  const Call call("SetupDiGetClassImageList");
  if (data->cbSize != kImagesSize)
    return call.Misused(ERROR_INVALID_USER_BUFFER, "the list's size");
  SpoilRecord(data);
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  data->ImageList = static_cast<HIMAGELIST>(call.Opened(Images{}));
  data->Reserved = reinterpret_cast<ULONG_PTR>(data->ImageList) + 1;
  return call.Done();
}

// The record must be the one that was filled.
bool IsList(const Call& call, const SP_CLASSIMAGELIST_DATA& data) {
  return call.Want(data.cbSize == kImagesSize &&
                       data.Reserved == reinterpret_cast<ULONG_PTR>(data.ImageList) + 1,
                   "a record that was not filled");
}

BOOL WINAPI GetImageIndex(PSP_CLASSIMAGELIST_DATA data, const GUID* guid, PINT index) {
  const Call call("SetupDiGetClassImageIndex");
  Spoil(index);
  if (!IsList(call, *data) || call.Find<Images>(data->ImageList) == nullptr)
    return call.Refuse(ERROR_INVALID_HANDLE);
  const sim::ClassInfo* const info = call.Machine().index.Class(AsKey(*guid));
  if (call.Fails() || info == nullptr || !info->hasImage) return call.Refuse(ERROR_INVALID_CLASS);
  *index = 0;
  return call.Done();
}

BOOL WINAPI DestroyImageList(PSP_CLASSIMAGELIST_DATA data) {
  const Call call("SetupDiDestroyClassImageList");
  return IsList(call, *data) ? call.Close<Images>(data->ImageList)
                             : call.Refuse(ERROR_INVALID_HANDLE);
}

BOOL WINAPI GetDescription(const GUID* guid, PWSTR buffer, DWORD chars, PDWORD required) {
  const Call call("SetupDiGetClassDescriptionW");
  Spoil(required);
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  const sim::ClassInfo* const info = call.Machine().index.Class(AsKey(*guid));
  if (call.Fails() || info == nullptr || !info->hasDescription)
    return call.Refuse(ERROR_INVALID_CLASS);
  const std::u16string_view known = sim::WellKnownClassDescription(AsKey(*guid));
  const std::u16string_view text = known.empty() ? std::u16string_view(info->name) : known;
  if (required != nullptr) *required = static_cast<DWORD>(text.size() + 1);
  return GiveText(text, buffer, chars) ? call.Done() : call.Refuse(ERROR_INSUFFICIENT_BUFFER);
}

}  // namespace

Functions SetupFunctions() {
  return {{"SetupDiGetClassDevsW", Address(GetClassDevs)},
          {"SetupDiEnumDeviceInfo", Address(EnumDeviceInfo)},
          {"SetupDiEnumDeviceInterfaces", Address(EnumDeviceInterfaces)},
          {"SetupDiGetDeviceInterfaceDetailW", Address(GetInterfaceDetail)},
          {"SetupDiGetDeviceInstanceIdW", Address(GetInstanceId)},
          {"SetupDiGetDeviceRegistryPropertyW", Address(GetRegistryProperty)},
          {"SetupDiDestroyDeviceInfoList", Address(DestroyInfoList)},
          {"SetupDiGetClassImageList", Address(GetImageList)},
          {"SetupDiGetClassImageIndex", Address(GetImageIndex)},
          {"SetupDiDestroyClassImageList", Address(DestroyImageList)},
          {"SetupDiGetClassDescriptionW", Address(GetDescription)}};
}

}  // namespace abi_pc
