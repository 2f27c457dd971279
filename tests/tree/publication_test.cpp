#include "tree/publication.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <functional>
#include <random>
#include <string>

#include "tests/support/desk_pc.h"
#include "tree/tree_index.h"

namespace KelvoUHW {
namespace {

template <class Record, class... Args>
RingPtr<Record> Below(CZKUMUsbTreeNodeImpl* parent, Args&&... args) {
  auto record = MakeRecord<Record>(std::forward<Args>(args)...);
  if (parent) {
    parent->m_childs.push_back(record);
    record->m_pParent = parent;
  }
  return record;
}

TEST(TreeIndexTest, AnswersAsTheSearch) {
  std::mt19937 random(11);
  const auto anyId = [&] { return std::u16string(1, static_cast<char16_t>(u'a' + random() % 7)); };
  std::size_t severalOfOneId = 0;
  for (int round = 0; round < 60; ++round) {
    const NodePtr root = MakeRecord<CZKUMUsbTreeNodeImpl>();
    std::vector<NodePtr> nodes{root};
    TreeIndex index(root);
    for (int step = 0; step < 60; ++step) {
      const NodePtr node = nodes[random() % nodes.size()];
      if (random() % 3 == 0) {
        const std::u16string earlier = std::exchange(node->m_strDevInstId, anyId());
        index.Renamed(*node, earlier);
      } else {
        // One or two nodes, hung in at once and at any place among the children.
        NodePtr added = MakeRecord<CZKUMUsbTreeNodeImpl>();
        if (random() % 3 == 0) added = MakeRecord<CZKUMPortDeviceImpl>(0u, nullptr, nullptr, nullptr, u"", u"", u"");
        added->m_strDevInstId = anyId();
        if (random() % 2 == 0) {
          nodes.push_back(Below<CZKUMUsbTreeNodeImpl>(added.Get()));
          nodes.back()->m_strDevInstId = anyId();
        }
        const auto place = random() % (node->m_childs.size() + 1);
        node->m_childs.insert(node->m_childs.begin() + static_cast<std::ptrdiff_t>(place), added);
        nodes.push_back(added);
        index.Added(added);
      }
      for (char16_t id = u'a'; id <= u'h'; ++id) {
        const std::u16string text(1, id);
        const NodePtr found = FindByInstanceId(root, text);
        ASSERT_EQ(index.Find(text), found) << round << " " << step;
        const bool isDevice = found && found->m_nType == KUDTPortDevice;
        ASSERT_EQ(index.FindPortDevice(text), isDevice ? found : NodePtr());
        severalOfOneId += std::ranges::count(nodes, text, [](auto& each) { return each->m_strDevInstId; }) > 1;
      }
    }
  }
  EXPECT_GT(severalOfOneId, 5000u);
}

TEST(Climbing, EndsAtTheNodeBelowAHubPort) {
  const auto root = MakeRecord<CZKUMUsbTreeRootImpl>();
  const auto controller = Below<CZKUMHostControllerImpl>(root.Get());
  const auto rootHub = Below<CZKUMHubDeviceImpl>(controller.Get());
  const auto port = Below<CZKUMHubPortImpl>(rootHub.Get(), 1u);
  const auto hub = Below<CZKUMHubDeviceImpl>(port.Get());
  const auto hubPort = Below<CZKUMHubPortImpl>(hub.Get(), 1u);
  const auto device = Below<CZKUMPortDeviceImpl>(hubPort.Get(), 0u, nullptr, nullptr, nullptr, u"", u"", u"device");
  const auto disk = Below<CZKUMInfoDeviceImpl>(device.Get());
  const auto volume = Below<CZKUMInfoDeviceImpl>(disk.Get());
  const auto lone = MakeRecord<CZKUMInfoDeviceImpl>();
  const auto belowLone = Below<CZKUMInfoDeviceImpl>(lone.Get());

  struct Case {
    CZKUMUsbTreeNodeImpl* start;
    CZKUMUsbTreeNodeImpl* below;
    bool rooted = true;
  };
  // A port of an external hub belongs to that hub, which is below another port.
  const Case cases[] = {{volume.Get(), device.Get()}, {disk.Get(), device.Get()},   {device.Get(), device.Get()},
                        {hubPort.Get(), hub.Get()},   {hub.Get(), hub.Get()},       {port.Get(), nullptr},
                        {root.Get(), nullptr},        {lone.Get(), nullptr, false}, {belowLone.Get(), nullptr, false}};
  for (const Case& c : cases) {
    EXPECT_EQ(ClimbToHubPort(c.start), c.below) << &c - cases;
    EXPECT_EQ(ReachesRoot(*c.start), c.rooted) << &c - cases;
  }
  EXPECT_EQ(ClimbToHubPort(nullptr), nullptr);
  root->m_childs.clear();
  controller->m_pParent = nullptr;
  EXPECT_FALSE(ReachesRoot(*volume));
}

// Whether a node is kept, by its name and the children of its parent at that time.
using Verdict = std::function<bool(char16_t name, const std::u16string& siblings)>;

class AskedNode final : public CZKUMUsbTreeNodeImpl {
 public:
  AskedNode(const Verdict& verdict, std::string& asked, char16_t name) : m_verdict(verdict), m_asked(asked) {
    m_strDevInstId = name;
  }
  bool AcceptNode(NodePtr node) override {
    EXPECT_EQ(node.Get(), this);
    m_asked += platform::ToUtf8(m_strDevInstId);
    std::u16string siblings;
    for (const NodePtr& child : m_pParent ? m_pParent->m_childs : DeviceList{}) siblings += child->m_strDevInstId;
    return m_verdict(m_strDevInstId[0], siblings);
  }

