#include "com/port_device_node.h"

#include "com/com_ptr.h"
#include "com/first_child.h"
#include "com/interface_descriptor.h"
#include "com/text_property.h"
#include "com/variant_enumerator.h"
#include "records/record_lock.h"

namespace KelvoUHW {

CZKUMPortDevice::~CZKUMPortDevice() = default;

void CZKUMPortDevice::SetImpl(const NodePtr& node) noexcept {
  CZKUMUsbTreeNode::SetImpl(node);
  m_device = node.StaticCast<CZKUMPortDeviceImpl>();
}

const CZKUMInfoDeviceImpl* CZKUMPortDevice::InfoRecord() const noexcept {
  if (!m_device) return nullptr;
  return static_cast<const CZKUMInfoDeviceImpl*>(m_device->m_infoDevice.Get());
}

HRESULT CZKUMPortDevice::get_Product(BSTR* pVal) {
  return ReadTextOf(m_device, E_POINTER, pVal,
                    [](const auto& record) { return std::u16string_view(record.m_strUsbProduct); });
}

HRESULT CZKUMPortDevice::get_Manufacturer1(BSTR* pVal) {
  return ReadTextOf(m_device, E_POINTER, pVal, [](const auto& record) {
    return std::u16string_view(record.m_strUsbManufacturer);
  });
}

HRESULT CZKUMPortDevice::get_Speed(ULONG* pVal) noexcept {
  if (pVal == nullptr) return E_INVALIDARG;
  const RecordReadLock lock;
  if (!m_device) return E_POINTER;
  *pVal = m_device->Speed();
  return S_OK;
}

HRESULT CZKUMPortDevice::get_NumberInterfaces(BYTE* pVal) noexcept {
  if (pVal == nullptr) return E_INVALIDARG;
  const RecordReadLock lock;
  if (!m_device) return E_POINTER;
  *pVal = m_device->NumberInterfaces();
  return S_OK;
}

HRESULT CZKUMPortDevice::get_InterfaceDescriptors(IEnumVARIANT** ppIIiterfaceDescr) noexcept {
  return Guarded([&]() -> HRESULT {
    if (ppIIiterfaceDescr) *ppIIiterfaceDescr = nullptr;
    m_interfaceDescriptors.clear();
    const RecordReadLock lock;
    if (!m_device) return E_POINTER;
    for (const InterfaceEntryPtr& entry : m_device->m_interfaceDescrs) {
      ComObject<CZKUMInterfaceDescr>* created = nullptr;
      const HRESULT result = ComObject<CZKUMInterfaceDescr>::Create(created);
      if (FAILED(result)) return result;
      created->SetEntry(entry);
      Variant element = Variant::OfUnknown(created);
      m_interfaceDescriptors.push_back(std::move(element));
    }
    return MakeCollection(ppIIiterfaceDescr, m_interfaceDescriptors);
  });
}

// Deliberate: the node tested is the one passed in and not this object, and when it is itself of
// the kind it is handed back without a reference and without a test of the out pointer.
HRESULT CZKUMPortDevice::get_FirstChildOfType(IZKUMUsbTreeNode* pNode, TUsbDeviceType nType,
                                              IZKUMUsbTreeNode** ppNodeOfType) noexcept {
  // The node may be one of the caller's own, which may throw.
  return Guarded([&] {
    if (pNode == nullptr) return E_POINTER;
    TUsbDeviceType kind = KUDTUnknown;
    const HRESULT result = pNode->get_Type(&kind);
    if (FAILED(result)) return nType == KUDTUnknown ? result : S_FALSE;
    if (kind == nType) {
      *ppNodeOfType = pNode;
      return S_OK;
    }
    return FindBelow(*pNode, nType, ppNodeOfType);
  });
}

}  // namespace KelvoUHW
