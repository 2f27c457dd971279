// A simulated process with the module in it, statically linked.
#pragma once

#include <gtest/gtest.h>

#include <optional>

#include "bench/plugs.h"
#include "module/module.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/com_objects.h"
#include "tests/support/monitor_process.h"

namespace KelvoUHW {

// From its start to its end, at which the module is unloaded and nothing of it may be left: many of them, one after the
// other, live in one program. The class of the tree is the module's own, over `pc`, unless a test registers another
// one. What a test holds it gives back before the end.
class ModuleProcess : public MonitorProcess {
 public:
  explicit ModuleProcess(ClockMode mode = ClockMode::Virtual) : MonitorProcess(mode) {
    platform::SetCurrentSystem({.host = &pc, .threads = &desktop, .desktop = &desktop});
    EXPECT_TRUE(SUCCEEDED(CoInitializeEx(nullptr, COINIT_MULTITHREADED)));
    module.emplace();
    EXPECT_EQ(CurrentModule(), &*module);
    UseTreeClass(Class(CLSID_ZKUMUsbTree).Get());
  }
  ~ModuleProcess() {
    notifier.Reset();
    point.Reset();
    UseTreeClass(nullptr);
    desktop.Settle();
    module->Unload();
    EXPECT_EQ(g_pNotifyTarget, nullptr);
    EXPECT_EQ(desktop.Counts().registrations, 0u) << "the notifier lives on";
    module.reset();
    CoUninitialize();
    EXPECT_EQ(CurrentModule(), nullptr);
    EXPECT_EQ(ModuleLockCount(), 0);
    // Each tree leaves a set of volume interfaces open, which is deliberate.
    EXPECT_EQ(pc.Open().files + pc.Open().imageLists + pc.Open().searches, 0u);
    EXPECT_TRUE(pc.Misuses().empty());
  }

  // The class object that creating a tree asks from now on; none for null.
  void UseTreeClass(IUnknown* classObject) {
    const DWORD before = std::exchange(m_treeClass, 0);
    EXPECT_TRUE(before == 0 || CoRevokeClassObject(before) == S_OK);
    if (classObject == nullptr) return;
    EXPECT_EQ(
        CoRegisterClassObject(CLSID_ZKUMUsbTree, classObject, CLSCTX_INPROC_SERVER, REGCLS_MULTIPLEUSE, &m_treeClass),
        S_OK);
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

  // `notifier` and `point` are there from now on.
  void Start() {
    notifier = Make<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier);
    ASSERT_TRUE(notifier);
    ASSERT_EQ(notifier.As<IConnectionPointContainer>()->FindConnectionPoint(DIID_IZKDeviceEventCallBack, point.Put()),
              S_OK);
  }
  DWORD Advise(IUnknown& sink) {
    DWORD cookie = 0;
    EXPECT_EQ(point->Advise(&sink, &cookie), S_OK);
    return cookie;
  }
  // A run on this thread, as an event thread makes it.
  HRESULT Notify(BYTE fire = TRUE) { return notifier.As<IZKUMPrivateNotifier>()->NotifyDeviceChange(0, fire); }
  void Do(const std::vector<Change>& changes) {
    for (const Change& change : changes) ASSERT_EQ(pc.Apply({0, u"", change}), u"");
  }

  platform::simulated::SimulatedPc pc{BarePc()};
  std::optional<CZKUsbMonitorModule> module;
  ComPtr<IZKUMEventNotifier> notifier;
  ComPtr<IConnectionPoint> point;

 private:
  DWORD m_treeClass = 0;
};

}  // namespace KelvoUHW
