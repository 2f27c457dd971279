#include "tree/tree_builder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "platform/wrappers/failing_host.h"
#include "tests/support/desk_pc.h"
#include "tree/port_device.h"

namespace KelvoUHW {
namespace {

using platform::simulated::Dismount;
using platform::simulated::Mount;
using testing::HasSubstr;
using testing::Not;

Change Out(const std::u16string& id) { return Unplug{id}; }
Change NodeOnly(const std::u16string& serial, const std::u16string& parent = kRootHubId) {
  Plug plug;
  AddNode(plug, UsbId(serial), parent, u"HIDClass", u"HidUsb");
  return plug;
}
Change PortOnly(const std::u16string& serial, std::uint32_t port) {
  Plug plug;
  AddPort(plug, UsbId(serial), kRootHubId, port);
  return plug;
}

// A PC with a builder. Each build is checked for what holds of every build.
class Desk {
 public:
  explicit Desk(Machine machine, const std::vector<Change>& devices = {})
      : pc(std::move(machine)), host(pc), builder(host) {
    Do(devices);
  }

  void Do(const std::vector<Change>& changes) {
    for (const Change& change : changes) {
      ASSERT_EQ(platform::ToUtf8(pc.Apply(StepOf(change))), "");
    }
  }

  // The lists as text, or "same" where nothing was published.
  std::string Build(bool commit = true) {
    const NodePtr before = builder.Root();
    std::vector<DeviceList> lists;
    for (std::size_t kind = 0; kind < 4; ++kind) lists.push_back(*builder.GetDeviceList(kind));
    const bool changed = builder.Build();
    EXPECT_EQ(builder.BuildingRoot(), nullptr);
    if (changed) {
      EXPECT_NE(builder.Root(), before);
      CheckNodesAreOf(builder.Root(), kConnectedList);
      CheckNodesAreOf(builder.Root(), kAttachedList);
      CheckNodesAreOf(before, kRemovedList);
      CheckNodesAreOf(builder.Root(), kModifiedList);
    } else {
      EXPECT_EQ(builder.Root(), before);
      for (std::size_t kind = 0; kind < 4; ++kind) {
        EXPECT_EQ(*builder.GetDeviceList(kind), lists[kind]);  // the same records
      }
    }
    EXPECT_EQ(builder.ConnectedCopy(), *builder.GetDeviceList(kConnectedList));
    EXPECT_EQ(builder.GetDeviceList(4), nullptr);
    EXPECT_EQ(builder.GetDeviceList(static_cast<std::size_t>(-1)), nullptr);
    if (commit) builder.CommitDeviceCache();
    return changed ? ListsText(builder) : "same";
  }

  void CheckNodesAreOf(const NodePtr& root, std::size_t kind) {
    for (const NodePtr& node : *builder.GetDeviceList(kind)) {
      EXPECT_EQ(node->m_nType, KUDTPortDevice);
      EXPECT_EQ(FindByInstanceId(root, node->m_strDevInstId), node) << kind;
    }
  }

  std::string Dump() const { return platform::ToUtf8(DumpOf(builder.Root())); }

