// The component as a client has it: two objects created through COM, and nothing else.
#pragma once

#include <functional>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "com/com_ptr.h"
#include "com/zkusb_monitor.h"
#include "tools/zkusb/event_sink.h"
#include "tools/zkusb/node_view.h"

namespace zkusb {

// A call of the component that failed, with its name and its code.
class ComponentError : public std::runtime_error {
 public:
  ComponentError(const std::string& call, HRESULT code);
};

// Throws a ComponentError for a code of failure; `call` names what failed, for people.
void Check(HRESULT result, const char* call);

// The multithreaded apartment of the calling thread, for as long as it lives.
class Apartment {
 public:
  Apartment();
  ~Apartment() { CoUninitialize(); }
  Apartment(const Apartment&) = delete;
  Apartment& operator=(const Apartment&) = delete;
};

// The root of the tree as it is now; nothing as long as no build has found anything. By any thread
// in the multithreaded apartment, inside calls of a sink too.
KelvoUHW::ComPtr<IZKUMUsbTreeNode> CurrentRoot();

// Makes both objects and advises a sink: from then on the tree is there and `handler` is called,
// first for every connected device before the constructor returns, then for what comes and goes, on
// threads of the component. One thread; throws ComponentError.
class Component {
 public:
  explicit Component(EventSink::Handler handler);
  ~Component();
  Component(const Component&) = delete;
  Component& operator=(const Component&) = delete;

  // Nothing as long as no build has found anything.
  std::optional<NodeView> Root() const;
  // The same without what lies below the hubs of the controllers.
  std::optional<NodeView> Top() const;
  // Calls with the component's own text for the root; with an empty one when there is none.
  void Dump(const std::function<void(std::u16string_view)>& handler) const;

 private:
  Apartment m_apartment;
  KelvoUHW::ComPtr<IZKUMEventNotifier> m_notifier;
  KelvoUHW::ComPtr<IZKUMUsbTree> m_tree;
  KelvoUHW::ComPtr<IConnectionPoint> m_point;
  DWORD m_cookie = 0;
};

}  // namespace zkusb
