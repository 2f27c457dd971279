// A notifier over a tree that a test sets, and three sinks.
#pragma once

#include "tests/support/notifier_process.h"
#include "tests/support/scripted_tree.h"
#include "tests/support/test_sink.h"

namespace KelvoUHW {

// A notifier over a scripted tree, with one device in list 0.
struct NotifierScene {
  NotifierScene() {
    process.UseTreeClass(static_cast<IClassFactory*>(&tree));
    process.Start();
    tree.lists[KDeviceConnected] = {tree.Device(u"c")};
  }
  // Whoever is still advised lets go.
  ~NotifierScene() {
    for (DWORD cookie = 1; process.point && cookie <= 9; ++cookie) process.point->Unadvise(cookie);
  }
  std::int32_t NotifierReferences() {
    const auto count = static_cast<std::int32_t>(process.notifier->AddRef()) - 1;
    process.notifier->Release();
    return count;
  }
  ComPtr<IConnectionPointContainer> Container() const { return process.notifier.As<IConnectionPointContainer>(); }

  TestSink::Log log;
  ScriptedTree tree;
  TestSink a{log, "A"};
  TestSink b{log, "B"};
  TestSink c{log, "C"};
  NotifierProcess process;
};

}  // namespace KelvoUHW
