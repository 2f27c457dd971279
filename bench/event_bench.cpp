// How long an event is on its way, from the broadcast to the last sink called, without the build in
// between.
//
// VirtualMilliseconds counts the waits that the component makes on purpose, exactly. RealTime is
// what a program feels: the broadcast, its event thread, and the calls of 1, 10 or 100 sinks for
// each device told of; on a busy machine most of it is waiting for a processor, and best_us, the
// best of the iterations, says more. The parts of that best one: to_build_us from the broadcast to
// the start of the build (window thread, event thread, notification lock), to_sink_us from its end
// to the first call of a sink (lists, node objects), sinks_us from there to the last.
#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <limits>
#include <memory>
#include <optional>
#include <stdexcept>
#include <vector>

#include "bench/plugs.h"
#include "com/com_ptr.h"
#include "com/private_interfaces.h"
#include "com/zkusb_monitor.h"
#include "module/module.h"
#include "monitor/process_state.h"
#include "platform/system.h"
#include "simulation/desktop/simulated_desktop.h"
#include "simulation/pc/broadcasts.h"
#include "simulation/pc/simulated_pc.h"

namespace {

using KelvoUHW::ComPtr;
using platform::simulated::ClockMode;
using platform::simulated::DeviceBroadcast;
using Clock = std::chrono::steady_clock;

void Check(HRESULT result) {
  if (result != S_OK) throw std::runtime_error("a call of the component failed");
}

// The tree as it is, which also knows how long it built.
class MeteredTree final : public IZKUMUsbTree, public IBuildUsbTree {
 public:
  explicit MeteredTree(ComPtr<IZKUMUsbTree> tree)
      : m_tree(std::move(tree)), m_build(m_tree.As<IBuildUsbTree>()) {}

  Clock::time_point Started() const { return m_started; }
  Clock::time_point Ended() const { return m_ended; }

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    *out = iid == platform::IidOf<IBuildUsbTree>()
               ? static_cast<void*>(static_cast<IBuildUsbTree*>(this))
               : static_cast<IZKUMUsbTree*>(this);
    return S_OK;
  }
  // It outlives the notifier.
  ULONG STDMETHODCALLTYPE AddRef() override { return 2; }
  ULONG STDMETHODCALLTYPE Release() override { return 1; }
  HRESULT STDMETHODCALLTYPE get_RootNode(IZKUMUsbTreeNode** out) override {
    return m_tree->get_RootNode(out);
  }
  HRESULT STDMETHODCALLTYPE get_PortDevicesWithVendorId(ULONG,
                                                        IZKUMUsbTreeNodeEnumerator**) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE get_VendorProductDevices(ULONG, ULONG,
                                                     IZKUMUsbTreeNodeEnumerator**) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE get_PortDevicesWithVolume(IZKUMUsbTreeNodeEnumerator**) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE BuildTree() override {
    m_started = Clock::now();
    const HRESULT result = m_build->BuildTree();
    m_ended = Clock::now();
    return result;
  }
  HRESULT STDMETHODCALLTYPE ResetDeviceCache() override { return m_build->ResetDeviceCache(); }
  HRESULT STDMETHODCALLTYPE GetDeviceList(LONG nList,
                                          const KelvoUHW::DeviceList** ppList) override {
    return m_build->GetDeviceList(nList, ppList);
  }

 private:
  const ComPtr<IZKUMUsbTree> m_tree;
  const ComPtr<IBuildUsbTree> m_build;
  // Of the last build; guarded by the notification lock, read when nothing runs.
  Clock::time_point m_started, m_ended;
};

class MeteredTreeClass final : public IClassFactory {
 public:
  explicit MeteredTreeClass(MeteredTree& tree) : m_tree(tree) {}
  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID, void** out) override {
    *out = this;
    return S_OK;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return 2; }
  ULONG STDMETHODCALLTYPE Release() override { return 1; }
  HRESULT STDMETHODCALLTYPE CreateInstance(IUnknown*, REFIID iid, void** out) override {
    return m_tree.QueryInterface(iid, out);
  }
  HRESULT STDMETHODCALLTYPE LockServer(BOOL) override { return S_OK; }

 private:
  MeteredTree& m_tree;
};

