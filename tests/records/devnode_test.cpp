#include "records/devnode.h"

#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <optional>
#include <unordered_map>
#include <vector>

#include "platform/flat_index.h"
#include "platform/text.h"
#include "platform/wrappers/intercepting_host.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/best_time.h"

namespace KelvoUHW {
namespace {

using platform::DevInst, platform::Status;
using Link = std::optional<DevInst>;
using Text = std::optional<std::u16string>;

// A device manager that answers what it is told, sense or not. Unset links and texts fail.
struct ScriptedManager final : platform::DeviceManager {
  struct Node {
    Link parent{}, child{}, sibling{};
    Text id{}, driver{}, description{};
    bool withoutZero = false;                     // texts come without a terminating zero
    std::optional<std::uint32_t> claimedBytes{};  // told in place of the size
  };
  std::map<DevInst, Node> nodes;
  Link root = 1;
  int calls = 0, walks = 0;
  int brokenWalks = 0;  // so many walks end at node 4, which is gone as soon as its sibling is asked for
  Status LocateRootDevNode(DevInst& out) noexcept override { return ++walks, Give(root, out); }
  Status GetParent(DevInst n, DevInst& out) noexcept override {
    return Give(n == 4 && walks <= brokenWalks ? Link() : nodes[n].parent, out);
  }
  Status GetChild(DevInst n, DevInst& out) noexcept override { return Give(nodes[n].child, out); }
  Status GetSibling(DevInst n, DevInst& out) noexcept override {
    return Give(n == 4 && walks <= brokenWalks ? Link() : nodes[n].sibling, out);
  }
  Status GetDeviceId(DevInst n, char16_t* buffer, std::uint32_t chars) noexcept override {
    std::uint32_t bytes = chars * 2;
    return GiveText(nodes[n], nodes[n].id, buffer, bytes);
  }
  Status GetDevNodeRegistryProperty(DevInst n, std::uint32_t property, std::uint32_t*, void* buffer,
                                    std::uint32_t& bytes) noexcept override {
    const bool driver = property == platform::kCM_DRP_DRIVER;
    return GiveText(nodes[n], driver ? nodes[n].driver : nodes[n].description, buffer, bytes);
  }
  Status Give(Link link, DevInst& out) {
    ++calls;
    if (!link) return Status::Failure(platform::kCR_NO_SUCH_DEVNODE);
    out = *link;
    return Status::Success();
  }
  Status GiveText(const Node& node, const Text& text, void* buffer, std::uint32_t& bytes) {
    ++calls;
    if (!text) return Status::Failure(platform::kCR_NO_SUCH_VALUE);
    const std::size_t size = (text->size() + (node.withoutZero ? 0 : 1)) * 2;
    if (size > bytes) return Status::Failure(platform::kCR_BUFFER_SMALL);
    std::memcpy(buffer, text->c_str(), size);
    bytes = node.claimedBytes.value_or(static_cast<std::uint32_t>(size));
    return Status::Success();
  }
};

TEST(DevNode, TextsAreReadWithinTheirBuffers) {
  const std::u16string longest(199, u'x'), tooLong(200, u'x');
  const std::tuple<ScriptedManager::Node, std::u16string, std::u16string> cases[] = {
      {{.id = u"A/B\\C/", .description = u"A/B"}, u"A/B", u"A\\B\\C\\"},
      {{}, u"", u""},
      {{.id = longest, .description = longest}, longest, longest},
      {{.id = tooLong, .description = tooLong}, u"", u""},
      {{.id = tooLong, .description = tooLong, .withoutZero = true}, u"", u""},
      {{.id = u"AB", .description = u"AB", .withoutZero = true}, u"AB", u"AB"},
      {{.description = u"ABC", .claimedBytes = 5}, u"AB", u""},
      {{.description = u"ABC", .claimedBytes = 0}, u"", u""},
      {{.description = u"ABC", .claimedBytes = 100000}, u"ABC", u""}};
  ScriptedManager manager;
  for (const auto& [node, description, id] : cases) {
    manager.nodes[5] = node;
    EXPECT_EQ(GetDeviceDescription(manager, 5), description);
    EXPECT_EQ(GetDeviceId(manager, 5), id);
  }
  // No node: the system is not even asked for a handle of 0, and ids of unknown handles are empty.
  manager.nodes[0] = manager.nodes[kUnknownDevInst] = {.id = u"A", .description = u"A"};
  manager.calls = 0;
  EXPECT_EQ(GetDeviceDescription(manager, 0) + GetDeviceId(manager, 0) + GetDeviceId(manager, kUnknownDevInst), u"");
  EXPECT_EQ(manager.calls, 0);
}

TEST(DevNode, ParentIsResolved) {
  const char16_t* const cases[][3] = {{u"USB\\A", u"USB/HUB\\1", u"USB\\HUB\\1"},
                                      {u"V\\_??_USBSTOR#DISK#1#{x}", u"ROOT\\VOLMGR\\0000", u"USBSTOR\\DISK\\1"},
                                      {u"V\\_??_#{x}", u"ROOT\\VOLMGR\\0000", u""},
                                      {u"V\\_??_USBSTOR#DISK#1", u"ROOT\\VOLMGR\\0000", u"ROOT\\VOLMGR\\0000"},
                                      {u"V\\_??_A#{x}", u"root\\volmgr\\0000", u"root\\volmgr\\0000"},
                                      {u"V\\_??_A#{x}", u"ROOT\\VOLMGR", u"ROOT\\VOLMGR"},
                                      {u"V\\_??_A#{x}", u"X\\ROOT\\VOLMGR\\", u"X\\ROOT\\VOLMGR\\"}};
  for (const auto& [id, parentId, resolved] : cases) {
    ScriptedManager manager;
    manager.nodes = {{2, {.parent = 3}}, {3, {.id = parentId}}};
    NodeIdentity node;
    node.m_strDevInstId = id;
    node.m_devInstHandle = 2;
    ResolveParentInstanceId(manager, node);
    EXPECT_EQ(node.m_devInstHandleParent, 3u);
    EXPECT_EQ(node.m_strDevInstIdParent, resolved);
    // A call that fails leaves the handle, and the id is read all the same.
    manager.nodes = {{3, {.id = u"OTHER"}}};
    ResolveParentInstanceId(manager, node);
    EXPECT_EQ(node.m_devInstHandleParent, 3u);
    EXPECT_EQ(node.m_strDevInstIdParent, u"OTHER");
  }
}

// 1 -- 2 -- 4
//   \    \- 5
//    \- 3 -- 6
const std::map<DevInst, ScriptedManager::Node> kSmallTree{
    {1, {.child = 2}},
    {2, {.parent = 1, .child = 4, .sibling = 3, .driver = u"Two"}},
    {3, {.parent = 1, .child = 6, .driver = u"Twice"}},
    {4, {.parent = 2, .sibling = 5, .driver = u"\u00C4\\4"}},
    {5, {.parent = 2, .driver = u"TWICE"}},
    {6, {.parent = 3, .driver = u""}}};

TEST(DriverKey, FindsTheFirstNodeIgnoringCase) {
  for (const bool zeros : {false, true}) {  // links that lead nowhere fail, or succeed with 0
    ScriptedManager manager;
    manager.nodes = kSmallTree;
    for (auto& [handle, node] : manager.nodes) {
      for (Link* link : {&node.parent, &node.child, &node.sibling}) {
        if (zeros) *link = link->value_or(0);
      }
    }
    DriverKeyIndex index(manager);
    EXPECT_EQ(manager.calls, 0);  // nothing is read before the first question
    index.Find(u"none");
    for (const auto& [key, node] : {std::pair{u"two", 2u}, {u"twice", 5}, {u"\u00E4\\4", 4}, {u"", 6}, {u"tw", 0}}) {
      EXPECT_EQ(FindDevNodeByDriverKey(manager, key), node);
      const int before = manager.calls;
      EXPECT_EQ(index.Find(key), node);
      EXPECT_EQ(manager.calls, before);
    }
    manager.nodes[6].driver = u"late";
    EXPECT_EQ(index.Find(u"late"), 0u);
    EXPECT_EQ(FindDevNodeByDriverKey(manager, u"late"), 6u);
  }
}

// The last node is not reached.
TEST(DriverKey, WalksEndOnEverySystem) {
  using Nodes = std::map<DevInst, ScriptedManager::Node>;
  const std::tuple<const char*, Link, Nodes> cases[] = {
      {"no root", {}, {}},
      {"a root of 0", 0, {}},
      {"a node that is its own child", 1, {{4, {.parent = 2, .child = 4, .sibling = 5}}}},
      {"siblings in a circle", 1, {{5, {.parent = 2, .sibling = 4}}}},
      {"a child that is its ancestor", 1, {{5, {.parent = 2, .child = 1}}}},
      {"parents in a circle", 1, {{5, {.parent = 6}}, {6, {.parent = 5, .driver = u""}}}},
      {"a node that is its own parent", 1, {{5, {.parent = 5}}}},
      {"a node without parent", 1, {{5, {}}}}};
  for (const auto& [what, root, changed] : cases) {
    ScriptedManager manager;
    manager.nodes = changed;
    manager.nodes.insert(kSmallTree.begin(), kSmallTree.end());
    manager.root = root;
    EXPECT_EQ(FindDevNodeByDriverKey(manager, u""), 0u) << what;
    EXPECT_EQ(DriverKeyIndex(manager).Find(u""), 0u) << what;
    EXPECT_EQ(manager.walks, 1 + 3) << what;  // none came to its end
  }
}

// A walk that broke off tells nothing of the nodes behind the break, and is made again.
TEST(DriverKey, AWalkThatBreaksOffIsNotKept) {
  const std::tuple<int, std::vector<DevInst>, int> cases[] = {
      // broken walks, answers for node 5, walks
      {0, {5, 5}, 1}, {1, {5, 5}, 2}, {2, {5, 5}, 3}, {3, {0, 5, 5}, 4}, {5, {0, 5, 5}, 6}, {6, {0, 0, 5, 5}, 7}};
  for (const auto& [broken, answers, walks] : cases) {
    ScriptedManager manager;
    manager.nodes = kSmallTree;
    manager.brokenWalks = broken;
    DriverKeyIndex index(manager);
    for (const DevInst answer : answers) EXPECT_EQ(index.Find(u"twice"), answer) << broken;
    EXPECT_EQ(manager.walks, walks);
  }
  // Where none ever comes to its end, what is before the break is found, and the walks are counted.
  ScriptedManager manager;
  manager.nodes = kSmallTree;
  manager.brokenWalks = 1 << 30;
  DriverKeyIndex index(manager);
  for (int i = 0; i < 1000; ++i) EXPECT_EQ(index.Find(u"\u00C4\\4") * 10 + index.Find(u"twice"), 40u);
  EXPECT_EQ(manager.walks, 300);
}

// Keys are told apart where their hashes are not.
TEST(DriverKey, KeysOfOneHashAreTwo) {
  std::unordered_map<std::uint32_t, int> numbers;
  for (int number = 0; number < 1'000'000; ++number) {
    const std::uint64_t hash = platform::HashOf(u"{class}\\" + platform::Decimal(number));
    const auto [other, fresh] = numbers.emplace(static_cast<std::uint32_t>(hash ^ hash >> 32), number);
    if (fresh) continue;
    ScriptedManager manager;
    manager.nodes = {{1, {.child = 2}},
                     {2, {.parent = 1, .sibling = 3, .driver = u"{class}\\" + platform::Decimal(number)}},
                     {3, {.parent = 1, .driver = u"{class}\\" + platform::Decimal(other->second)}}};
    DriverKeyIndex index(manager);
    EXPECT_EQ(index.Find(*manager.nodes[2].driver), 2u);
    EXPECT_EQ(index.Find(*manager.nodes[3].driver), 3u);
    return;
  }
  FAIL() << "no two keys have one hash";
}

// Nearly all keys have one class: looking through all of them for each would take some hundred times as long.
TEST(DriverKey, OneClassForAllNodesTakesNoLonger) {
  const auto time = [](bool oneClass) {
    constexpr DevInst count = 4'000;
    ScriptedManager manager;
    for (DevInst i = 2; i < count; ++i) {
      manager.nodes[i] = {.parent = 1,
                          .sibling = i + 1 < count ? Link(i + 1) : Link(),
                          .driver = u"{" + platform::Decimal(static_cast<int>(10'000'000 + (oneClass ? 0 : i))) +
                                    u"-c465-11cf-8056-444553540000}\\" + platform::Decimal(static_cast<int>(i))};
    }
    manager.nodes[1].child = 2;
    const std::u16string last = *manager.nodes[count - 1].driver;
    return testing_support::BestOfThree([&] { EXPECT_EQ(DriverKeyIndex(manager).Find(last), count - 1); });
  };
  EXPECT_LT(time(true), 20 * time(false));
}

// Each node has a child that nobody has seen.
TEST(DriverKey, NodesWithoutEndAreLeft) {
  struct Endless final : platform::wrappers::InterceptingHost {
    explicit Endless(platform::Host& base) : InterceptingHost(base) {}
    Status BeforeCall(const platform::wrappers::HostCall&) noexcept override { return {}; }
    Status LocateRootDevNode(DevInst& out) noexcept override { return out = 1, Status::Success(); }
    Status GetChild(DevInst node, DevInst& out) noexcept override { return out = node + 1, ++calls, Status::Success(); }
    std::uint32_t calls = 0;
  };
  platform::simulated::SimulatedPc pc{platform::simulated::Machine()};
  Endless endless(pc);
  DriverKeyIndex index(endless);
  EXPECT_EQ(index.Find(u"a") + index.Find(u"b"), 0u);
  EXPECT_EQ(endless.calls, 200'000u);  // in one walk, which is kept
}

}  // namespace
}  // namespace KelvoUHW
