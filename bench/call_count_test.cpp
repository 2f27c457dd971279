// What a build asks of four real PCs, counted: whoever adds a call has to say so here.
#include <gtest/gtest.h>

#include "bench/build_costs.h"
#include "simulation/machine/machine_file.h"

namespace bench {
namespace {

TEST(CallCounts, OfBuildsOverRealPcs) {
  struct Case {
    const char* machine;
    std::uint64_t first, unchanged, requests;
  };
  for (const Case& c : {Case{"dell-precision", 697, 538, 85}, Case{"asus-b560", 1214, 760, 90},
                        Case{"hp-cardreader", 729, 604, 94}, Case{"vmware-win7", 647, 540, 54}}) {
    SCOPED_TRACE(c.machine);
    const BuildCosts costs = CostsOfBuilds(platform::simulated::LoadMachine(
        std::string(ZKUSB_SOURCE_DIR "/machines/") + c.machine + ".json"));
    EXPECT_EQ(AllCalls(costs.first), c.first);
    EXPECT_EQ(AllCalls(costs.unchanged), c.unchanged);
    EXPECT_EQ(costs.first.CallsOf(CallKind::Request), c.requests);
    EXPECT_LE(CallsForEachNode(costs.first, costs.deviceNodes), 20);
    for (std::size_t kind = 0; kind < kCallKinds; ++kind) {
      EXPECT_LE(costs.unchanged.CallsOf(static_cast<CallKind>(kind)),
                costs.first.CallsOf(static_cast<CallKind>(kind)))
          << kCallKindNames[kind];
    }
  }
}

}  // namespace
}  // namespace bench