// When a sink was called first and last, and how often.
struct Calls {
  std::atomic<std::uint64_t> count = 0;
  std::uint64_t countBefore = 0;  // of this broadcast
  Clock::time_point first{}, last{};
  std::uint64_t lastVirtual = 0;
};

class Sink final : public IDispatch {
 public:
  Sink(Calls& calls, const platform::simulated::SimulatedDesktop& desktop)
      : m_calls(calls), m_desktop(desktop) {}
  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID, void** out) override {
    *out = this;
    return S_OK;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return 2; }
  ULONG STDMETHODCALLTYPE Release() override { return 1; }
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT*) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT, LCID, ITypeInfo**) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE Invoke(DISPID, REFIID, LCID, WORD, DISPPARAMS*, VARIANT*, EXCEPINFO*,
                                   UINT*) override {
    m_calls.last = Clock::now();
    if (m_calls.count++ == m_calls.countBefore) m_calls.first = m_calls.last;
    if (m_desktop.Mode() == ClockMode::Virtual) m_calls.lastVirtual = m_desktop.Now();
    return S_OK;
  }

 private:
  Calls& m_calls;
  const platform::simulated::SimulatedDesktop& m_desktop;
};

// A process with sinks on a PC with one stick, where another one comes and goes.
class Process {
 public:
  Process(ClockMode mode, std::size_t sinks) : m_pc(KelvoUHW::BarePc()), desktop(mode) {
    KelvoUHW::ForgetMonitorState();
    Do(KelvoUHW::Stick(u"S1", 1, u'E'));
    platform::SetCurrentSystem({.host = &m_pc, .threads = &desktop, .desktop = &desktop});
    m_module.emplace();
    ComPtr<IZKUMUsbTree> tree;
    CreateInstance(CLSID_ZKUMUsbTree, tree);
    m_tree.emplace(std::move(tree));
    m_treeClass.emplace(*m_tree);
    Check(CoRegisterClassObject(CLSID_ZKUMUsbTree, &*m_treeClass, CLSCTX_INPROC_SERVER,
                                REGCLS_MULTIPLEUSE, &m_registration));
    CreateInstance(CLSID_ZKUMEventNotifier, m_notifier);
    Check(m_notifier.As<IConnectionPointContainer>()->FindConnectionPoint(
        DIID_IZKDeviceEventCallBack, m_point.Put()));
    for (std::size_t i = 0; i < sinks; ++i) {
      m_sinks.push_back(std::make_unique<Sink>(calls, desktop));
      DWORD cookie = 0;
      Check(m_point->Advise(m_sinks.back().get(), &cookie));
    }
  }
  ~Process() {
    for (std::size_t cookie = 1; cookie <= m_sinks.size(); ++cookie)
      m_point->Unadvise(static_cast<DWORD>(cookie));
    m_point.Reset();
    m_notifier.Reset();
    CoRevokeClassObject(m_registration);
    m_module->Unload();
    m_tree.reset();
    m_module.reset();
    desktop.EndProcess();
    KelvoUHW::ForgetMonitorState();
    platform::SetCurrentSystem({});
  }

  // The other stick comes, or goes; nothing is told yet.
  void Change() {
    if (m_plugged) {
      Do(KelvoUHW::Unplug{KelvoUHW::UsbId(u"S2")});
    } else {
      Do(KelvoUHW::Stick(u"S2", 2, u'F'));
    }
    m_plugged = !m_plugged;
  }
  const MeteredTree& Tree() const { return *m_tree; }

 private:
  void Do(const KelvoUHW::Change& change) {
    if (!m_pc.Apply({0, u"", change}).empty()) throw std::runtime_error("a change was refused");
  }
  template <class Interface>
  void CreateInstance(const CLSID& clsid, ComPtr<Interface>& out) {
    ComPtr<IClassFactory> factory;
    Check(m_module->GetClassObject(clsid, platform::IidOf<IClassFactory>(), factory.PutVoid()));
    Check(factory->CreateInstance(nullptr, platform::IidOf<Interface>(), out.PutVoid()));
  }

