#include "com/interface_device_node.h"

#include "com/com_ptr.h"
#include "com/text_property.h"
#include "com/variant_enumerator.h"
#include "platform/text.h"
#include "records/record_lock.h"

namespace KelvoUHW {

CZKUMInterfaceDevice::~CZKUMInterfaceDevice() = default;

void CZKUMInterfaceDevice::SetImpl(const NodePtr& node) noexcept {
  CZKUMUsbTreeNode::SetImpl(node);
  m_device = node.StaticCast<CZKUMInterfaceDeviceImpl>();
}

HRESULT CZKUMInterfaceDevice::get_VolumeName(BSTR* pVal) {
  return ReadTextOf(m_device, E_POINTER, pVal,
                    [](const auto& record) { return std::u16string_view(record.VolumeName); });
}

HRESULT CZKUMInterfaceDevice::get_VendorId(BSTR* pVal) {
  return ReadTextOf(m_device, E_POINTER, pVal,
                    [](const auto& record) { return std::u16string_view(record.StorageVendorId); });
}

HRESULT CZKUMInterfaceDevice::get_ProductId(BSTR* pVal) {
  return ReadTextOf(m_device, E_POINTER, pVal, [](const auto& record) {
    return std::u16string_view(record.StorageProductId);
  });
}

HRESULT CZKUMInterfaceDevice::get_ProductRev(BSTR* pVal) {
  return ReadTextOf(m_device, E_POINTER, pVal,
                    [](const auto& record) { return std::u16string_view(record.ProductRev); });
}

HRESULT CZKUMInterfaceDevice::get_DevicePath(BSTR* pVal) {
  return ReadTextOf(m_device, E_POINTER, pVal,
                    [](const auto& record) { return record.DevicePath(); });
}

HRESULT CZKUMInterfaceDevice::get_MountPoint(BSTR* pVal) {
  return ReadTextOf(m_device, E_POINTER, pVal,
                    [](const auto& record) { return record.MountPoint(); });
}

HRESULT CZKUMInterfaceDevice::get_MountPoints(IEnumVARIANT** ppIUsbTreeNode) {
  return GuardedRaising([&]() -> HRESULT {
    if (ppIUsbTreeNode) *ppIUsbTreeNode = nullptr;
    m_mountPoints.clear();
    const RecordReadLock lock;
    if (!m_device) return E_POINTER;
    for (const std::u16string& mountPoint : m_device->MountPoints) {
      const BSTR copy = platform::MakeBstr(platform::UpToZero(mountPoint));
      if (copy == nullptr) throw ComError(E_OUTOFMEMORY);
      Variant element = Variant::OfBstr(copy);
      m_mountPoints.push_back(std::move(element));
    }
    return MakeCollection(ppIUsbTreeNode, m_mountPoints);
  });
}

}  // namespace KelvoUHW
