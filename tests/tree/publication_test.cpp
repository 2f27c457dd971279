#include "tree/publication.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <random>

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

// A port of an external hub belongs to that hub, which is below another port.
TEST(Climbing, EndsAtTheNodeBelowAHubPort) {
  const auto root = MakeRecord<CZKUMUsbTreeRootImpl>();
  const auto rootHub = Below<CZKUMHubDeviceImpl>(root.Get());
  const auto port = Below<CZKUMHubPortImpl>(rootHub.Get(), 1u);
  const auto hub = Below<CZKUMHubDeviceImpl>(port.Get());
  const auto hubPort = Below<CZKUMHubPortImpl>(hub.Get(), 1u);
  const auto device = Below<CZKUMPortDeviceImpl>(hubPort.Get(), 0u, nullptr, nullptr, nullptr, u"", u"", u"device");
  const auto disk = Below<CZKUMInfoDeviceImpl>(device.Get());
  const auto lone = MakeRecord<CZKUMInfoDeviceImpl>();
  const std::pair<NodePtr, NodePtr> cases[] = {{disk, device},  {device, device}, {hubPort, hub}, {hub, hub},
                                               {port, nullptr}, {root, nullptr},  {lone, nullptr}};
  HubPortClimbs climbs;
  for (const auto& [start, below] : cases) {
    EXPECT_EQ(HubPortClimbs().From(start.Get()), below.Get()) << start->m_nType;
    for (int again = 0; again < 2; ++again) EXPECT_EQ(climbs.From(start.Get()), below.Get()) << start->m_nType;
    EXPECT_EQ(ReachesRoot(*start), start != lone) << start->m_nType;
  }
  EXPECT_EQ(climbs.From(nullptr), nullptr);
  // A chain of devices is climbed once, from whichever of them and in whichever order one asks.
  constexpr std::size_t kLength = 2000;
  for (const auto& [top, below] : {std::pair<NodePtr, NodePtr>{disk, device}, {lone, nullptr}}) {
    std::vector<NodePtr> chain{top};
    while (chain.size() < kLength) chain.push_back(Below<CZKUMInfoDeviceImpl>(chain.back().Get()));
    for (const bool fromTop : {true, false}) {
      HubPortClimbs ofChain;
      for (std::size_t i = 0; i < kLength; ++i) {
        EXPECT_EQ(ofChain.From(chain[fromTop ? i : kLength - 1 - i].Get()), below.Get());
      }
      EXPECT_LE(ofChain.Steps(), 2 * kLength + 2);
    }
  }
}

// Whether a node is kept, by its name and the children of its parent at that time.
using Verdict = bool (*)(char16_t name, const std::u16string& siblings);

struct AskedNode final : CZKUMUsbTreeNodeImpl {
  AskedNode(Verdict verdict, std::string& asked, char16_t name) : m_verdict(verdict), m_asked(asked) {
    m_strDevInstId = name;
  }
  bool AcceptNode(const NodePtr& node) override {
    EXPECT_EQ(node.Get(), this);
    m_asked += platform::ToUtf8(m_strDevInstId);
    std::u16string siblings;
    for (const NodePtr& child : m_pParent ? m_pParent->m_childs : DeviceList{}) siblings += child->m_strDevInstId;
    return m_verdict(m_strDevInstId[0], siblings);
  }
  const Verdict m_verdict;
  std::string& m_asked;
};

