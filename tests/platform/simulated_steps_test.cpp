#include <gmock/gmock.h>

#include <atomic>
#include <thread>
#include <type_traits>
#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "tests/platform/stick_pc.h"

namespace platform::simulated {
namespace {

using testing::ElementsAre;
using testing::Field;

// A keyboard for port 1 of the external hub.
Plug Keyboard() {
  Plug plug;
  plug.fragment.devices = {MakeDevice(u"HID\\KEYS\\1", u"USB\\KEYS\\1", u"HIDClass", u"{hid}\\0000"),
                           MakeDevice(u"USB\\KEYS\\1", kHub, u"HIDClass", u"{hid}\\0001")};
  plug.ports = {{kHubName, 1, {DeviceConnected, Speed::Low, false, {}, u"{hid}\\0001", {}, 1, 0, {}}}};
  return plug;
}

TEST(Unplug, TakesEverythingThatNamesTheStickAndItCanComeBack) {
  const Machine before = StickMachine();
  SimulatedPc pc(before);
  ASSERT_EQ(pc.Apply(UnplugStep(ToLower(std::u16string_view(kStick)))), u"");
  const Machine left = pc.Snapshot();
  EXPECT_THAT(left.devices, ElementsAre(Field(&Device::id, kController), Field(&Device::id, u"USB\\ROOT_HUB30\\4&1"),
                                        Field(&Device::id, kHub), Field(&Device::id, u"ROOT\\VOLMGR\\0000"),
                                        Field(&Device::id, kSystemVolume)));
  EXPECT_THAT(left.interfaces,
              ElementsAre(Field(&Interface::path, kControllerPath), Field(&Interface::path, kSystemVolumePath)));
  EXPECT_TRUE(left.storage.empty()) << "of the disk and of its drive";
  EXPECT_THAT(left.volumes, ElementsAre(Field(&Volume::name, kSystemVolumeName)));
  EXPECT_TRUE(left.volumes[0].folderMounts.empty());
  EXPECT_THAT(left.drives, ElementsAre(Field(&Drive::letter, u'C')));
  EXPECT_EQ(left.hubs[0].ports[0].status, NoDeviceConnected);
  EXPECT_FALSE(left.hubs[0].ports[0].driverKey);
  EXPECT_TRUE(left.hubs[0].ports[1].hubName) << "the other ports stay";

  ASSERT_EQ(pc.Apply({0, u"", StickPlug()}), u"");
  const Machine after = pc.Snapshot();
  EXPECT_EQ(after.devices.size(), before.devices.size());
  EXPECT_EQ(after.interfaces.size(), before.interfaces.size());
  EXPECT_EQ(after.storage.size(), before.storage.size());
  EXPECT_EQ(after.volumes.size(), before.volumes.size());
  EXPECT_EQ(after.drives.size(), before.drives.size());
  EXPECT_EQ(after.hubs[0].ports[0].driverKey, before.hubs[0].ports[0].driverKey);
}

// What is left of the PC with the keyboard and a folder mount on the stick, by what goes.
TEST(Unplug, TakesWhatHangsBelow) {
  Machine before = StickMachine();
  before.volumes[0].paths.push_back(u"e:\\System\\");
  const struct {
    const char16_t* device;
    std::size_t controllers, hubs, devices, volumes, pathsOfSystem;
  } kCases[] = {{kStick, 1, 2, 7, 1, 1}, {kHub, 1, 1, 7, 2, 2}, {kController, 0, 0, 2, 1, 1}};
  for (const auto& test : kCases) {
    SCOPED_TRACE(ToUtf8(test.device));
    SimulatedPc pc(before);
    ASSERT_EQ(pc.Apply({0, u"", Keyboard()}), u"");
    EXPECT_EQ(pc.Snapshot().hubs[1].ports[0].driverKey, u"{hid}\\0001");
    ASSERT_EQ(pc.Apply(UnplugStep(test.device)), u"");
    const Machine left = pc.Snapshot();
    EXPECT_EQ(left.hostControllers.size(), test.controllers);
    ASSERT_EQ(left.hubs.size(), test.hubs);
    EXPECT_EQ(left.devices.size(), test.devices);
    EXPECT_EQ(left.volumes.size(), test.volumes);
    EXPECT_EQ(left.volumes[0].paths.size(), test.pathsOfSystem) << "folders of a lost volume are lost";
    EXPECT_TRUE(left.hubs.empty() || left.hubs[0].ports[1].isHub == (test.hubs == 2));
  }
}

// The keyboard with one list more, or with ports more.
template <class Record>
Step With(std::vector<Record> Machine::*list, const std::type_identity_t<std::vector<Record>>& more) {
  Plug plug = Keyboard();
  (plug.fragment.*list).insert((plug.fragment.*list).begin(), more.begin(), more.end());
  return {0, u"", plug};
}
Step WithPort(const PortChange& port) {
  Plug plug = Keyboard();
  plug.ports.push_back(port);
  return {0, u"", plug};
}

TEST(Steps, RefusedOnesChangeNothing) {
  const Text hub = kHubName, volume = kStickVolumeName;
  const auto device = [](const Text& id, const Text& parent = u"") { return MakeDevice(id, parent, u"USB", u"k"); };
  const auto mount = [](const Text& name, const Text& path) { return Step{0, u"", Mount{name, path}}; };
  const auto dismount = [](const Text& name, const Text& path) { return Step{0, u"", Dismount{name, path}}; };
  const struct {
    Step step;
    Text reason;
  } kCases[] = {
      {UnplugStep(u"USB\\NONE\\1"), u"device USB\\NONE\\1 is missing"},
      {UnplugStep(kRootDeviceId), u"the root device stays"},
      {UnplugStep(u""), u"the root device stays"},
      {With(&Machine::devices, {device(u"usb\\vid_0781&pid_5580\\aa01")}),
       u"device usb\\vid_0781&pid_5580\\aa01 is there already"},
      {With(&Machine::devices, {device(kRootDeviceId)}), u"device HTREE\\ROOT\\0 is there already"},
      {With(&Machine::devices, {device(u"USB\\KEYS\\1")}), u"device USB\\KEYS\\1 is there already"},
      {With(&Machine::devices, {device(u"A", u"USB\\NONE\\1")}), u"parent USB\\NONE\\1 is missing"},
      {With(&Machine::devices, {device(u"A", u"b"), device(u"B", u"a")}), u"the parents of A form a circle"},
      {With(&Machine::interfaces, {{kNullGuid, kDiskPath, kStick}}),
       Text(u"interface ") + kDiskPath + u" is there already"},
      {With(&Machine::interfaces, {{kNullGuid, u"new", u"USB\\NONE\\1"}}),
       u"device USB\\NONE\\1 of interface new is missing"},
      {With(&Machine::hostControllers, {{{u"\\\\.\\hcd0"}, u"k", u"h"}}),
       u"host controller \\\\.\\hcd0 is there already"},
      {With(&Machine::hubs, {{hub, {}, false}}), u"hub " + hub + u" is there already"},
      {With(&Machine::volumes, {{volume, u"", {}, {}, 3, false, {}}}), u"volume " + volume + u" is there already"},
      {With(&Machine::volumes, {{u"new", u"", {u"e:\\"}, {}, 3, false, {}}}), u"path e:\\ is there already"},
      {With(&Machine::drives, {{u'c', 3, {}, u""}}), u"drive c is there already"},
      {With(&Machine::drives, {{u'X', 3, {}, u"USB\\NONE\\1"}}), u"device USB\\NONE\\1 of drive X: is missing"},
      {WithPort({u"USB#NONE", 1, {}}), u"hub USB#NONE is missing"},
      {WithPort({hub, 3, {}}), u"port 3 of hub " + hub + u" is missing"},
      {WithPort({hub, 0, {}}), u"port 0 of hub " + hub + u" is missing"},
      {WithPort(Keyboard().ports[0]), u"port 1 of hub " + hub + u" is taken"},
      {mount(u"none", u"X:\\"), u"volume none is missing"},
      {mount(volume, u"e:\\"), u"path e:\\ is taken"},
      {mount(volume, u"X:"), u"path X: is neither a drive's root nor a folder that ends with \\"},
      {mount(volume, u"C:\\A"), u"path C:\\A is neither a drive's root nor a folder that ends with \\"},
      {dismount(u"none", u"E:\\"), u"volume none is missing"},
      {dismount(volume, u"C:\\"), u"volume " + volume + u" has no path C:\\"}};
  for (const auto& [step, reason] : kCases) {
    SimulatedPc pc(StickMachine());
    EXPECT_EQ(ToUtf8(pc.Apply(step)), ToUtf8(reason));
    const Machine after = pc.Snapshot();
    EXPECT_EQ(after.devices.size() + after.hubs.size() + after.volumes[1].paths.size(), 8u + 2u + 2u) << ToUtf8(reason);
    EXPECT_FALSE(after.hubs[1].ports[0].driverKey) << ToUtf8(reason);
  }
}

TEST(Mounts, AVolumeGetsAndLosesPaths) {
  SimulatedPc pc(StickMachine());
  ASSERT_EQ(pc.Apply({0, u"", Mount{kStickVolumeName, u"X:\\"}}), u"");
  ASSERT_EQ(pc.Apply({0, u"", Mount{kStickVolumeName, u"C:\\Other\\"}}), u"");
  EXPECT_EQ(pc.DriveType(u"X:\\"), kDRIVE_REMOVABLE) << "the letter came with the path";
  char16_t target[64];
  ASSERT_TRUE(pc.DosDeviceTarget(u"X:", target, 64));
  EXPECT_EQ(Text(target), u"\\Device\\HarddiskVolume5");
  EXPECT_EQ(pc.Snapshot().volumes[0].folderMounts.back().folder, u"Other\\");

  for (const char16_t* path : {u"x:\\", u"c:\\other\\", u"E:\\"}) {
    ASSERT_EQ(pc.Apply({0, u"", Dismount{kStickVolumeName, path}}), u"") << ToUtf8(path);
    char16_t name[64];
    EXPECT_FALSE(pc.VolumeNameForMountPoint(path, name, 64)) << ToUtf8(path);
  }
  EXPECT_EQ(pc.DriveType(u"X:\\"), kDRIVE_NO_ROOT_DIR) << "and went with it";
  EXPECT_EQ(pc.DriveType(u"E:\\"), kDRIVE_REMOVABLE) << "the disk's own letter stays";
  EXPECT_EQ(pc.Snapshot().volumes[0].folderMounts.size(), 1u);
  ASSERT_EQ(pc.Apply({0, u"", Mount{kStickVolumeName, u"E:\\"}}), u"");
  EXPECT_EQ(pc.Snapshot().drives.size(), 2u);
}

// Readers on other threads see each step whole or not at all: the disk never without its path.
TEST(Steps, AreSeenWhole) {
  SimulatedPc pc(StickMachine());
  std::atomic<bool> stop = false;
  std::atomic<int> withStick = 0;
  std::atomic<int> withoutStick = 0;
  std::thread reader([&] {
    while (!stop) {
      const Machine seen = pc.Snapshot();
      const bool port = seen.hubs[0].ports[0].driverKey.has_value();
      EXPECT_EQ(seen.devices.size(), port ? 8u : 5u);
      EXPECT_EQ(seen.interfaces.size(), port ? 4u : 2u);
      ++(port ? withStick : withoutStick);
      FileHandle handle = kInvalidHandle;
      if (!pc.OpenDevice(kDiskPath, 0, 0, handle)) continue;
      std::uint32_t returned = 0;
      pc.DeviceControl(handle, 0x2D1080, nullptr, 0, nullptr, 0, returned);
      EXPECT_TRUE(pc.CloseDevice(handle));
    }
  });
  for (int round = 0; round < 20000 && (withStick < 50 || withoutStick < 50); ++round) {
    EXPECT_EQ(pc.Apply(UnplugStep(kStick)), u"");
    EXPECT_EQ(pc.Apply({0, u"", StickPlug()}), u"");
  }
  stop = true;
  reader.join();
  EXPECT_GE(withStick, 50);
  EXPECT_GE(withoutStick, 50);
  EXPECT_EQ(pc.Open(), OpenCounts{});
}

}  // namespace
}  // namespace platform::simulated
