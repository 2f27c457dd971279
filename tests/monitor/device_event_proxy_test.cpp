// The connection point as its clients see it: codes, slots, enumerators, references.
#include "monitor/device_event_proxy.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <thread>

#include "monitor/event_notifier.h"
#include "tests/support/failing_memory.h"
#include "tests/support/notifier_scene.h"

namespace KelvoUHW {
namespace {

constexpr HRESULT kNoConnection = static_cast<HRESULT>(0x80040200);
constexpr HRESULT kAdviseLimit = static_cast<HRESULT>(0x80040201);
constexpr HRESULT kCannotConnect = static_cast<HRESULT>(0x80040202);
constexpr HRESULT kSinkCode = static_cast<HRESULT>(0x80070005);
constexpr DWORD kMark = 0xA5A5A5A5;

using Scene = NotifierScene;
using DeviceEventProxy = ComObjects;

TEST_F(DeviceEventProxy, HasItsOwnIdentityAndCountsOnTheNotifier) {
  Scene scene;
  const auto& point = scene.point;
  const auto container = scene.Container();
  const std::int32_t before = scene.NotifierReferences();
  const auto unknown = scene.point.As<IUnknown>();
  EXPECT_EQ(scene.NotifierReferences(), before + 1);
  EXPECT_FALSE(unknown.Get() == scene.notifier.As<IUnknown>().Get());
  EXPECT_TRUE(unknown.As<IConnectionPoint>().Get() == point.Get());
  for (const IID& iid : {platform::IidOf<IConnectionPointContainer>(), platform::IidOf<IZKUMEventNotifier>(),
                         platform::IidOf<IZKUMPrivateNotifier>(), DIID_IZKDeviceEventCallBack}) {
    void* out = Mark<void>();
    EXPECT_EQ(point->QueryInterface(iid, &out), E_NOINTERFACE);
    EXPECT_EQ(out, nullptr);
  }
  EXPECT_EQ(scene.NotifierReferences(), before + 1);

  IID iid{};
  EXPECT_EQ(point->GetConnectionInterface(&iid), S_OK);
  EXPECT_TRUE(iid == DIID_IZKDeviceEventCallBack);
  ComPtr<IConnectionPointContainer> owner;
  EXPECT_EQ(point->GetConnectionPointContainer(owner.Put()), S_OK);
  EXPECT_TRUE(owner.Get() == container.Get());
  for (const IID& other : {platform::IidOf<IDispatch>(), platform::IidOf<IZKUMDeviceEvent>()}) {
    auto* found = Mark<IConnectionPoint>();
    EXPECT_EQ(container->FindConnectionPoint(other, &found), kNoConnection);
    EXPECT_EQ(found, nullptr);
  }
  const auto support = scene.notifier.As<ISupportErrorInfo>();
  EXPECT_EQ(support->InterfaceSupportsErrorInfo(platform::IidOf<IZKUMPrivateNotifier>()), S_FALSE);
  EXPECT_EQ(support->InterfaceSupportsErrorInfo(platform::IidOf<IZKUMEventNotifier>()), S_OK);

  ComPtr<IEnumConnectionPoints> list;
  ASSERT_EQ(container->EnumConnectionPoints(list.Put()), S_OK);
  IConnectionPoint* points[2] = {};
  ULONG fetched = 0;
  EXPECT_EQ(list->Next(2, points, &fetched), S_FALSE);
  EXPECT_EQ(fetched, 1u);
  EXPECT_TRUE(ComPtr<IConnectionPoint>::Attach(points[0]).Get() == point.Get());

  DWORD cookie = kMark;
  for (const HRESULT result :
       {point->QueryInterface(platform::IidOf<IUnknown>(), nullptr), point->GetConnectionInterface(nullptr),
        point->GetConnectionPointContainer(nullptr), container->EnumConnectionPoints(nullptr),
        container->FindConnectionPoint(platform::IidOf<IDispatch>(), nullptr), point->EnumConnections(nullptr),
        point->Advise(nullptr, &cookie), point->Advise(&scene.a, nullptr)}) {
    EXPECT_EQ(result, E_POINTER);
  }
  EXPECT_EQ(cookie, kMark);
}

// Whether a sink that could not be told is advised all the same, and what was asked of the tree.
TEST_F(DeviceEventProxy, AdviseCodes) {
  const auto answers = [](std::vector<HRESULT> codes) { return [=](Scene& s) { s.a.eventCodes = codes; }; };
  const auto unadvises = [](Scene& s) { s.tree.onBuild = [&s] { EXPECT_EQ(s.point->Unadvise(1), S_OK); }; };
  const struct {
    const char* what;
    std::function<void(Scene&)> prepare;
    HRESULT result;
    bool advised;
    const char *calls, *log;
  } kCases[] = {
      {"nothing changed", [](Scene& s) { s.tree.built = S_FALSE; }, S_OK, true, "build list0 reset", "A 0 c"},
      {"reset fails", [](Scene& s) { s.tree.reset = E_FAIL; }, S_OK, true, "build list0 reset", "A 0 c"},
      {"sink fails", [](Scene& s) { s.a.onEvent = [] { return E_FAIL; }; }, S_OK, true, "build list0 reset", "A 0 c"},
      {"no IUnknown", [](Scene& s) { s.a.unknownCode = E_NOINTERFACE; }, E_NOINTERFACE, false, "", ""},
      {"no event interface", answers({E_NOINTERFACE}), kCannotConnect, false, "", ""},
      {"another code", answers({kSinkCode}), kSinkCode, false, "", ""},
      {"throws when asked", answers({TestSink::kThrows}), E_FAIL, false, "", ""},
      {"no event interface the second time", answers({S_OK, E_NOINTERFACE}), E_NOINTERFACE, true, "", ""},
      {"build fails", [](Scene& s) { s.tree.built = kSinkCode; }, kSinkCode, true, "build", ""},
      {"list fails", [](Scene& s) { s.tree.listed = kSinkCode; }, E_FAIL, true, "build list0", ""},
      {"no list", [](Scene& s) { s.tree.withoutLists = true; }, E_FAIL, true, "build list0", ""},
      {"unadvised meanwhile", unadvises, S_OK, false, "build list0 reset", ""},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    Scene scene;
    test.prepare(scene);
    DWORD cookie = kMark;
    EXPECT_EQ(scene.point->Advise(&scene.a, &cookie), test.result);
    EXPECT_TRUE(test.advised ? cookie == 1 : cookie == kMark || cookie == 1) << cookie;
    EXPECT_EQ(scene.tree.calls, test.calls);
    EXPECT_EQ(Taken(scene.log), test.log);
    EXPECT_EQ(scene.point->Unadvise(1), test.advised ? S_OK : kNoConnection);
    EXPECT_EQ(scene.a.References(), 1);
  }
}

TEST_F(DeviceEventProxy, AdviseWithoutMemory) {
  // The first allocation of an advise is for the slots, when there are no free ones.
  for (const std::size_t advised : {0u, 4u, 3u}) {
    SCOPED_TRACE(advised);
    Scene scene;
    for (std::size_t i = 0; i < advised; ++i) scene.Advise(scene.b);
    scene.log.clear();
    DWORD cookie = kMark;
    bool failed = false;
    EXPECT_EQ(WithoutAllocation(1, failed, [&] { return scene.point->Advise(&scene.a, &cookie); }),
              advised == 3 ? E_OUTOFMEMORY : kAdviseLimit);
    EXPECT_TRUE(failed);
    EXPECT_EQ(cookie, advised == 3 ? 4u : kMark);
    EXPECT_EQ(scene.a.References(), advised == 3 ? 2 : 1);
    EXPECT_EQ(Taken(scene.log), "");
    scene.point->Unadvise(4);
    scene.Advise(scene.a);
    EXPECT_EQ(Taken(scene.log), "A 0 c");
  }
}

TEST_F(DeviceEventProxy, LowestFreeSlotGivesTheCookie) {
  Scene scene;
  for (DWORD expected = 1; expected <= 5; ++expected) EXPECT_EQ(scene.Advise(scene.b), expected);
  for (const DWORD removed : {4u, 2u}) EXPECT_EQ(scene.point->Unadvise(removed), S_OK);
  for (const DWORD expected : {2u, 4u, 6u, 7u, 8u, 9u}) EXPECT_EQ(scene.Advise(scene.a), expected);
  EXPECT_EQ(scene.point->Unadvise(3), S_OK);
  for (const DWORD free : {0u, 3u, 16u, 17u, 0xFFFFFFFF}) EXPECT_EQ(scene.point->Unadvise(free), kNoConnection) << free;
  // In the order of the slots, whatever the order in which they came.
  scene.log.clear();
  scene.tree.lists = {};
  scene.tree.lists[KDeviceAttached] = {scene.tree.Device(u"d")};
  EXPECT_EQ(scene.Notify(), S_OK);
  EXPECT_EQ(Taken(scene.log), "B 1 d, A 1 d, A 1 d, B 1 d, A 1 d, A 1 d, A 1 d, A 1 d");
  // Four slots became eight and then sixteen: of those advised inside a call, into slots 3 and 10 to 17, only the last
  // one stands behind the end of this round.
  scene.b.onEvent = [&] {
    scene.b.onEvent = {};
    for (int i = 0; i < 9; ++i) scene.Advise(scene.c);
    return S_OK;
  };
  EXPECT_EQ(scene.Notify(), S_OK);
  EXPECT_EQ(std::ranges::count(scene.log, "C 1 d"), 8);
  for (DWORD each = 1; each <= 17; ++each) EXPECT_EQ(scene.point->Unadvise(each), S_OK);
}

// What the sink answered for the event interface first is what is called, though it answers with another one later.
TEST_F(DeviceEventProxy, SlotHoldsTheFirstAnswer) {
  Scene scene;
  scene.a.severalFaces = true;
  scene.Advise(scene.a);
  scene.tree.lists[KDeviceRemoved] = {scene.tree.Device(u"r")};
  EXPECT_EQ(scene.Notify(), S_OK);
  EXPECT_EQ(Taken(scene.log), "A 0 c, A 0 c, A 2 r");
  EXPECT_EQ(scene.a.Calls(0), 3);
  EXPECT_EQ(scene.a.Calls(1), 0);
}

TEST_F(DeviceEventProxy, FiringAnswersTheLastCode) {
  const struct {
    HRESULT codes[3];
    bool onlyB;
    HRESULT result;
    const char* log;
  } kCases[] = {
      {{E_FAIL, S_OK, S_OK}, false, S_OK, "A 1 d, B 1 d, C 1 d"},
      {{S_OK, S_OK, kSinkCode}, false, kSinkCode, "A 1 d, B 1 d, C 1 d"},
      {{E_FAIL, S_FALSE, E_FAIL}, true, S_FALSE, "B 1 d"},
  };
  Scene scene;
  scene.tree.lists = {};
  TestSink* const sinks[] = {&scene.a, &scene.b, &scene.c};
  for (TestSink* sink : sinks) scene.Advise(*sink);
  ComPtr<IUnknown> b;
  EXPECT_EQ(scene.b.QueryInterface(DIID_IZKDeviceEventCallBack, b.PutVoid()), S_OK);
  auto* notifier = static_cast<CZKUMEventNotifier*>(scene.notifier.Get());
  const auto node = Wrap(scene.tree.Device(u"d"));
  for (const auto& test : kCases) {
    for (std::size_t i = 0; i < 3; ++i) sinks[i]->onEvent = [code = test.codes[i]] { return code; };
    EXPECT_EQ(notifier->Fire_OnDeviceChanged(KDeviceAttached, node.Get(), test.onlyB ? b.Get() : nullptr), test.result);
    EXPECT_EQ(Taken(scene.log), test.log);
    EXPECT_EQ(References(node.Get()), 1u);
  }
  // Nobody is called by empty slots.
  for (const DWORD cookie : {1u, 2u, 3u}) EXPECT_EQ(scene.point->Unadvise(cookie), S_OK);
  EXPECT_EQ(notifier->Fire_OnDeviceChanged(KDeviceAttached, node.Get(), nullptr), S_OK);
  EXPECT_EQ(Taken(scene.log), "");
}

TEST_F(DeviceEventProxy, EnumeratesConnections) {
  const std::pair<const char*, const char*> kCases[] = {
      {"n3 n1", "S_FALSE:A1:C3#2, S_FALSE#0"},
      {"n1! n0 n0! n2! n1", "S_OK:A1, S_OK#0, S_OK, E_POINTER, S_OK:C3#1"},
      {"s1 n1 s1 s0", "S_OK, S_OK:C3#1, S_FALSE, S_OK"},
      {"s3 r s2 n1", "S_FALSE, S_OK, S_OK, S_FALSE#0"},
      {"n1 c n2 r n1", "S_OK:A1#1, S_OK, S_FALSE:C3#1, S_OK, S_OK:A1#1"},
  };
  Scene scene;
  for (TestSink* sink : {&scene.a, &scene.b, &scene.c}) scene.Advise(*sink);
  EXPECT_EQ(scene.point->Unadvise(2), S_OK);
  const auto next = [&](IEnumConnections* from, ULONG count, bool withNumber) {
    CONNECTDATA items[4] = {};
    ULONG fetched = 0;
    std::string text = CodeName(from->Next(count, items, withNumber ? &fetched : nullptr));
    for (const CONNECTDATA& item : items) {
      if (item.pUnk == nullptr) continue;
      const auto sink = ComPtr<IUnknown>::Attach(item.pUnk).As<IUnknown>();
      text += sink.Get() == &scene.a ? ":A" : sink.Get() == &scene.c ? ":C" : ":?";
      text += std::to_string(item.dwCookie);
    }
    return withNumber ? text + "#" + std::to_string(fetched) : text;
  };
  for (const auto& [operations, outcome] : kCases) {
    ComPtr<IEnumConnections> list;
    ASSERT_EQ(scene.point->EnumConnections(list.Put()), S_OK);
    EXPECT_EQ(Play(list, operations, next), outcome) << operations;
  }
  EXPECT_TRUE(scene.a.References() == 2 && scene.c.References() == 2) << "all but those of the slots given back";
  // A list is what was advised when it was made.
  ComPtr<IEnumConnections> list;
  ASSERT_EQ(scene.point->EnumConnections(list.Put()), S_OK);
  for (const DWORD cookie : {1u, 3u}) EXPECT_EQ(scene.point->Unadvise(cookie), S_OK);
  EXPECT_EQ(scene.a.References(), 2);
  EXPECT_EQ(Play(list, "n2", next), "S_OK:A1:C3#2");
}

TEST_F(DeviceEventProxy, EnumeratesWithoutMemory) {
  Scene scene;
  scene.Advise(scene.a);
  HRESULT result = E_OUTOFMEMORY;
  int failures = 0;
  for (std::uint64_t nth = 1; result == E_OUTOFMEMORY && nth < 50; ++nth) {
    auto* out = Mark<IEnumConnections>();
    const FailingAllocation failing(nth);
    result = scene.point->EnumConnections(&out);
    failures += failing.Failed() ? 1 : 0;
    EXPECT_EQ(failing.Failed(), out == nullptr);
    if (out != nullptr) out->Release();
  }
  EXPECT_EQ(result, S_OK);
  EXPECT_GE(failures, 3);
  EXPECT_EQ(scene.a.References(), 2);
}

// Whoever has the lock changes the slots: everybody else waits.
TEST(SinkSlots, EachCallWaitsForTheLock) {
  platform::CriticalSection lock;
  ASSERT_EQ(lock.Initialize(), S_OK);
  TestSink::Log log;
  TestSink sink(log, "A");
  SinkSlots slots(lock);
  DWORD cookie = 0;
  const std::pair<const char*, std::function<void()>> kCalls[] = {
      {"Add",
       [&] {
         ComPtr<IUnknown> added(&sink);
         EXPECT_EQ(slots.Add(added, cookie), S_OK);
       }},
      {"At", [&] { EXPECT_TRUE(slots.At(0)); }},
      {"Occupied", [&] { EXPECT_EQ(slots.Occupied().size(), 1u); }},
      {"Take", [&] { EXPECT_TRUE(slots.Take(cookie)); }},
  };
  for (const auto& [what, call] : kCalls) {
    std::atomic<bool> done = false;
    lock.lock();
    std::thread caller([&done, &call = call] {
      call();
      done = true;
    });
    std::this_thread::sleep_for(std::chrono::milliseconds(30));
    EXPECT_FALSE(done) << what;
    lock.unlock();
    caller.join();
  }
}

}  // namespace
}  // namespace KelvoUHW
