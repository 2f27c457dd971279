// Clients advise, unadvise, walk and destroy, broadcasts arrive, and the module is unloaded, in thousands of orders:
// virtual time lets one thread run until it waits, and the test decides which goes on. Builds wait, too, between their
// calls to the PC.
#include <gmock/gmock.h>

#include <cstdlib>
#include <functional>
#include <iostream>
#include <random>
#include <set>

#include "platform/wrappers/intercepting_host.h"
#include "tests/support/cases.h"
#include "tests/support/module_process.h"
#include "tests/support/test_sink.h"

namespace KelvoUHW {
namespace {

using platform::simulated::VolumeBroadcast, platform::wrappers::HostCall, platform::wrappers::Operation;
using Choose = platform::simulated::Scheduler::Choose;

// Lets others run where a build holds none of the locks that are not virtual.
class PausingHost final : public platform::wrappers::InterceptingHost {
 public:
  PausingHost(platform::Host& base, SimulatedDesktop& desktop) : InterceptingHost(base), m_desktop(desktop) {}
  platform::Status BeforeCall(const HostCall& call) noexcept override {
    const bool pauses = call.operation == Operation::GetClassDevs || call.operation == Operation::FirstVolume ||
                        call.operation == Operation::GetClassImageList;
    if (pauses && paused) m_desktop.Sleep(0);
    return {};
  }
  bool paused = false;

