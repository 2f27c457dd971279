#include "tree/topology_walker.h"

#include <gmock/gmock.h>

#include <algorithm>

#include "bench/small_pcs.h"
#include "devinfo/disk_letters.h"
#include "devinfo/info_device_cache.h"
#include "platform/wrappers/counting_host.h"
#include "platform/wrappers/logging_host.h"
#include "records/device_set.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/outline.h"
#include "tests/support/scripted_driver.h"

namespace KelvoUHW {
namespace {

using platform::simulated::OpenCounts, platform::simulated::SimulatedPc;
using platform::wrappers::LoggingHost, platform::wrappers::Operation;
using testing::EndsWith, testing::HasSubstr;

std::size_t Count(const NodePtr& root, bool (*counts)(const CZKUMUsbTreeNodeImpl&)) {
  std::size_t count = 0;
  VisitPreOrder(root, [&](const NodePtr& node) {
    count += counts(*node) ? 1 : 0;
    return true;
  });
  return count;
}
bool IsHub(const CZKUMUsbTreeNodeImpl& node) { return node.m_nType == KUDTHub; }

// A root hub with a mouse, an unconfigured device, an empty port, a failed device and a hub of two
// ports with a device of unknown driver key.
Machine Busy() {
  constexpr char16_t kHubId[] = u"USB\\VID_05E3&PID_0610\\2";
  Machine machine = OneController(5);
  machine.devices.insert(machine.devices.end(),
                         {DeviceNode(u"USB\\VID_046D&PID_C52B\\7", kRootHubId, u"HIDClass", u"{usb}\\0004", u"Mouse"),
                          DeviceNode(kHubId, kRootHubId, u"USB", u"{usb}\\0005", u"Generic Hub")});
  auto& ports = machine.hubs[0].ports;
  ports[0] = DevicePort(u"{USB}\\0004", 0x046D, 0xC52B);
  ports[0].speed = platform::simulated::Speed::Low;
  ports[1] = DevicePort(u"{usb}\\0009", 1, 2);
  ports[1].configuration = 0;
  ports[3].status = 2;
  ports[4] = HubOnPort(u"{usb}\\0005", HubName(kHubId));
  machine.hubs.push_back({HubName(kHubId), {{}, DevicePort(u"{usb}\\0099", 3, 4)}, false});
  machine.hubs[1].ports[1].driverKey.reset();
  return machine;
}

const char* const kBusyOutline =
    "Abstract root\n"
    ".controller PCI\\VEN_8086&DEV_1C26&SUBSYS_1C268086&REV_05\\3&11583659&0&E8\n"
    "..hub USB\\ROOT_HUB20\\4&1 'RootHub'\n"
    "...port 1 status 1 USB\\ROOT_HUB20\\4&1 port 1\n"
    "....device USB\\VID_046D&PID_C52B\\7 'Mouse' {USB}\\0004 speed 0\n"
    "...port 2 status 2 USB\\ROOT_HUB20\\4&1 port 2\n"
    "....device  '' {usb}\\0009 speed 1\n"
    "...port 3 status 0 USB\\ROOT_HUB20\\4&1 port 3\n"
    "...port 4 status 2 USB\\ROOT_HUB20\\4&1 port 4\n"
    "....device  ''  speed 1\n"
    "...port 5 status 1 USB\\ROOT_HUB20\\4&1 port 5\n"
    "....hub USB\\VID_05E3&PID_0610\\2 'Generic Hub'\n"
    ".....port 1 status 0 USB\\VID_05E3&PID_0610\\2 port 1\n"
    ".....port 2 status 1 USB\\VID_05E3&PID_0610\\2 port 2\n"
    "......device  ''  speed 1\n";

TEST(Walk, EveryPortThatAnswersIsInTheTree) {
  SimulatedPc pc(Busy());
  CZKUMTopologyWalker walker(pc);
  walker.StartWalk();
  EXPECT_EQ(OutlineOf(walker.m_building), kBusyOutline);
  const auto nodeless = [](const auto& node) { return node.m_nType == KUDTPortDevice && node.m_devInstHandle == 0; };
  EXPECT_EQ(Count(walker.m_building, nodeless), 3u);
  EXPECT_EQ(std::pair(walker.m_nConnectedDevices, walker.m_nConnectedHubs), std::pair(4u, 1u));
  EXPECT_EQ(pc.Open(), OpenCounts{});
  walker.Commit();
  EXPECT_EQ(walker.m_building, nullptr);
  walker.StartWalk();
  EXPECT_EQ(walker.m_nConnectedDevices, 4u);  // of this walk alone
  walker.Abort();
  EXPECT_EQ(OutlineOf(walker.m_current), kBusyOutline);
}

// Every controller and hub is opened for writing, shared for writing, and nothing else.
struct AccessHost final : ScriptedDriver {
  using ScriptedDriver::ScriptedDriver;
  platform::Status OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                              platform::FileHandle& handle) noexcept override {
    EXPECT_EQ(std::pair(access, share), std::pair(0x40000000u, 2u));
    return ScriptedDriver::OpenDevice(path, access, share, handle);
  }
};

// 4 or 8 bytes of head, the characters of a name and their zero; a root hub's name takes nothing in.
TEST(Walk, RequestsOfAPortGoInOrder) {
  SimulatedPc pc(Busy());
  AccessHost host(pc);
  LoggingHost log(host);
  CZKUMTopologyWalker(log).StartWalk();
  std::string requests;
  for (const Text& line : log.Log()) {
    const bool open = line.starts_with(u"OpenDevice") || line.starts_with(u"CloseDevice");
    if (open || line.starts_with(u"DeviceControl")) requests += platform::ToUtf8(line) + "\n";
  }
  const std::string hub = "f18a0e88-c30c-11d0-8815-00a0c906bed8} = ";
  const char* const connection = "DeviceControl #2 0x220448 in 365 out 365\nDeviceControl #2 0x22040C in 365 out 365\n";
  EXPECT_THAT(requests,
              testing::StartsWith("OpenDevice \\\\.\\HCD0 = #1\n"
                                  "DeviceControl #1 0x220424 in 512 out 512\nDeviceControl #1 0x220408 out 512\n"
                                  "OpenDevice \\\\.\\USB#ROOT_HUB20#4&1#{" +
                                  hub + "#2\nDeviceControl #2 0x220408 in 76 out 76\n" + connection +
                                  "DeviceControl #2 0x220420 in 512 out 512\n" + connection));
  // The hub on the last port is opened with the port's hub still open, and closed before it.
  EXPECT_THAT(requests, HasSubstr("DeviceControl #2 0x220414 in 512 out 512\n"
                                  "OpenDevice \\\\.\\USB#VID_05E3&PID_0610#2#{" +
                                  hub + "#3\n"));
  EXPECT_THAT(requests, HasSubstr("CloseDevice #3\nCloseDevice #2\nCloseDevice #1\nOpenDevice \\\\.\\HCD1 ! 2\n"));
  EXPECT_THAT(requests, EndsWith("OpenDevice \\\\.\\HCD9 ! 2\n"));
}

constexpr char16_t kHcd3[] = u"\\\\.\\HCD3";
void AddHcd1(Machine& machine, const char16_t* driverKey) {
  machine.hostControllers.push_back({{u"\\\\.\\HCD1"}, driverKey, u"other"});
}
// A device interface of the all-zero class leads to a controller of its own path.
Text AddInterface(Machine& machine, const Text& path) {
  return machine.interfaces.emplace_back(platform::simulated::Interface{platform::kNullGuid, path, kControllerId}).path;
}
void Name(Machine& machine, const Text& name, bool oneMore = false) {
  auto& names = machine.hostControllers[0].names;
  if (!oneMore) names.clear();
  names.push_back(name);
}
void RenameController(Machine& machine, const char16_t* id) { machine.devices[1].id = machine.devices[2].parent = id; }

TEST(Walk, SourcesAndIdentityOfControllers) {
  // Device, revision and description are read in this order, and a missing part ends it.
  const std::string id = platform::ToUtf8(kControllerId), complete = " " + id + " 5 'EHCI Controller'";
  const std::tuple<const char*, void (*)(Machine&), std::string> cases[] = {
      {"none", [](Machine& m) { m.hostControllers.clear(); }, ""},
      {"a number above nine", [](Machine& m) { Name(m, u"\\\\.\\HCD10"); }, ""},
      {"two names for one controller", [](Machine& m) { Name(m, kHcd3), Name(m, u"\\\\.\\HCD7", true); },
       "\\\\.\\HCD3" + complete},
      {"a second controller with the same driver key in other case", [](Machine& m) { AddHcd1(m, u"{USB}\\0000"); },
       "\\\\.\\HCD0" + complete},
      {"no driver key", [](Machine& m) { m.hostControllers[0].driverKey.reset(); }, ""},
      {"an interface and a name for one controller", [](Machine& m) { Name(m, AddInterface(m, u"\\\\?\\hc"), true); },
       "\\\\.\\HCD0" + complete},
      {"an interface alone, behind one that leads nowhere",
       [](Machine& m) { AddInterface(m, u"\\\\?\\gone"), Name(m, AddInterface(m, u"\\\\?\\hc")); },
       "\\\\?\\hc" + complete},
      {"no device with that driver key", [](Machine& m) { m.devices[1].driver = u"{usb}\\0099"; },
       "\\\\.\\HCD0  0 '' without hub"},
      {"no PCI device", [](Machine& m) { RenameController(m, u"ROOT\\USB\\0000"); },
       "\\\\.\\HCD0 ROOT\\USB\\0000 0 '' without hub"},
      {"no revision", [](Machine& m) { RenameController(m, u"PCI\\VEN_8086&DEV_1C26&SUBSYS_1C268086\\1"); },
       "\\\\.\\HCD0 PCI\\VEN_8086&DEV_1C26&SUBSYS_1C268086\\1 0 '' without hub"},
      {"no description", [](Machine& m) { m.devices[1].description.reset(); },
       "\\\\.\\HCD0 " + id + " 5 '' without hub"},
      {"an empty description", [](Machine& m) { m.devices[1].description = u""; },
       "\\\\.\\HCD0 " + id + " 5 '' without hub"},
      {"no root hub", [](Machine& m) { m.hostControllers[0].rootHub.reset(); },
       "\\\\.\\HCD0" + complete + " without hub"},
      {"a root hub that does not open", [](Machine& m) { m.hubs.clear(); }, "\\\\.\\HCD0" + complete + " without hub"},
      {"two that fail before their ids are read look the same, and one is in the tree",
       [](Machine& m) { m.hostControllers[0].driverKey = u"{usb}\\0091", AddHcd1(m, u"{usb}\\0092"); },
       "\\\\.\\HCD0  0 '' without hub"}};
  for (const auto& [what, change, controllers] : cases) {
    Machine machine = OneController(1);
    change(machine);
    SimulatedPc pc(machine);
    LoggingHost log(pc);
    CZKUMTopologyWalker walker(log);
    walker.StartWalk();
    std::string found;
    for (const NodePtr& node : walker.m_building->m_childs) {
      const auto& controller = static_cast<const CZKUMHostControllerImpl&>(*node);
      found += platform::ToUtf8(controller.m_strLeafName + u" " + controller.m_strDevInstId) + " " +
               std::to_string(controller.m_nPciRevision) + " '" + platform::ToUtf8(controller.m_strDeviceDescr) + "'" +
               (controller.m_childs.empty() ? " without hub" : "");
      EXPECT_EQ(controller.m_devInstHandle, controller.m_strDevInstId.empty() ? 0u : 2u) << what;
      if (controller.m_childs.empty()) continue;
      EXPECT_EQ(controller.m_nPciVendorId << 16 | controller.m_nPciDeviceId, 0x80861C26u);
      EXPECT_EQ(controller.m_nPciSubSysId, 0x1C268086u);
    }
    EXPECT_EQ(found, controllers) << what;
    EXPECT_EQ(pc.Open(), OpenCounts{}) << what;
    // The extra detail query of each interface reaches no driver: nothing is opened for it.
    const auto count = [&](const char16_t* call) {
      return std::ranges::count_if(log.Log(), [&](const Text& line) { return line.starts_with(call); });
    };
    const auto interfaces = static_cast<std::ptrdiff_t>(machine.interfaces.size());
    EXPECT_EQ(count(u"GetDeviceInterfaceDetail"), interfaces) << what;
    EXPECT_EQ(count(u"OpenDevice \\\\?\\"), interfaces) << what;
    EXPECT_EQ(count(u"OpenDevice \\\\.\\ "), 0) << what << ": a root hub without name";
  }
}

TEST(Walk, AControllerIsAddedOnce) {
  Machine machine = OneController(1);
  AddHcd1(machine, u"{usb}\\0077");
  SimulatedPc pc(machine);
  DeviceFile first(pc), second(pc);
  EXPECT_TRUE(first.Open(u"\\\\.\\HCD0", platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE));
  EXPECT_TRUE(second.Open(u"\\\\.\\HCD1", platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE));
  CZKUMTopologyWalker walker(pc);
  const auto add = [&](const DeviceFile& file) { return walker.AddHostController(file.Get(), u"name"); };
  EXPECT_FALSE(add(first)) << "no walk has begun";
  walker.m_building = MakeRecord<CZKUMUsbTreeRootImpl>();
  EXPECT_TRUE(add(first));
  EXPECT_FALSE(add(first));
  second.Close();
  EXPECT_FALSE(add(second)) << "it has no key";
  EXPECT_EQ(walker.m_building->m_childs.size(), 1u);
  const auto controller = MakeRecord<CZKUMHostControllerImpl>();
  for (const auto& [key, known] : {std::pair{u"{usb}\\0000", true}, {u"{usb}\\0077", false}}) {
    controller->m_strDriverKeyName = key;
    EXPECT_EQ(walker.AddRootHub(controller, first.Get()), known);
  }
}

// Neither a request that fails nor a hub that does not build costs more than the root hub's port 5.
TEST(Walk, PortsThatFailCostThemselvesAlone) {
  const std::string noDevice = "...port 5 status 0 USB\\ROOT_HUB20\\4&1 port 5\n";
  const auto leave = [](Machine&) {};
  // The request that fails, the outline of port 5 and the number of hubs.
  const std::tuple<const char*, std::uint32_t, void (*)(Machine&), std::string, std::uint32_t> cases[] = {
      {"probe", platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX, leave, noDevice, 0},
      {"older request", platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, leave, "", 0},
      {"driver key", platform::kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME, leave,
       "...port 5 status 1 USB\\ROOT_HUB20\\4&1 port 5\n....hub USB\\VID_05E3&PID_0610\\2 ''\n"
       ".....port 1 status 0 USB\\VID_05E3&PID_0610\\2 port 1\n.....port 2 status 1 USB\\VID_05E3&PID_0610\\2 port 2\n"
       "......device  ''  speed 1\n",
       1},
      {"hub name", platform::kIOCTL_USB_GET_NODE_CONNECTION_NAME, leave, noDevice, 1},
      {"a hub that does not open", 0, [](Machine& m) { m.hubs.pop_back(); }, noDevice, 1},
      {"a hub that names one above", 0, [](Machine& m) { m.hubs[0].ports[4].hubName = m.hubs[0].name; }, noDevice, 1}};
  for (const auto& [what, code, change, outline, hubs] : cases) {
    Machine machine = Busy();
    change(machine);
    SimulatedPc pc(machine);
    ScriptedDriver driver(pc);
    driver.Always(code, [](const void* in, void*, std::uint32_t, std::uint32_t&) {
      const std::uint32_t port = *static_cast<const std::uint32_t*>(in);
      return port == 5 ? platform::Status::Failure(31) : platform::Status::Success();
    });
    const std::size_t live = ConnectionRecord::LiveCount();
    CZKUMTopologyWalker walker(driver);
    walker.StartWalk();
    EXPECT_THAT(OutlineOf(walker.m_building),
                EndsWith("...port 4 status 2 USB\\ROOT_HUB20\\4&1 port 4\n....device  ''  speed 1\n" + outline))
        << what;
    EXPECT_EQ(walker.m_nConnectedHubs, hubs) << what;
    // A record per port device and hub below a port, not for the root hub; the others are freed, that
    // of a hub without name among them.
    const auto owns = [](const auto& node) { return node.m_nType == KUDTPortDevice || IsHub(node); };
    EXPECT_EQ(ConnectionRecord::LiveCount() - live, Count(walker.m_building, owns) - 1) << what;
    EXPECT_EQ(pc.Open(), OpenCounts{}) << what;
  }
}

// Chains of hubs have no limit that a PC could reach. A driver that names its hubs on every port would otherwise make
// the walk grow with each of them.
TEST(Walk, AHubIsWalkedOnce) {
  for (const auto& [hubs, ports] : {std::pair(12u, 12u), std::pair(3000u, 1u)}) {
    Machine machine = OneController(0);
    for (std::uint32_t hub = 1; hub <= hubs; ++hub) {
      machine.hubs.push_back({u"hub " + platform::Decimal(static_cast<std::int32_t>(hub)), {}, false});
    }
    for (std::uint32_t hub = 0; hub <= hubs; ++hub) {
      // The only port of a hub in a chain leads to the next hub, that of the last one back.
      for (std::uint32_t port = 0; port < ports; ++port) {
        const std::uint32_t next = ports == 1 ? (hub + 1) % (hubs + 1) : port + 1;
        machine.hubs[hub].ports.push_back(HubOnPort(u"{k}\\0", machine.hubs[next].name));
      }
    }
    SimulatedPc pc(machine);
    platform::wrappers::CountingHost host(pc);
    CZKUMTopologyWalker walker(host);
    walker.StartWalk();
    EXPECT_EQ(Count(walker.m_building, IsHub), hubs + 1);
    EXPECT_EQ(host.Count(Operation::OpenDevice), 10 + hubs + 1);
  }
}

// Every port of every hub has a hub that nobody has seen. Opened hubs have numbers from kHub on.
struct EndlessHubs final : ScriptedDriver {
  static constexpr platform::FileHandle kHub = 1 << 20;
  using ScriptedDriver::ScriptedDriver;
  platform::Status OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                              platform::FileHandle& handle) noexcept override {
    if (Text(path).starts_with(u"\\\\.\\HCD")) return ScriptedDriver::OpenDevice(path, access, share, handle);
    return handle = kHub + ++hubs, platform::Status::Success();
  }
  platform::Status CloseDevice(platform::FileHandle handle) noexcept override {
    closed += handle >= kHub ? 1 : 0;
    return handle >= kHub ? platform::Status::Success() : ScriptedDriver::CloseDevice(handle);
  }
  platform::Status DeviceControl(platform::FileHandle handle, std::uint32_t code, const void* in, std::uint32_t inBytes,
                                 void* out, std::uint32_t outBytes, std::uint32_t& returned) noexcept override {
    if (handle < kHub) return ScriptedDriver::DeviceControl(handle, code, in, inBytes, out, outBytes, returned);
    if (code == platform::kIOCTL_USB_GET_NODE_INFORMATION) {
      static_cast<platform::USB_NODE_INFORMATION*>(out)->HubDescriptor.bNumberOfPorts = 255;
    } else if (code == platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION) {
      static_cast<platform::LegacyConnectionInformation*>(out)->Info.DeviceIsHub = 1;
    } else if (code == platform::kIOCTL_USB_GET_NODE_CONNECTION_NAME) {
      const Text name = platform::Decimal(++names);
      return NameAnswer(8, 100, name, static_cast<std::uint32_t>(8 + name.size() * 2))(in, out, outBytes, returned);
    }
    return platform::Status::Success();
  }
  platform::FileHandle hubs = 0, closed = 0;
  std::int32_t names = 0;
};

