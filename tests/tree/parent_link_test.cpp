#include "platform/wrappers/failing_host.h"
#include "tests/support/desk_pc.h"
#include "tree/publication.h"

namespace KelvoUHW {
namespace {

// The stick's record stays current while no tree shows the stick any more, and nobody keeps the
// tree that did: its link must not name the dead port, which the next build would climb through.
TEST(ParentLinks, EndWithThePortTheyName) {
  Desk<platform::wrappers::FailingHost> desk(BarePc(), {ExternalHub(u"HUB", 1), Stick(u"S1", 1, u'E', UsbId(u"HUB"))});
  CZKUMUsbTreeBuilder& builder = desk.builder;
  ASSERT_TRUE(builder.Build());
  const InfoDevicePtr stick = builder.DeviceInfo().Current().FindByInstanceId(UsbId(u"S1"));
  ASSERT_TRUE(stick);
  EXPECT_EQ(stick->m_pParent->m_nType, KUDTHubPort);
  builder.CommitDeviceCache();
  for (const std::uint32_t port : {2u, 3u, 4u}) {
    desk.Do({Gadget(Text(1, static_cast<char16_t>(u'0' + port)), port)});
    // The third is the external hub, behind the controller and its root hub.
    desk.host.SetPlan({.call = 3, .operation = platform::wrappers::Operation::OpenDevice});
    ASSERT_TRUE(builder.Build());
    EXPECT_EQ(FindByInstanceId(builder.Root(), UsbId(u"S1")), nullptr);
    EXPECT_TRUE(builder.DeviceInfo().Current().HasRecord(stick.Get()));
    builder.CommitDeviceCache();
  }
  EXPECT_EQ(stick->m_pParent, nullptr);
}

}  // namespace
}  // namespace KelvoUHW
