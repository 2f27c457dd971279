#include <gtest/gtest.h>

#include <string>

#include "platform/wrappers/failing_host.h"
#include "tests/support/desk_pc.h"
#include "tree/publication.h"

namespace KelvoUHW {
namespace {

// The stick's record stays current while no tree shows the stick any more, and nobody keeps the
// tree that did: its link must not name the dead port, which the next build would climb through.
TEST(ParentLinks, EndWithThePortTheyName) {
  SimulatedPc pc(BarePc());
  platform::wrappers::FailingHost host(pc);
  CZKUMUsbTreeBuilder builder(host);
  const auto plug = [&pc](const Change& change) {
    EXPECT_EQ(pc.Apply({.atMilliseconds = 0, .name = {}, .change = change}), u"");
  };
  plug(ExternalHub(u"HUB", 1));
  plug(Stick(u"S1", 1, u'E', UsbId(u"HUB")));
  ASSERT_TRUE(builder.Build());
  const InfoDevicePtr stick = builder.DeviceInfo().Current().FindByInstanceId(UsbId(u"S1"));
  ASSERT_TRUE(stick);
  EXPECT_EQ(stick->m_pParent->m_nType, KUDTHubPort);
  builder.CommitDeviceCache();
  for (const std::uint32_t port : {2u, 3u, 4u}) {
    plug(Gadget(u"M" + platform::Decimal(static_cast<std::int32_t>(port)), port));
    platform::wrappers::FailurePlan plan;
    plan.operation = platform::wrappers::Operation::OpenDevice;
    plan.call = 3;  // the external hub, behind the controller and its root hub
    host.SetPlan(plan);
    ASSERT_TRUE(builder.Build());
    EXPECT_EQ(FindByInstanceId(builder.Root(), UsbId(u"S1")), nullptr);
    EXPECT_TRUE(builder.DeviceInfo().Current().HasRecord(stick.Get()));
    builder.CommitDeviceCache();
  }
  EXPECT_EQ(stick->m_pParent, nullptr);
}

}  // namespace
}  // namespace KelvoUHW
