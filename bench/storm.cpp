// A storm: devices come, go, move, are reset and mounted while builds read them, messages of every
// kind arrive, ten sinks come and go, and clients walk the trees and hold nodes of them. In one
// simulated process after the other, each from its own seed, on virtual or on real time.
//
//   zkusb_storm [--broadcasts N] [--seed N] [--clock virtual|real]
//
// Whenever it is quiet, what a sink was told has to explain the difference between what was
// connected before and what is now (storm_model.h), the lists have to show the PC as it is, and
// nothing may be open. Ends with 1, and names the seed, when anything is not so.
#include <array>
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <memory>
#include <optional>
#include <random>
#include <stdexcept>
#include <thread>

#ifdef __GLIBC__
#include <malloc.h>
#endif

#include "bench/object_reader.h"
#include "bench/storm_model.h"
#include "com/module_lock.h"
#include "module/module.h"
#include "monitor/process_state.h"
#include "monitor/usb_event_receiver.h"
#include "platform/system.h"
#include "simulation/desktop/simulated_desktop.h"
#include "simulation/pc/broadcasts.h"

namespace bench {
namespace {

using KelvoUHW::ComPtr;
using platform::simulated::ClockMode;
using platform::simulated::DeviceBroadcast;

constexpr int kPhases = 10;  // each ends at a quiet point
constexpr int kSenders = 3;
constexpr int kBroadcastsOfASender = 70;
constexpr std::size_t kSinks = 10;
constexpr std::uint32_t kEventThreadsAtOnce = 24;

void Check(bool holds, const char* what) {
  if (!holds) throw std::runtime_error(what);
}

// What is allocated now, where the system can say so.
std::size_t HeapInUse() {
#ifdef __GLIBC__
  return mallinfo2().uordblks;
#else
  return 0;
#endif
}

class Sink final : public IDispatch {
 public:
  std::function<void(int kind, const std::string& device)> onEvent;
  LONG References() const { return m_references; }

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID, void** out) override {
    *out = this;
    AddRef();
    return S_OK;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(++m_references); }
  ULONG STDMETHODCALLTYPE Release() override { return static_cast<ULONG>(--m_references); }
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT*) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT, LCID, ITypeInfo**) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE Invoke(DISPID, REFIID, LCID, WORD, DISPPARAMS* parameters, VARIANT*,
                                   EXCEPINFO*, UINT*) override {
    const auto node = ComPtr<IUnknown>(parameters->rgvarg[0].punkVal).As<IZKUMUsbTreeNode>();
    const std::u16string id = testing_support::InstanceIdOf(node);
    onEvent(parameters->rgvarg[1].lVal, platform::ToUtf8(id.substr(id.rfind(u'\\') + 1)));
    return S_OK;
  }

 private:
  std::atomic<LONG> m_references = 1;
};

