#include <gmock/gmock.h>

#include <new>

#include "tests/support/cases.h"
#include "tests/support/desk_pc.h"
#include "tests/support/failing_memory.h"
#include "tree/publication.h"

namespace KelvoUHW {
namespace {

struct Newcomer {
  Change plug;
  const char* lists;  // of the first build that sees it
  // Of one behind a build that failed after it had seen it: a device that is added in two builds
  // without a commit between them is attached twice.
  const char* listsOfSecond;
};

// The lists of the build after one that ran out of memory.
std::string BuildAfterFailure(const Machine& machine, const Newcomer& change, std::uint64_t allocation, bool& failed) {
  Desk<WellFedHost> desk(machine);
  EXPECT_TRUE(desk.builder.Build());
  desk.builder.CommitDeviceCache();
  desk.Do({change.plug});
  const NodePtr root = desk.builder.Root();
  const std::vector<DeviceList> lists = desk.Lists();
  bool thrown = false;
  {
    const FailingAllocation failing(allocation);
    try {
      desk.builder.Build();
    } catch (const std::bad_alloc&) {  // and nothing else
      thrown = true;
    }
    failed = failing.Failed();
  }
  const OpenCounts open = desk.pc.Open();
  EXPECT_EQ(open.files + open.imageLists + open.searches, 0u);
  if (thrown) {
    EXPECT_EQ(desk.builder.Root(), root);
    EXPECT_EQ(desk.Lists(), lists);
    EXPECT_EQ(desk.builder.ConnectedCopy(), lists[0]);
    // The failed build may have taken device records over; every climb ends all the same.
    VisitPreOrder(root, [](const NodePtr& node) {
      const bool reaches = ReachesRoot(*node);
      if (node->m_nType < KUDTInfoDevice) {
        EXPECT_TRUE(reaches);
      }
      return true;
    });
    if (!desk.builder.Build()) return "same";
  }
  EXPECT_TRUE(desk.pc.Misuses().empty());
  return ListsText(desk.builder);
}

TEST(BuildWithoutMemory, PublishesNothingAndTheNextOneWorks) {
  const Machine machine =
      Desk<WellFedHost>(BarePc(), {InternalDisk(), ExternalHub(u"HUB", 1), Gadget(u"M1", 1, UsbId(u"HUB")),
                                   Stick(u"S1", 2, u'E'), CardReader(u"CR", 3)})
          .pc.Snapshot();
  const Newcomer newcomers[] = {
      {Stick(u"S2", 4, u'F'), "M1 S1 CR S2 | S2 | - | S1 CR CR", "M1 S1 CR S2 | S2 S2 | - | S1 CR CR"},
      {Volume(DiskId(u"CR"), u'F'), "M1 S1 CR | - | - | S1 CR CR", "M1 S1 CR | - | - | S1 CR CR"}};
  for (const Newcomer& newcomer : newcomers) {
    Desk<WellFedHost> desk(machine);
    desk.builder.Build();
    desk.builder.CommitDeviceCache();
    desk.Do({newcomer.plug});
    const auto allocations = DistinctAllocations([&] { desk.builder.Build(); });
    for (std::size_t i = 0; i < allocations.size(); i += testing_support::Cases<std::size_t>(1, 23)) {
      const std::uint64_t allocation = allocations[i];
      bool failed = false;
      EXPECT_THAT(BuildAfterFailure(machine, newcomer, allocation, failed),
                  testing::AnyOf(newcomer.lists, newcomer.listsOfSecond));
      EXPECT_TRUE(failed);
      ASSERT_FALSE(HasFailure()) << newcomer.lists << ": " << allocation;
    }
    EXPECT_GT(allocations.size(), 200u);
    EXPECT_GT(allocations.back(), 500u);
  }
}

}  // namespace
}  // namespace KelvoUHW
