// A simulated process with an event notifier in it.
#pragma once

#include <gtest/gtest.h>

#include <optional>
#include <utility>

#include "com/com_ptr.h"
#include "com/zkusb_monitor.h"
#include "module/module.h"
#include "platform/simulated/simulated_pc.h"
#include "tests/support/com_objects.h"
#include "tests/support/machines.h"
#include "tests/support/monitor_process.h"

namespace KelvoUHW {

// From its start to its end: many of them, one after the other, live in one program. The class of the tree is the
// component's own, over `pc`, unless a test registers another one. What a test holds it gives back before the end.
class NotifierProcess {
 public:
  explicit NotifierProcess(Machine machine = OneController(1), ClockMode mode = ClockMode::Virtual)
      : pc(std::move(machine)), m_process(mode), desktop(m_process.desktop) {
    platform::SetCurrentSystem({.host = &pc, .threads = &desktop, .desktop = &desktop});
    EXPECT_TRUE(SUCCEEDED(CoInitializeEx(nullptr, COINIT_MULTITHREADED)));
    module.emplace();
  }
  ~NotifierProcess() {
    notifier.Reset();
    point.Reset();
    UseTreeClass(nullptr);
    desktop.Settle();
    module->Unload();
    EXPECT_EQ(g_pNotifyTarget, nullptr);
    EXPECT_EQ(desktop.Counts().registrations, 0u) << "the notifier lives on";
    EXPECT_TRUE(pc.Misuses().empty());
    CoUninitialize();
    module.reset();
  }

  // The class object that creating a tree asks from now on; none for null.
  void UseTreeClass(IUnknown* classObject) {
    if (m_treeClass != 0) CoRevokeClassObject(m_treeClass);
    m_treeClass = 0;
    if (classObject == nullptr) return;
    EXPECT_EQ(CoRegisterClassObject(CLSID_ZKUMUsbTree, classObject, CLSCTX_INPROC_SERVER, 0, &m_treeClass), S_OK);
  }
  ComPtr<IClassFactory> Class(const CLSID& clsid) {
    ComPtr<IClassFactory> factory;
    EXPECT_EQ(module->GetClassObject(clsid, platform::IidOf<IClassFactory>(), factory.PutVoid()), S_OK);
    return factory;
  }
  void UseOwnTreeClass() { UseTreeClass(Class(CLSID_ZKUMUsbTree).Get()); }

  HRESULT Create(ComPtr<IZKUMEventNotifier>& out) {
    return Class(CLSID_ZKUMEventNotifier)
        ->CreateInstance(nullptr, platform::IidOf<IZKUMEventNotifier>(), out.PutVoid());
  }
  // `notifier` and `point` are there from now on.
  void Start() {
    ASSERT_EQ(Create(notifier), S_OK);
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
  void Do(const decltype(platform::simulated::Step::change)& change) { ASSERT_EQ(pc.Apply({0, u"", change}), u""); }

  platform::simulated::SimulatedPc pc;

 private:
  MonitorProcess m_process;
  DWORD m_treeClass = 0;

 public:
  SimulatedDesktop& desktop;
  std::optional<CZKUsbMonitorModule> module;
  ComPtr<IZKUMEventNotifier> notifier;
  ComPtr<IConnectionPoint> point;
};

}  // namespace KelvoUHW
