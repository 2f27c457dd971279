// What builds cost in platform calls, exactly; the counters are the rows of docs/performance.md.
#include <benchmark/benchmark.h>

#include <string>

#include "bench/build_costs.h"
#include "bench/workload.h"
#include "simulation/machine/generated.h"
#include "simulation/machine/machine_file.h"

namespace {

using namespace bench;
using platform::simulated::GeneratedShape, platform::simulated::GenerateMachine,
    platform::simulated::LoadMachine, platform::simulated::Machine;

// What the first build of each PC took before answers were kept: calls, and milliseconds at the
// prices with quick and with slow hubs.
struct RealPc {
  const char* name;
  double callsBefore, quickBefore, slowBefore;
};
constexpr RealPc kRealPcs[] = {{"dell-precision", 1711, 13.5, 34.7},
                               {"asus-b560", 3003, 20.0, 42.2},
                               {"hp-cardreader", 1836, 15.0, 39.4},
                               {"vmware-win7", 1757, 12.4, 25.8}};

Machine Load(const char* name) {
  return LoadMachine(std::string(ZKUSB_SOURCE_DIR "/machines/") + name + ".json");
}
double Calls(const Cost& cost) { return static_cast<double>(AllCalls(cost)); }
double Milliseconds(const Cost& cost, const Prices& prices) { return PriceOf(cost, prices) / 1e3; }

void CountPc(benchmark::State& state, const RealPc& pc, bool unchanged) {
  const Machine machine = Load(pc.name);
  BuildCosts costs;
  for ([[maybe_unused]] const auto& iteration : state) costs = CostsOfBuilds(machine);
  const Cost& cost = unchanged ? costs.unchanged : costs.first;
  state.counters["calls"] = Calls(cost);
  for (std::size_t kind = 0; kind < kCallKinds; ++kind) {
    state.counters[kCallKindNames[kind]] =
        static_cast<double>(cost.CallsOf(static_cast<CallKind>(kind)));
  }
  state.counters["for_each_node"] = CallsForEachNode(cost, costs.deviceNodes);
  state.counters["quick_ms"] = Milliseconds(cost, kQuickHubs);
  state.counters["slow_ms"] = Milliseconds(cost, kSlowHubs);
  if (unchanged) return;
  state.counters["share_of_calls"] = Calls(cost) / pc.callsBefore;
  state.counters["share_of_quick"] = Milliseconds(cost, kQuickHubs) / pc.quickBefore;
  state.counters["share_of_slow"] = Milliseconds(cost, kSlowHubs) / pc.slowBefore;
}

void CountAlternatives(benchmark::State& state, const RealPc& pc) {
  const Machine machine = Load(pc.name);
  Cost query, walk;
  BuildCosts costs;
  for ([[maybe_unused]] const auto& iteration : state) {
    query = CostOfFullQuery(machine);
    walk = CostOfDevNodeWalk(machine);
    costs = CostsOfBuilds(machine);
  }
  state.counters["full_query"] = Calls(query);
  state.counters["full_query_ms"] = Milliseconds(query, kQuickHubs);
  state.counters["devnode_walk"] = Calls(walk);
  state.counters["devnode_walk_ms"] = Milliseconds(walk, kQuickHubs);
  state.counters["first"] = Calls(costs.first);
  state.counters["unchanged"] = Calls(costs.unchanged);
  state.counters["requests"] = static_cast<double>(costs.first.CallsOf(CallKind::Request));
}

void CountGrowth(benchmark::State& state, GeneratedShape shape) {
  const auto devices = static_cast<std::size_t>(state.range(0));
  const Machine machine = GenerateMachine(shape, devices);
  BuildCosts costs;
  for ([[maybe_unused]] const auto& iteration : state) costs = CostsOfBuilds(machine);
  const Cost query = CostOfFullQuery(machine);
  state.counters["nodes"] = static_cast<double>(costs.deviceNodes);
  state.counters["first"] = Calls(costs.first);
  state.counters["first_ms"] = Milliseconds(costs.first, kQuickHubs);
  state.counters["unchanged"] = Calls(costs.unchanged);
  state.counters["unchanged_ms"] = Milliseconds(costs.unchanged, kQuickHubs);
  state.counters["full_query"] = Calls(query);
  state.counters["full_query_ms"] = Milliseconds(query, kQuickHubs);
  state.counters["for_each_node"] = CallsForEachNode(costs.first, costs.deviceNodes);
  state.counters["allocations_per_device"] =
      static_cast<double>(costs.first.allocations) / static_cast<double>(devices);
  state.counters["retained_bytes_per_node"] = RetainedBytesForEachNode(machine);
}

[[maybe_unused]] const bool costsRegistered = [] {
  for (const RealPc& pc : kRealPcs) {
    for (const bool unchanged : {false, true}) {
      const std::string name =
          std::string("calls/") + pc.name + (unchanged ? "/unchanged" : "/first");
      benchmark::RegisterBenchmark(name.c_str(), [&pc, unchanged](benchmark::State& state) {
        CountPc(state, pc, unchanged);
      })->Iterations(1);
    }
    benchmark::RegisterBenchmark((std::string("alternatives/") + pc.name).c_str(),
                                 [&pc](benchmark::State& state) { CountAlternatives(state, pc); })
        ->Iterations(1);
  }
  for (const GeneratedShape shape : {GeneratedShape::Wide, GeneratedShape::Deep}) {
    auto* registration = benchmark::RegisterBenchmark(
        (std::string("counts/") + NameOf(shape)).c_str(),
        [shape](benchmark::State& state) { CountGrowth(state, shape); });
    for (const int devices : {10, 100, 1'000, 10'000}) registration->Arg(devices);
    registration->Iterations(1);
  }
  return true;
}();

}  // namespace