// One process, from its start to its end. What goes wrong is in model.faults.
class Process {
 public:
  Process(std::uint32_t seed, ClockMode clock)
      : m_seed(seed), m_random(seed), m_desktop(clock), m_host(m_pc.pc, [this] { Pause(); }) {
    KelvoUHW::ForgetMonitorState();
    platform::SetCurrentSystem({.host = &m_host, .threads = &m_desktop, .desktop = &m_desktop});
    Check(SUCCEEDED(CoInitializeEx(nullptr, COINIT_MULTITHREADED)), "no apartment");
    m_module.emplace();
    m_tree.emplace(Make<IZKUMUsbTree>(CLSID_ZKUMUsbTree), m_pc, m_host);
    m_tree->onChange = [this](const Found& found) { model.Judge(found); };
    m_tree->onNoChange = [this](const Names& during) { model.NoChange(during); };
    Check(CoRegisterClassObject(CLSID_ZKUMUsbTree, static_cast<IClassFactory*>(&*m_tree),
                                CLSCTX_INPROC_SERVER, REGCLS_MULTIPLEUSE, &m_treeClass) == S_OK,
          "the class of the tree is not registered");
    m_notifier = Make<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier);
    Check(m_notifier.As<IConnectionPointContainer>()->FindConnectionPoint(
              DIID_IZKDeviceEventCallBack, m_point.Put()) == S_OK,
          "no connection point");
    m_always.onEvent = [this](int kind, const std::string& device) {
      if (!StormTree::t_advises) model.ToldToA(std::to_string(kind) + " " + device);
    };
    m_cookie = Advise(m_always);
    if (clock == ClockMode::Virtual) {
      m_desktop.SetChoice([this](std::size_t threads) { return m_choices() % threads; });
    }
  }
  ~Process() {
    m_desktop.SetChoice(nullptr);
    m_point->Unadvise(m_cookie);
    m_point.Reset();
    m_notifier.Reset();
    CoRevokeClassObject(m_treeClass);
    m_desktop.Settle();
    m_module->Unload();
    m_tree.reset();
    m_module.reset();
    CoUninitialize();
    m_desktop.EndProcess();
    KelvoUHW::ForgetMonitorState();
    platform::SetCurrentSystem({});
  }
  Process(const Process&) = delete;
  Process& operator=(const Process&) = delete;

  void Rage() {
    for (std::uint32_t sender = 0; sender < kSenders; ++sender) {
      Launch([this](std::mt19937& random) { Send(random); });
    }
    for (std::size_t first = 0; first < kSinks; first += 3) {
      Launch([this, first](std::mt19937& random) { ComeAndGo(first, random); });
    }
    for (int client = 0; client < 2; ++client) {
      Launch([this](std::mt19937& random) { Walk(random); });
    }
    m_desktop.Settle();
  }

  // Nothing happens but what is done here.
  void LookWhenQuiet() {
    m_rages = false;
    m_pc.PutVolumesBack();
    // A device that went with its volume comes back within two runs, the second after a change.
    for (int run = 0; run < 4; ++run) SendVolume();
    model.CompareTold();
    m_pc.PlugProbe();
    const Names without = m_pc.Present();
    Names with = without;
    with.insert("PROBE");
    SendVolume();
    Expect(with, "1 PROBE");
    m_pc.UnplugProbe();
    SendVolume();
    Expect(without, "2 PROBE");
    const platform::simulated::OpenCounts open = m_pc.pc.Open();
    if (open.files + open.imageLists + open.searches + open.sets != 0) Fault("something is open");
    if (!m_pc.pc.Misuses().empty()) Fault("the PC was misused");
    if (KelvoUHW::g_pActiveReceiver.load()->m_nBusy != 0) Fault("busy and nothing runs");
    for (const Sink& sink : m_sinks) {
      if (sink.References() != 1) Fault("a sink is still referred to");
    }
    m_rages = true;
  }

  StormModel model;
  const StormTree& Tree() const { return *m_tree; }
  std::atomic<std::size_t> broadcasts = 0, advises = 0, fromInside = 0, walked = 0;

 private:
  template <class Interface>
  ComPtr<Interface> Make(const CLSID& clsid) {
    ComPtr<IClassFactory> factory;
    ComPtr<Interface> object;
    Check(m_module->GetClassObject(clsid, platform::IidOf<IClassFactory>(), factory.PutVoid()) ==
                  S_OK &&
              factory->CreateInstance(nullptr, platform::IidOf<Interface>(), object.PutVoid()) ==
                  S_OK,
          "an object cannot be made");
    return object;
  }
  void Fault(const char* what) { model.faults.push_back(what); }

  void Launch(std::function<void(std::mt19937&)> body) {
    struct Thread {
      std::function<void(std::mt19937&)> body;
      std::mt19937 random;
    };
    auto thread = std::make_unique<Thread>(Thread{std::move(body), std::mt19937(m_random())});
    const auto run = [](void* argument) {
      const std::unique_ptr<Thread> own(static_cast<Thread*>(argument));
      Check(SUCCEEDED(CoInitializeEx(nullptr, COINIT_MULTITHREADED)), "no apartment");
      own->body(own->random);
      CoUninitialize();
    };
    Check(m_desktop.StartThread(run, 0, thread.get()), "no thread");
    static_cast<void>(thread.release());
  }
  // Lets others run. The clock of a virtual process stands still meanwhile.
  void Pause() {
    if (!m_rages) return;
    if (m_desktop.Mode() == ClockMode::Virtual) {
      m_desktop.Sleep(0);
    } else {
      std::this_thread::yield();
    }
  }
  DWORD Advise(Sink& sink) {
    DWORD cookie = 0;
    const bool before = std::exchange(StormTree::t_advises, true);
    const HRESULT advised = m_point->Advise(&sink, &cookie);
    StormTree::t_advises = before;
    Check(advised == S_OK, "a sink cannot be advised");
    return cookie;
  }

  void SendVolume() {
    ++broadcasts;
    m_desktop.Broadcast(
        platform::simulated::VolumeBroadcast(platform::kDBT_DEVICEARRIVAL, u'E', 0));
    m_desktop.Settle();
  }
  void Send(std::mt19937& random) {
    using platform::simulated::InterfaceBroadcast, platform::simulated::VolumeBroadcast;
    for (int i = 0; i < kBroadcastsOfASender; ++i) {
      if (random() % 4 == 0) m_pc.ChangeSomething(random, [this] { Pause(); });
      const std::uint32_t event =
          random() % 2 == 0 ? platform::kDBT_DEVICEARRIVAL : platform::kDBT_DEVICEREMOVECOMPLETE;
      const auto kind = random() % 16;
      // A watched device that goes is looked at three seconds late: no matter on virtual time.
      const bool watched = kind == 0 && (m_desktop.Mode() == ClockMode::Virtual ||
                                         event == platform::kDBT_DEVICEARRIVAL);
      DeviceBroadcast broadcast =
          kind >= 12 ? VolumeBroadcast(event, u'E', 0)
                     : InterfaceBroadcast(event, platform::GUID_DEVINTERFACE_DISK,
                                          watched ? u"\\\\?\\USB#VID_05AC&PID_1291#1#{x}"
                                                  : u"\\\\?\\USB#VID_046D&PID_C077#1#{x}");
      if (kind == 1) {
        // Cut off somewhere, and it says so: no message is without its own size, which stands
        // first.
        std::uint32_t size = sizeof size;
        size += static_cast<std::uint32_t>(random() % (broadcast.record.size() - sizeof size));
        broadcast.record.resize(size);
        std::memcpy(broadcast.record.data(), &size, sizeof size);
      }
      if (kind == 2) broadcast = {7, {}};
      ++broadcasts;
      m_desktop.Broadcast(broadcast);
      if (random() % 8 == 0) Pause();
      while (KelvoUHW::g_nEventThreads > kEventThreadsAtOnce) m_desktop.Sleep(1);
    }
  }
  // Every third sink from `first` on; now and then one advises another from inside a call.
  void ComeAndGo(std::size_t first, std::mt19937& random) {
    for (int round = 0; round < 6; ++round) {
      Sink& sink = m_sinks.at(std::min(first + random() % 3, kSinks - 1));
      Sink inner;
      inner.onEvent = [](int, const std::string&) {};
      bool nests = random() % 4 == 0;
      sink.onEvent = [&](int, const std::string&) {
        if (!std::exchange(nests, false)) return;
        ++fromInside;
        m_point->Unadvise(Advise(inner));
        model.AdvisedInside();
      };
      const DWORD cookie = Advise(sink);
      ++advises;
      Pause();
      m_desktop.Sleep(static_cast<std::uint32_t>(random() % 30));
      // A call that is under way goes on meanwhile.
      m_point->Unadvise(cookie);
      while (sink.References() != 1 || inner.References() != 1) m_desktop.Sleep(1);
    }
  }
  void Walk(std::mt19937& random) {
    const auto tree = Make<IZKUMUsbTree>(CLSID_ZKUMUsbTree);
    std::vector<ComPtr<IZKUMUsbTreeNode>> held;
    for (int round = 0; round < 12; ++round) {
      ComPtr<IZKUMUsbTreeNode> root;
      if (SUCCEEDED(tree->get_RootNode(root.Put()))) {
        testing_support::WalkChilds(root, [&](const ComPtr<IZKUMUsbTreeNode>& node) {
          ++walked;
          if (random() % 8 == 0) held.push_back(node);
          if (random() % 8 == 0) testing_support::ReadProperties(node, [](auto&&...) {});
          if (random() % 16 == 0) Pause();
        });
      }
      for (const auto& node : held) testing_support::InstanceIdOf(node);
      while (held.size() > 20) held.erase(held.begin() + static_cast<int>(random() % held.size()));
      m_desktop.Sleep(static_cast<std::uint32_t>(random() % 20));
    }
  }
  // After a change that nothing else went along with.
  void Expect(const Names& connected, const std::string& told) {
    if (model.Connected() != connected) {
      std::string text = "connected is not what is there:";
      for (const std::string& name : model.Connected()) text += " " + name;
      text += ", there:";
      for (const std::string& name : connected) text += " " + name;
      model.faults.push_back(text);
    }
    model.ExpectOnly(told);
    model.CompareTold();
  }

  const std::uint32_t m_seed;
  std::mt19937 m_random;
  std::mt19937 m_choices{m_seed};
  StormPc m_pc;
  platform::simulated::SimulatedDesktop m_desktop;
  StormHost m_host;
  std::optional<KelvoUHW::CZKUsbMonitorModule> m_module;
  std::optional<StormTree> m_tree;
  DWORD m_treeClass = 0, m_cookie = 0;
  ComPtr<IZKUMEventNotifier> m_notifier;
  ComPtr<IConnectionPoint> m_point;
  Sink m_always;
  std::array<Sink, kSinks> m_sinks;
  std::atomic<bool> m_rages = true;
};

