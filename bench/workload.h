// The work that the benchmarks measure: walks and builds over generated PCs. The programs here
// print costs in platform calls (costs_bench.cpp) and times, and tests pin counts of calls.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "simulation/machine/generated.h"
#include "simulation/pc/simulated_pc.h"
#include "tree/topology_walker.h"
#include "tree/tree_builder.h"

namespace bench {

enum class Work : std::uint8_t {
  Walk,       // the USB walk alone
  First,      // the first build of a builder
  Unchanged,  // a build that finds everything as it was
  OneMore,    // a build that finds one more stick
};
const char* NameOf(Work work) noexcept;
const char* NameOf(platform::simulated::GeneratedShape shape) noexcept;

// One kind of work, to be done over and over: Prepare, Run, Prepare, Run. The component talks to
// `host`, which is the PC or a wrapper around it.
class Workload {
 public:
  Workload(Work work, std::size_t devices, platform::simulated::SimulatedPc& pc,
           platform::Host& host);

  // Brings PC and component to where the work starts.
  void Prepare();
  // Does the work. Throws std::logic_error when it did not find what it had to find.
  void Run();

 private:
  void BuildUntilQuiet();
  void Expect(bool asExpected) const;
  std::uint32_t WalkOnce();

  Work m_work;
  std::size_t m_devices;
  platform::simulated::SimulatedPc& m_pc;
  platform::Host& m_host;
  platform::simulated::Step m_oneMore;
  bool m_plugged = false;
  std::optional<KelvoUHW::CZKUMUsbTreeBuilder> m_builder;
  std::optional<KelvoUHW::CZKUMTopologyWalker> m_walker;
};

}  // namespace bench
