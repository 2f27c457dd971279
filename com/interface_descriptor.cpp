#include "com/interface_descriptor.h"

#include <cstddef>

#include "platform/usb_ioctl.h"

namespace KelvoUHW {

using platform::USB_INTERFACE_DESCRIPTOR;

CZKUMInterfaceDescr::~CZKUMInterfaceDescr() = default;

HRESULT CZKUMInterfaceDescr::ByteAt(std::size_t offset, BYTE* pVal) const noexcept {
  if (pVal == nullptr) return E_INVALIDARG;
  *pVal = m_entry->Byte(offset);
  return S_OK;
}

HRESULT CZKUMInterfaceDescr::get_InterfaceClass(BYTE* pVal) noexcept {
  return ByteAt(offsetof(USB_INTERFACE_DESCRIPTOR, bInterfaceClass), pVal);
}

HRESULT CZKUMInterfaceDescr::get_InterfaceSubClass(BYTE* pVal) noexcept {
  return ByteAt(offsetof(USB_INTERFACE_DESCRIPTOR, bInterfaceSubClass), pVal);
}

HRESULT CZKUMInterfaceDescr::get_InterfaceProtocol(BYTE* pVal) noexcept {
  return ByteAt(offsetof(USB_INTERFACE_DESCRIPTOR, bInterfaceProtocol), pVal);
}

}  // namespace KelvoUHW
