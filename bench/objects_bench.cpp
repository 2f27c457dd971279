// What clients do with a published tree, per node of the tree.
#include <benchmark/benchmark.h>

#include <string>

#include "bench/object_work.h"
#include "bench/start_state.h"
#include "bench/workload.h"

namespace {

using platform::simulated::GeneratedShape;

void RunWork(benchmark::State& state, bench::ObjectWork work, GeneratedShape shape) {
  bench::KeepFreedMemory();
  const bench::ObjectWorkload workload(shape, static_cast<std::size_t>(state.range(0)));
  for ([[maybe_unused]] const auto& iteration : state) {
    benchmark::DoNotOptimize(workload.Run(work));
  }
  const bench::ObjectCost cost = workload.CostOf(work);
  state.counters["nodes"] = cost.nodes;
  state.counters["brought"] = cost.brought;
  state.counters["allocations_per_node"] = cost.allocations / cost.nodes;
  state.counters["texts_per_node"] = cost.texts / cost.nodes;
  state.counters["per_node"] = benchmark::Counter(
      cost.nodes, benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

// The devices of trees with about 100, 1,000 and 10,000 nodes, and of one that is larger still.
[[maybe_unused]] const bool objectsRegistered = [] {
  for (const GeneratedShape shape : {GeneratedShape::Wide, GeneratedShape::Deep}) {
    for (const bench::ObjectWork work : bench::kObjectWorks) {
      const std::string name =
          std::string("objects/") + bench::NameOf(work) + "/" + bench::NameOf(shape);
      auto* registration = benchmark::RegisterBenchmark(
          name.c_str(), [=](benchmark::State& state) { RunWork(state, work, shape); });
      for (const int devices : {25, 250, 2'500, 10'000}) registration->Arg(devices);
      registration->Unit(benchmark::kMicrosecond);
    }
  }
  return true;
}();

}  // namespace
