// A simulated process with the module in it, statically linked.
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <optional>
#include <string>

#include "com/com_ptr.h"
#include "com/module_lock.h"
#include "com/usb_tree.h"
#include "com/zkusb_monitor.h"
#include "module/module.h"
#include "module/singleton.h"
#include "monitor/event_notifier.h"
#include "platform/simulated/simulated_pc.h"
#include "tests/support/desk_pc.h"
#include "tests/support/monitor_process.h"

namespace KelvoUHW {

using TreeState = SingletonState<CZKUMUsbTree, IUnknown>;
using NotifierState = SingletonState<CZKUMEventNotifier, IUnknown>;

// From its start to its end, at which the module is unloaded and nothing of it may be left. The module's class of the
// tree is registered with the process, where the notifier finds it.
class ModuleProcess : public MonitorProcess {
 public:
  explicit ModuleProcess(ClockMode mode = ClockMode::Virtual) : MonitorProcess(mode) {
    platform::SetCurrentSystem({.host = &pc, .threads = &desktop, .desktop = &desktop});
    module.emplace();
    EXPECT_EQ(CurrentModule(), &*module);
    const ComPtr<IClassFactory> tree = Class(CLSID_ZKUMUsbTree);
    EXPECT_EQ(CoRegisterClassObject(CLSID_ZKUMUsbTree, tree.Get(), CLSCTX_INPROC_SERVER, 0, &m_cookie), S_OK);
  }
  ~ModuleProcess() {
    Withdraw();
    module->Unload();
    module.reset();
    EXPECT_EQ(CurrentModule(), nullptr);
    EXPECT_EQ(ModuleLockCount(), 0);
    // Each tree leaves a set of volume interfaces open, which is meant.
    EXPECT_EQ(pc.Open().files + pc.Open().imageLists + pc.Open().searches, 0u);
    EXPECT_TRUE(pc.Misuses().empty());
  }

  // Takes the class of the tree back from the process, and with it a lock of the module.
  void Withdraw() {
    if (m_cookie == 0) return;
    EXPECT_EQ(CoRevokeClassObject(m_cookie), S_OK);
    m_cookie = 0;
  }
  ComPtr<IClassFactory> Class(const CLSID& clsid) {
    ComPtr<IClassFactory> factory;
    EXPECT_EQ(module->GetClassObject(clsid, platform::IidOf<IClassFactory>(), factory.PutVoid()), S_OK);
    return factory;
  }
  // Null with the code on failure.
  template <class Interface>
  ComPtr<Interface> Make(const CLSID& clsid, HRESULT expected = S_OK) {
    ComPtr<Interface> object;
    EXPECT_EQ(Class(clsid)->CreateInstance(nullptr, platform::IidOf<Interface>(), object.PutVoid()), expected);
    return object;
  }

  platform::simulated::SimulatedPc pc{BarePc()};
  std::optional<CZKUsbMonitorModule> module;

 private:
  DWORD m_cookie = 0;
};

}  // namespace KelvoUHW
