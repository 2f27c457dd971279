#include "com/node_object.h"

#include <memory>
#include <utility>
#include <vector>

#include "com/com_ptr.h"
#include "com/node_enumerator.h"
#include "com/text_property.h"
#include "com/variant_enumerator.h"
#include "platform/text.h"
#include "records/record_lock.h"

namespace KelvoUHW {

namespace {

// A copy of the text with no test of the allocation: a null text and S_OK when memory runs out.
// This is deliberate.
HRESULT CopyUntested(const std::u16string& text, BSTR* out) noexcept {
  *out = platform::MakeBstr(platform::UpToZero(text));
  return S_OK;
}

// As many characters as most nodes of the kind write, without their children. That of a device goes
// on with what the device manager has of it.
std::size_t CharsOfDump(const CZKUMUsbTreeNodeImpl& node) noexcept {
  switch (node.m_nType) {
    case KUDTHubPort:
      return 256;
    case KUDTPortDevice:
      return 6'144;
    default:
      return 1'024;
  }
}

}  // namespace

CZKUMUsbTreeNode::~CZKUMUsbTreeNode() = default;

void CZKUMUsbTreeNode::SetImpl(const NodePtr& node) noexcept { m_node = node; }

HRESULT CZKUMUsbTreeNode::get_InstanceId(BSTR* pVal) {
  return ReadTextOf(m_node, E_FAIL, pVal,
                    [](const auto& node) { return std::u16string_view(node.m_strDevInstId); });
}

HRESULT CZKUMUsbTreeNode::get_Type(TUsbDeviceType* pType) noexcept {
  const RecordReadLock lock;
  if (!m_node) return E_INVALIDARG;
  if (pType == nullptr) return E_POINTER;
  *pType = m_node->m_nType;
  return S_OK;
}

// The object made here owns the parent record together with nobody: when the caller releases it,
// the record is destroyed while the tree still refers to it. This is deliberate. What refers to it
// holds nothing from then on. Nothing is destroyed between the look at the link and the handle,
// since whoever destroys waits for readers.
HRESULT CZKUMUsbTreeNode::get_Parent(IZKUMUsbTreeNode** ppIUsbTreeNode) noexcept {
  return Guarded([&] {
    if (ppIUsbTreeNode == nullptr) return E_POINTER;
    *ppIUsbTreeNode = nullptr;
    const RecordReadLock lock;
    if (!m_node) return E_POINTER;
    CZKUMUsbTreeNodeImpl* parent = m_node->m_pParent;
    if (parent == nullptr) return E_POINTER;
    NodePtr node = NodePtr::InARingOfItsOwn(parent);
    const HRESULT result = CreateNodeObject(node, ppIUsbTreeNode);
    if (FAILED(result)) node.Abandon();  // nobody has it, so nobody destroys it
    return result;
  });
}

HRESULT CZKUMUsbTreeNode::get_Childs(IZKUMUsbTreeNodeEnumerator** ppNodeEnum) noexcept {
  return Guarded([&] {
    if (ppNodeEnum == nullptr) return E_POINTER;
    *ppNodeEnum = nullptr;
    std::unique_ptr<VariantVector> items(new (std::nothrow) VariantVector);
    if (!items) return E_POINTER;
    std::vector<NodePtr> childs;
    {
      const RecordReadLock lock;
      if (!m_node) return E_POINTER;
      childs = m_node->m_childs;
    }
    const HRESULT wrapped = AppendNodeObjects(childs, *items);
    return FAILED(wrapped) ? wrapped : CreateNodeEnumerator(items, ppNodeEnum);
  });
}

HRESULT CZKUMUsbTreeNode::get_InSubtreeDevicesOfType(
    TUsbDeviceType nType, IZKUMUsbTreeNodeEnumerator** ppDevicesOfTypeEnum) noexcept {
  return Guarded([&] {
    if (ppDevicesOfTypeEnum == nullptr) return E_POINTER;
    *ppDevicesOfTypeEnum = nullptr;
    std::vector<NodePtr> found;
    {
      const RecordReadLock lock;
      if (!m_node) return E_POINTER;
      VisitPreOrder(m_node, [&](const NodePtr& node) {
        if (node->m_nType == nType) found.push_back(node);
        return true;
      });
    }
    std::unique_ptr<VariantVector> items(new (std::nothrow) VariantVector);
    if (!items) return E_POINTER;
    const HRESULT wrapped = AppendNodeObjects(found, *items);
    return FAILED(wrapped) ? wrapped : CreateNodeEnumerator(items, ppDevicesOfTypeEnum);
  });
}

HRESULT CZKUMUsbTreeNode::get_Description(BSTR* pVal) {
  return ReadTextOf(m_node, E_FAIL, pVal,
                    [](const auto& node) { return std::u16string_view(node.m_strDeviceDescr); });
}

// The one text that is not read when nobody asks for it.
HRESULT CZKUMUsbTreeNode::get_SerialNumber(BSTR* pVal) {
  if (pVal == nullptr) return E_POINTER;
  return ReadTextOf(m_node, E_FAIL, pVal,
                    [](const auto& node) { return std::u16string_view(node.m_strSerialNumber); });
}

HRESULT CZKUMUsbTreeNode::get_VendorId(LONG* pVal) noexcept {
  const RecordReadLock lock;
  if (pVal == nullptr || !m_node) return E_POINTER;
  *pVal = static_cast<LONG>(m_node->m_nVendorId);
  return S_OK;
}

HRESULT CZKUMUsbTreeNode::get_ProductId(LONG* pVal) noexcept {
  const RecordReadLock lock;
  if (pVal == nullptr || !m_node) return E_POINTER;
  *pVal = static_cast<LONG>(m_node->m_nProductId);
  return S_OK;
}

HRESULT CZKUMUsbTreeNode::get_DriverKeyName(BSTR* pVal) {
  return ReadTextOf(m_node, E_FAIL, pVal,
                    [](const auto& node) { return std::u16string_view(node.m_strDriverKeyName); });
}

HRESULT CZKUMUsbTreeNode::get_ToString(BSTR* pVal) {
  return ReadTextOf(m_node, E_FAIL, pVal, [](const auto& node) {
    // Room for most dumps from the start: a large one would be copied again and again as it grows.
    std::size_t chars = CharsOfDump(node);
    for (const NodePtr& child : node.m_childs) {
      VisitPreOrder(child, [&chars](const NodePtr& below) {
        chars += CharsOfDump(*below);
        return true;
      });
    }
    std::u16string text;
    text.reserve(chars);
    node.ToString(text, {});
    return text;
  });
}

HRESULT CZKUMUsbTreeNode::get_Vendor(BSTR* pVal) noexcept {
  if (pVal) *pVal = nullptr;
  const RecordReadLock lock;
  if (pVal == nullptr || !m_node) return E_POINTER;
  return CopyUntested(m_node->m_strVendor, pVal);
}

HRESULT CZKUMUsbTreeNode::get_Product(BSTR* pVal) {
  if (pVal) *pVal = nullptr;
  const RecordReadLock lock;
  if (pVal == nullptr || !m_node) return E_POINTER;
  return CopyUntested(m_node->m_strProduct, pVal);
}

// The owner that the enumerator keeps alive is a second object on the same record, not this one.
// Deliberate: whoever holds the enumerator holds the record, and keeps this object himself.
HRESULT CZKUMUsbTreeNode::MakeCollection(IEnumVARIANT** out,
                                         const VariantVector& items) const noexcept {
  ComPtr<IZKUMUsbTreeNode> owner;
  const HRESULT result = CreateNodeObject(m_node, owner.Put());
  return FAILED(result) ? result : MakeVariantEnum(out, owner.Get(), &items);
}

}  // namespace KelvoUHW