 private:
  SimulatedDesktop& m_desktop;
};

// One order: what each of four threads does, a sink that is advised all the time, and how it all ends.
void RunInOneOrder(Choose choose) {
  TestSink::Log log, others;
  TestSink always(log, "A"), first(others, "B"), second(others, "C");
  ModuleProcess process;
  PausingHost host(process.pc, process.desktop);
  platform::SetCurrentSystem({.host = &host, .threads = &process.desktop, .desktop = &process.desktop});
  process.Do({Stick(u"S1", 1, u'E'), Gadget(u"M1", 2)});
  process.Start();
  const DWORD cookie = process.Advise(always);
  EXPECT_EQ(Taken(log), "A 0 S1, A 0 M1");
  auto tree = process.Make<IZKUMUsbTree>(CLSID_ZKUMUsbTree);
  SimulatedDesktop& desktop = process.desktop;
  desktop.SetChoice(std::move(choose));
  host.paused = true;

  const auto comeAndGo = [&](TestSink& sink) {
    EXPECT_TRUE(SUCCEEDED(CoInitializeEx(nullptr, COINIT_MULTITHREADED)));
    const DWORD own = process.Advise(sink);
    desktop.Sleep(0);
    EXPECT_EQ(process.point->Unadvise(own), S_OK);
    CoUninitialize();
  };
  process.Launch([&] { comeAndGo(first); });
  process.Launch([&] { comeAndGo(second); });
  process.Launch([&] {
    process.Do({Stick(u"S2", 3, u'F')});
    EXPECT_EQ(desktop.Broadcast(VolumeBroadcast(platform::kDBT_DEVICEARRIVAL, u'F', 0)), 1u);
    desktop.Sleep(0);
    process.Do({Unplug{UsbId(u"M1")}});
    EXPECT_EQ(desktop.Broadcast(VolumeBroadcast(platform::kDBT_DEVICEREMOVECOMPLETE, u'F', 0)), 1u);
  });
  process.Launch([&] {
    for (int round = 0; round < 2; ++round) {
      ComPtr<IZKUMUsbTreeNode> root, parent;
      if (SUCCEEDED(tree->get_RootNode(root.Put()))) {
        testing_support::WalkChilds(root, [&](const ComPtr<IZKUMUsbTreeNode>& node) {
          desktop.Sleep(0);
          TUsbDeviceType kind = KUDTUnknown;
          // A port goes while the tree that has it may be the one that a build replaces just now.
          if (node->get_Type(&kind) == S_OK && kind == KUDTPortDevice && round == 1) node->get_Parent(parent.Put());
        });
      }
      root.Reset();
      desktop.Sleep(0);
    }
  });
  desktop.Settle();
  host.paused = false;
  desktop.SetChoice(nullptr);
  // What is there is what the next change tells as connected; what was told in between explains the rest.
  Taken(log);
  process.Do({Gadget(u"M2", 4)});
  EXPECT_EQ(process.Notify(), S_OK);
  std::set<std::string> connected;
  for (const std::string& entry : log) {
    if (entry.starts_with("A 0 ")) connected.insert(entry.substr(4));
  }
  EXPECT_THAT(connected, testing::ElementsAre("M2", "S1", "S2"));
  EXPECT_EQ(process.point->Unadvise(cookie), S_OK);
  tree.Reset();
}

std::uint32_t Count(const char* variable, std::uint32_t usual) {
  const char* text = std::getenv(variable);
  return text == nullptr ? usual : static_cast<std::uint32_t>(std::strtoul(text, nullptr, 10));
}

TEST(Schedules, RandomOrdersEndAlike) {
  const std::uint32_t seed = Count("ZKUSB_RANDOM_SEED", 1),
                      schedules = Count("ZKUSB_SCHEDULES", testing_support::Cases(100u, 40u));
  std::cout << "ZKUSB_RANDOM_SEED=" << seed << " ZKUSB_SCHEDULES=" << schedules << '\n';
  for (std::uint32_t i = 0; i < schedules && !testing::Test::HasFailure(); ++i) {
    SCOPED_TRACE(seed + i);
    std::mt19937 random(seed + i);
    RunInOneOrder([&random](std::size_t threads) { return random() % threads; });
  }
}

// Every order of the first choices; behind them the threads take turns. Returns how many orders there were.
std::size_t PlayAllOrders(std::size_t depth, const std::function<void(Choose)>& run) {
  std::vector<std::pair<std::size_t, std::size_t>> path;  // what was chosen, of how many
  std::size_t orders = 0;
  do {
    std::size_t at = 0;
    run([&](std::size_t threads) {
      if (at >= depth) return std::size_t{0};
      if (at == path.size()) path.emplace_back(0, threads);
      EXPECT_EQ(path[at].second, threads) << "a run repeats itself";
      return path[at++].first;
    });
    ++orders;
    while (!path.empty() && ++path.back().first >= path.back().second) path.pop_back();
  } while (!path.empty() && !testing::Test::HasFailure());
  std::cout << orders << " orders\n";
  return orders;
}

TEST(Schedules, AllOrdersOfTheFirstChoicesEndAlike) {
  EXPECT_GE(PlayAllOrders(Count("ZKUSB_CHOICES", 3), RunInOneOrder), 8u);
}

// The module is unloaded while broadcasts arrive and events are under way, which a client does not see: it has let go
// of the notifier, or lets go of it meanwhile.
void UnloadInOneOrder(bool held, Choose choose) {
  TestSink::Log log;
  TestSink sink(log, "A");
  {
    ModuleProcess process;
    PausingHost host(process.pc, process.desktop);
    platform::SetCurrentSystem({.host = &host, .threads = &process.desktop, .desktop = &process.desktop});
    process.Do({Stick(u"S1", 1, u'E')});
    process.Start();
    process.Advise(sink);
    process.point.Reset();
    if (!held) process.notifier.Reset();
    process.UseTreeClass(nullptr);
    Taken(log);
    SimulatedDesktop& desktop = process.desktop;
    desktop.SetChoice(std::move(choose));
    host.paused = true;
    bool unloaded = false;
    std::size_t toldInTime = 0;
    for (const std::uint32_t port : {2u, 3u}) {
      process.Launch([&, port] {
        process.Do({Gadget(port == 2 ? u"M1" : u"M2", port)});
        EXPECT_EQ(desktop.Broadcast(VolumeBroadcast(platform::kDBT_DEVICEARRIVAL, u'E', 0)), 1u);
      });
    }
    process.Launch([&] {
      desktop.Sleep(0);
      process.module->Unload();
      unloaded = true;
      toldInTime = log.size();
      EXPECT_EQ(g_nEventThreads, 0u);
      EXPECT_EQ(g_pNotifyTarget, nullptr);
    });
    desktop.Settle();
    desktop.SetChoice(nullptr);
    host.paused = false;
    EXPECT_TRUE(unloaded);
    EXPECT_EQ(log.size(), toldInTime) << "told after the unload";
    EXPECT_EQ(ModuleLockCount(), held ? 2 : 0);
    // Whether its code is still there is not known, so nobody lets go of it. This is deliberate.
    EXPECT_EQ(sink.References(), 2);
    sink.Release();
  }
}

TEST(Schedules, AllOrdersOfBroadcastsAndUnloadEndAlike) {
  for (const bool held : {false, true}) {
    const auto run = [held](Choose choose) { UnloadInOneOrder(held, std::move(choose)); };
    EXPECT_GE(PlayAllOrders(Count("ZKUSB_CHOICES", 3), run), 8u);
  }
}

}  // namespace
}  // namespace KelvoUHW
