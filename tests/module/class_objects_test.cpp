// The class objects, the shared instances behind them, and the module's lock count and end.
#include <gmock/gmock.h>

#include <array>
#include <atomic>
#include <bit>
#include <chrono>
#include <thread>

#include "com/usb_tree.h"
#include "module/singleton.h"
#include "monitor/event_notifier.h"
#include "tests/support/counting_sink.h"
#include "tests/support/failing_memory.h"
#include "tests/support/module_process.h"
#include "tests/support/rendezvous.h"
#include "tests/support/scripted_tree.h"

namespace KelvoUHW {
namespace {

using platform::controls::FailCriticalSection;
using platform::simulated::VolumeBroadcast;
using testing_support::CountingSink;

constexpr HRESULT kNoResources = static_cast<HRESULT>(0x800705AA);
// What the system answers where nothing in the process has the class of its interface table: its own COM has it, and
// asks for an apartment first.
#ifdef _WIN32
constexpr HRESULT kNoInterfaceTable = CO_E_NOTINITIALIZED;
#else
constexpr HRESULT kNoInterfaceTable = REGDB_E_CLASSNOTREG;
#endif
constexpr CLSID kUnknownClass{0x11111111, 1, 1, {1}};
constexpr CLSID kInterfaceTableClass{0x00000323, 0, 0, {0xC0, 0, 0, 0, 0, 0, 0, 0x46}};

bool HasInstance(const CLSID& clsid) {
  return clsid == CLSID_ZKUMUsbTree ? SingletonState<CZKUMUsbTree, IUnknown>::s_pInstance != nullptr
                                    : SingletonState<CZKUMEventNotifier, IUnknown>::s_pInstance != nullptr;
}

TEST(ClassObjects, RefuseWhatTheyCannotMake) {
  for (const CLSID& clsid : {CLSID_ZKUMUsbTree, CLSID_ZKUMEventNotifier}) {
    ModuleProcess process;
    const ComPtr<IClassFactory> factory = process.Class(clsid);
    const LONG locks = ModuleLockCount();
    const std::tuple<IUnknown*, IID, bool, HRESULT> kCases[] = {
        {nullptr, platform::IidOf<IUnknown>(), false, E_POINTER},
        {factory.Get(), platform::IidOf<IUnknown>(), false, E_POINTER},
        {factory.Get(), platform::IidOf<IUnknown>(), true, CLASS_E_NOAGGREGATION},
        {nullptr, platform::IidOf<IClassFactory>(), true, E_NOINTERFACE}};
    for (const auto& [outer, iid, giveOut, result] : kCases) {
      void* object = Mark<void>();
      EXPECT_EQ(factory->CreateInstance(outer, iid, giveOut ? &object : nullptr), result);
      EXPECT_EQ(object, giveOut ? nullptr : Mark<void>());
      // A notifier that was made for nothing is there all the same, and the tree that it holds.
      const bool made = result == E_NOINTERFACE && clsid == CLSID_ZKUMEventNotifier;
      EXPECT_EQ(HasInstance(clsid), made);
      EXPECT_EQ(ModuleLockCount(), locks + (made ? 2 : 0));
    }
  }
}

TEST(ClassObjects, HandOutOneObjectUntilItsLastRelease) {
  ModuleProcess process;
  const LONG locks = ModuleLockCount();
  for (int round = 0; round < 2; ++round) {
    IUnknown* first = process.Make<IUnknown>(CLSID_ZKUMUsbTree).Detach();
    IZKUMUsbTree* second = process.Make<IZKUMUsbTree>(CLSID_ZKUMUsbTree).Detach();
    EXPECT_EQ(static_cast<void*>(first), static_cast<void*>(second));
    EXPECT_EQ(ModuleLockCount(), locks + 1);
    EXPECT_EQ(first->AddRef(), 3u);
    for (const ULONG left : {255u, 255u, 0u}) EXPECT_EQ(second->Release(), left);
    EXPECT_FALSE(HasInstance(CLSID_ZKUMUsbTree));
    EXPECT_EQ(ModuleLockCount(), locks);
  }
  IUnknown* notifier = process.Make<IUnknown>(CLSID_ZKUMEventNotifier).Detach();
  IUnknown* same = process.Make<IUnknown>(CLSID_ZKUMEventNotifier).Detach();
  IUnknown* tree = process.Make<IUnknown>(CLSID_ZKUMUsbTree).Detach();
  EXPECT_EQ(notifier, same);
  for (IUnknown* held : {notifier, same, tree}) EXPECT_EQ(held->Release(), 255u);
  EXPECT_TRUE(HasInstance(CLSID_ZKUMEventNotifier) && HasInstance(CLSID_ZKUMUsbTree));
}

TEST(ClassObjects, TheLastReferenceIsDroppedUnderTheLock) {
  platform::CriticalSection lock;
  ASSERT_EQ(lock.Initialize(), S_OK);
  std::atomic<LONG> count = 2;
  EXPECT_FALSE(ReleaseAndLockIfLast(count, lock));
  EXPECT_EQ(count, 1);
  lock.lock();
  for (int round = 0; round < 2; ++round) {
    // Taken by another thread while the last owner waits for the lock, or just before it looks.
    bool last = true;
    std::thread owner([&] { last = ReleaseAndLockIfLast(count, lock); });
    std::this_thread::sleep_for(std::chrono::milliseconds(20));
    EXPECT_EQ(count, 1) << "dropped by one without the lock";
    ++count;
    lock.unlock();
    owner.join();
    EXPECT_FALSE(last);
    // Whoever drops the last one holds the lock: in the second round the owner waits for this one.
    EXPECT_TRUE(ReleaseAndLockIfLast(count, lock));
    EXPECT_EQ(count.exchange(1), 0);
  }
  lock.unlock();
}

TEST(ClassObjects, LeaveNothingOfAHalfBuiltObject) {
  enum What { kClass, kObject, kWithoutPc, kWithoutTreeClass };
  const struct {
    const char* fails;
    CLSID clsid;
    What what;
    std::uint64_t failingLock, failingAllocation;
    HRESULT result;
  } kCases[] = {
      {"the lock of the class object", CLSID_ZKUMEventNotifier, kClass, 1, 0, kNoResources},
      {"the memory of the class object", CLSID_ZKUMEventNotifier, kClass, 0, 1, E_OUTOFMEMORY},
      {"the tree's lock", CLSID_ZKUMUsbTree, kObject, 1, 0, kNoResources},
      {"the tree's memory", CLSID_ZKUMUsbTree, kObject, 0, 1, E_OUTOFMEMORY},
      {"the memory of its builder", CLSID_ZKUMUsbTree, kObject, 0, 2, E_FAIL},
      {"the tree's PC", CLSID_ZKUMUsbTree, kWithoutPc, 0, 0, E_FAIL},
      {"the notifier's lock", CLSID_ZKUMEventNotifier, kObject, 1, 0, kNoResources},
      {"the lock of its tree", CLSID_ZKUMEventNotifier, kObject, 2, 0, kNoResources},
      {"the notifier's memory", CLSID_ZKUMEventNotifier, kObject, 0, 1, E_OUTOFMEMORY},
      {"the class of its tree", CLSID_ZKUMEventNotifier, kWithoutTreeClass, 0, 0, REGDB_E_CLASSNOTREG},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.fails);
    ModuleProcess process;
    const ComPtr<IClassFactory> factory = test.what == kClass ? nullptr : process.Class(test.clsid);
    if (test.what == kWithoutPc) platform::SetCurrentSystem({.threads = &process.desktop, .desktop = &process.desktop});
    if (test.what == kWithoutTreeClass) process.UseTreeClass(nullptr);
    const LONG locks = ModuleLockCount();
    void* object = Mark<void>();
    bool failed = false;
    FailCriticalSection(test.failingLock, kNoResources);
    EXPECT_EQ(WithoutAllocation(
                  test.failingAllocation, failed,
                  [&] {
                    return factory ? factory->CreateInstance(nullptr, platform::IidOf<IUnknown>(), &object)
                                   : process.module->GetClassObject(test.clsid, platform::IidOf<IUnknown>(), &object);
                  }),
              test.result);
    EXPECT_EQ(object, nullptr);
    EXPECT_FALSE(HasInstance(CLSID_ZKUMUsbTree) || HasInstance(CLSID_ZKUMEventNotifier));
    EXPECT_EQ(ModuleLockCount(), locks);
    EXPECT_EQ(process.desktop.Calls(DesktopCall::StartThread), 0u) << "the monitor was started";
    if (test.what <= kObject) {
      EXPECT_TRUE(process.Make<IUnknown>(test.clsid)) << "made when it can be";
    }
  }
}

TEST(ClassObjects, AreCachedAndLockTheModuleWhileAClientHoldsThem) {
  ModuleProcess process;
  process.UseTreeClass(nullptr);
  CZKUsbMonitorModule& module = *process.module;
  const auto expectLocks = [&](LONG locks, const char* after) {
    EXPECT_EQ(module.GetLockCount(), locks) << after;
    EXPECT_EQ(module.CanUnloadNow(), locks == 0 ? S_OK : S_FALSE) << after;
  };
  expectLocks(0, "nothing");
  ComPtr<IClassFactory> first = process.Class(CLSID_ZKUMUsbTree);
  expectLocks(1, "the first reference");
  ComPtr<IUnknown> unknown;
  EXPECT_EQ(module.GetClassObject(CLSID_ZKUMUsbTree, platform::IidOf<IUnknown>(), unknown.PutVoid()), S_OK);
  EXPECT_EQ(static_cast<IUnknown*>(first.Get()), unknown.Get());
  expectLocks(1, "the second");
  ComPtr<IClassFactory> second = process.Class(CLSID_ZKUMEventNotifier);
  expectLocks(2, "the other class");
  ComPtr<IUnknown> tree = process.Make<IUnknown>(CLSID_ZKUMUsbTree);
  expectLocks(3, "an object");
  EXPECT_EQ(first->LockServer(TRUE), S_OK);
  EXPECT_EQ(second->LockServer(2), S_OK);
  expectLocks(5, "two locks");
  EXPECT_EQ(first->LockServer(FALSE), S_OK);
  const IUnknown* const cached = unknown.Get();
  first.Reset();
  expectLocks(4, "an unlock, and one reference less");
  EXPECT_EQ(unknown.Detach()->Release(), 1u);
  expectLocks(3, "none left");
  first = process.Class(CLSID_ZKUMUsbTree);
  EXPECT_EQ(first.Get(), cached);
  expectLocks(4, "the same once more");
  first.Reset();
  EXPECT_EQ(second->LockServer(FALSE), S_OK);
  second.Reset();
  expectLocks(1, "the last unlock");
  tree.Reset();
  expectLocks(0, "no object");
}

TEST(Module, AnswersUnexpectedWhenItCouldNotInitialise) {
  for (const std::uint64_t lock : {1u, 2u, 3u, 4u}) {
    SCOPED_TRACE(lock);
    const bool whole = lock == 4;
    FailCriticalSection(lock, kNoResources);
    CZKUsbMonitorModule module;
    FailCriticalSection(0, S_OK);
    EXPECT_EQ(module.Initialized(), whole);
    for (const CLSID& clsid : {CLSID_ZKUMUsbTree, CLSID_ZKUMEventNotifier, kUnknownClass}) {
      void* out = Mark<void>();
      EXPECT_EQ(module.GetClassObject(clsid, platform::IidOf<IDispatch>(), &out), !whole ? E_UNEXPECTED
                                                                                  : clsid == kUnknownClass
                                                                                      ? CLASS_E_CLASSNOTAVAILABLE
                                                                                      : E_NOINTERFACE);
      EXPECT_EQ(out, nullptr);
      EXPECT_EQ(module.GetClassObject(clsid, platform::IidOf<IUnknown>(), nullptr), E_POINTER);
    }
    void* table = Mark<void>();
    EXPECT_EQ(module.GetGlobalInterfaceTable(reinterpret_cast<IUnknown**>(&table)),
              whole ? kNoInterfaceTable : E_UNEXPECTED);
    EXPECT_EQ(table, nullptr);
    EXPECT_EQ(module.CanUnloadNow(), S_OK);
    module.Unload();
  }
}

// In the ABI of these builds a pointer to a virtual method is its place in the table of methods, in bytes, plus one.
template <class Method>
std::size_t SlotOf(Method method) {
  const auto words = std::bit_cast<std::array<std::uintptr_t, 2>>(method);
  EXPECT_EQ(words[0] % sizeof(void*), 1u) << "not virtual";
  return words[0] / sizeof(void*);
}

TEST(Module, KeepsTheOrderOfItsVirtualOperations) {
  using Module = CZKUsbMonitorModule;
  // Two places are the destructor's.
  EXPECT_EQ(SlotOf(&Module::Lock), 2u);
  EXPECT_EQ(SlotOf(&Module::Unlock), 3u);
  EXPECT_EQ(SlotOf(&Module::GetLockCount), 4u);
  EXPECT_EQ(SlotOf(&Module::GetGlobalInterfaceTable), 5u);
  EXPECT_EQ(SlotOf(&Module::AddCommonRGSReplacements), 6u);

  Module module;
  for (const LONG count : {1, 2}) EXPECT_EQ(module.Lock(), count);
  for (const LONG count : {1, 0}) EXPECT_EQ(module.Unlock(), count);

  std::vector<Replacement> replacements{{u"MINE", u"kept"}};
  module.AddCommonRGSReplacements(replacements);
  ASSERT_EQ(replacements.size(), 2u);
  EXPECT_EQ(replacements[1].name, u"APPID");
  EXPECT_EQ(replacements[1].text, u"{A0C53575-7F3D-4FF2-B5A7-BFA873492510}");
}

TEST(Module, KeepsTheInterfaceTableOfTheProcess) {
#ifdef _WIN32
  GTEST_SKIP() << "the system gives its own table, whatever class is registered";
#endif
  // Any object will do.
  ScriptedTree table;
  table.alias = {0x00000146, 0, 0, {0xC0, 0, 0, 0, 0, 0, 0, 0x46}};
  IClassFactory* const classObject = &table;
  DWORD cookie = 0;
  ASSERT_EQ(CoRegisterClassObject(kInterfaceTableClass, classObject, CLSCTX_INPROC_SERVER, REGCLS_MULTIPLEUSE, &cookie),
            S_OK);
  CZKUsbMonitorModule module;
  EXPECT_EQ(module.GetGlobalInterfaceTable(nullptr), E_POINTER);
  for (int call = 0; call < 2; ++call) {
    ComPtr<IUnknown> out;
    EXPECT_EQ(module.GetGlobalInterfaceTable(out.Put()), S_OK);
    EXPECT_EQ(out.Get(), static_cast<IZKUMUsbTree*>(&table));
    EXPECT_EQ(table.creations, 1);
    EXPECT_EQ(References(classObject), 4u) << "the process, the module and the caller besides its own";
  }
  module.Unload();
  EXPECT_EQ(References(classObject), 2u);
  ComPtr<IUnknown> out;
  EXPECT_EQ(module.GetGlobalInterfaceTable(out.Put()), E_UNEXPECTED);
  EXPECT_FALSE(out);
  EXPECT_EQ(CoRevokeClassObject(cookie), S_OK);
}

TEST(Module, EndsWithTheNotifierHeldOrNotHeld) {
  const DeviceBroadcast volume = VolumeBroadcast(platform::kDBT_DEVICEARRIVAL, u'E', 0);
  const DeviceBroadcast late = NamedBroadcast(platform::kDBT_DEVICEREMOVECOMPLETE, 5, kWatchedPath);
  for (const bool held : {false, true}) {
    for (const bool underWay : {false, true}) {
      SCOPED_TRACE(testing::Message() << (held ? "held" : "not held") << (underWay ? ", with an event under way" : ""));
      ModuleProcess process;
      CountingSink sink;
      IUnknown* notifier = process.Make<IUnknown>(CLSID_ZKUMEventNotifier).Detach();
      process.UseTreeClass(nullptr);
      {
        ComPtr<IConnectionPoint> point;
        DWORD cookie = 0;
        const auto container = ComPtr<IUnknown>(notifier).As<IConnectionPointContainer>();
        ASSERT_EQ(container->FindConnectionPoint(DIID_IZKDeviceEventCallBack, point.Put()), S_OK);
        ASSERT_EQ(point->Advise(&sink, &cookie), S_OK);
      }
      // What a stick that comes leads to as long as the module is not unloaded, and no longer.
      const auto plug = [&](const char16_t* serial, std::uint32_t port, char16_t letter) {
        process.Do({Stick(serial, port, letter)});
        EXPECT_EQ(process.desktop.Broadcast(volume), 1u);
        process.desktop.Settle();
        return sink.Events();
      };
      const std::size_t told = plug(u"S1", 1, u'E');
      EXPECT_GE(told, 1u);
      if (!held) {
        EXPECT_EQ(notifier->Release(), 255u);
      }
      if (underWay) process.desktop.Broadcast(late);
      EXPECT_EQ(ModuleLockCount(), underWay ? 3 : 2) << "notifier, tree, event thread";

      for (int time = 0; time < 2; ++time) process.module->Unload();
      EXPECT_EQ(process.desktop.Now() >= 3000, underWay);
      EXPECT_EQ(HasInstance(CLSID_ZKUMEventNotifier), held);
      EXPECT_EQ(ModuleLockCount(), held ? 2 : 0);
      const std::uint64_t threads = process.desktop.Calls(DesktopCall::StartThread);
      EXPECT_EQ(plug(u"S2", 2, u'F'), told);
      if (held) {
        EXPECT_EQ(notifier->Release(), 0u);
      }
      EXPECT_FALSE(HasInstance(CLSID_ZKUMEventNotifier) || HasInstance(CLSID_ZKUMUsbTree));
      EXPECT_EQ(ModuleLockCount(), 0);
      // Whether its code is still there is not known, so it is not released. This is deliberate.
      EXPECT_EQ(sink.References(), 2);
      EXPECT_EQ(plug(u"S3", 3, u'G'), told);
      EXPECT_EQ(process.desktop.Calls(DesktopCall::StartThread), threads);
      EXPECT_EQ(process.desktop.Counts().registrations, 0u);
      EXPECT_THAT(process.desktop.Pins(), testing::ElementsAre(&g_notifyLock));
    }
  }
}

// Nobody has asked a fresh module for a class object yet: whoever comes first makes it, and all get that one.
TEST(ModuleStress, EightThreadsAskAFreshModuleForItsClassObjects) {
  constexpr std::size_t kThreads = 8;
  constexpr int kModules = 5;
  testing_support::Rendezvous round(kThreads + 1);
  std::atomic<CZKUsbMonitorModule*> asked = nullptr;
  std::array<std::array<ComPtr<IClassFactory>, 2>, kThreads> answers;
  std::vector<std::thread> threads;
  for (auto& answer : answers) {
    threads.emplace_back([&] {
      for (int i = 0; i < kModules; ++i) {
        round.ArriveAndWait();
        const SlowAllocations slow;
        for (std::size_t kind = 0; kind < 2; ++kind) {
          const CLSID& clsid = kind == 0 ? CLSID_ZKUMUsbTree : CLSID_ZKUMEventNotifier;
          EXPECT_EQ(asked.load()->GetClassObject(clsid, platform::IidOf<IClassFactory>(), answer[kind].PutVoid()),
                    S_OK);
        }
        round.ArriveAndWait();
        round.ArriveAndWait();
      }
    });
  }
  int different = 0;
  for (int i = 0; i < kModules; ++i) {
    CZKUsbMonitorModule module;
    asked = &module;
    round.ArriveAndWait();
    round.ArriveAndWait();
    for (auto& answer : answers) {
      for (std::size_t kind = 0; kind < 2; ++kind) different += answer[kind].Get() != answers[0][kind].Get() ? 1 : 0;
    }
    for (auto& answer : answers) answer = {};
    EXPECT_EQ(module.GetLockCount(), 0);
    module.Unload();
    round.ArriveAndWait();
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(different, 0);
}

TEST(ModuleStress, EightThreadsMakeAndReleaseTheTree) {
  constexpr std::size_t kThreads = 8;
  constexpr std::size_t kRounds = 500;
  ModuleProcess process(ClockMode::Real);
  process.UseTreeClass(nullptr);
  std::atomic<std::size_t> made = 0, shared = 0;
  testing_support::Rendezvous round(kThreads);
  std::vector<std::thread> threads;
  for (std::size_t thread = 0; thread < kThreads; ++thread) {
    threads.emplace_back([&, thread] {
      for (std::size_t i = 0; i < kRounds; ++i) {
        round.ArriveAndWait();
        IZKUMUsbTree* const tree = process.Make<IZKUMUsbTree>(CLSID_ZKUMUsbTree).Detach();
        if (tree == nullptr) continue;
        IZKUMUsbTreeNode* root = nullptr;
        EXPECT_EQ(tree->get_RootNode(&root), E_POINTER);
        if ((i + thread) % 4 == 0) std::this_thread::yield();
        ++(tree->Release() == 0 ? made : shared);
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(made + shared, kThreads * kRounds);
  // In every round at least the first thread found none: all had been released.
  EXPECT_GE(made, kRounds);
  EXPECT_GE(shared, 1u) << "no two threads met";
  EXPECT_EQ(process.pc.Open().sets, made) << "of which each tree leaves one, so no more were made than destroyed";
  EXPECT_FALSE(HasInstance(CLSID_ZKUMUsbTree));
  EXPECT_EQ(ModuleLockCount(), 0);
}

}  // namespace
}  // namespace KelvoUHW
