// A notifier over a tree that a test sets, and three sinks.
#pragma once

#include "tests/support/module_process.h"
#include "tests/support/scripted_tree.h"
#include "tests/support/test_sink.h"

namespace KelvoUHW {

// What outlives the process.
struct SceneParts {
  TestSink::Log log;
  ScriptedTree tree;
  TestSink a{log, "A"}, b{log, "B"}, c{log, "C"};
};

// Over the scripted tree, with one device in list 0; over the component's own where its PC has `devices`.
struct NotifierScene : SceneParts, ModuleProcess {
  explicit NotifierScene(const std::vector<Change>& devices = {}) {
    Do(devices);
    if (devices.empty()) UseTreeClass(static_cast<IClassFactory*>(&tree));
    Start();
    tree.lists[KDeviceConnected] = {tree.Device(u"c")};
  }
  // Whoever is still advised lets go.
  ~NotifierScene() {
    for (DWORD cookie = 1; point && cookie <= 9; ++cookie) point->Unadvise(cookie);
  }
  std::int32_t NotifierReferences() {
    const auto count = static_cast<std::int32_t>(notifier->AddRef()) - 1;
    notifier->Release();
    return count;
  }
  ComPtr<IConnectionPointContainer> Container() const { return notifier.As<IConnectionPointContainer>(); }
};

}  // namespace KelvoUHW
