#include "com/node_enumerator.h"

#include <limits>
#include <utility>

#include "com/com_ptr.h"
#include "com/node_object.h"

namespace KelvoUHW {

HRESULT AppendNodeObjects(const std::vector<NodePtr>& nodes, VariantVector& items) {
  for (const NodePtr& node : nodes) {
    ComPtr<IZKUMUsbTreeNode> object;
    CreateNodeObject(node, object.Put());
    if (!object) return E_POINTER;
    items.push_back(Variant::OfUnknown(object.Detach()));
  }
  return S_OK;
}

HRESULT CreateNodeEnumerator(std::unique_ptr<VariantVector>& items,
                             IZKUMUsbTreeNodeEnumerator** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  if (!items) return E_POINTER;
  ComObject<CZKUMNodeEnumerator>* created = nullptr;
  const HRESULT result = ComObject<CZKUMNodeEnumerator>::Create(created);
  if (FAILED(result)) return result;
  created->SetItems(std::move(items));
  *out = created;
  return S_OK;
}

CZKUMNodeEnumerator::~CZKUMNodeEnumerator() = default;

HRESULT CZKUMNodeEnumerator::MoveNext(VARIANT_BOOL* pbSuccess) noexcept {
  // Stops where it could not be counted any more, far behind the end of every list.
  if (m_nCurrent < std::numeric_limits<LONG>::max()) ++m_nCurrent;
  const bool inside = static_cast<std::size_t>(m_nCurrent) < m_items->size();
  *pbSuccess = inside ? VARIANT_TRUE : VARIANT_FALSE;
  return S_OK;
}

HRESULT CZKUMNodeEnumerator::GetCurrent(IZKUMUsbTreeNode** ppIUsbTreeNode) noexcept {
  if (ppIUsbTreeNode) *ppIUsbTreeNode = nullptr;
  if (m_nCurrent < 0 || static_cast<std::size_t>(m_nCurrent) >= m_items->size()) return E_FAIL;
  const Variant& item = (*m_items)[static_cast<std::size_t>(m_nCurrent)];
  if ((item.vt != VT_UNKNOWN && item.vt != VT_DISPATCH) || item.punkVal == nullptr) return E_FAIL;
  return item.punkVal->QueryInterface(platform::IidOf<IZKUMUsbTreeNode>(),
                                      reinterpret_cast<void**>(ppIUsbTreeNode));
}

}  // namespace KelvoUHW
