// What reading a tree costs a client grows with the number of its nodes: exact numbers of
// allocations and texts, compared between a PC and one ten times as large.
#include <gtest/gtest.h>

#include <cstddef>
#include <string>
#include <vector>

#include "bench/object_work.h"
#include "bench/workload.h"

namespace bench {
namespace {

using platform::simulated::GeneratedShape;

constexpr std::size_t kObjectDevices = 250;
constexpr double kMostAllocationsOfADump = 3.2;  // for each node

class ObjectGrowth : public testing::TestWithParam<GeneratedShape> {};

TEST_P(ObjectGrowth, IsTheSamePerNode) {
  const auto run = [&](std::size_t devices) {
    const ObjectWorkload workload(GetParam(), devices);
    std::vector<ObjectCost> costs;
    for (const ObjectWork work : kObjectWorks) costs.push_back(workload.CostOf(work));
    return costs;
  };
  const std::vector<ObjectCost> smallCosts = run(kObjectDevices);
  const std::vector<ObjectCost> largeCosts = run(kObjectDevices * 10);
  for (const ObjectWork work : kObjectWorks) {
    SCOPED_TRACE(NameOf(work));
    const ObjectCost& small = smallCosts[static_cast<std::size_t>(work)];
    const ObjectCost& large = largeCosts[static_cast<std::size_t>(work)];
    // A tree of ten times the devices has somewhat less than ten times the nodes: the controllers
    // stay ten.
    EXPECT_GT(large.nodes, small.nodes * 8);
    EXPECT_NEAR(large.brought / small.brought, large.nodes / small.nodes, 1);
    EXPECT_LE(large.allocations / large.nodes, small.allocations / small.nodes * 1.05);
    EXPECT_LE(large.texts / large.nodes, small.texts / small.nodes * 1.05);
    // A dump is one text that grows; all else makes an object for whatever it brings.
    if (work == ObjectWork::Dump) {
      EXPECT_LE(large.allocations / large.nodes, kMostAllocationsOfADump);
    } else {
      EXPECT_GE(large.allocations, large.brought);
    }
    EXPECT_EQ(large.texts > 0, work == ObjectWork::Read || work == ObjectWork::Dump);
  }
}

INSTANTIATE_TEST_SUITE_P(Objects, ObjectGrowth,
                         testing::Values(GeneratedShape::Wide, GeneratedShape::Deep),
                         [](const auto& info) { return std::string(NameOf(info.param)); });

}  // namespace
}  // namespace bench
