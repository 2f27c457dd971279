#include "tree/hub_queries.h"

#include <gmock/gmock.h>

#include <string>

#include "devinfo/device_set.h"
#include "devinfo/devnode.h"
#include "platform/simulated/simulated_pc.h"
#include "platform/wrappers/logging_host.h"
#include "tests/support/machines.h"
#include "tests/support/scripted_driver.h"

namespace KelvoUHW {
namespace {

using platform::simulated::SimulatedPc;
using platform::wrappers::LoggingHost;
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
    EXPECT_EQ(m_pc.Open(), platform::simulated::OpenCounts{});
    EXPECT_THAT(m_pc.Misuses(), testing::IsEmpty());
  }

  std::vector<std::string> Log() const {
    std::vector<std::string> lines;
    for (const Text& line : m_log.Log()) lines.push_back(platform::ToUtf8(line));
    return lines;
  }
  static platform::FileHandle Opened(DeviceFile& file, const std::u16string& path) {
    EXPECT_TRUE(file.Open(path, platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE));
    return file.Get();
  }

  SimulatedPc m_pc{TwoPorts()};
  ScriptedDriver m_driver{m_pc};
  LoggingHost m_log{m_driver};
  DeviceFile m_controller{m_log};
  DeviceFile m_hub{m_log};
  platform::FileHandle m_hcd = Opened(m_controller, u"\\\\.\\HCD0");
  platform::FileHandle m_root = Opened(m_hub, u"\\\\.\\" + HubName(kRootHubId));
};

TEST_F(HubQueries, EachNameTakesTwoRequestsOfItsOwnShape) {
  EXPECT_EQ(GetHcdDriverKeyName(m_log, m_hcd), u"{usb}\\0000");
  EXPECT_EQ(GetRootHubName(m_log, m_hcd), HubName(kRootHubId));
  EXPECT_EQ(GetConnectionDriverKeyName(m_log, m_root, 1), u"{usb}\\0004");
  EXPECT_EQ(GetConnectionName(m_log, m_root, 2), u"USB#HUB#2");
  // 4 or 8 bytes of head, the characters and their zero. The root hub's name takes nothing in.
  EXPECT_THAT(Log(), ElementsAre("DeviceControl #1 0x220424 in 6 out 6", "DeviceControl #1 0x220424 in 26 out 26",
                                 "DeviceControl #1 0x220408 out 6", "DeviceControl #1 0x220408 out 120",
                                 "DeviceControl #2 0x220420 in 10 out 10", "DeviceControl #2 0x220420 in 30 out 30",
                                 "DeviceControl #2 0x220414 in 10 out 10", "DeviceControl #2 0x220414 in 28 out 28"));
}

constexpr std::uint32_t kGigabyte = 0x40000000;

TEST_F(HubQueries, ADriverThatLiesGivesNoNameOrAShorterOne) {
  struct Query {
    const char* what;
    std::uint32_t code;
    std::uint32_t head;
    std::u16string (*ask)(platform::DeviceIo&, platform::FileHandle);
    bool testsSize = true;
  };
  // What the driver answers to the first and to the second request, and what comes of it.
  struct Case {
    const char* what;
    std::uint32_t claimed;   // ActualLength of the first answer
    std::u16string text;     // of the second answer
    std::uint32_t received;  // bytes of the second answer; 0: it fails
    std::size_t requests;
    const char16_t* name;
  };
  const Query queries[] = {
      {"hcd driver key", platform::kIOCTL_GET_HCD_DRIVERKEY_NAME, 4,
       [](auto& io, auto handle) { return GetHcdDriverKeyName(io, handle); }},
      {"root hub", platform::kIOCTL_USB_GET_ROOT_HUB_NAME, 4,
       [](auto& io, auto handle) { return GetRootHubName(io, handle); }, false},
      {"connection driver key", platform::kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME, 8,
       [](auto& io, auto handle) { return GetConnectionDriverKeyName(io, handle, 1); }},
      {"connection name", platform::kIOCTL_USB_GET_NODE_CONNECTION_NAME, 8,
       [](auto& io, auto handle) { return GetConnectionName(io, handle, 2); }},
  };
  for (const Query& query : queries) {
    const std::uint32_t head = query.head;
    const Case cases[] = {
        {"nothing at all", 0, u"", 0, 1, u""},
        {"nothing but the declared character", head + 2, u"", head + 2, query.testsSize ? 1u : 2u, u""},
        {"one character and no zero", head + 4, u"ab", head + 4, 2, u"ab"},
        {"the second request fails", head + 8, u"abc", 0, 2, u""},
        {"fewer bytes than claimed", head + 400, u"abc", head + 6, 2, u"abc"},
        {"an odd number of bytes", head + 7, u"abc", head + 5, 2, u"ab"},
        {"more bytes received than there is room", head + 6, u"abc", 0xFFFFFFFF, 2, u"abc"},
        {"a zero in the middle", head + 10, std::u16string(u"ab\0cd", 5), head + 10, 2, u"ab"},
        {"no more than the head", head + 8, u"abc", head, 2, u""},
        {"a gigabyte", kGigabyte, u"abc", head + 8, 2, u"abc"},
    };
    for (const Case& c : cases) {
      m_log.Clear();
      m_driver.Next(query.code, c.claimed == 0 ? RefuseRequest : NameAnswer(head, c.claimed, u"", head + 2));
      if (c.requests == 2) {
        m_driver.Next(query.code, c.received == 0 ? RefuseRequest : NameAnswer(head, c.claimed, c.text, c.received));
      }
      const std::u16string name = query.ask(m_log, head == 8 ? m_root : m_hcd);
      // On a machine that grants no gigabyte the name is empty instead.
      EXPECT_TRUE(name == c.name || (c.claimed == kGigabyte && name.empty())) << query.what << ": " << c.what;
      EXPECT_EQ(m_log.Log().size(), c.requests) << query.what << ": " << c.what;
    }
  }
}