  SimulatedPc pc;
  platform::wrappers::FailingHost host;
  CZKUMUsbTreeBuilder builder;
};

struct Beat {
  std::vector<Change> changes;
  std::string lists;
};
struct Story {
  const char* what;
  Machine machine;
  std::vector<Change> devices;
  std::vector<Beat> beats;
};

void Play(const Story& story) {
  SCOPED_TRACE(story.what);
  Desk desk(story.machine, story.devices);
  int number = 0;
  for (const Beat& beat : story.beats) {
    ++number;
    desk.Do(beat.changes);
    EXPECT_EQ(desk.Build(), beat.lists) << "build " << number;
  }
}

// A mouse, a stick and a card reader with two empty slots, beside an internal disk.
std::vector<Change> Usual() { return {InternalDisk(), Gadget(u"M1", 1), Stick(u"S1", 2, u'E'), CardReader(u"CR", 3)}; }
const char kUsual[] = "M1 S1 CR | M1 S1 CR | - | -";

// The list of modified devices repeats every device with a volume or an empty slot that is not
// attached anew, once for each of them.
TEST(Builds, WhatComesAndGoes) {
  const Story stories[] = {
      {"nothing changes", BarePc(), Usual(), {{{}, kUsual}, {{}, "same"}, {{}, "same"}}},
      {"a stick comes and goes",
       BarePc(),
       Usual(),
       {{{}, kUsual},
        {{Stick(u"S2", 4, u'F')}, "M1 S1 CR S2 | S2 | - | S1 CR CR"},
        {{}, "same"},
        {{Out(UsbId(u"S2"))}, "M1 S1 CR | - | S2 | S1 CR CR"},
        {{}, "same"}}},
      {"a hub goes with all its devices",
       BarePc(),
       {ExternalHub(u"HUB", 1), Gadget(u"K1", 1, UsbId(u"HUB")), Gadget(u"M1", 2),
        Stick(u"S3", 2, u'E', UsbId(u"HUB"))},
       {{{}, "K1 M1 S3 | K1 M1 S3 | - | -"}, {{Out(UsbId(u"HUB"))}, "M1 | - | K1 S3 | -"}}},
      {"a device with a serial number moves to another port: the same device",
       BarePc(),
       Usual(),
       {{{}, kUsual}, {{Out(UsbId(u"S1")), Stick(u"S1", 5, u'E')}, "same"}}},
      {"a device named after its port moves: another device",
       BarePc(),
       Usual(),
       {{{}, kUsual}, {{Out(UsbId(u"M1")), Gadget(u"M5", 5)}, "S1 CR M5 | M5 | M1 | S1 CR CR"}}},
      {"mounting and dismounting alone",
       BarePc(),
       Usual(),
       {{{}, kUsual},
        {{Mount{u"\\\\?\\Volume{of E:}\\", u"X:\\"}}, "same"},
        {{Dismount{u"\\\\?\\Volume{of E:}\\", u"X:\\"}}, "same"}}},
      {"an internal disk alone is something to publish",
       BarePc(),
       {InternalDisk()},
       {{{}, "- | - | - | -"}, {{}, "same"}}},
  };
  for (const Story& story : stories) Play(story);
}

// Parents of what left are reported with it and come back one level per build, and only where
// another child of theirs is there.
TEST(Builds, ParentsOfWhatLeftComeBack) {
  const Change secondVolume = Volume(DiskId(u"S1"), u'F', u"#2");
  const Story stories[] = {
      {"a second volume on a stick that is there",
       BarePc(),
       Usual(),
       {{{}, kUsual},
        {{secondVolume}, "M1 S1 CR | - | - | S1 S1 CR CR"},
        {{}, "same"},
        {{Out(VolumeId(DiskId(u"S1"), u"#2"))}, "M1 CR | - | S1 | CR CR"},
        {{}, "same"},  // the disk is back, which no port shows
        {{}, "M1 CR S1 | S1 | - | CR CR"},
        {{}, "same"}}},
      {"a card in one slot of two",
       BarePc(),
       Usual(),
       {{{}, kUsual},
        {{Volume(DiskId(u"CR"), u'F')}, "M1 S1 CR | - | - | S1 CR CR"},
        {{Out(VolumeId(DiskId(u"CR")))}, "M1 S1 | - | CR | S1"},
        {{}, "M1 S1 CR | CR | - | S1"},
        {{}, "same"},
        {{Volume(DiskId(u"CR"), u'G')}, "M1 S1 CR | - | - | S1 CR CR"},
        {{}, "same"}}},
      // Records of hubs have the ids of hubs of the tree, which nothing joins.
      {"a stick below hubs that are devices themselves",
       BarePc(kNewHubService),
       {ExternalHub(u"HUB", 1, kNewHubService), Gadget(u"K1", 1, UsbId(u"HUB")), Stick(u"S3", 2, u'E', UsbId(u"HUB"))},
       {{{}, "K1 S3 | K1 S3 | - | -"},
        {{Out(UsbId(u"S3"))}, "K1 | - | S3 | -"},
        {{}, "K1 | - | - | -"},
        {{}, "K1 | - | - | -"},
        {{}, "same"}}},
  };
  for (const Story& story : stories) Play(story);
}

TEST(Builds, DevicesThatTheCachesDoNotSee) {
  const Story stories[] = {
      // They are in the next tree that something else brings about, and leave as what was in the
      // last tree and is not in the new one.
      {"excluded and not admitted",
       BarePc(),
       {Gadget(u"M1", 1)},
       {{{}, "M1 | M1 | - | -"},
        {{ExternalHub(u"HUB", 4), Gadget(u"NET", 5, kRootHubId, u"Net")}, "same"},
        {{NodeOnly(u"ELSEWHERE", u"ACPI\\PNP0A08\\0"), PortOnly(u"ELSEWHERE", 6)}, "same"},
        {{Gadget(u"M2", 2)}, "M1 M2 | M2 | - | -"},
        {{Out(UsbId(u"NET")), Out(UsbId(u"ELSEWHERE"))}, "same"},
        {{Gadget(u"M3", 3)}, "M1 M2 M3 | M3 | NET ELSEWHERE | -"}}},
      {"the node before its port",
       BarePc(),
       {Gadget(u"M1", 1)},
       {{{}, "M1 | M1 | - | -"},
        {{NodeOnly(u"K1")}, "same"},
        {{}, "same"},
        {{PortOnly(u"K1", 2)}, "M1 K1 | K1 | - | -"},
        {{}, "same"}}},
      // A port whose device has no node yet shows a device without name; it leaves when the name
      // comes.
      {"the port before its node",
       BarePc(),
       {Gadget(u"M1", 1)},
       {{{}, "M1 | M1 | - | -"},
        {{PortOnly(u"K2", 5)}, "same"},
        {{Gadget(u"M2", 2)}, "M1 M2 | M2 | - | -"},
        {{NodeOnly(u"K2")}, "M1 M2 K2 | K2 | ? | -"}}},
  };
  for (const Story& story : stories) Play(story);
}

TEST(Builds, NothingIsPublishedBeforeThereIsSomething) {
  Desk desk(BarePc());
  EXPECT_EQ(desk.Build(), "same");
  EXPECT_EQ(desk.Build(), "same");
  EXPECT_EQ(desk.builder.Root(), nullptr);
  desk.Do({Gadget(u"M1", 1)});
  EXPECT_EQ(desk.Build(), "M1 | M1 | - | -");
}

// Without a commit every build compares with the last committed one, and what was added stays so:
// devices are attached once more by each build.
TEST(Builds, WithoutCommitChangesAddUp) {
  Desk desk(BarePc(), Usual());
  EXPECT_EQ(desk.Build(false), kUsual);
  EXPECT_EQ(desk.Build(false), "M1 S1 CR | M1 S1 CR M1 S1 CR | - | -");
  desk.Do({Out(UsbId(u"M1"))});
  EXPECT_EQ(desk.Build(), "S1 CR | S1 CR S1 CR S1 CR | M1 | -");
  EXPECT_EQ(desk.Build(false), "same");
  desk.Do({Out(UsbId(u"S1"))});
  EXPECT_EQ(desk.Build(false), "CR | - | S1 | CR CR");
  // What left is looked up in the published tree, which does not have it any more.
  EXPECT_EQ(desk.Build(false), "CR | - | - | CR CR");
  EXPECT_EQ(desk.Build(), "CR | - | - | CR CR");
  EXPECT_EQ(desk.Build(), "same");
}

TEST(Builds, APublishedTreeShowsTheCardThatIsThere) {
  Desk desk(BarePc(), Usual());
  desk.Build();
  desk.Do({Volume(DiskId(u"CR"), u'F')});
  desk.Build();
  EXPECT_THAT(desk.Dump(), HasSubstr("devVolumeName   : \\\\?\\Volume{of F:}\\\r\n"));
  EXPECT_THAT(desk.Dump(), HasSubstr("devMountPoint   : F:\\\r\n"));
  const NodePtr withCard = desk.builder.Root();
  desk.Do({Out(VolumeId(DiskId(u"CR")))});
  desk.Build();
  EXPECT_THAT(desk.Dump(), Not(HasSubstr("of F:")));
  // What is reported as removed still tells what left, and hangs in the tree before.
  const NodePtr removed = desk.builder.GetDeviceList(kRemovedList)->at(0);
  EXPECT_THAT(platform::ToUtf8(DumpOf(removed)), HasSubstr("devMountPoint   : F:\\\r\n"));
  const NodePtr& info = static_cast<const CZKUMPortDeviceImpl&>(*removed).m_infoDevice;
  EXPECT_EQ(info->m_pParent, static_cast<CZKUMUsbTreeNodeImpl*>(removed->m_pParent));
  desk.Build();
  desk.Do({Volume(DiskId(u"CR"), u'G')});
  EXPECT_EQ(desk.Build(), "M1 S1 CR | - | - | S1 CR CR");
  EXPECT_THAT(desk.Dump(), Not(HasSubstr("of F:")));
  EXPECT_THAT(desk.Dump(), Not(HasSubstr("F:\\")));
  EXPECT_THAT(desk.Dump(), HasSubstr("devVolumeName   : \\\\?\\Volume{of G:}\\\r\n"));
  EXPECT_THAT(desk.Dump(), HasSubstr("devMountPoint   : G:\\\r\n"));
}

// Climbs from every record of a tree; a link into freed memory is found by the address sanitizer.
std::size_t ClimbFromEverywhere(const NodePtr& root) {
  std::size_t steps = 0;
  VisitPreOrder(root, [&](const NodePtr& node) {
    const auto climb = [&](const CZKUMUsbTreeNodeImpl* at) {
      for (; at != nullptr; at = at->m_pParent) steps += at->m_strDevInstId.size() + 1;
    };
    climb(node.Get());
    if (node->m_nType == KUDTPortDevice) {
      climb(static_cast<const CZKUMPortDeviceImpl&>(*node).m_infoDevice.Get());
    }
    return true;
  });
  return steps;
}

TEST(Builds, RecordsSharedBetweenTreesLeaveNoLinkBehind) {
  Desk desk(BarePc(), {ExternalHub(u"HUB", 1), Stick(u"S1", 1, u'E', UsbId(u"HUB"))});
  EXPECT_EQ(desk.Build(), "S1 | S1 | - | -");
  NodePtr first = desk.builder.Root();

  // The hub does not open: its stick is gone from the tree, though not from the device manager.
  desk.Do({Gadget(u"M1", 2)});
  platform::wrappers::FailurePlan plan;
  plan.operation = platform::wrappers::Operation::OpenDevice;
  plan.call = 3;  // behind the controller and its root hub
  desk.host.SetPlan(plan);
  EXPECT_EQ(desk.Build(), "M1 | M1 | S1 | -");
  EXPECT_EQ(desk.host.Failures(), 1u);
  NodePtr second = desk.builder.Root();
  EXPECT_EQ(FindByInstanceId(second, UsbId(u"S1")), nullptr);
  const NodePtr removed = desk.builder.GetDeviceList(kRemovedList)->at(0);
  EXPECT_EQ(FindByInstanceId(first, UsbId(u"S1")), removed);

  // It opens again. The stick is connected, and was never away for the device manager.
  EXPECT_EQ(desk.Build(), "same");
  desk.Do({Gadget(u"M2", 3)});
  EXPECT_EQ(desk.Build(), "S1 M1 M2 | M2 | - | S1");
  const auto& stick = static_cast<const CZKUMPortDeviceImpl&>(*FindByInstanceId(desk.builder.Root(), UsbId(u"S1")));
  EXPECT_EQ(stick.m_infoDevice, static_cast<CZKUMPortDeviceImpl&>(*removed).m_infoDevice);
  for (NodePtr* each : {&first, &second}) {
    EXPECT_GT(ClimbFromEverywhere(*each), 0u);
    EXPECT_GT(ClimbFromEverywhere(desk.builder.Root()), 0u);
    each->Reset();
  }
  // The records have two trees less and still hang in the third.
  EXPECT_EQ(stick.m_infoDevice->m_pParent, static_cast<CZKUMUsbTreeNodeImpl*>(stick.m_pParent));
  EXPECT_EQ(stick.m_childs.at(0)->m_pParent, &stick);
  EXPECT_GT(ClimbFromEverywhere(desk.builder.Root()), 0u);
  EXPECT_GT(ClimbFromEverywhere(removed), 0u);
}

}  // namespace
}  // namespace KelvoUHW