// Every set has an element more, of which nothing can be read.
struct EndlessSets final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  platform::Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override {
    const bool reads =
        call.operation == Operation::GetDeviceRegistryProperty || call.operation == Operation::GetDeviceInterfaceDetail;
    return reads ? platform::Status::Failure(platform::kERROR_INVALID_DATA) : platform::Status::Success();
  }
  platform::Status EnumDeviceInfo(platform::DeviceSetHandle, std::uint32_t index,
                                  platform::SP_DEVINFO_DATA& data) noexcept override {
    return data.DevInst = 1'000 + index, ++devices, platform::Status::Success();
  }
  platform::Status EnumDeviceInterfaces(platform::DeviceSetHandle, const platform::Guid&, std::uint32_t,
                                        platform::SP_DEVICE_INTERFACE_DATA&) noexcept override {
    return ++interfaces, platform::Status::Success();
  }
  std::pair<std::uint32_t, std::uint32_t> Taken() { return {std::exchange(devices, 0), std::exchange(interfaces, 0)}; }
  std::uint32_t devices = 0, interfaces = 0;
};

TEST(Walk, SetsWithoutEndAreLeft) {
  SimulatedPc pc(OneController(0));
  EndlessSets endless(pc);
  CZKUMTopologyWalker walker(endless);
  walker.StartWalk();
  EXPECT_EQ(endless.Taken(), std::pair(kMostElements, kMostElements));
  EXPECT_EQ(InfoDeviceCache(endless, walker.Answers()).EnumerateDeviceNodes({}), 0u);
  EXPECT_EQ(endless.Taken(), std::pair(kMostElements, 0u));
  EXPECT_EQ(DiskLetterFinder(endless).FindStorageDevInstByDeviceNumber(1, platform::kDRIVE_FIXED, u""), 0u);
  EXPECT_EQ(endless.Taken(), std::pair(0u, kMostElements));
  EXPECT_EQ(pc.Open(), OpenCounts{});
}

TEST(Walk, HubsWithoutEndAreLeft) {
  SimulatedPc pc(OneController(0));
  EndlessHubs endless(pc);
  CZKUMTopologyWalker walker(endless);
  walker.StartWalk();
  EXPECT_EQ(endless.hubs, 20'000);
  EXPECT_EQ(endless.closed, 20'000);
  EXPECT_EQ(Count(walker.m_building, [](const auto& node) { return node.m_nType == KUDTHubPort; }), 200'000u);
}

}  // namespace
}  // namespace KelvoUHW
