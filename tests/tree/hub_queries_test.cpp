#include "tree/hub_queries.h"

#include <gmock/gmock.h>

#include <array>

#include "bench/small_pcs.h"
#include "platform/wrappers/logging_host.h"
#include "records/device_set.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/scripted_driver.h"

namespace KelvoUHW {
namespace {

using testing::ElementsAre;

Machine TwoPorts() {
  Machine machine = OneController(2);
  machine.hubs[0].ports = {DevicePort(u"{usb}\\0004", 0x046D, 0xC52B), HubOnPort(u"{usb}\\0005", u"USB#HUB#2")};
  return machine;
}

class HubQueries : public testing::Test {
 protected:
  HubQueries() { m_log.Clear(); }
  ~HubQueries() override {
    m_controller.Close();
    m_hub.Close();
    EXPECT_TRUE(m_pc.Open() == platform::simulated::OpenCounts{} && m_pc.Misuses().empty());
  }
  static platform::FileHandle Opened(DeviceFile& file, const std::u16string& path) {
    EXPECT_TRUE(file.Open(path, platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE));
    return file.Get();
  }
  platform::simulated::SimulatedPc m_pc{TwoPorts()};
  ScriptedDriver m_driver{m_pc};
  platform::wrappers::LoggingHost m_log{m_driver};
  DeviceFile m_controller{m_log}, m_hub{m_log};
  platform::FileHandle m_hcd = Opened(m_controller, u"\\\\.\\HCD0");
  platform::FileHandle m_root = Opened(m_hub, u"\\\\.\\" + HubName(kRootHubId));
};

constexpr std::uint32_t kMostNameBytes = 1U << 17;

TEST_F(HubQueries, ADriverThatLiesGivesNoNameOrAShorterOne) {
  using Ask = std::u16string (*)(platform::DeviceIo&, platform::FileHandle);
  const std::tuple<std::uint32_t, std::uint32_t, Ask> queries[] = {
      {platform::kIOCTL_GET_HCD_DRIVERKEY_NAME, 4, [](auto& io, auto hcd) { return GetHcdDriverKeyName(io, hcd); }},
      {platform::kIOCTL_USB_GET_ROOT_HUB_NAME, 4, [](auto& io, auto hcd) { return GetRootHubName(io, hcd); }},
      {platform::kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME, 8,
       [](auto& io, auto hub) { return GetConnectionDriverKeyName(io, hub, 1); }},
      {platform::kIOCTL_USB_GET_NODE_CONNECTION_NAME, 8,
       [](auto& io, auto hub) { return GetConnectionName(io, hub, 2); }}};
  for (const auto& [code, head, ask] : queries) {
    // The root hub's size alone is not tested against the declared character.
    const Text declared = code == platform::kIOCTL_USB_GET_ROOT_HUB_NAME ? u"a" : u"";
    // The length that an answer claims, the text and the bytes received of the last one (0: it fails); the requests
    // that were made, and the name that comes of them.
    const std::tuple<const char*, std::uint32_t, Text, std::uint32_t, std::size_t, Text> cases[] = {
        {"nothing at all", 0, u"", 0, 1, u""},
        {"nothing but the declared character", head + 2, u"a", head + 2, 1, declared},
        {"half a character more", head + 3, u"a", head + 3, 1, u"a"},
        {"one character and no zero", head + 4, u"ab", head + 4, 1, u"ab"},
        {"fewer bytes than claimed", head + 400, u"abc", head + 6, 1, u"abc"},
        {"an odd number of bytes", head + 7, u"abc", head + 5, 1, u"ab"},
        {"more bytes received than claimed", head + 6, u"abcd", 0xFFFFFFFF, 1, u"abc"},
        {"a zero in the middle", head + 10, Text(u"ab\0cd", 5), head + 10, 1, u"ab"},
        {"no more than the head", head + 8, u"abc", head, 1, u""},
        {"less than the head", head + 8, u"abc", 2, 1, u""},
        {"as much as fits at first", 512, u"abc", head + 6, 1, u"abc"},
        {"one byte more", 513, u"abc", head + 6, 2, u"abc"},
        {"a second request that fails", 600, u"abc", 0, 2, u""},
        {"more bytes received than there is room", 600, u"abc", 0xFFFFFFFF, 2, u"abc"},
        {"as much as is read", kMostNameBytes, u"abc", head + 8, 2, u"abc"},
        {"a byte more", kMostNameBytes + 1, u"abc", head + 8, 1, u""},
        {"a gigabyte", 0x40000000, u"abc", head + 8, 1, u""}};
    for (const auto& [what, claimed, text, received, requests, expected] : cases) {
      m_log.Clear();
      if (requests == 2) m_driver.Next(code, NameAnswer(head, claimed, u"", head + 2));
      m_driver.Next(code, received == 0 ? RefuseRequest : NameAnswer(head, claimed, text, received));
      const Text name = ask(m_log, head == 8 ? m_root : m_hcd);
      EXPECT_EQ(name, expected) << std::hex << code << ": " << what;
      EXPECT_EQ(m_log.Log().size(), requests) << std::hex << code << ": " << what;
    }
  }
}

TEST_F(HubQueries, ARootHubNameIsAskedForWithoutInput) {
  EXPECT_EQ(GetRootHubName(m_log, m_hcd), HubName(kRootHubId));
  EXPECT_EQ(GetConnectionName(m_log, m_root, 2), u"USB#HUB#2");
  EXPECT_THAT(m_log.Log(),
              ElementsAre(u"DeviceControl #1 0x220408 out 512", u"DeviceControl #2 0x220414 in 512 out 512"));
}

TEST_F(HubQueries, ConnectionRecordsAreFilledFromTheOlderRequest) {
  m_driver.Always(platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION,
                  [](const void*, void* out, std::uint32_t, std::uint32_t&) {
                    auto& answer = *static_cast<platform::LegacyConnectionInformation*>(out);
                    answer.Info.LowSpeed = 7;
                    answer.Info.DeviceAddress = 0x1234;
                    answer.Info.NumberOfOpenPipes = 2;
                    answer.PipeList[29].ScheduleOffset = 99;
                    return platform::Status::Success();
                  });
  ConnectionRecord record;
  EXPECT_TRUE(GetConnectionInformation(m_log, m_root, 1, record));
  const platform::USB_NODE_CONNECTION_INFORMATION_EX& info = record.Info;
  EXPECT_THAT((std::array<std::uint32_t, 8>{info.ConnectionIndex, info.ConnectionStatus, info.DeviceDescriptor.idVendor,
                                            info.CurrentConfigurationValue, info.DeviceAddress, info.NumberOfOpenPipes,
                                            info.Speed, record.PipeList[29].ScheduleOffset}),
              ElementsAre(1, 1, 0x046D, 1, 0x1234, 2, platform::UsbLowSpeed, 99));
  m_driver.Next(platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, RefuseRequest);
  ConnectionRecord unfilled;
  EXPECT_FALSE(GetConnectionInformation(m_log, m_root, 1, unfilled));
  EXPECT_EQ(+unfilled.Info.ConnectionIndex, 0u);
  EXPECT_FALSE(ProbeConnectionInformationEx(m_log, m_root, 9));
}

}  // namespace
}  // namespace KelvoUHW
