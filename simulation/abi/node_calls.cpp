// The configuration manager, and device notifications, which are looked on.
#include "simulation/abi/state.h"

#include <dbt.h>

namespace abi_pc {
namespace {

// The parameter that has no values yet.
void WantNoFlags(const Call& call, ULONG flags) { call.Want(flags == 0, "flags"); }

CONFIGRET WINAPI Locate(PDEVINST node, DEVINSTID_W id, ULONG flags) {
  const Call call("CM_Locate_DevNodeW");
  WantNoFlags(call, flags);
  call.Want(id == nullptr, "a node by its id");
  Spoil(node);
  if (call.Fails()) return CR_FAILURE;
  *node = sim::kRootDeviceNumber;
  return CR_SUCCESS;
}

// A step from a node to another one.
CONFIGRET Step(const Call& call, PDEVINST to, DEVINST from, ULONG flags,
               Position (Index::*step)(Position) const) {
  WantNoFlags(call, flags);
  Spoil(to);
  if (call.Fails()) return CR_FAILURE;
  const Index& index = call.Machine().index;
  const Position here = index.DeviceByNumber(from);
  if (here == kNone) return CR_INVALID_DEVNODE;
  const Position there = (index.*step)(here);
  if (there == kNone) return CR_NO_SUCH_DEVNODE;
  *to = index.NumberOf(there);
  return CR_SUCCESS;
}
CONFIGRET WINAPI Parent(PDEVINST to, DEVINST from, ULONG flags) {
  return Step(Call("CM_Get_Parent"), to, from, flags, &Index::Parent);
}
CONFIGRET WINAPI Child(PDEVINST to, DEVINST from, ULONG flags) {
  return Step(Call("CM_Get_Child"), to, from, flags, &Index::FirstChild);
}
CONFIGRET WINAPI Sibling(PDEVINST to, DEVINST from, ULONG flags) {
  return Step(Call("CM_Get_Sibling"), to, from, flags, &Index::NextSibling);
}

CONFIGRET WINAPI DeviceId(DEVINST node, PWCHAR buffer, ULONG chars, ULONG flags) {
  const Call call("CM_Get_Device_IDW");
  WantNoFlags(call, flags);
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  if (call.Fails()) return CR_FAILURE;
  const Position here = call.Machine().index.DeviceByNumber(node);
  if (here == kNone) return CR_INVALID_DEVNODE;
  const std::u16string_view id = here == Index::kRoot
                                     ? std::u16string_view(sim::kRootDeviceId)
                                     : std::u16string_view(call.Machine().machine.devices[here].id);
  return GiveText(id, buffer, chars) ? CR_SUCCESS : CR_BUFFER_SMALL;
}

CONFIGRET WINAPI RegistryProperty(DEVINST node, ULONG property, PULONG type, PVOID buffer,
                                  PULONG bytes, ULONG flags) {
  const Call call("CM_Get_DevNode_Registry_PropertyW");
  WantNoFlags(call, flags);
  const ULONG offered = *bytes;
  if (!call.Want(buffer != nullptr || offered == 0, "a size without a buffer"))
    return CR_INVALID_POINTER;
  Spoil(type, bytes);
  call.SpoilBytes(buffer, offered);
  if (call.Fails()) return CR_FAILURE;
  const Position here = call.Machine().index.DeviceByNumber(node);
  if (here == kNone) return CR_INVALID_DEVNODE;
  if (here == Index::kRoot) return CR_NO_SUCH_VALUE;
  // CM_DRP_DEVICEDESC is 1 and SPDRP_DEVICEDESC 0, and so on.
  const auto value = PropertyOf(call.Machine().machine.devices[here], property - 1);
  if (!value) return CR_NO_SUCH_VALUE;
  if (type != nullptr) *type = value->first;
  *bytes = static_cast<ULONG>(value->second.size());
  if (offered < value->second.size()) return CR_BUFFER_SMALL;
  std::memcpy(buffer, value->second.data(), value->second.size());
  return CR_SUCCESS;
}

HDEVNOTIFY WINAPI RegisterNotification(HANDLE recipient, LPVOID filter, DWORD flags) {
  const Call call("RegisterDeviceNotificationW");
  const auto& record = *static_cast<const DEV_BROADCAST_DEVICEINTERFACE_W*>(filter);
  wchar_t name[32] = L"";
  DWORD process = 0;
  GetWindowThreadProcessId(static_cast<HWND>(recipient), &process);
  GetClassNameW(static_cast<HWND>(recipient), name, 32);
  call.Want(IsWindow(static_cast<HWND>(recipient)) && process == GetCurrentProcessId() &&
                std::wstring(name) == L"MsgReceiver",
            "not the component's window");
  // DEVICE_NOTIFY_WINDOW_HANDLE | DEVICE_NOTIFY_ALL_INTERFACE_CLASSES
  call.Want(flags == 4, "flags");
  call.Want(record.dbcc_size == 32 && record.dbcc_devicetype == DBT_DEVTYP_DEVICEINTERFACE &&
                record.dbcc_reserved == 0,
            "the filter");
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE), nullptr;
  return call.Opened(Notification{});
}

BOOL WINAPI UnregisterNotification(HDEVNOTIFY handle) {
  return Call("UnregisterDeviceNotification").Close<Notification>(handle);
}

}  // namespace

Functions NodeFunctions() {
  return {{"CM_Locate_DevNodeW", Address(Locate)},
          {"CM_Get_Parent", Address(Parent)},
          {"CM_Get_Child", Address(Child)},
          {"CM_Get_Sibling", Address(Sibling)},
          {"CM_Get_Device_IDW", Address(DeviceId)},
          {"CM_Get_DevNode_Registry_PropertyW", Address(RegistryProperty)}};
}

Functions NotificationFunctions() {
  return {{"RegisterDeviceNotificationW", Address(RegisterNotification)},
          {"UnregisterDeviceNotification", Address(UnregisterNotification)}};
}

}  // namespace abi_pc
