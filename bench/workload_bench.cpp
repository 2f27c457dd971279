#include "bench/workload_bench.h"

#include <algorithm>
#include <ctime>
#include <limits>
#include <stdexcept>
#include <string>

#include "bench/metered_host.h"
#include "bench/recording_host.h"

namespace bench {
namespace {

using platform::simulated::GeneratedShape;
using platform::simulated::GenerateMachine;
using platform::simulated::SimulatedPc;

// So many times each work is done, to keep the best time.
int Rounds(std::size_t devices) { return devices < 1000 ? 100 : devices < 10'000 ? 20 : 5; }

// Processor time: nothing that is measured here waits, and what else runs on the machine must not
// count.
template <class Action>
double Seconds(Action action) {
  const std::clock_t start = std::clock();
  action();
  return static_cast<double>(std::clock() - start) / CLOCKS_PER_SEC;
}

void CountCosts(benchmark::State& state, Work work, SimulatedPc& pc, std::size_t devices) {
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
double FloorSeconds(Work work, SimulatedPc& pc, std::size_t devices) {
  Recording recording;
  Workload workload(work, devices, pc, recording.Host(pc));
  workload.Prepare();
  recording.Clear();
  workload.Run();
  double best = std::numeric_limits<double>::max();
  for (int round = 0; round < Rounds(devices); ++round) {
    std::size_t different = 0;
    best = std::min(best, Seconds([&] { different = recording.Replay(pc); }));
    if (different != 0) throw std::logic_error("the floor's calls end otherwise");
  }
  return best;
}

void RunWork(benchmark::State& state, Work work, GeneratedShape shape) {
  const auto devices = static_cast<std::size_t>(state.range(0));
  const auto machine = GenerateMachine(shape, devices);
  {
    SimulatedPc pc(machine);
    CountCosts(state, work, pc, devices);
  }
  SimulatedPc pc(machine);
  Workload workload(work, devices, pc, pc);
  double best = std::numeric_limits<double>::max();
  for ([[maybe_unused]] const auto& iteration : state) {
    workload.Prepare();
    const double seconds = Seconds([&] { workload.Run(); });
    state.SetIterationTime(seconds);
    best = std::min(best, seconds);
  }
  SimulatedPc calm(machine);
  const double floor = FloorSeconds(work, calm, devices);
  state.counters["best_ms"] = best * 1e3;
  state.counters["floor_ms"] = floor * 1e3;
  state.counters["x_floor"] = best / floor;
}

}  // namespace

void RegisterWork(Work work) {
  for (const GeneratedShape shape : {GeneratedShape::Wide, GeneratedShape::Deep}) {
    const std::string name = std::string(NameOf(work)) + "/" + NameOf(shape);
    for (const std::size_t devices : {10u, 100u, 1'000u, 10'000u}) {
      benchmark::RegisterBenchmark(name.c_str(),
                                   [=](benchmark::State& state) { RunWork(state, work, shape); })
          ->Arg(static_cast<std::int64_t>(devices))
          ->UseManualTime()
          ->Unit(benchmark::kMillisecond)
          ->Iterations(static_cast<benchmark::IterationCount>(Rounds(devices)));
    }
  }
}

}  // namespace bench