  platform::simulated::SimulatedPc m_pc;

 public:
  platform::simulated::SimulatedDesktop desktop;
  Calls calls;

 private:
  std::optional<KelvoUHW::CZKUsbMonitorModule> m_module;
  std::optional<MeteredTree> m_tree;
  std::optional<MeteredTreeClass> m_treeClass;
  DWORD m_registration = 0;
  std::vector<std::unique_ptr<Sink>> m_sinks;
  ComPtr<IZKUMEventNotifier> m_notifier;
  ComPtr<IConnectionPoint> m_point;
  bool m_plugged = false;
};

const DeviceBroadcast& VolumeCame() {
  static const DeviceBroadcast broadcast =
      platform::simulated::VolumeBroadcast(platform::kDBT_DEVICEARRIVAL, u'F', 0);
  return broadcast;
}
const DeviceBroadcast& WatchedWent() {
  static const DeviceBroadcast broadcast = platform::simulated::InterfaceBroadcast(
      platform::kDBT_DEVICEREMOVECOMPLETE, {}, u"\\\\?\\USB#VID_05AC&PID_1291#1#{0}");
  return broadcast;
}

void VirtualMilliseconds(benchmark::State& state, const DeviceBroadcast& (*broadcast)()) {
  Process process(ClockMode::Virtual, static_cast<std::size_t>(state.range(0)));
  std::uint64_t waited = 0;
  for (auto _ : state) {
    process.Change();
    const std::uint64_t start = process.desktop.Now();
    const std::uint64_t before = process.calls.count;
    process.desktop.Broadcast(broadcast());
    process.desktop.Settle();
    if (process.calls.count == before) throw std::runtime_error("nobody was called");
    waited = process.calls.lastVirtual - start;
  }
  state.counters["virtual_ms"] = static_cast<double>(waited);
}

void RealTime(benchmark::State& state) {
  Process process(ClockMode::Real, static_cast<std::size_t>(state.range(0)));
  const std::uint64_t before = process.calls.count;
  double best = std::numeric_limits<double>::max();
  std::array<double, 3> parts{};
  const auto seconds = [](Clock::duration duration) {
    return std::chrono::duration<double>(duration).count();
  };
  for (auto _ : state) {
    process.Change();
    const std::uint64_t called = process.calls.countBefore = process.calls.count;
    const Clock::time_point start = Clock::now();
    process.desktop.Broadcast(VolumeCame());
    process.desktop.Settle();
    if (process.calls.count == called) throw std::runtime_error("nobody was called");
    const Calls& calls = process.calls;
    const std::array<double, 3> now{seconds(process.Tree().Started() - start),
                                    seconds(calls.first - process.Tree().Ended()),
                                    seconds(calls.last - calls.first)};
    const double whole = now[0] + now[1] + now[2];
    if (whole < best) parts = now;
    best = std::min(best, whole);
    state.SetIterationTime(whole);
  }
  state.counters["best_us"] = best * 1e6;
  static constexpr const char* kParts[] = {"to_build_us", "to_sink_us", "sinks_us"};
  for (std::size_t i = 0; i < parts.size(); ++i) state.counters[kParts[i]] = parts[i] * 1e6;
  state.counters["calls"] = benchmark::Counter(static_cast<double>(process.calls.count - before),
                                               benchmark::Counter::kAvgIterations);
}

BENCHMARK_CAPTURE(VirtualMilliseconds, volume, VolumeCame)
    ->Arg(1)
    ->Arg(10)
    ->Arg(100)
    ->Iterations(4);
BENCHMARK_CAPTURE(VirtualMilliseconds, watched_removal, WatchedWent)
    ->Arg(1)
    ->Arg(10)
    ->Arg(100)
    ->Iterations(4);
BENCHMARK(RealTime)->Arg(1)->Arg(10)->Arg(100)->UseManualTime()->Unit(benchmark::kMicrosecond);

}  // namespace