TEST(PrunePass, AsksParentsFirstAndStartsAListAgain) {
  using Siblings = const std::u16string&;
  struct Case {
    const char* what;
    Verdict keep;
    // What is asked and what is left; what AcceptsAll asks, which changes nothing.
    const char *asked, *left, *askedByAcceptsAll;
    bool kept = true, accepted = false;
  };
  const Case cases[] = {
      {"all kept", [](char16_t, Siblings) { return true; }, "RAaBCcd", "RAaBCcd", "RAaBCcd", true, true},
      {"the root goes", [](char16_t name, Siblings) { return name != u'R'; }, "R", "RAaBCcd", "R", false},
      {"the first goes with what is below it", [](char16_t name, Siblings) { return name != u'A'; }, "RABCcd", "RBCcd",
       "RA"},
      {"one in the middle goes, and those before it are asked again",
       [](char16_t name, Siblings) { return name != u'B'; }, "RAaBAaCcd", "RAaCcd", "RAaB"},
      {"the last of an inner list: the outer one goes on", [](char16_t name, Siblings) { return name != u'd'; },
       "RAaBCcdc", "RAaBCc", "RAaBCcd"},
      {"one goes because another went",
       [](char16_t name, Siblings all) { return name != u'B' && (name != u'A' || all.find(u'B') != all.npos); },
       "RAaBACcd", "RCcd", "RAaB"}};
  for (const Case& c : cases) {
    for (const bool prune : {true, false}) {
      std::string asked, left;
      const auto root = Below<AskedNode>(nullptr, c.keep, asked, u'R');
      NodePtr branch;
      for (const char16_t name : {u'A', u'a', u'B', u'C', u'c', u'd'}) {
        const bool leaf = name >= u'a';
        const auto node = Below<AskedNode>(leaf ? branch.Get() : root.Get(), c.keep, asked, name);
        if (!leaf) branch = node;
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
  machine.hostControllers[0].rootHub = machine.hubs[0].name = u"USB#OTHER#1#{1}";
  machine.hubs[0].ports[0].hubName = machine.hubs[1].name = u"USB#OTHER#2#{1}";
  SimulatedPc pc(machine);
  CZKUMUsbTreeBuilder builder(pc);
  ASSERT_TRUE(builder.Build());
  ASSERT_EQ(ListsText(builder), "K1 S1 | K1 S1 | - | -");
  const InfoDeviceSet& current = builder.DeviceInfo().Current();
  const auto stick = builder.GetDeviceList(kConnectedList)->at(1).StaticCast<CZKUMPortDeviceImpl>();
  const InfoDevicePtr entry = current.FindByInstanceId(UsbId(u"S1"));
  EXPECT_EQ(stick->m_infoDevice, entry);
  const CZKUMUsbTreeNodeImpl* port = stick->m_pParent;
  EXPECT_EQ(entry->m_pParent, port);  // not the device
  EXPECT_EQ(port->m_childs, DeviceList{stick});
  // The entry's children hang below the device, and stay in the entry's list.
  ASSERT_EQ(stick->m_childs, DeviceList{current.FindByInstanceId(DiskId(u"S1"))});
  EXPECT_EQ(entry->m_childs, stick->m_childs);
  EXPECT_EQ(stick->m_childs[0]->m_pParent, stick.Get());
  // The hubs on the way up are named after the device manager's parents; their ports are not, and
  // the controller and the root stay as the walk left them.
  const auto handleOf = [&](const Text& id) { return std::to_string(current.FindByInstanceId(id)->m_devInstHandle); };
  const auto identity = [](const CZKUMUsbTreeNodeImpl& node) {
    return platform::ToUtf8(node.m_strDevInstId) + " " + std::to_string(node.m_devInstHandle) + " < " +
           platform::ToUtf8(node.m_strDevInstIdParent) + " " + std::to_string(node.m_devInstHandleParent);
  };
  EXPECT_EQ(port->m_strDevInstId, u"USB\\OTHER\\2 port 2");
  const CZKUMUsbTreeNodeImpl& hub = *port->m_pParent;
  const CZKUMUsbTreeNodeImpl& rootHub = *hub.m_pParent->m_pParent;
  const std::string hubId = platform::ToUtf8(UsbId(u"HUB")) + " " + handleOf(UsbId(u"HUB"));
  const std::string rootHubId = platform::ToUtf8(kRootHubId) + " " + handleOf(kRootHubId);
  EXPECT_EQ(identity(hub), hubId + " < " + rootHubId);
  EXPECT_EQ(identity(rootHub), rootHubId + " < " + platform::ToUtf8(kControllerId) + " 2");
  EXPECT_EQ(builder.Root()->m_strDevInstId, u"Abstract root");
  CZKUMTopologyWalker walker(pc);
  walker.StartWalk();
  EXPECT_EQ(identity(*rootHub.m_pParent), identity(*walker.m_building->m_childs.at(0)));
}

// Two devices on one hub whose parents are two nodes: the hub is given the identity of the last one's.
TEST(Merging, EachDeviceNamesTheHubsAboveIt) {
  Machine machine = BarePc();
  for (const Plug& plug : {Gadget(u"A", 1), Gadget(u"B", 2)}) EXPECT_EQ(CarryOut(machine, plug), u"");
  auto other = *std::ranges::find_if(machine.devices, [](const auto& each) { return each.id == kRootHubId; });
  machine.devices.back().parent = other.id = Text(kRootHubId) + u"OTHER";
  machine.devices.push_back(other);
  SimulatedPc pc(machine);
  CZKUMUsbTreeBuilder builder(pc);
  ASSERT_TRUE(builder.Build());
  ASSERT_EQ(ListsText(builder), "A B | A B | - | -");
  const NodePtr device = builder.GetDeviceList(kConnectedList)->at(0);
  EXPECT_EQ(device->m_pParent->m_pParent->m_strDevInstId, other.id);
}

}  // namespace
}  // namespace KelvoUHW
