#include "simulation/machine/steps.h"

#include <gtest/gtest.h>

#include <fstream>

#include "platform/host.h"
#include "tests/simulation/stick_pc.h"

namespace platform::simulated {
namespace {

// "8 4 1 2 2": devices, interfaces, controllers, hubs and storage; "xx- --": the ports; then the volumes with their
// paths and, in brackets, the folders in which others are mounted; at last the drives with their types.
std::string Outline(const Machine& pc) {
  std::string text;
  for (const std::size_t size :
       {pc.devices.size(), pc.interfaces.size(), pc.hostControllers.size(), pc.hubs.size(), pc.storage.size()}) {
    text += std::to_string(size) + " ";
  }
  for (const Hub& hub : pc.hubs) {
    for (const Port& port : hub.ports) text += port.status == 0 && !port.driverKey && !port.hubName ? "-" : "x";
    text += " ";
  }
  for (const Volume& volume : pc.volumes) {
    text += "|";
    for (const Text& path : volume.paths) text += " " + ToUtf8(path);
    for (const FolderMount& mount : volume.folderMounts) text += " (" + ToUtf8(mount.folder) + ")";
  }
  text += pc.volumes.empty() ? "| " : " | ";
  for (const Drive& drive : pc.drives) text += ToUtf8(Text(1, drive.letter)) + std::to_string(drive.type);
  return text;
}

Device Node(const Text& id, const Text& parent) {
  Device device;
  device.id = id;
  device.parent = parent;
  return device;
}

TEST(Steps, ChangeWhatBelongsTogetherOrSayWhyNot) {
  Machine start = StickMachine();
  start.devices.push_back(Node(u"USB\\A/B\\1", kHub));
  start.hubs[1].ports[0].hubName = u"USB#A/B#1#{f18a0e88}";
  start.hubs.push_back({u"usb#a#b#1#{f18a0e88}", std::vector<Port>(1), false});
  start.drives.push_back({u'D', kDRIVE_CDROM, {}, start.devices[0].id});  // without a disc
  start.volumes[0].folderMounts.push_back({u"Other\\", u"\\\\?\\Volume{6}\\"});
  start.volumes[0].folderMounts.push_back({u"mount\\stick\\", u"\\\\?\\Volume{6}\\"});
  start.volumes.push_back({u"\\\\?\\Volume{6}\\", {}, {u"C:\\Other\\"}, {}, kDRIVE_FIXED, false, {}});
  // The steps, a tab, what is left of the PC or the reason.
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/machine/steps.tsv");
  int cases = 0;
  for (std::string steps, expected; std::getline(file, steps, '\t') && std::getline(file, expected); ++cases) {
    Machine pc = start;
    std::string found;
    try {
      for (const Step& step : ParseScript("{\"steps\": [" + steps + "]}", "s.json", start)) {
        EXPECT_EQ(std::visit([&](const auto& change) { return CarryOut(pc, change); }, step.change), u"");
      }
      found = Outline(pc);
    } catch (const MachineFileError& error) {
      found = error.what();
    }
    EXPECT_EQ(found, expected) << steps;
  }
  EXPECT_EQ(cases, 27);
  // A letter of the volume's own has its device behind it; a volume goes with a device that is named by nobody else.
  ASSERT_EQ(CarryOut(start, Mount{kStickVolumeName, u"q:\\"}), u"");
  EXPECT_EQ(start.drives.back().dosDevice, u"\\Device\\HarddiskVolume5");
  EXPECT_EQ(start.drives.back().device, kStickVolume);
  start.volumes[2].device = u"STORAGE\\X\\_??_A#{1}_#{2}";
  ASSERT_EQ(CarryOut(start, Unplug{start.devices[8].id}), u"");
  EXPECT_EQ(start.volumes.size(), 3u);
  start.volumes[2].device = u"STORAGE\\X\\_??_USBSTOR#DISK&VEN_SANDISK#AA01&0#{1}#{2}";
  ASSERT_EQ(CarryOut(start, Unplug{kDisk}), u"");
  EXPECT_EQ(start.volumes.size(), 1u);
}

TEST(Steps, PlugRefusesWhatIsThereOrMissing) {
  const Machine pc = StickMachine();
  // What comes, a tab, the reason. Some of it is wrong by itself, too, which is not what is asked here.
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/machine/refused-plugs.tsv");
  int cases = 0;
  for (std::string json, reason; std::getline(file, json, '\t') && std::getline(file, reason); ++cases) {
    Machine changed = pc;
    std::vector<std::string> faults;
    EXPECT_EQ(ToUtf8(CarryOut(changed, Plug{ParseMachine(json, "f", faults), {}})), reason) << json;
  }
  EXPECT_EQ(cases, 15);
  Machine changed = pc;
  Plug plug;
  plug.fragment.interfaces = {{{}, u"P", u""}};
  EXPECT_EQ(CarryOut(changed, plug), u"device  of interface P is missing");
  plug.fragment.interfaces.clear();
  plug.fragment.devices = {Node(u"N", u"m"), Node(u"M", kRootDeviceId)};
  plug.fragment.volumes = {{u"V", {}, {}, {}, 3, false, {}}};
  plug.fragment.drives = {{u'Q', 3, {}, {}}};
  EXPECT_EQ(CarryOut(changed, plug), u"");
  EXPECT_EQ(Outline(changed), "10 4 1 2 2 xx- -- | C:\\ (Mount\\Stick\\)| E:\\ C:\\Mount\\Stick\\| | E2C3Q3");
  // The port, and what the hub's second one has already.
  const std::string hub = " of hub " + ToUtf8(kHubName);
  const std::optional<Text> none, some = u"k";
  const std::tuple<std::uint32_t, std::uint32_t, std::optional<Text>, std::optional<Text>, std::string> kPorts[] = {
      {0, 0, none, none, "port 0" + hub + " is missing"}, {3, 0, none, none, "port 3" + hub + " is missing"},
      {2, 2, none, none, "port 2" + hub + " is taken"},   {2, 0, some, none, "port 2" + hub + " is taken"},
      {2, 0, none, some, "port 2" + hub + " is taken"},   {2, 0, none, none, ""}};
  for (const auto& [index, status, driverKey, hubName, reason] : kPorts) {
    changed = pc;
    Port& port = changed.hubs[1].ports[1];
    std::tie(port.status, port.driverKey, port.hubName) = std::tie(status, driverKey, hubName);
    EXPECT_EQ(ToUtf8(CarryOut(changed, Plug{{}, {{kHubName, index, pc.hubs[0].ports[0]}}})), reason);
    EXPECT_EQ(port.driverKey == u"{usb}\\0003", reason.empty());
  }
  EXPECT_EQ(CarryOut(changed, Plug{{}, {{u"X", 1, {}}}}), u"hub X is missing");
}

}  // namespace
}  // namespace platform::simulated
