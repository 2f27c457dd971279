#include "bench/workload_bench.h"

#include <algorithm>
#include <ctime>
#include <limits>
#include <stdexcept>
#include <string>
#include <vector>

#include "bench/metered_host.h"
#include "bench/recording_host.h"
#include "bench/start_state.h"

namespace bench {
namespace {

using platform::simulated::GeneratedShape;
using platform::simulated::GenerateMachine;
using platform::simulated::SimulatedPc;

constexpr std::size_t kSmall = 1'000;
constexpr std::size_t kLarge = 10'000;
constexpr int kPairs = 11;

// So many times each work is done.
int Rounds(std::size_t devices) { return devices < kSmall ? 100 : devices < kLarge ? 20 : 5; }

// Processor time: nothing that is measured here waits, and what else runs on the machine must not
// count.
template <class Action>
double ColdSeconds(Action action) {
  StartCold();
  const std::clock_t start = std::clock();
  action();
  return static_cast<double>(std::clock() - start) / CLOCKS_PER_SEC;
}

double Median(std::vector<double> values) {
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
  std::nth_element(values.begin(), middle, values.end());
  return *middle;
}

// A PC and the work that is done on it over and over.
class Repeated {
 public:
  Repeated(Work work, GeneratedShape shape, std::size_t devices)
      : m_pc(GenerateMachine(shape, devices)), m_workload(work, devices, m_pc, m_pc) {}

  // Does the work once. What prepares it, the end of the previous tree included, is not measured.
  double Seconds() {
    m_workload.Prepare();
    m_seconds.push_back(ColdSeconds([&] { m_workload.Run(); }));
    return m_seconds.back();
  }
  double MedianSeconds() const { return Median(m_seconds); }

 private:
  SimulatedPc m_pc;
  Workload m_workload;
  std::vector<double> m_seconds;
};

void CountCosts(benchmark::State& state, Work work, GeneratedShape shape, std::size_t devices) {
  SimulatedPc pc(GenerateMachine(shape, devices));
  MeteredHost metered(pc);
  Workload workload(work, devices, pc, metered.Host());
  workload.Prepare();
  const Cost cost = metered.Measure([&] { workload.Run(); });
  for (std::size_t kind = 0; kind < kCallKinds; ++kind) {
    state.counters[kCallKindNames[kind]] =
        static_cast<double>(cost.CallsOf(static_cast<CallKind>(kind)));
  }
  state.counters["allocations"] = static_cast<double>(cost.allocations);
}

// The recorded work leaves the PC as it found it, but for the stick that it may have plugged in:
// the floor is measured at once.
double FloorSeconds(Work work, GeneratedShape shape, std::size_t devices) {
  SimulatedPc pc(GenerateMachine(shape, devices));
  Recording recording;
  Workload workload(work, devices, pc, recording.Host(pc));
  workload.Prepare();
  recording.Clear();
  workload.Run();
  std::vector<double> seconds;
  for (int round = 0; round < Rounds(devices); ++round) {
    std::size_t different = 0;
    seconds.push_back(ColdSeconds([&] { different = recording.Replay(pc); }));
    if (different != 0) throw std::logic_error("the floor's calls end otherwise");
  }
  return Median(seconds);
}

void RunWork(benchmark::State& state, Work work, GeneratedShape shape) {
  KeepFreedMemory();
  const auto devices = static_cast<std::size_t>(state.range(0));
  CountCosts(state, work, shape, devices);
  Repeated repeated(work, shape, devices);
  for ([[maybe_unused]] const auto& iteration : state) state.SetIterationTime(repeated.Seconds());
  const double median = repeated.MedianSeconds();
  const double floor = FloorSeconds(work, shape, devices);
  state.counters["median_ms"] = median * 1e3;
  state.counters["floor_ms"] = floor * 1e3;
  state.counters["x_floor"] = median / floor;
  state.counters["own_us"] = (median - floor) * 1e6 / static_cast<double>(devices);
}

// The two sizes take turns, so that a machine that is busy for a while slows both.
void RunGrowth(benchmark::State& state, Work work, GeneratedShape shape) {
  KeepFreedMemory();
  Repeated small(work, shape, kSmall);
  Repeated large(work, shape, kLarge);
  for ([[maybe_unused]] const auto& iteration : state) {
    small.Seconds();
    state.SetIterationTime(large.Seconds());
  }
  state.counters["small_ms"] = small.MedianSeconds() * 1e3;
  state.counters["large_ms"] = large.MedianSeconds() * 1e3;
  state.counters["x_time"] = large.MedianSeconds() / small.MedianSeconds();
}

}  // namespace

void RegisterWork(Work work) {
  for (const GeneratedShape shape : {GeneratedShape::Wide, GeneratedShape::Deep}) {
    const std::string name = std::string(NameOf(work)) + "/" + NameOf(shape);
    for (const std::size_t devices : {std::size_t{10}, std::size_t{100}, kSmall, kLarge}) {
      benchmark::RegisterBenchmark(name.c_str(),
                                   [=](benchmark::State& state) { RunWork(state, work, shape); })
          ->Arg(static_cast<std::int64_t>(devices))
          ->UseManualTime()
          ->Unit(benchmark::kMillisecond)
          ->Iterations(static_cast<benchmark::IterationCount>(Rounds(devices)));
    }
    benchmark::RegisterBenchmark(("growth/" + name).c_str(),
                                 [=](benchmark::State& state) { RunGrowth(state, work, shape); })
        ->UseManualTime()
        ->Unit(benchmark::kMillisecond)
        ->Iterations(kPairs);
  }
}

}  // namespace bench