TEST_F(HubQueries, ARootHubNameWithoutRoomIsAskedForAllTheSame) {
  m_driver.Next(platform::kIOCTL_USB_GET_ROOT_HUB_NAME, NameAnswer(4, 0, u"", 6));
  EXPECT_EQ(GetRootHubName(m_log, m_hcd), u"");
  EXPECT_THAT(Log(), ElementsAre("DeviceControl #1 0x220408 out 6", "DeviceControl #1 0x220408 ! 122"));
}

TEST_F(HubQueries, NodeInformationGoesInAndOutOfOneBuffer) {
  platform::USB_NODE_INFORMATION information{};
  EXPECT_TRUE(GetNodeInformation(m_log, m_root, information));
  EXPECT_EQ(+information.HubDescriptor.bNumberOfPorts, 2);
  EXPECT_THAT(Log(), ElementsAre("DeviceControl #2 0x220408 in 76 out 76"));
  EXPECT_FALSE(GetNodeInformation(m_log, m_root + 1000, information));
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
  EXPECT_TRUE(ProbeConnectionInformationEx(m_log, m_root, 1));
  EXPECT_EQ(+record.Info.ConnectionStatus, 0u);
  EXPECT_TRUE(GetConnectionInformation(m_log, m_root, 1, record));
  EXPECT_EQ(+record.Info.ConnectionIndex, 1u);
  EXPECT_EQ(+record.Info.ConnectionStatus, 1u);
  EXPECT_EQ(+record.Info.DeviceDescriptor.idVendor, 0x046D);
  EXPECT_EQ(+record.Info.CurrentConfigurationValue, 1);
  EXPECT_EQ(+record.Info.DeviceAddress, 0x1234);
  EXPECT_EQ(+record.Info.NumberOfOpenPipes, 2u);
  EXPECT_EQ(+record.Info.Speed, platform::UsbLowSpeed);
  EXPECT_EQ(+record.PipeList[29].ScheduleOffset, 99u);
  EXPECT_THAT(Log(),
              ElementsAre("DeviceControl #2 0x220448 in 365 out 365", "DeviceControl #2 0x22040C in 365 out 365"));
  m_driver.Next(platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, RefuseRequest);
  ConnectionRecord unfilled;
  EXPECT_FALSE(GetConnectionInformation(m_log, m_root, 1, unfilled));
  EXPECT_EQ(+unfilled.Info.ConnectionIndex, 0u);
  EXPECT_FALSE(ProbeConnectionInformationEx(m_log, m_root, 9));
}

void RenameController(Machine& machine, const char16_t* id) { machine.devices[1].id = machine.devices[2].parent = id; }

TEST(ControllerIdentity, EachMissingPartEndsIt) {
  struct Case {
    const char* what;
    void (*change)(Machine&);
    bool complete;
    const char16_t* id;
    std::uint32_t revision;
    const char16_t* description;
  };
  const Case cases[] = {
      {"complete", [](Machine&) {}, true, kControllerId, 5, u"EHCI Controller"},
      {"no device with that driver key", [](Machine& m) { m.devices[1].driver = u"{usb}\\0099"; }, false, u"", 0, u""},
      {"no PCI device", [](Machine& m) { RenameController(m, u"ROOT\\USB\\0000"); }, false, u"ROOT\\USB\\0000", 0, u""},
      {"no revision", [](Machine& m) { RenameController(m, u"PCI\\VEN_8086&DEV_1C26&SUBSYS_1C268086\\1"); }, false,
       u"PCI\\VEN_8086&DEV_1C26&SUBSYS_1C268086\\1", 0, u""},
      {"no description", [](Machine& m) { m.devices[1].description.reset(); }, false, kControllerId, 5, u""},
      {"an empty description", [](Machine& m) { m.devices[1].description = u""; }, false, kControllerId, 5, u""},
      {"no root hub", [](Machine& m) { m.hostControllers[0].rootHub.reset(); }, false, kControllerId, 5,
       u"EHCI Controller"},
  };
  for (const Case& c : cases) {
    Machine machine = OneController(1);
    c.change(machine);
    SimulatedPc pc(machine);
    DeviceFile file(pc);
    ASSERT_TRUE(file.Open(u"\\\\.\\HCD0", platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE));
    CZKUMHostControllerImpl controller;
    DriverKeyIndex index(pc);
    ASSERT_TRUE(ReadDriverKeyName(pc, file.Get(), controller)) << c.what;
    EXPECT_EQ(Initialise(pc, pc, index, file.Get(), controller), c.complete) << c.what;
    EXPECT_EQ(controller.m_strDevInstId, c.id) << c.what;
    EXPECT_EQ(controller.m_nPciRevision, c.revision) << c.what;
    EXPECT_EQ(controller.m_strDeviceDescr, c.description) << c.what;
    EXPECT_EQ(controller.m_devInstHandle, c.id[0] == 0 ? 0u : 2u) << c.what;
    if (c.complete) {
      EXPECT_EQ(controller.m_nPciVendorId << 16 | controller.m_nPciDeviceId, 0x80861C26u);
      EXPECT_EQ(controller.m_nPciSubSysId, 0x1C268086u);
      EXPECT_EQ(controller.m_strRootHubName, HubName(kRootHubId));
      EXPECT_EQ(controller.m_strVendor, u"8086");
    }
  }
}

}  // namespace
}  // namespace KelvoUHW
