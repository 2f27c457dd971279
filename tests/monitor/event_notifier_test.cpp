#include "monitor/event_notifier.h"

#include <gtest/gtest.h>

#include <set>

#include "module/singleton.h"
#include "tests/support/failing_memory.h"
#include "tests/support/notifier_scene.h"

namespace KelvoUHW {
namespace {

using platform::simulated::VolumeBroadcast;
using Scene = NotifierScene;
using EventNotifier = ComObjects;

constexpr HRESULT kOtherCode = static_cast<HRESULT>(0x80070005);
constexpr char kCaught[] = "Error caught\t-\tterminating";

TEST_F(EventNotifier, IsNotCreatedWithoutATreeAndOutlivesItsClients) {
  const struct {
    const char* what;
    HRESULT created, offers;
    bool registered;
    HRESULT result;
    std::uint64_t threads;  // started and left behind: the window's
  } kCases[] = {
      {"no class", S_OK, S_OK, false, REGDB_E_CLASSNOTREG, 0},
      {"class fails", kOtherCode, S_OK, true, kOtherCode, 0},
      {"no building", S_OK, E_NOINTERFACE, true, E_NOINTERFACE, 1},
      {"building fails", S_OK, kOtherCode, true, kOtherCode, 1},
      {"fine", S_OK, S_OK, true, S_OK, 1},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    ScriptedTree tree;
    tree.created = test.created;
    tree.offers = test.offers;
    ModuleProcess process;
    process.UseTreeClass(test.registered ? static_cast<IClassFactory*>(&tree) : nullptr);
    process.notifier = process.Make<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier, test.result);
    EXPECT_EQ(process.notifier.Get() != nullptr, SUCCEEDED(test.result));
    EXPECT_EQ((SingletonState<CZKUMEventNotifier, IUnknown>::s_pInstance != nullptr), SUCCEEDED(test.result));
    EXPECT_EQ(ModuleLockCount(), SUCCEEDED(test.result) ? 1 : 0);
    EXPECT_EQ(tree.creations, test.registered ? 1 : 0);
    // What was started without a target is torn down again.
    EXPECT_EQ(process.desktop.Calls(DesktopCall::StartThread), test.threads);
    EXPECT_EQ(process.desktop.Calls(DesktopCall::RegisterDeviceNotificationW), test.threads);
    EXPECT_EQ(process.desktop.Counts().registrations, test.result == S_OK ? 1u : 0u);
    EXPECT_EQ(g_pActiveReceiver != nullptr, test.result == S_OK);
    EXPECT_EQ(g_pNotifyTarget != nullptr, test.result == S_OK);
    // It builds nothing by itself, and outlives its clients.
    EXPECT_EQ(tree.calls, "");
    process.notifier.Reset();
    process.desktop.Broadcast(VolumeBroadcast(platform::kDBT_DEVICEARRIVAL, u'E', 0));
    process.desktop.Settle();
    EXPECT_EQ(tree.calls, test.result == S_OK ? "build list1 list0 list2 list3 reset" : "");
  }
}

TEST_F(EventNotifier, NotifyDeviceChangeCodes) {
  constexpr const char* kWithoutLists = "build reset";
  constexpr const char* kWithLists = "build list1 list0 list2 list3 reset";
  const struct {
    const char* what;
    HRESULT built, reset;
    BYTE fire;
    const char *calls, *log;
  } kCases[] = {
      {"changed, another flag", S_OK, S_OK, 0x80, kWithLists, "A 0 c"},
      {"changed, no events wanted", S_OK, S_OK, 0, kWithoutLists, ""},
      {"another success", static_cast<HRESULT>(2), S_OK, TRUE, kWithLists, "A 0 c"},
      {"build fails", E_OUTOFMEMORY, S_OK, TRUE, kWithoutLists, ""},
      {"reset fails", S_OK, kOtherCode, TRUE, kWithLists, "A 0 c"},
      {"unchanged", S_FALSE, S_FALSE, TRUE, kWithoutLists, ""},
  };
  Scene scene;
  scene.Advise(scene.a);
  const std::atomic<std::int32_t>& busy = g_pActiveReceiver.load()->m_nBusy;
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    scene.log.clear();
    scene.tree.calls.clear();
    scene.tree.built = test.built;
    scene.tree.reset = test.reset;
    scene.tree.onBuild = [&] { EXPECT_EQ(busy, 1); };
    EXPECT_EQ(scene.Notify(test.fire), test.reset);
    EXPECT_EQ(scene.tree.calls, test.calls);
    EXPECT_EQ(Taken(scene.log), test.log);
    EXPECT_EQ(busy, 0);
  }
  // Before its construction is complete it holds no tree.
  CSingletonExComObject2<CZKUMEventNotifier, IUnknown> bare;
  ASSERT_EQ(bare.InitializeLock(), S_OK);
  EXPECT_EQ(bare.NotifyDeviceChange(0, TRUE), E_FAIL);
  DWORD cookie = 0;
  EXPECT_EQ(bare.ConnectionPoint()->Advise(&scene.a, &cookie), E_FAIL);
  EXPECT_EQ(bare.ConnectionPoint()->Unadvise(cookie), S_OK);
  EXPECT_EQ(Taken(scene.log), "");
}

