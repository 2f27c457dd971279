#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <thread>
#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "tests/platform/stick_pc.h"

namespace platform::simulated {
namespace {

using testing::ElementsAre;

template <class Record>
std::vector<Text> Names(const std::vector<Record>& records, Text Record::*name) {
  std::vector<Text> names;
  for (const Record& record : records) names.push_back(record.*name);
  return names;
}

// A keyboard for port 1 of the external hub.
Plug Keyboard() {
  Plug plug;
  plug.fragment.devices = {
      MakeDevice(u"HID\\KEYS\\1", u"USB\\KEYS\\1", u"HIDClass", u"{hid}\\0000"),
      MakeDevice(u"USB\\KEYS\\1", kHub, u"HIDClass", u"{hid}\\0001")};
  Port port;
  port.status = DeviceConnected;
  port.driverKey = u"{hid}\\0001";
  plug.ports = {{kHubName, 1, port}};
  return plug;
}

// What comes back with the stick.
Plug StickPlug() {
  const Machine whole = StickMachine();
  Plug back;
  back.fragment.devices = {whole.devices[3], whole.devices[4], whole.devices[6]};
  back.fragment.interfaces = {whole.interfaces[1], whole.interfaces[2]};
  back.fragment.storage = whole.storage;
  back.fragment.volumes = {whole.volumes[1]};
  back.fragment.drives = {whole.drives[0]};
  back.ports = {{ToUpper(std::u16string_view(kRootHubName)), 1, whole.hubs[0].ports[0]}};
  return back;
}

TEST(Unplug, TakesEverythingThatNamesTheStick) {
  SimulatedPc pc(StickMachine());
  ASSERT_EQ(pc.Apply(UnplugStep(ToLower(std::u16string_view(kStick)))), u"");
  const Machine left = pc.Snapshot();
  EXPECT_THAT(Names(left.devices, &Device::id),
              ElementsAre(kController, u"USB\\ROOT_HUB30\\4&1", kHub, u"ROOT\\VOLMGR\\0000",
                          u"STORAGE\\VOLUME\\{5C31}#01"));
  EXPECT_THAT(Names(left.interfaces, &Interface::path),
              ElementsAre(kControllerPath, u"\\\\?\\STORAGE#Volume#{5c31}#01#{53f5630d}"));
  EXPECT_TRUE(left.storage.empty()) << "of the disk and of its drive";
  EXPECT_THAT(Names(left.volumes, &Volume::name), ElementsAre(kSystemVolumeName));
  EXPECT_TRUE(left.volumes[0].folderMounts.empty());
  ASSERT_EQ(left.drives.size(), 1u);
  EXPECT_EQ(left.drives[0].letter, u'C');
  EXPECT_EQ(left.hubs[0].ports[0].status, NoDeviceConnected);
  EXPECT_FALSE(left.hubs[0].ports[0].driverKey);
  EXPECT_TRUE(left.hubs[0].ports[1].hubName) << "the other ports stay";
}

TEST(Unplug, AHubTakesWhatHangsBelow) {
  SimulatedPc pc(StickMachine());
  ASSERT_EQ(pc.Apply({0, u"", Keyboard()}), u"");
  EXPECT_EQ(pc.Snapshot().hubs[1].ports[0].driverKey, u"{hid}\\0001");
  ASSERT_EQ(pc.Apply(UnplugStep(kHub)), u"");
  const Machine left = pc.Snapshot();
  EXPECT_EQ(left.devices.size(), StickMachine().devices.size() - 1);
  EXPECT_THAT(Names(left.hubs, &Hub::name), ElementsAre(kRootHubName));
  EXPECT_FALSE(left.hubs[0].ports[1].isHub);
  EXPECT_EQ(left.volumes.size(), 2u);
}

TEST(Unplug, AControllerTakesItsHubs) {
  SimulatedPc pc(StickMachine());
  ASSERT_EQ(pc.Apply(UnplugStep(kController)), u"");
  const Machine left = pc.Snapshot();
  EXPECT_TRUE(left.hostControllers.empty());
  EXPECT_TRUE(left.hubs.empty());
  EXPECT_EQ(left.devices.size(), 2u);
}

TEST(Unplug, FoldersOfALostVolumeAreLost) {
  Machine machine = StickMachine();
  machine.volumes[0].paths.push_back(u"e:\\System\\");
  SimulatedPc pc(machine);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  EXPECT_THAT(pc.Snapshot().volumes[0].paths, ElementsAre(u"C:\\"));
}

TEST(Plug, WhatLeftCanComeBack) {
  const Machine before = StickMachine();
  SimulatedPc pc(before);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  ASSERT_EQ(pc.Apply({0, u"", StickPlug()}), u"");
  const Machine after = pc.Snapshot();
  EXPECT_EQ(after.devices.size(), before.devices.size());
  EXPECT_EQ(after.interfaces.size(), before.interfaces.size());
  EXPECT_EQ(after.storage.size(), before.storage.size());
  EXPECT_EQ(after.volumes.size(), before.volumes.size());
  EXPECT_EQ(after.drives.size(), before.drives.size());
  EXPECT_EQ(after.hubs[0].ports[0].driverKey, before.hubs[0].ports[0].driverKey);
}

TEST(Steps, RefusedOnesChangeNothing) {
  const auto plugWith = [](const std::function<void(Plug&)>& change) {
    Plug plug = Keyboard();
    change(plug);
    return Step{0, u"", plug};
  };
  const struct {
    Step step;
    Text reason;
  } kCases[] = {
      {UnplugStep(u"USB\\NONE\\1"), u"device USB\\NONE\\1 is missing"},
      {UnplugStep(kRootDeviceId), u"the root device stays"},
      {UnplugStep(u""), u"the root device stays"},
      {plugWith([](Plug& p) { p.fragment.devices[0].id = ToLower(std::u16string_view(kStick)); }),
       u"device usb\\vid_0781&pid_5580\\aa01 is there already"},
      {plugWith([](Plug& p) { p.fragment.devices[0].id = kRootDeviceId; }),
       u"device HTREE\\ROOT\\0 is there already"},
      {plugWith([](Plug& p) { p.fragment.devices[0].id = p.fragment.devices[1].id; }),
       u"device USB\\KEYS\\1 is there already"},
      {plugWith([](Plug& p) { p.fragment.devices[1].parent = u"USB\\NONE\\1"; }),
       u"parent USB\\NONE\\1 is missing"},
      {plugWith([](Plug& p) { p.fragment.devices[1].parent = u"hid\\keys\\1"; }),
       u"the parents of HID\\KEYS\\1 form a circle"},
      {plugWith([](Plug& p) {
         p.fragment.interfaces = {{kNullGuid, kDiskPath, kStick}};
       }),
       Text(u"interface ") + kDiskPath + u" is there already"},
      {plugWith([](Plug& p) {
         p.fragment.interfaces = {{kNullGuid, u"new", u"USB\\NONE\\1"}};
       }),
       u"device USB\\NONE\\1 of interface new is missing"},
      {plugWith([](Plug& p) {
         p.fragment.hostControllers = {{{u"\\\\.\\hcd0"}, u"k", u"h"}};
       }),
       u"host controller \\\\.\\hcd0 is there already"},
      {plugWith([](Plug& p) {
         p.fragment.hubs = {{kHubName, {}, false}};
       }),
       Text(u"hub ") + kHubName + u" is there already"},
      {plugWith([](Plug& p) {
         p.fragment.volumes = {{kStickVolumeName, u"", {}, {}, 3, false, {}}};
       }),
       Text(u"volume ") + kStickVolumeName + u" is there already"},
      {plugWith([](Plug& p) {
         p.fragment.volumes = {{u"new", u"", {u"e:\\"}, {}, 3, false, {}}};
       }),
       u"path e:\\ is there already"},
      {plugWith([](Plug& p) {
         p.fragment.drives = {{u'c', 3, {}, u""}};
       }),
       u"drive c is there already"},
      {plugWith([](Plug& p) {
         p.fragment.drives = {{u'X', 3, {}, u"USB\\NONE\\1"}};
       }),
       u"device USB\\NONE\\1 of drive X: is missing"},
      {plugWith([](Plug& p) { p.ports[0].hub = u"USB#NONE"; }), u"hub USB#NONE is missing"},
      {plugWith([](Plug& p) { p.ports[0].index = 3; }),
       Text(u"port 3 of hub ") + kHubName + u" is missing"},
      {plugWith([](Plug& p) { p.ports[0].index = 0; }),
       Text(u"port 0 of hub ") + kHubName + u" is missing"},
      {plugWith([](Plug& p) { p.ports.push_back(p.ports[0]); }),
       Text(u"port 1 of hub ") + kHubName + u" is taken"},
      {{0, u"", Mount{u"none", u"X:\\"}}, u"volume none is missing"},
      {{0, u"", Mount{kStickVolumeName, u"e:\\"}}, u"path e:\\ is taken"},
      {{0, u"", Mount{kStickVolumeName, u"X:"}},
       u"path X: is neither a drive's root nor a folder that ends with \\"},
      {{0, u"", Mount{kStickVolumeName, u"C:\\Folder"}},
       u"path C:\\Folder is neither a drive's root nor a folder that ends with \\"},
      {{0, u"", Dismount{u"none", u"E:\\"}}, u"volume none is missing"},
      {{0, u"", Dismount{kStickVolumeName, u"C:\\"}},
       Text(u"volume ") + kStickVolumeName + u" has no path C:\\"},
  };
  for (const auto& [step, reason] : kCases) {
    SimulatedPc pc(StickMachine());
    EXPECT_EQ(ToUtf8(pc.Apply(step)), ToUtf8(reason));
    const Machine after = pc.Snapshot();
    EXPECT_EQ(after.devices.size(), 8u) << ToUtf8(reason);
    EXPECT_EQ(after.hubs.size(), 2u) << ToUtf8(reason);
    EXPECT_FALSE(after.hubs[1].ports[0].driverKey) << ToUtf8(reason);
    EXPECT_EQ(after.volumes[1].paths.size(), 2u) << ToUtf8(reason);
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
