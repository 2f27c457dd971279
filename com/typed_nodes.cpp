#include "com/typed_nodes.h"

#include "com/text_property.h"
#include "records/record_lock.h"

namespace KelvoUHW {

CZKUMHostController::~CZKUMHostController() = default;
CZKUMHubDevice::~CZKUMHubDevice() = default;
CZKUMHubPort::~CZKUMHubPort() = default;
CZKUMInfoDevice::~CZKUMInfoDevice() = default;

void CZKUMHostController::SetImpl(const NodePtr& node) noexcept {
  CZKUMUsbTreeNode::SetImpl(node);
  m_controller = node.StaticCast<CZKUMHostControllerImpl>();
}

HRESULT CZKUMHostController::get_LeafName(BSTR* pVal) {
  return ReadTextOf(m_controller, E_POINTER, pVal,
                    [](const auto& record) { return std::u16string_view(record.m_strLeafName); });
}

void CZKUMHubDevice::SetImpl(const NodePtr& node) noexcept {
  CZKUMUsbTreeNode::SetImpl(node);
  m_hub = node.StaticCast<CZKUMHubDeviceImpl>();
}

HRESULT CZKUMHubDevice::get_PathName(BSTR* pVal) {
  return ReadTextOf(m_hub, E_POINTER, pVal,
                    [](const auto& record) { return std::u16string_view(record.m_strPathName); });
}

HRESULT CZKUMHubDevice::get_ConnectionName(BSTR* pVal) {
  return ReadTextOf(m_hub, E_POINTER, pVal, [](const auto& record) {
    return std::u16string_view(record.m_strConnectionName);
  });
}

void CZKUMHubPort::SetImpl(const NodePtr& node) noexcept {
  CZKUMUsbTreeNode::SetImpl(node);
  m_port = node.StaticCast<CZKUMHubPortImpl>();
}

HRESULT CZKUMHubPort::get_PortIndex(LONG* pVal) noexcept {
  if (pVal == nullptr) return E_INVALIDARG;
  const RecordReadLock lock;
  if (!m_port) return E_POINTER;
  *pVal = static_cast<LONG>(m_port->m_nPortIndex);
  return S_OK;
}

void CZKUMInfoDevice::SetImpl(const NodePtr& node) noexcept {
  CZKUMUsbTreeNode::SetImpl(node);
  m_info = node.StaticCast<CZKUMInfoDeviceImpl>();
}

}  // namespace KelvoUHW