TEST_F(EventNotifier, FiresInOrderWhatSitsOnHubPorts) {
  Scene scene;
  const auto root = MakeNode<CZKUMUsbTreeRootImpl>(u"");
  const auto controller = MakeNode<CZKUMHostControllerImpl>(u"");
  const auto hub = MakeNode<CZKUMHubDeviceImpl>(u"");
  const auto device = MakeNode<CZKUMPortDeviceImpl>(u"", {}, 0u, nullptr, nullptr, nullptr, u"", u"", u"");
  ScriptedTree& tree = scene.tree;
  const NodePtr twice = tree.Device(u"m");
  tree.lists[KDeviceConnected] = {tree.Device(u"c1"), NodePtr(), tree.Device(u"c2")};
  tree.lists[KDeviceAttached] = {ScriptedTree::Below(hub, u"x"),    tree.Device(u"a1"),
                                 ScriptedTree::Below(root, u"x"),   ScriptedTree::Below(controller, u"x"),
                                 ScriptedTree::Below(device, u"x"), ScriptedTree::Below(NodePtr(), u"x")};
  tree.lists[KDeviceRemoved] = {tree.Device(u"r1")};
  tree.lists[KDeviceModified] = {twice, twice};
  scene.Advise(scene.a);
  scene.Advise(scene.b);
  EXPECT_EQ(Taken(scene.log), "A 0 c1, A 0 c2, B 0 c1, B 0 c2");
  std::vector<ComPtr<IUnknown>> data;
  scene.b.keeps = &data;
  testing::internal::CaptureStdout();
  EXPECT_EQ(scene.Notify(), S_OK);
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "") << "an empty place is passed over";
  EXPECT_EQ(Taken(scene.log),
            "A 1 a1, B 1 a1, A 0 c1, B 0 c1, A 0 c2, B 0 c2, A 2 r1, B 2 r1, A 3 m, B 3 m, A 3 m, B 3 m");
  ASSERT_EQ(data.size(), 6u);
  std::set<IUnknown*> objects;
  for (const ComPtr<IUnknown>& each : data) {
    EXPECT_TRUE(each.As<IZKUMPortDevice>());
    EXPECT_EQ(References(each.Get()), 1u);
    objects.insert(each.Get());
  }
  EXPECT_EQ(objects.size(), 6u) << "each event has an object of its own";
}

// What sinks may do inside a call. Before it A stands in slot 1 and B in slot 2; "d1" and "d2" were attached, "c" is
// connected. A does it in its first call.
TEST_F(EventNotifier, SinksActInsideACall) {
  const std::string all = "A 1 d1, B 1 d1, A 1 d2, B 1 d2, A 0 c, B 0 c";
  const struct {
    const char* what;
    DWORD unadvised;                // 0: none
    TestSink SceneParts::*advised;  // afterwards, into these slots
    std::vector<DWORD> slots;
    std::string log;
    std::function<void(Scene&)> act = {};
    const char* out = "";
  } kCases[] = {
      {"unadvises itself", 1, nullptr, {}, "A 1 d1, B 1 d1, B 1 d2, B 0 c"},
      {"unadvises the next", 2, nullptr, {}, "A 1 d1, A 1 d2, A 0 c"},
      {"advises another, into a slot of this round",
       0,
       &Scene::c,
       {3},
       "A 1 d1, C 0 c, B 1 d1, C 1 d1, A 1 d2, B 1 d2, C 1 d2, A 0 c, B 0 c, C 0 c"},
      {"advises itself again: told once for each slot",
       0,
       &Scene::a,
       {3},
       "A 1 d1, A 0 c, A 0 c, B 1 d1, A 1 d1, A 1 d2, B 1 d2, A 1 d2, A 0 c, B 0 c, A 0 c"},
      {"leaves and comes again", 1, &Scene::a, {1}, "A 1 d1, A 0 c, B 1 d1, A 1 d2, B 1 d2, A 0 c, B 0 c"},
      {"advises another, into a slot that was passed",
       1,
       &Scene::c,
       {1},
       "A 1 d1, C 0 c, B 1 d1, C 1 d2, B 1 d2, C 0 c, B 0 c"},
      {"advises many: the fifth slot is called from the next device on",
       0,
       &Scene::c,
       {3, 4, 5},
       "A 1 d1, C 0 c, C 0 c, C 0 c, C 0 c, C 0 c, C 0 c, B 1 d1, C 1 d1, C 1 d1, A 1 d2, B 1 d2, C 1 d2, C 1 d2, "
       "C 1 d2, A 0 c, B 0 c, C 0 c, C 0 c, C 0 c"},
      {"starts a run of its own",
       0,
       nullptr,
       {},
       "A 1 d1, " + all + ", B 1 d1, A 1 d2, B 1 d2, A 0 c, B 0 c",
       [](Scene& s) { EXPECT_EQ(s.Notify(), S_OK); }},
      {"throws: the others miss this device",
       0,
       nullptr,
       {},
       "A 1 d1, A 1 d2, B 1 d2, A 0 c, B 0 c",
       [](Scene&) { throw 3; },
       kCaught},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    Scene scene;
    scene.tree.lists[KDeviceAttached] = {scene.tree.Device(u"d1"), scene.tree.Device(u"d2")};
    scene.Advise(scene.a);
    scene.Advise(scene.b);
    scene.log.clear();
    scene.a.onEvent = [&, done = false]() mutable {
      if (std::exchange(done, true)) return S_OK;
      if (test.unadvised != 0) {
        for (const HRESULT result : {S_OK, CONNECT_E_NOCONNECTION}) {
          EXPECT_EQ(scene.point->Unadvise(test.unadvised), result);
        }
        EXPECT_GE(scene.a.References(), 2) << "kept while it is called";
        EXPECT_EQ(scene.b.References(), test.unadvised == 2 ? 1 : 2);
      }
      for (const DWORD slot : test.slots) EXPECT_EQ(scene.Advise(scene.*test.advised), slot);
      if (test.act) test.act(scene);
      return S_OK;
    };
    testing::internal::CaptureStdout();
    EXPECT_EQ(scene.Notify(), S_OK);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), test.out);
    EXPECT_EQ(Taken(scene.log), test.log);
  }
}

