#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <new>
#include <ostream>
#include <string>
#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "platform/simulated/steps.h"
#include "tests/support/desk_pc.h"
#include "tests/support/failing_memory.h"
#include "tree/publication.h"

namespace KelvoUHW {
namespace {

using platform::simulated::OpenCounts;
using testing_support::FailingAllocation;
using testing_support::WellFedHost;

struct Newcomer {
  const char* what;
  Plug plug;
  const char* lists;  // of the first build that sees it
  // Of one behind a build that failed after it had seen it: a device that is added in two builds
  // without a commit between them is attached twice.
  const char* listsOfSecond;

  friend void PrintTo(const Newcomer& change, std::ostream* out) { *out << change.what; }
};

// The lists of the build after one that ran out of memory.
std::string BuildAfterFailure(const Machine& machine, const Newcomer& change, std::uint64_t allocation, bool& failed) {
  SimulatedPc pc(machine);
  WellFedHost host(pc);
  CZKUMUsbTreeBuilder builder(host);
  EXPECT_TRUE(builder.Build());
  builder.CommitDeviceCache();
  EXPECT_EQ(pc.Apply(StepOf(change.plug)), u"");
  const NodePtr root = builder.Root();
  std::vector<DeviceList> lists;
  for (std::size_t kind = 0; kind < 4; ++kind) lists.push_back(*builder.GetDeviceList(kind));

  bool thrown = false;
  {
    const FailingAllocation failing(allocation);
    try {
      builder.Build();
    } catch (const std::bad_alloc&) {  // and nothing else
      thrown = true;
    }
    failed = failing.Failed();
  }
  const OpenCounts open = pc.Open();
  EXPECT_EQ(open.files + open.imageLists + open.searches, 0u);
  if (thrown) {
    EXPECT_EQ(builder.Root(), root);
    for (std::size_t kind = 0; kind < 4; ++kind) {
      EXPECT_EQ(*builder.GetDeviceList(kind), lists[kind]);
    }
    EXPECT_EQ(builder.ConnectedCopy(), lists[0]);
    // The failed build may have taken device records over; every climb ends all the same.
    VisitPreOrder(root, [](const NodePtr& node) {
      EXPECT_TRUE(ReachesRoot(*node) || node->m_nType >= KUDTInfoDevice);
      return true;
    });
    if (!builder.Build()) return "same";
  }
  EXPECT_TRUE(pc.Misuses().empty());
  return ListsText(builder);
}

class BuildWithoutMemory : public testing::TestWithParam<Newcomer> {};

TEST_P(BuildWithoutMemory, PublishesNothingAndTheNextOneWorks) {
  Machine machine = BarePc();
  for (const Plug& plug : {InternalDisk(), ExternalHub(u"HUB", 1), Gadget(u"M1", 1, UsbId(u"HUB")),
                           Stick(u"S1", 2, u'E'), CardReader(u"CR", 3)}) {
    ASSERT_EQ(CarryOut(machine, plug), u"");
  }
  std::uint64_t allocation = 1;
  for (bool failed = true; failed; ++allocation) {
    EXPECT_THAT(BuildAfterFailure(machine, GetParam(), allocation, failed),
                testing::AnyOf(GetParam().lists, GetParam().listsOfSecond));
    ASSERT_FALSE(HasFailure()) << allocation;
  }
  EXPECT_GT(allocation, 500u);
}

INSTANTIATE_TEST_SUITE_P(Changes, BuildWithoutMemory,
                         testing::Values(Newcomer{"Stick", Stick(u"S2", 4, u'F'), "M1 S1 CR S2 | S2 | - | S1 CR CR",
                                                  "M1 S1 CR S2 | S2 S2 | - | S1 CR CR"},
                                         Newcomer{"Card", Volume(DiskId(u"CR"), u'F'), "M1 S1 CR | - | - | S1 CR CR",
                                                  "M1 S1 CR | - | - | S1 CR CR"}),
                         [](const auto& change) { return std::string(change.param.what); });

}  // namespace
}  // namespace KelvoUHW
