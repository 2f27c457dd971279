#include "platform/windows/native_types.h"
#include "platform/windows/windows_host.h"

namespace platform::windows {

namespace {

static_assert(sizeof(DEVINST) == sizeof(DevInst));

// A call that fails may have cleared its out value already, which the seam promises to leave alone.
template <class Call>
Status AskForNode(DevInst& node, Call call) noexcept {
  DEVINST answer = 0;
  const Status status = FromConfigRet(call(&answer));
  if (status) node = answer;
  return status;
}

}  // namespace

Status WindowsHost::LocateRootDevNode(DevInst& node) noexcept {
  return AskForNode(node, [](DEVINST* answer) {
    return CM_Locate_DevNodeW(answer, nullptr, CM_LOCATE_DEVNODE_NORMAL);
  });
}

Status WindowsHost::GetParent(DevInst node, DevInst& parent) noexcept {
  return AskForNode(parent, [&](DEVINST* answer) { return CM_Get_Parent(answer, node, 0); });
}

Status WindowsHost::GetChild(DevInst node, DevInst& child) noexcept {
  return AskForNode(child, [&](DEVINST* answer) { return CM_Get_Child(answer, node, 0); });
}

Status WindowsHost::GetSibling(DevInst node, DevInst& sibling) noexcept {
  return AskForNode(sibling, [&](DEVINST* answer) { return CM_Get_Sibling(answer, node, 0); });
}

Status WindowsHost::GetDeviceId(DevInst node, char16_t* buffer,
                                std::uint32_t bufferChars) noexcept {
  return FromConfigRet(CM_Get_Device_IDW(node, Native(buffer), bufferChars, 0));
}

Status WindowsHost::GetDevNodeRegistryProperty(DevInst node, std::uint32_t property,
                                               std::uint32_t* type, void* buffer,
                                               std::uint32_t& bytes) noexcept {
  return FromConfigRet(
      CM_Get_DevNode_Registry_PropertyW(node, property, Native(type), buffer, Native(&bytes), 0));
}

}  // namespace platform::windows
