#include "tree/topology_walker.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "platform/text.h"
#include "platform/wrappers/counting_host.h"
#include "platform/wrappers/failing_host.h"
#include "platform/wrappers/logging_host.h"
#include "tests/support/machines.h"
#include "tests/support/scripted_driver.h"
#include "tree/port_device.h"

namespace KelvoUHW {
namespace {

using platform::simulated::OpenCounts;
using platform::simulated::SimulatedPc;
using platform::wrappers::CountingHost;
using platform::wrappers::FailingHost;
using platform::wrappers::FailurePlan;
using platform::wrappers::LoggingHost;
using platform::wrappers::Operation;
using testing_support::DeviceNode;
using testing_support::DevicePort;
using testing_support::HubName;
using testing_support::HubOnPort;
using testing_support::kControllerId;
using testing_support::Machine;
using testing_support::OneController;
using testing_support::RefuseRequest;
using testing_support::ScriptedDriver;
using testing_support::Text;

// One line a node: kind, what tells it apart, and its depth in dots.
void Outline(const NodePtr& node, const std::string& dots, std::string& out) {
  out += dots;
  switch (node->m_nType) {
    case KUDTHostController:
      out += "controller " + platform::ToUtf8(node->m_strDriverKeyName) + " at " +
             platform::ToUtf8(static_cast<const CZKUMHostControllerImpl&>(*node).m_strLeafName);
      break;
    case KUDTHub:
      out += "hub " + platform::ToUtf8(node->m_strDevInstId) + " '" + platform::ToUtf8(node->m_strDeviceDescr) + "'";
      break;
    case KUDTHubPort:
      out += "port status " + std::to_string(static_cast<const CZKUMHubPortImpl&>(*node).m_nStatus) + " " +
             platform::ToUtf8(node->m_strDevInstId);
      break;
    case KUDTPortDevice:
      out += "device " + platform::ToUtf8(node->m_strDevInstId) + " '" + platform::ToUtf8(node->m_strDeviceDescr) +
             "' speed " + std::to_string(static_cast<const CZKUMPortDeviceImpl&>(*node).Speed());
      break;
    default:
      out += platform::ToUtf8(node->m_strDevInstId);
  }
  out += "\n";
  for (const NodePtr& child : node->m_childs) Outline(child, dots + ".", out);
}

std::string OutlineOf(const NodePtr& root) {
  std::string out;
  Outline(root, "", out);
  return out;
}

// A root hub with a mouse, an unconfigured device, an empty port, a failed device and a hub of two
// ports with a device of unknown driver key.
Machine Busy() {
  Machine machine = OneController(5);
  machine.devices.push_back(
      DeviceNode(u"USB\\VID_046D&PID_C52B\\7", u"USB\\ROOT_HUB20\\4&1", u"HIDClass", u"{usb}\\0004", u"Mouse"));
  machine.devices.push_back(
      DeviceNode(u"USB\\VID_05E3&PID_0610\\2", u"USB\\ROOT_HUB20\\4&1", u"USB", u"{usb}\\0005", u"Generic Hub"));
  auto& ports = machine.hubs[0].ports;
  ports[0] = DevicePort(u"{USB}\\0004", 0x046D, 0xC52B);
  ports[0].speed = platform::simulated::Speed::Low;
  ports[1] = DevicePort(u"{usb}\\0009", 1, 2);
  ports[1].configuration = 0;
  ports[3].status = 2;
  ports[4] = HubOnPort(u"{usb}\\0005", HubName(u"USB\\VID_05E3&PID_0610\\2"));
  machine.hubs.push_back({HubName(u"USB\\VID_05E3&PID_0610\\2"), {}, false});
  machine.hubs[1].ports.resize(2);
  machine.hubs[1].ports[1] = DevicePort(u"{usb}\\0099", 3, 4);
  machine.hubs[1].ports[1].driverKey.reset();
  return machine;
}

const char* const kBusyOutline =
    "Abstract root\n"
    ".controller {usb}\\0000 at \\\\.\\HCD0\n"
    "..hub USB\\ROOT_HUB20\\4&1 'RootHub'\n"
    "...port status 1 USB\\ROOT_HUB20\\4&1 port 1\n"
    "....device USB\\VID_046D&PID_C52B\\7 'Mouse' speed 0\n"
    "...port status 2 USB\\ROOT_HUB20\\4&1 port 2\n"
    "....device  '' speed 1\n"
    "...port status 0 USB\\ROOT_HUB20\\4&1 port 3\n"
    "...port status 2 USB\\ROOT_HUB20\\4&1 port 4\n"
    "....device  '' speed 1\n"
    "...port status 1 USB\\ROOT_HUB20\\4&1 port 5\n"
    "....hub USB\\VID_05E3&PID_0610\\2 'Generic Hub'\n"
    ".....port status 0 USB\\VID_05E3&PID_0610\\2 port 1\n"
    ".....port status 1 USB\\VID_05E3&PID_0610\\2 port 2\n"
    "......device  '' speed 1\n";

TEST(Walk, EveryPortThatAnswersIsInTheTree) {
  SimulatedPc pc(Busy());
  CZKUMTopologyWalker walker(pc);
  walker.StartWalk();
  EXPECT_EQ(OutlineOf(walker.m_building), kBusyOutline);
  EXPECT_EQ(walker.m_nConnectedDevices, 4u);
  EXPECT_EQ(walker.m_nConnectedHubs, 1u);
  EXPECT_EQ(pc.Open(), OpenCounts{});
  EXPECT_EQ(walker.m_current, nullptr);
  walker.Commit();
  EXPECT_NE(walker.m_current, nullptr);
  EXPECT_EQ(walker.m_building, nullptr);
  walker.StartWalk();
  EXPECT_EQ(walker.m_previous, walker.m_current);
  EXPECT_EQ(walker.m_nConnectedDevices, 4u);  // of this walk alone
  walker.Abort();
  EXPECT_EQ(OutlineOf(walker.m_current), kBusyOutline);
}

TEST(Walk, RequestsOfAPortGoInOrder) {
  SimulatedPc pc(Busy());
  LoggingHost log(pc);
  CZKUMTopologyWalker walker(log);
  walker.StartWalk();
  std::string requests;
  for (const std::u16string& line : log.Log()) {
    if (line.starts_with(u"OpenDevice") || line.starts_with(u"DeviceControl") || line.starts_with(u"CloseDevice")) {
      requests += platform::ToUtf8(line) + "\n";
    }
  }
  const std::string hub = "f18a0e88-c30c-11d0-8815-00a0c906bed8}";
  EXPECT_THAT(requests, testing::StartsWith("OpenDevice \\\\.\\HCD0 = #1\n"
                                            "DeviceControl #1 0x220424 in 6 out 6\n"
                                            "DeviceControl #1 0x220424 in 26 out 26\n"
                                            "DeviceControl #1 0x220408 out 6\n"
                                            "DeviceControl #1 0x220408 out 120\n"
                                            "OpenDevice \\\\.\\USB#ROOT_HUB20#4&1#{" +
                                            hub +
                                            " = #2\n"
                                            "DeviceControl #2 0x220408 in 76 out 76\n"
                                            "DeviceControl #2 0x220448 in 365 out 365\n"
                                            "DeviceControl #2 0x22040C in 365 out 365\n"
                                            "DeviceControl #2 0x220420 in 10 out 10\n"
                                            "DeviceControl #2 0x220420 in 30 out 30\n"
                                            "DeviceControl #2 0x220448 in 365 out 365\n"));
  // The hub on the last port is opened with the port's hub still open, and closed before it.
  EXPECT_THAT(requests, testing::HasSubstr("DeviceControl #2 0x220414 in 10 out 10\n"
                                           "DeviceControl #2 0x220414 in 134 out 134\n"
                                           "OpenDevice \\\\.\\USB#VID_05E3&PID_0610#2#{" +
                                           hub + " = #3\n"));
  EXPECT_THAT(requests, testing::HasSubstr("CloseDevice #3\nCloseDevice #2\nCloseDevice #1\n"
                                           "OpenDevice \\\\.\\HCD1 ! 2\n"));
  EXPECT_THAT(requests, testing::EndsWith("OpenDevice \\\\.\\HCD9 ! 2\n"));
}

// A device interface of the all-zero class leads to a controller of its own path.
void AddInterfaceController(Machine& machine, const char16_t* path, const char16_t* device) {
  machine.interfaces.push_back({platform::kNullGuid, path, device});
}

TEST(Walk, SourcesOfControllers) {
  struct Case {
    const char* what;
    void (*change)(Machine&);
    std::vector<std::string> leafNames;
  };
  const Case cases[] = {
      {"none", [](Machine& m) { m.hostControllers.clear(); }, {}},
      {"a number above nine", [](Machine& m) { m.hostControllers[0].names = {u"\\\\.\\HCD10"}; }, {}},
      {"two names for one controller",
       [](Machine& m) {
         m.hostControllers[0].names = {u"\\\\.\\HCD3", u"\\\\.\\HCD7"};
       },
       {"\\\\.\\HCD3"}},
      {"a second controller with the same driver key in other case",
       [](Machine& m) {
         m.hostControllers.push_back({{u"\\\\.\\HCD1"}, u"{USB}\\0000", u"other"});
       },
       {"\\\\.\\HCD0"}},
      {"no driver key", [](Machine& m) { m.hostControllers[0].driverKey.reset(); }, {}},
      {"an interface and a name for one controller",
       [](Machine& m) {
         m.hostControllers[0].names.push_back(u"\\\\?\\hc");
         AddInterfaceController(m, u"\\\\?\\hc", kControllerId);
       },
       {"\\\\.\\HCD0"}},
      {"an interface alone",
       [](Machine& m) {
         m.hostControllers[0].names = {u"\\\\?\\hc"};
         AddInterfaceController(m, u"\\\\?\\gone", kControllerId);
         AddInterfaceController(m, u"\\\\?\\hc", kControllerId);
       },
       {"\\\\?\\hc"}},
      {"one that is no PCI device stays without hub",
       [](Machine& m) {
         m.devices[1].id = u"ROOT\\USB\\0000";
         m.devices[2].parent = m.devices[1].id;
       },
       {"\\\\.\\HCD0 without hub"}},
      {"one whose root hub does not open", [](Machine& m) { m.hubs.clear(); }, {"\\\\.\\HCD0 without hub"}},
      {"two that fail before their ids are read look the same, and one is in the tree",
       [](Machine& m) {
         m.hostControllers[0].driverKey = u"{usb}\\0091";
         m.hostControllers.push_back({{u"\\\\.\\HCD1"}, u"{usb}\\0092", u"other"});
       },
       {"\\\\.\\HCD0 without hub"}},
  };
  for (const Case& c : cases) {
    Machine machine = OneController(1);
    c.change(machine);
    SimulatedPc pc(machine);
    LoggingHost log(pc);
    CZKUMTopologyWalker walker(log);
    walker.StartWalk();
    std::vector<std::string> found;
    for (const NodePtr& node : walker.m_building->m_childs) {
      const auto& controller = static_cast<const CZKUMHostControllerImpl&>(*node);
      found.push_back(platform::ToUtf8(controller.m_strLeafName) + (controller.m_childs.empty() ? " without hub" : ""));
    }
    EXPECT_EQ(found, c.leafNames) << c.what;
    EXPECT_EQ(pc.Open(), OpenCounts{}) << c.what;
    // The extra detail query of each interface reaches no driver: nothing is opened for it.
    std::size_t details = 0;
    std::size_t opened = 0;
    for (const std::u16string& line : log.Log()) {
      details += line.starts_with(u"GetDeviceInterfaceDetail") ? 1 : 0;
      opened += line.starts_with(u"OpenDevice \\\\?\\") ? 1 : 0;
    }
    EXPECT_EQ(details, 2 * machine.interfaces.size()) << c.what;
    EXPECT_EQ(opened, machine.interfaces.size()) << c.what;
  }
}

TEST(Walk, PortsThatFailCostThemselvesAlone) {
  struct Case {
    const char* what;
    std::uint32_t code;
    std::uint32_t failingPort;
    const char* outline;  // of the root hub's ports 4 and 5
  };
  const Case cases[] = {
      {"probe", platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX, 5,
       "...port status 2 USB\\ROOT_HUB20\\4&1 port 4\n....device  '' speed 1\n"
       "...port status 0 USB\\ROOT_HUB20\\4&1 port 5\n"},
      {"older request", platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, 5,
       "...port status 2 USB\\ROOT_HUB20\\4&1 port 4\n....device  '' speed 1\n"},
      {"driver key", platform::kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME, 5,
       "...port status 2 USB\\ROOT_HUB20\\4&1 port 4\n....device  '' speed 1\n"
       "...port status 1 USB\\ROOT_HUB20\\4&1 port 5\n"
       "....hub USB\\VID_05E3&PID_0610\\2 ''\n"
       ".....port status 0 USB\\VID_05E3&PID_0610\\2 port 1\n"
       ".....port status 1 USB\\VID_05E3&PID_0610\\2 port 2\n"
       "......device  '' speed 1\n"},
      {"hub name", platform::kIOCTL_USB_GET_NODE_CONNECTION_NAME, 5,
       "...port status 2 USB\\ROOT_HUB20\\4&1 port 4\n....device  '' speed 1\n"
       "...port status 0 USB\\ROOT_HUB20\\4&1 port 5\n"},
  };
  for (const Case& c : cases) {
    SimulatedPc pc(Busy());
    ScriptedDriver driver(pc);
    driver.Always(c.code, [&c](const void* in, std::uint32_t, void*, std::uint32_t, std::uint32_t&) {
      const std::uint32_t port = *static_cast<const std::uint32_t*>(in);
      return port == c.failingPort ? platform::Status::Failure(31) : platform::Status::Success();
    });
    const std::size_t live = ConnectionRecord::LiveCount();
    CZKUMTopologyWalker walker(driver);
    walker.StartWalk();
    const std::string outline = OutlineOf(walker.m_building);
    EXPECT_THAT(outline, testing::EndsWith(c.outline)) << c.what;
    // A record per port device and hub below a port; the others are freed, that of a hub without
    // name among them.
    std::size_t owners = 0;
    VisitPreOrder(walker.m_building, [&](const NodePtr& node) {
      owners += node->m_nType == KUDTPortDevice || node->m_nType == KUDTHub ? 1 : 0;
      return true;
    });
    EXPECT_EQ(ConnectionRecord::LiveCount() - live, owners - 1) << c.what;  // less the root hub
    EXPECT_EQ(pc.Open(), OpenCounts{}) << c.what;
  }
}

TEST(Walk, AHubThatDoesNotBuildLeavesItsPortEmptyAndItsRecordFreed) {
  struct Case {
    const char* what;
    void (*change)(Machine&);
  };
  const Case cases[] = {
      {"does not open", [](Machine& m) { m.hubs.pop_back(); }},
      {"has no name",
       [](Machine& m) {
         m.hubs[0].ports[4].hubName.reset();
         m.hubs[0].ports[4].isHub = true;
       }},
      {"names itself above", [](Machine& m) { m.hubs[0].ports[4].hubName = m.hubs[0].name; }},
  };
  for (const Case& c : cases) {
    Machine machine = Busy();
    c.change(machine);
    SimulatedPc pc(machine);
    const std::size_t live = ConnectionRecord::LiveCount();
    CZKUMTopologyWalker walker(pc);
    walker.StartWalk();
    EXPECT_THAT(OutlineOf(walker.m_building), testing::EndsWith("...port status 0 USB\\ROOT_HUB20\\4&1 port 5\n"))
        << c.what;
    EXPECT_EQ(walker.m_nConnectedHubs, 1u) << c.what;
    EXPECT_EQ(ConnectionRecord::LiveCount() - live, 3u) << c.what;
    walker.Abort();
    EXPECT_EQ(ConnectionRecord::LiveCount(), live) << c.what;
  }
}

TEST(Walk, ChainsOfHubsHaveNoLimit) {
  constexpr std::size_t kDepth = 3000;
  Machine machine = OneController(1);
  machine.hubs[0].ports[0] = HubOnPort(u"{k}\\0", u"hub 1");
  for (std::size_t depth = 1; depth < kDepth; ++depth) {
    machine.hubs.push_back({u"hub " + platform::Decimal(static_cast<std::int32_t>(depth)), {}, false});
    machine.hubs.back().ports.push_back(
        HubOnPort(u"{k}\\0", u"hub " + platform::Decimal(static_cast<std::int32_t>(depth + 1))));
  }
  SimulatedPc pc(machine);
  CZKUMTopologyWalker walker(pc);
  walker.StartWalk();
  std::size_t hubs = 0;
  VisitPreOrder(walker.m_building, [&](const NodePtr& node) {
    hubs += node->m_nType == KUDTHub ? 1 : 0;
    return true;
  });
  EXPECT_EQ(hubs, kDepth);
}

// A driver that names its hubs on every port would otherwise make the walk grow with each of them.
TEST(Walk, AHubIsWalkedOnce) {
  constexpr std::size_t kHubs = 12;
  Machine machine = OneController(kHubs);
  for (std::size_t hub = 0; hub < kHubs; ++hub) {
    const Text name = u"hub " + platform::Decimal(static_cast<std::int32_t>(hub));
    machine.hubs.push_back({name, {}, false});
  }
  for (auto& hub : machine.hubs) {
    hub.ports.clear();
    for (std::size_t port = 1; port <= kHubs; ++port) {
      hub.ports.push_back(HubOnPort(u"{k}\\0", machine.hubs[port].name));
    }
  }
  SimulatedPc pc(machine);
  CountingHost host(pc);
  CZKUMTopologyWalker walker(host);
  walker.StartWalk();
  std::size_t hubs = 0;
  VisitPreOrder(walker.m_building, [&](const NodePtr& node) {
    hubs += node->m_nType == KUDTHub ? 1 : 0;
    return true;
  });
  EXPECT_EQ(hubs, kHubs + 1);
  EXPECT_EQ(host.Count(Operation::OpenDevice), 10 + hubs);
}

// Fails every call in turn, once and from then on.
TEST(Walk, AnyCallMayFail) {
  SimulatedPc pc(Busy());
  FailingHost host(pc);
  std::size_t runs = 0;
  for (const bool onwards : {false, true}) {
    for (std::uint64_t call = 1;; ++call) {
      FailurePlan plan;
      plan.call = call;
      plan.onwards = onwards;
      host.SetPlan(plan);
      const std::size_t live = ConnectionRecord::LiveCount();
      const std::size_t kept = ConnectionRecord::KeptCount();
      std::size_t hubsWithRecord = 0;
      {
        CZKUMTopologyWalker walker(host);
        walker.StartWalk();
        ASSERT_NE(walker.m_building, nullptr);
        VisitPreOrder(walker.m_building, [&](const NodePtr& node) {
          hubsWithRecord +=
              node->m_nType == KUDTHub && static_cast<CZKUMHubDeviceImpl&>(*node).m_bHasConnectionInfo ? 1 : 0;
          return true;
        });
      }
      // All that remains is the record of each external hub, by design; sets stay open only where
      // the reading of the device manager stopped at a device without parent.
      EXPECT_EQ(ConnectionRecord::LiveCount() - live, hubsWithRecord) << call;
      EXPECT_EQ(ConnectionRecord::KeptCount() - kept, hubsWithRecord) << call;
      const OpenCounts open = pc.Open();
      EXPECT_EQ(open.files + open.imageLists + open.searches, 0u) << call;
      ++runs;
      if (host.Failures() == 0) break;
    }
  }
  EXPECT_GT(runs, 150u);
  EXPECT_THAT(pc.Misuses(), testing::IsEmpty());
}

}  // namespace
}  // namespace KelvoUHW
