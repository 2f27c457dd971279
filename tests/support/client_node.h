// A node that a client made: the component may be handed one.
#pragma once

#include <functional>
#include <utility>
#include <vector>

#include "com/com_ptr.h"
#include "com/node_enumerator.h"
#include "com/zkusb_monitor.h"

namespace KelvoUHW {

// Node and enumerator in one: its Childs is itself, one walk long. Each method first asks `before` for its code;
// a failure is answered without doing anything. Lives on the stack: references are only counted.
class ClientNode final : public IZKUMUsbTreeNode, public IZKUMUsbTreeNodeEnumerator {
 public:
  enum Method { kType, kChilds, kMoveNext, kGetCurrent };

  explicit ClientNode(TUsbDeviceType type, std::vector<IZKUMUsbTreeNode*> childs = {})
      : m_type(type), m_childs(std::move(childs)) {}

  std::function<HRESULT(Method)> before = [](Method) { return S_OK; };
  ULONG references = 1;
  bool givesNoList = false;  // Childs answers S_OK all the same

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    const bool node = iid == platform::IidOf<IZKUMUsbTreeNode>();
    *out = node ? static_cast<IZKUMUsbTreeNode*>(this) : nullptr;
    references += node ? 1 : 0;
    return node ? S_OK : E_NOINTERFACE;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return ++references; }
  ULONG STDMETHODCALLTYPE Release() override { return --references; }

  HRESULT STDMETHODCALLTYPE get_Type(TUsbDeviceType* type) override {
    return Answer(kType, [&] { *type = m_type; });
  }
  HRESULT STDMETHODCALLTYPE get_Childs(IZKUMUsbTreeNodeEnumerator** out) override {
    return Answer(kChilds, [&] {
      *out = nullptr;
      if (givesNoList) return;
      m_current = 0;
      ++references;
      *out = this;
    });
  }
  HRESULT STDMETHODCALLTYPE MoveNext(VARIANT_BOOL* more) override {
    return Answer(kMoveNext, [&] { *more = ++m_current <= m_childs.size() ? VARIANT_TRUE : VARIANT_FALSE; });
  }
  HRESULT STDMETHODCALLTYPE GetCurrent(IZKUMUsbTreeNode** out) override {
    return Answer(kGetCurrent, [&] {
      *out = m_childs[m_current - 1];
      (*out)->AddRef();
    });
  }

  HRESULT STDMETHODCALLTYPE get_InstanceId(BSTR*) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE get_Parent(IZKUMUsbTreeNode**) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE get_InSubtreeDevicesOfType(TUsbDeviceType, IZKUMUsbTreeNodeEnumerator**) override {
    return E_NOTIMPL;
  }

 private:
  template <class Act>
  HRESULT Answer(Method method, Act act) {
    const HRESULT result = before(method);
    if (SUCCEEDED(result)) act();
    return result;
  }

  const TUsbDeviceType m_type;
  const std::vector<IZKUMUsbTreeNode*> m_childs;
  std::size_t m_current = 0;
};

}  // namespace KelvoUHW
