// Lists of nodes for clients.
#pragma once

#include <memory>
#include <vector>

#include "com/object.h"
#include "com/variant.h"
#include "com/zkusb_monitor.h"
#include "records/node.h"

namespace KelvoUHW {

// Wraps each node and appends its object as VT_UNKNOWN, in order. The first node that cannot be
// wrapped ends it with E_POINTER. Throws std::bad_alloc when the list cannot grow.
HRESULT AppendNodeObjects(const std::vector<NodePtr>& nodes, VariantVector& items);

// An enumerator over `items`, which it takes over; on failure they stay with the caller. E_POINTER
// for a null `out` or empty `items`, else the code of the failed creation.
HRESULT CreateNodeEnumerator(std::unique_ptr<VariantVector>& items,
                             IZKUMUsbTreeNodeEnumerator** out) noexcept;

// Walked once, by one thread at a time: there is no way back and no count.
class CZKUMNodeEnumerator : public ObjectRoot, public IZKUMUsbTreeNodeEnumerator {
 public:
  using Interfaces = InterfaceMap<IZKUMUsbTreeNodeEnumerator>;

  // The pointer is not tested, and the position grows with every call, also behind the end. Both
  // are deliberate.
  HRESULT STDMETHODCALLTYPE MoveNext(VARIANT_BOOL* pbSuccess) noexcept override;
  // E_FAIL for an element without object and outside the list.
  HRESULT STDMETHODCALLTYPE GetCurrent(IZKUMUsbTreeNode** ppIUsbTreeNode) noexcept override;

  virtual ~CZKUMNodeEnumerator();
  void SetItems(std::unique_ptr<VariantVector> items) noexcept { m_items = std::move(items); }

 private:
  std::unique_ptr<VariantVector> m_items;
  LONG m_nCurrent = -1;
};

}  // namespace KelvoUHW