struct Totals {
  std::size_t broadcasts = 0, builds = 0, changes = 0, events = 0, advises = 0, fromInside = 0;
  std::size_t walked = 0, cameBackUntold = 0, wentUntold = 0, swallowed = 0, hubs = 0,
              processes = 0;
};

// False when something was not as it has to be.
bool RunProcess(std::uint32_t seed, ClockMode clock, Totals& totals) {
  std::vector<std::string> faults;
  {
    Process process(seed, clock);
    for (int phase = 0; phase < kPhases && process.model.faults.empty(); ++phase) {
      process.Rage();
      process.LookWhenQuiet();
    }
    const StormTree& tree = process.Tree();
    // One of volumes, one of disks; a third by the object of the tree itself, when it was made.
    if (tree.fewestSets != 2 || tree.mostSets > 3) {
      process.model.faults.push_back("a build left " + std::to_string(tree.fewestSets) + " to " +
                                     std::to_string(tree.mostSets) + " sets open");
    }
    faults = process.model.faults;
    totals.broadcasts += process.broadcasts;
    totals.builds += tree.builds;
    totals.changes += tree.changes;
    totals.hubs += tree.hubs;
    totals.events += process.model.toldEvents;
    totals.advises += process.advises;
    totals.fromInside += process.fromInside;
    totals.walked += process.walked;
    totals.cameBackUntold += process.model.cameBackUntold;
    totals.wentUntold += process.model.wentUntold;
    totals.swallowed += process.model.swallowedByAdvise;
    ++totals.processes;
  }
  if (KelvoUHW::ModuleLockCount() != 0) faults.push_back("an object was left behind");
  for (const std::string& fault : faults) {
    std::printf("seed %u, %s time: %s\n", static_cast<unsigned>(seed),
                clock == ClockMode::Virtual ? "virtual" : "real", fault.c_str());
  }
  return faults.empty();
}

