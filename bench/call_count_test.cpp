// What a build asks of four real PCs and two generated ones, counted: whoever adds a call has to
// say so here. And what it leaves on the heap.
#include <gtest/gtest.h>

#include "bench/build_costs.h"
#include "simulation/machine/generated.h"
#include "simulation/machine/machine_file.h"

namespace bench {
namespace {

struct Case {
  const char* machine;
  std::uint64_t first, unchanged, requests;
};

void Expect(const Case& c, const platform::simulated::Machine& machine) {
  SCOPED_TRACE(c.machine);
  const BuildCosts costs = CostsOfBuilds(machine);
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

TEST(CallCounts, OfBuildsOverRealPcs) {
  for (const Case& c : {Case{"dell-precision", 697, 538, 85}, Case{"asus-b560", 1214, 760, 90},
                        Case{"hp-cardreader", 729, 604, 94}, Case{"vmware-win7", 647, 540, 54}}) {
    Expect(c, platform::simulated::LoadMachine(std::string(ZKUSB_SOURCE_DIR "/machines/") +
                                               c.machine + ".json"));
  }
}

TEST(CallCounts, OfBuildsOverGeneratedPcs) {
  using platform::simulated::GeneratedShape, platform::simulated::GenerateMachine;
  Expect({"wide", 6753, 3992, 473}, GenerateMachine(GeneratedShape::Wide, 100));
  Expect({"deep", 8899, 5883, 1344}, GenerateMachine(GeneratedShape::Deep, 100));
}

#ifdef __GLIBC__  // other C libraries do not tell
TEST(RetainedBytes, OfARecordAreAKibibyteAtMost) {
  using platform::simulated::GeneratedShape, platform::simulated::GenerateMachine;
  for (const GeneratedShape shape : {GeneratedShape::Wide, GeneratedShape::Deep}) {
    const double bytes = RetainedBytesForEachNode(GenerateMachine(shape, 100));
    EXPECT_TRUE(bytes > 500 && bytes <= 1'024) << bytes;
  }
}
#endif

}  // namespace
}  // namespace bench
