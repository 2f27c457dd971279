#include "com/first_child.h"

#include <utility>
#include <vector>

#include "com/com_ptr.h"

namespace KelvoUHW {

namespace {

// The lists on the way down, the innermost last. A vector and not the stack: how deep a tree goes
// is up to the hardware.
class Descent {
 public:
  void Enter(IZKUMUsbTreeNode& node) {
    ComPtr<IZKUMUsbTreeNodeEnumerator> childs;
    if (SUCCEEDED(node.get_Childs(childs.Put())) && childs) m_lists.push_back(std::move(childs));
  }
  // Ends the innermost list.
  void Leave() noexcept { m_lists.pop_back(); }
  bool Done() const noexcept { return m_lists.empty(); }

  // The next node of the innermost list; empty at its end and where it breaks off.
  ComPtr<IZKUMUsbTreeNode> Next() {
    ComPtr<IZKUMUsbTreeNode> node;
    VARIANT_BOOL more = VARIANT_FALSE;
    const ComPtr<IZKUMUsbTreeNodeEnumerator>& list = m_lists.back();
    if (FAILED(list->MoveNext(&more)) || more == VARIANT_FALSE) return {};
    if (FAILED(list->GetCurrent(node.Put()))) return {};
    return node;
  }

 private:
  std::vector<ComPtr<IZKUMUsbTreeNodeEnumerator>> m_lists;
};

}  // namespace

HRESULT FindBelow(IZKUMUsbTreeNode& node, TUsbDeviceType kind, IZKUMUsbTreeNode** out) {
  Descent descent;
  descent.Enter(node);
  while (!descent.Done()) {
    ComPtr<IZKUMUsbTreeNode> child = descent.Next();
    if (!child) {
      descent.Leave();
      continue;
    }
    TUsbDeviceType childKind = KUDTUnknown;
    if (FAILED(child->get_Type(&childKind))) {
      // Asked for the unknown kind, the failure ends the list; else the node is passed over.
      if (kind == KUDTUnknown) descent.Leave();
      continue;
    }
    if (childKind == kind) {
      if (out == nullptr) return E_POINTER;
      *out = child.Detach();
      return S_OK;
    }
    descent.Enter(*child.Get());
  }
  return S_FALSE;
}

}  // namespace KelvoUHW
