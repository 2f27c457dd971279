// A tree object over a simulated PC, which is the system of this process meanwhile.
#pragma once

#include <gtest/gtest.h>

#include <utility>

#include "bench/object_reader.h"
#include "com/module_lock.h"
#include "com/usb_tree.h"
#include "platform/com_controls.h"
#include "platform/system.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/failing_memory.h"

namespace KelvoUHW {

// One at a time. What a test takes from the tree it gives back before the desk goes: the desk counts objects and texts.
class TreeDesk {
 public:
  explicit TreeDesk(platform::simulated::Machine machine) : pc(std::move(machine)) {
    platform::SetCurrentSystem({.host = &m_host});
    ComObject<CZKUMUsbTree>* created = nullptr;
    EXPECT_EQ(ComObject<CZKUMUsbTree>::Create(created), S_OK);
    tree = ComPtr<IZKUMUsbTree>::Attach(created);
    build = tree.As<IBuildUsbTree>();
  }
  ~TreeDesk() {
    tree.Reset();
    build.Reset();
    platform::SetCurrentSystem({});
    EXPECT_EQ(ModuleLockCount(), 0);
    EXPECT_EQ(platform::controls::CountBstrs().alive, m_texts);
    EXPECT_TRUE(pc.Misuses().empty());
  }
  TreeDesk(const TreeDesk&) = delete;
  TreeDesk& operator=(const TreeDesk&) = delete;

  void Do(const decltype(platform::simulated::Step::change)& change) { ASSERT_EQ(pc.Apply({0, u"", change}), u""); }
  // A build as an event triggers it.
  HRESULT Rebuild() {
    const HRESULT result = build->BuildTree();
    EXPECT_EQ(build->ResetDeviceCache(), S_OK);
    return result;
  }
  ComPtr<IZKUMUsbTreeNode> Root() const {
    ComPtr<IZKUMUsbTreeNode> root;
    EXPECT_EQ(tree->get_RootNode(root.Put()), S_OK);
    return root;
  }

  platform::simulated::SimulatedPc pc;
  ComPtr<IZKUMUsbTree> tree;
  ComPtr<IBuildUsbTree> build;

 private:
  WellFedHost m_host{pc};
  const std::int64_t m_texts = platform::controls::CountBstrs().alive;
};

}  // namespace KelvoUHW
