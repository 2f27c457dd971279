#include "tree/tree_builder.h"

#include <gmock/gmock.h>

#include <functional>
#include <map>

#include "platform/wrappers/failing_host.h"
#include "records/devnode.h"
#include "tests/support/desk_pc.h"
#include "tests/support/outline.h"
#include "tree/publication.h"

namespace KelvoUHW {
namespace {

using platform::Status, platform::simulated::Dismount, platform::simulated::Mount;
using testing::HasSubstr, testing::Not;

Change Out(const Text& id) { return Unplug{id}; }
Change NodeOnly(const Text& serial, const Text& parent = kRootHubId) {
  Plug plug;
  AddNode(plug, UsbId(serial), parent, u"HIDClass", u"HidUsb");
  return plug;
}
// The device manager has the hub below another device, whatever port it sits on.
Change HubBelow(const Text& serial, std::uint32_t port, const Text& parent) {
  Plug plug = ExternalHub(serial, port, kNewHubService);
  plug.fragment.devices[0].parent = parent;
  return plug;
}
Change PortOnly(const Text& serial, std::uint32_t port) {
  Plug plug;
  AddPort(plug, UsbId(serial), kRootHubId, port);
  return plug;
}

// Each build is checked for what holds of every build.
class BuildDesk : public Desk<platform::wrappers::FailingHost> {
 public:
  using Desk::Desk;
  // The lists as text, or "same" where nothing was published.
  std::string Build(bool commit = true) {
    const NodePtr before = builder.Root();
    const std::vector<DeviceList> lists = Lists();
    const bool changed = builder.Build();
    EXPECT_EQ(builder.BuildingRoot(), nullptr);
    EXPECT_EQ(builder.Root() != before, changed);
    EXPECT_TRUE(changed || Lists() == lists);  // the same records
    for (std::size_t kind = kConnectedList; changed && kind <= kModifiedList; ++kind) {
      for (const NodePtr& node : *builder.GetDeviceList(kind)) {
        EXPECT_EQ(node->m_nType, KUDTPortDevice);
        EXPECT_EQ(FindByInstanceId(kind == kRemovedList ? before : builder.Root(), node->m_strDevInstId), node) << kind;
      }
    }
    EXPECT_EQ(builder.ConnectedCopy(), *builder.GetDeviceList(kConnectedList));
    EXPECT_EQ(builder.GetDeviceList(4), nullptr);
    if (commit) builder.CommitDeviceCache();
    return changed ? ListsText(builder) : "same";
  }
};

// A mouse, a stick and a card reader with two empty slots, beside an internal disk.
std::vector<Change> Usual() { return {InternalDisk(), Gadget(u"M1", 1), Stick(u"S1", 2, u'E'), CardReader(u"CR", 3)}; }
const char kUsual[] = "M1 S1 CR | M1 S1 CR | - | -";

// The list of modified devices repeats every device with a volume or an empty slot that is not
// attached anew, once for each of them.
TEST(Builds, WhatComesAndGoes) {
  struct Beat {
    std::vector<Change> changes;
    const char* lists;
  };
  struct Story {
    const char* what;
    std::vector<Beat> beats;
    std::vector<Change> devices = Usual();
    const char* first = kUsual;
    const char16_t* hubService = kOldHubService;
  };
  const Text hub = UsbId(u"HUB");
  const Story stories[] = {
      {"a stick comes and goes",
       {{{Stick(u"S2", 4, u'F')}, "M1 S1 CR S2 | S2 | - | S1 CR CR"},
        {{}, "same"},
        {{Out(UsbId(u"S2"))}, "M1 S1 CR | - | S2 | S1 CR CR"},
        {{}, "same"}}},
      {"a device with a serial number moves to another port: the same device; one named after its port: another",
       {{{Out(UsbId(u"S1")), Stick(u"S1", 5, u'E')}, "same"},
        {{Out(UsbId(u"M1")), Gadget(u"M5", 6)}, "CR S1 M5 | M5 | M1 | S1 CR CR"}}},
      {"mounting and dismounting alone",
       {{{Mount{u"\\\\?\\Volume{of E:}\\", u"X:\\"}}, "same"},
        {{Dismount{u"\\\\?\\Volume{of E:}\\", u"X:\\"}}, "same"}}},
      {"an internal disk alone is something to publish", {{{}, "same"}}, {InternalDisk()}, "- | - | - | -"},
      {"nothing is published before there is something",
       {{{}, "same"}, {{Gadget(u"M1", 1)}, "M1 | M1 | - | -"}},
       {},
       "same"},
      // Parents of what left are reported with it and come back one level per build, and only where
      // another child of theirs is there.
      {"a second volume on a stick that is there",
       {{{Volume(DiskId(u"S1"), u'F', u"#2")}, "M1 S1 CR | - | - | S1 S1 CR CR"},
        {{}, "same"},
        {{Out(VolumeId(DiskId(u"S1"), u"#2"))}, "M1 CR | - | S1 | CR CR"},
        {{}, "same"},  // the disk is back, which no port shows
        {{}, "M1 CR S1 | S1 | - | CR CR"},
        {{}, "same"}}},
      {"a card in one slot of two",
       {{{Volume(DiskId(u"CR"), u'F')}, "M1 S1 CR | - | - | S1 CR CR"},
        {{Out(VolumeId(DiskId(u"CR")))}, "M1 S1 | - | CR | S1"},
        {{}, "M1 S1 CR | CR | - | S1"},
        {{}, "same"}}},
      // Records of hubs have the ids of hubs of the tree, which nothing joins.
      {"a stick below hubs that are devices themselves",
       {{{Out(UsbId(u"S3"))}, "K1 | - | S3 | -"}, {{}, "K1 | - | - | -"}, {{}, "K1 | - | - | -"}, {{}, "same"}},
       {ExternalHub(u"HUB", 1, kNewHubService), Gadget(u"K1", 1, hub), Stick(u"S3", 2, u'E', hub)},
       "K1 S3 | K1 S3 | - | -",
       kNewHubService},
      // Told once, and not where it is attached itself.
      {"hubs that belong to another device",
       {{{HubBelow(u"H2", 3, UsbId(u"A")), HubBelow(u"H3", 4, UsbId(u"A"))}, "A | - | - | A"}, {{}, "same"}},
       {Gadget(u"A", 1), HubBelow(u"H1", 2, UsbId(u"A"))},
       "A | A | - | -"},
      // What the caches do not see is in the next tree that something else brings about, and leaves
      // as what was in the last tree and is not in the new one.
      {"excluded and not admitted",
       {{{ExternalHub(u"HUB", 4), Gadget(u"NET", 5, kRootHubId, u"Net")}, "same"},
        {{NodeOnly(u"ELSEWHERE", u"ACPI\\PNP0A08\\0"), PortOnly(u"ELSEWHERE", 6)}, "same"},
        {{Gadget(u"M2", 2)}, "M1 M2 | M2 | - | -"},
        {{Out(UsbId(u"NET")), Out(UsbId(u"ELSEWHERE"))}, "same"},
        {{Gadget(u"M3", 3)}, "M1 M2 M3 | M3 | NET ELSEWHERE | -"}},
       {Gadget(u"M1", 1)},
       "M1 | M1 | - | -"},
      // A port whose device has no node yet shows a device without name; it leaves when the name
      // comes.
      {"the node before its port, and the port before its node",
       {{{NodeOnly(u"K1")}, "same"},
        {{PortOnly(u"K1", 2)}, "M1 K1 | K1 | - | -"},
        {{PortOnly(u"K2", 5)}, "same"},
        {{Gadget(u"M2", 3)}, "M1 K1 M2 | M2 | - | -"},
        {{NodeOnly(u"K2")}, "M1 K1 M2 K2 | K2 | ? | -"}},
       {Gadget(u"M1", 1)},
       "M1 | M1 | - | -"}};
  for (const Story& story : stories) {
    SCOPED_TRACE(story.what);
    BuildDesk desk(BarePc(story.hubService), story.devices);
    EXPECT_EQ(desk.Build(), story.first);
    for (const Beat& beat : story.beats) {
      desk.Do(beat.changes);
      EXPECT_EQ(desk.Build(), beat.lists) << "build " << &beat - story.beats.data();
    }
  }
}

// Without a commit every build compares with the last committed one, and what was added stays so:
// devices are attached once more by each build.
TEST(Builds, WithoutCommitChangesAddUp) {
  BuildDesk desk(BarePc(), Usual());
  EXPECT_EQ(desk.Build(false), kUsual);
  EXPECT_EQ(desk.Build(false), "M1 S1 CR | M1 S1 CR M1 S1 CR | - | -");
  desk.Do({Out(UsbId(u"M1"))});
  EXPECT_EQ(desk.Build(), "S1 CR | S1 CR S1 CR S1 CR | M1 | -");
  EXPECT_EQ(desk.Build(false), "same");
  desk.Do({Out(UsbId(u"S1"))});
  EXPECT_EQ(desk.Build(false), "CR | - | S1 | CR CR");
  // What left is looked up in the published tree, which does not have it any more.
  EXPECT_EQ(desk.Build(), "CR | - | - | CR CR");
  EXPECT_EQ(desk.Build(), "same");
}

// What is reported as removed still tells what left, and hangs in the tree before.
TEST(Builds, ARemovedReaderShowsTheCardThatLeft) {
  BuildDesk desk(BarePc(), Usual());
  desk.Build();
  desk.Do({Volume(DiskId(u"CR"), u'F')});
  desk.Build();
  const NodePtr withCard = desk.builder.Root();
  desk.Do({Out(VolumeId(DiskId(u"CR")))});
  desk.Build();
  EXPECT_THAT(DumpOf(*desk.builder.Root()), Not(HasSubstr("of F:")));
  const NodePtr removed = desk.builder.GetDeviceList(kRemovedList)->at(0);
  EXPECT_THAT(DumpOf(*removed), HasSubstr("devMountPoint   : F:\\\r\n"));
  EXPECT_EQ(removed.StaticCast<CZKUMPortDeviceImpl>()->m_infoDevice->m_pParent,
            static_cast<CZKUMUsbTreeNodeImpl*>(removed->m_pParent));
}

// Its node gets another, in a place of its own.
TEST(Builds, ARecordThatAClientDestroyedLeavesNoEmptyPlace) {
  BuildDesk desk(BarePc(), {Stick(u"S1", 1, u'E')});
  EXPECT_EQ(desk.Build(), "S1 | S1 | - | -");
  const auto stick = desk.builder.GetDeviceList(kConnectedList)->at(0).StaticCast<CZKUMPortDeviceImpl>();
  const DeviceList& children = stick->m_infoDevice->m_childs;
  NodePtr::InARingOfItsOwn(children.at(0).Get()).Reset();
  EXPECT_EQ(children, DeviceList(1));
  desk.Do({Gadget(u"M1", 2)});
  EXPECT_EQ(desk.Build(), "S1 M1 | M1 | - | S1");
  ASSERT_EQ(children.size(), 1u);
  ASSERT_TRUE(children[0]);
  EXPECT_EQ(children[0]->m_strDevInstId, DiskId(u"S1"));
}

// Unplugs devices while the driver keys are read: each as soon as its own key was asked for.
struct HostThatLoses final : platform::wrappers::InterceptingHost {
  explicit HostThatLoses(SimulatedPc& simulated) : InterceptingHost(simulated), pc(simulated) {}
  Status BeforeCall(const platform::wrappers::HostCall&) noexcept override { return {}; }
  void AfterCall(const platform::wrappers::HostCall& call, const Status&, const std::intptr_t*) noexcept override {
    if (call.operation != platform::wrappers::Operation::GetDevNodeRegistryProperty ||
        call.code != platform::kCM_DRP_DRIVER)
      return;
    for (std::size_t i = 0; i < leaving.size(); ++i) {
      const Text id = KelvoUHW::GetDeviceId(pc, static_cast<platform::DevInst>(call.handle));
      if (id != leaving[i]) continue;
      leaving.erase(leaving.begin() + static_cast<std::ptrdiff_t>(i));
      EXPECT_EQ(pc.Apply({0, u"", Unplug{id}}), u"");
    }
  }
  SimulatedPc& pc;
  std::vector<Text> leaving;
};

TEST(Builds, ADeviceThatGoesDuringTheWalkTakesNoOtherAlong) {
  const std::tuple<std::vector<const char16_t*>, const char*> cases[] = {
      {{u"X"}, "A B C D | - | X | -"},
      {{u"X", u"B", u"A"}, "C D | - | A X B | -"},
      {{u"D"}, "A X B C | - | D | -"},
      // Each goes in the search for the next one's key, when no walk came to its end so far.
      {{u"A", u"X", u"B", u"C"}, "D | - | A X B C | -"}};
  for (const auto& [leaving, lists] : cases) {
    Desk<HostThatLoses> desk(BarePc(),
                             {Gadget(u"A", 1), Gadget(u"X", 2), Gadget(u"B", 3), Gadget(u"C", 4), Gadget(u"D", 5)});
    EXPECT_TRUE(desk.builder.Build());
    desk.builder.CommitDeviceCache();
    for (const char16_t* serial : leaving) desk.host.leaving.push_back(UsbId(serial));
    EXPECT_TRUE(desk.builder.Build());
    EXPECT_TRUE(desk.host.leaving.empty());
    EXPECT_EQ(ListsText(desk.builder), lists);
    desk.builder.CommitDeviceCache();
    EXPECT_FALSE(desk.builder.Build());
  }
}

// Acts before the first call of a kind.
struct HostThatActs final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override {
    if (const auto found = first.find(call.operation); found != first.end()) std::exchange(found->second, [] {})();
    return {};
  }
  std::map<platform::wrappers::Operation, std::function<void()>> first;
};

// A device that is reset is away for the walk and back for the device manager: it is told of as removed by a build that
// publishes, and never as attached again. Only the connected ones tell that it is there.
TEST(Builds, ADeviceThatIsResetDuringABuildIsToldOnlyAsConnected) {
  Desk<HostThatActs> desk(BarePc(), {Gadget(u"A", 1), Gadget(u"B", 2)});
  const auto build = [&] {
    const std::string lists = desk.builder.Build() ? ListsText(desk.builder) : "same";
    desk.builder.CommitDeviceCache();
    return lists;
  };
  EXPECT_EQ(build(), "A B | A B | - | -");
  desk.Do({Gadget(u"C", 3)});
  desk.host.first = {{platform::wrappers::Operation::OpenDevice, [&] { desk.Do({Out(UsbId(u"B"))}); }},
                     {platform::wrappers::Operation::GetClassImageList, [&] { desk.Do({Gadget(u"B", 2)}); }}};
  EXPECT_EQ(build(), "A C | C | B | -");
  EXPECT_EQ(build(), "same");
  desk.Do({Gadget(u"D", 4)});
  EXPECT_EQ(build(), "A C B D | D | - | -");
}

// A link into freed memory is found by the address sanitizer.
void ClimbFromEverywhere(const NodePtr& root) {
  VisitPreOrder(root, [&](const NodePtr& node) {
    const bool reaches = ReachesRoot(*node);
    if (node->m_nType < KUDTInfoDevice) {
      EXPECT_TRUE(reaches);
    }
    if (node->m_nType == KUDTPortDevice) ReachesRoot(*node.StaticCast<CZKUMPortDeviceImpl>()->m_infoDevice);
    return true;
  });
}

TEST(Builds, RecordsSharedBetweenTreesLeaveNoLinkBehind) {
  BuildDesk desk(BarePc(), {ExternalHub(u"HUB", 1), Stick(u"S1", 1, u'E', UsbId(u"HUB"))});
  EXPECT_EQ(desk.Build(), "S1 | S1 | - | -");
  NodePtr first = desk.builder.Root();
  // The hub, behind the controller and its root hub, does not open: its stick is gone from the
  // tree, though not from the device manager.
  desk.Do({Gadget(u"M1", 2)});
  desk.host.SetPlan({.call = 3, .operation = platform::wrappers::Operation::OpenDevice});
  EXPECT_EQ(desk.Build(), "M1 | M1 | S1 | -");
  EXPECT_EQ(desk.host.Failures(), 1u);
  NodePtr second = desk.builder.Root();
  const auto removed = desk.builder.GetDeviceList(kRemovedList)->at(0).StaticCast<CZKUMPortDeviceImpl>();
  // It opens again. The stick is connected, and was never away for the device manager.
  EXPECT_EQ(desk.Build(), "same");
  desk.Do({Gadget(u"M2", 3)});
  EXPECT_EQ(desk.Build(), "S1 M1 M2 | M2 | - | S1");
  const NodePtr third = desk.builder.Root();
  const auto stick = FindByInstanceId(third, UsbId(u"S1")).StaticCast<CZKUMPortDeviceImpl>();
  EXPECT_EQ(stick->m_infoDevice, removed->m_infoDevice);
  for (NodePtr* each : {&first, &second}) {
    ClimbFromEverywhere(*each);
    each->Reset();
    ClimbFromEverywhere(third);
  }
  // The records have two trees less and still hang in the third.
  EXPECT_EQ(stick->m_infoDevice->m_pParent, static_cast<CZKUMUsbTreeNodeImpl*>(stick->m_pParent));
  EXPECT_EQ(stick->m_childs.at(0)->m_pParent, stick.Get());
}

}  // namespace
}  // namespace KelvoUHW