// A run that finds no memory ends without events, or loses those of one device; the lock is free again, nothing busy.
TEST_F(EventNotifier, NotifiesWithoutMemory) {
  Scene scene;
  scene.Advise(scene.a);
  scene.log.clear();
  scene.log.reserve(8);
  const auto target = scene.notifier.As<IZKUMPrivateNotifier>();
  int failures = 0;
  bool failed = true;
  for (std::uint64_t nth = 1; failed && nth < 200; ++nth) {
    testing::internal::CaptureStdout();
    const HRESULT result = WithoutAllocation(nth, failed, [&] { return target->NotifyDeviceChange(0, TRUE); });
    const std::string out = testing::internal::GetCapturedStdout();
    const std::string log = Taken(scene.log);
    failures += failed ? 1 : 0;
    EXPECT_TRUE(failed || (result == S_OK && out.empty() && log == "A 0 c"));
    EXPECT_TRUE(result == E_OUTOFMEMORY ? out.empty() : result == S_OK) << nth << " " << CodeName(result);
    EXPECT_EQ(g_pActiveReceiver.load()->m_nBusy, 0);
    bool taken = false;
    scene.Launch([&] {
      const ThreadLockGuard guard(g_notifyLock);
      taken = true;
    });
    scene.desktop.RunFor(0);
    EXPECT_TRUE(taken) << nth;
  }
  EXPECT_GE(failures, 3);
}

// The lock as other threads meet it, on virtual time.
TEST_F(EventNotifier, OtherThreadsWaitToAdviseAndNotToUnadvise) {
  Scene scene;
  SimulatedDesktop& desktop = scene.desktop;
  scene.Advise(scene.a);
  scene.Advise(scene.b);
  scene.log.clear();
  scene.tree.lists = {};
  scene.tree.lists[KDeviceAttached] = {scene.tree.Device(u"d"), scene.tree.Device(u"e")};
  std::uint64_t advised = 0;
  std::uint64_t unadvised = 1;
  scene.a.onEvent = [&] {
    scene.Launch([&] {
      DWORD cookie = 0;
      EXPECT_EQ(scene.point->Advise(&scene.c, &cookie), S_OK);
      advised = desktop.Now();
    });
    scene.Launch([&] {
      EXPECT_EQ(scene.point->Unadvise(2), S_OK);
      EXPECT_EQ(scene.point->Unadvise(1), S_OK);
      unadvised = desktop.Now();
    });
    desktop.Sleep(120);
    EXPECT_GE(scene.a.References(), 2) << "the call has one of its own";
    return S_OK;
  };
  const std::uint64_t start = desktop.Now();
  desktop.Broadcast(VolumeBroadcast(platform::kDBT_DEVICEARRIVAL, u'E', 0));
  desktop.Settle();
  // A and B left while A was called; C is in a slot of this round already, and told what is connected after the run.
  EXPECT_EQ(Taken(scene.log), "A 1 d, C 1 d, C 1 e");
  EXPECT_EQ(unadvised - start, 0u);
  EXPECT_EQ(advised - start, 150u);
}

}  // namespace
}  // namespace KelvoUHW