int Main(int argc, char** argv) {
  std::size_t broadcasts = 20'000;
  std::uint32_t seed = 1;
  ClockMode clock = ClockMode::Virtual;
  for (int i = 1; i + 1 < argc; i += 2) {
    const std::string option = argv[i];
    if (option == "--broadcasts") broadcasts = std::strtoul(argv[i + 1], nullptr, 10);
    if (option == "--seed")
      seed = static_cast<std::uint32_t>(std::strtoul(argv[i + 1], nullptr, 10));
    if (option == "--clock" && argv[i + 1] == std::string("real")) clock = ClockMode::Real;
  }
#ifdef __GLIBC__
  mallopt(M_ARENA_MAX, 1);  // what all threads allocate is then in one count
#endif
  std::printf("seeds from %u on\n", static_cast<unsigned>(seed));
  Totals totals;
  bool good = true;
  std::size_t heapAtFirst = 0, hubsAtFirst = 0, processesAtFirst = 0;
  for (; totals.broadcasts < broadcasts && good; ++seed) {
    good = RunProcess(seed, clock, totals);
    // What is made once has been made by then.
    if (totals.processes == 3) {
      heapAtFirst = HeapInUse();
      hubsAtFirst = totals.hubs;
      processesAtFirst = totals.processes;
    }
  }
  const double seconds = static_cast<double>(std::clock()) / CLOCKS_PER_SEC;
  std::printf(
      "%zu broadcasts, %zu builds of which %zu found a change, %zu events told to one sink, %zu "
      "advises and %zu from inside calls, %zu nodes walked, in %zu processes; %.1f CPU seconds\n"
      "after a change during a build %zu devices came back untold and %zu went late; %zu changes "
      "were told to a new sink alone\n",
      totals.broadcasts, totals.builds, totals.changes, totals.events, totals.advises,
      totals.fromInside, totals.walked, totals.processes, seconds, totals.cameBackUntold,
      totals.wentUntold, totals.swallowed);
  if (totals.processes > processesAtFirst && heapAtFirst != 0) {
    // Each build keeps at most 384 bytes for each external hub, and nothing else.
    const std::size_t kept = 384 * (totals.hubs - hubsAtFirst), heap = HeapInUse();
    std::printf("heap: %zu bytes, after three processes %zu; %zu may be kept for hubs\n", heap,
                heapAtFirst, kept);
    if (heap > heapAtFirst + kept + 65'536 + 256 * totals.processes) {
      std::printf("memory grows\n");
      good = false;
    }
  }
  if (totals.changes == 0 || totals.fromInside == 0 || totals.walked == 0) {
    std::printf("nothing happened\n");
    good = false;
  }
  return good ? 0 : 1;
}

}  // namespace
}  // namespace bench

int main(int argc, char** argv) {
  try {
    return bench::Main(argc, argv);
  } catch (const std::exception& error) {
    std::printf("%s\n", error.what());
    return 1;
  }
}