 private:
  const Verdict& m_verdict;
  std::string& m_asked;
};

TEST(PrunePass, AsksParentsFirstAndStartsAListAgain) {
  using Siblings = const std::u16string&;
  struct Case {
    const char* what;
    Verdict keep;
    bool kept;
    const char* asked;
    const char* left;
    bool accepted;
    const char* askedByAcceptsAll;
  };
  const Case cases[] = {
      {"all kept", [](char16_t, Siblings) { return true; }, true, "RAaBCcd", "RAaBCcd", true, "RAaBCcd"},
      {"the root goes", [](char16_t name, Siblings) { return name != u'R'; }, false, "R", "RAaBCcd", false, "R"},
      {"the first goes with what is below it", [](char16_t name, Siblings) { return name != u'A'; }, true, "RABCcd",
       "RBCcd", false, "RA"},
      {"one in the middle goes, and those before it are asked again",
       [](char16_t name, Siblings) { return name != u'B'; }, true, "RAaBAaCcd", "RAaCcd", false, "RAaB"},
      {"the last of an inner list: the outer one goes on", [](char16_t name, Siblings) { return name != u'd'; }, true,
       "RAaBCcdc", "RAaBCc", false, "RAaBCcd"},
      {"one goes because another went",
       [](char16_t name, Siblings all) { return name != u'B' && (name != u'A' || all.find(u'B') != all.npos); }, true,
       "RAaBACcd", "RCcd", false, "RAaB"},
  };
  for (const Case& c : cases) {
    for (const bool prune : {true, false}) {
      std::string asked, left;
      const auto root = Below<AskedNode>(nullptr, c.keep, asked, u'R');
      for (const char16_t* branch : {u"Aa", u"B", u"Ccd"}) {
        const auto node = Below<AskedNode>(root.Get(), c.keep, asked, branch[0]);
        for (const char16_t* leaf = branch + 1; *leaf != 0; ++leaf) {
          Below<AskedNode>(node.Get(), c.keep, asked, *leaf);
        }
      }
      EXPECT_EQ(prune ? PruneTree(root) : AcceptsAll(root), prune ? c.kept : c.accepted) << c.what;
      VisitPreOrder(root, [&](const NodePtr& node) {
        left += platform::ToUtf8(node->m_strDevInstId);
        return true;
      });
      EXPECT_EQ(asked, prune ? c.asked : c.askedByAcceptsAll) << c.what;
      EXPECT_EQ(left, prune ? c.left : "RAaBCcd") << c.what;
    }
  }
}

TEST(Merging, JoinsDeviceNodesToPortDevices) {
  // A hub with a keyboard and a stick; the drivers call both hubs by names that the device manager
  // does not know.
  Machine machine = BarePc(kNewHubService);
  for (const Plug& plug : {ExternalHub(u"HUB", 1, kNewHubService), Gadget(u"K1", 1, UsbId(u"HUB")),
                           Stick(u"S1", 2, u'E', UsbId(u"HUB"))}) {
    EXPECT_EQ(CarryOut(machine, plug), u"");
  }
  machine.hubs[0].name = u"USB#OTHER#1#{1}";
  machine.hostControllers[0].rootHub = machine.hubs[0].name;
  machine.hubs[1].name = u"USB#OTHER#2#{1}";
  machine.hubs[0].ports[0].hubName = machine.hubs[1].name;
  SimulatedPc pc(machine);
  CZKUMUsbTreeBuilder builder(pc);
  ASSERT_TRUE(builder.Build());
  ASSERT_EQ(ListsText(builder), "K1 S1 | K1 S1 | - | -");
  const InfoDeviceSet& current = builder.DeviceInfo().Current();
  const auto handleOf = [&](const std::u16string& id) { return current.FindByInstanceId(id)->m_devInstHandle; };

  const NodePtr& stick = builder.GetDeviceList(kConnectedList)->at(1);
  const InfoDevicePtr entry = current.FindByInstanceId(UsbId(u"S1"));
  EXPECT_EQ(static_cast<const CZKUMPortDeviceImpl&>(*stick).m_infoDevice, entry);
  const CZKUMUsbTreeNodeImpl* port = stick->m_pParent;
  ASSERT_EQ(port->m_nType, KUDTHubPort);
  EXPECT_EQ(entry->m_pParent, port);  // not the device
  EXPECT_EQ(port->m_childs, DeviceList{stick});
  // The entry's children hang below the device, and stay in the entry's list.
  ASSERT_EQ(stick->m_childs.size(), 1u);
  const NodePtr& disk = stick->m_childs[0];
  EXPECT_EQ(disk, current.FindByInstanceId(DiskId(u"S1")));
  EXPECT_EQ(entry->m_childs, stick->m_childs);
  EXPECT_EQ(disk->m_pParent, stick.Get());
  // The volume below the disk, as device node and as storage.
  ASSERT_EQ(disk->m_childs.size(), 2u);
  EXPECT_EQ(disk->m_childs[1]->m_nType, KUDTInterfaceDevice);
  EXPECT_EQ(disk->m_childs[1]->m_strDevInstId, disk->m_childs[0]->m_strDevInstId);

  // The hubs on the way up are named after the device manager's parents; their ports are not.
  const CZKUMUsbTreeNodeImpl* hub = port->m_pParent;
  EXPECT_EQ(port->m_strDevInstId, u"USB\\OTHER\\2 port 2");
  EXPECT_EQ(hub->m_strDevInstId, UsbId(u"HUB"));
  EXPECT_EQ(hub->m_devInstHandle, handleOf(UsbId(u"HUB")));
  EXPECT_EQ(hub->m_strDevInstIdParent, kRootHubId);
  EXPECT_EQ(hub->m_devInstHandleParent, handleOf(kRootHubId));
  const CZKUMUsbTreeNodeImpl* rootHub = hub->m_pParent->m_pParent;
  EXPECT_EQ(rootHub->m_strDevInstId, kRootHubId);
  EXPECT_EQ(rootHub->m_devInstHandle, handleOf(kRootHubId));
  EXPECT_EQ(rootHub->m_strDevInstIdParent, kControllerId);
  EXPECT_EQ(rootHub->m_devInstHandleParent, 2u);
  // The controller and the root stay as the walk left them.
  EXPECT_EQ(builder.Root()->m_strDevInstId, u"Abstract root");
  CZKUMTopologyWalker walker(pc);
  walker.StartWalk();
  const CZKUMUsbTreeNodeImpl* controller = rootHub->m_pParent;
  ASSERT_EQ(controller->m_nType, KUDTHostController);
  const CZKUMUsbTreeNodeImpl& walked = *walker.m_building->m_childs.at(0);
  EXPECT_TRUE(controller->IsSameNode(walked));
  EXPECT_EQ(controller->m_devInstHandle, walked.m_devInstHandle);
  EXPECT_EQ(controller->m_strDevInstIdParent, walked.m_strDevInstIdParent);
}

}  // namespace
}  // namespace KelvoUHW
