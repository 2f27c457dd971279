#include "devinfo/devnode.h"

#include <gtest/gtest.h>

#include <cstring>
#include <map>
#include <optional>

namespace KelvoUHW {
namespace {

using platform::DevInst;
using platform::Status;

// A device manager that answers what it is told, sense or not. Unset links and texts fail.
class ScriptedManager final : public platform::DeviceManager {
 public:
  struct Node {
    std::optional<DevInst> parent{}, child{}, sibling{};
    std::optional<std::u16string> id{}, driver{}, description{};
    bool withoutZero = false;                     // texts come without a terminating zero
    std::optional<std::uint32_t> claimedBytes{};  // told in place of the size
  };
  std::map<DevInst, Node> nodes;
  std::optional<DevInst> root = 1;
  int calls = 0;

  Status LocateRootDevNode(DevInst& out) noexcept override { return Give(root, out); }
  Status GetParent(DevInst n, DevInst& out) noexcept override { return Give(nodes[n].parent, out); }
  Status GetChild(DevInst n, DevInst& out) noexcept override { return Give(nodes[n].child, out); }
  Status GetSibling(DevInst n, DevInst& out) noexcept override {
    return Give(nodes[n].sibling, out);
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

 private:
  Status Give(std::optional<DevInst> link, DevInst& out) {
    ++calls;
    if (!link) return Status::Failure(platform::kCR_NO_SUCH_DEVNODE);
    out = *link;
    return Status::Success();
  }
  Status GiveText(const Node& node, const std::optional<std::u16string>& text, void* buffer,
                  std::uint32_t& bytes) {
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
  const std::u16string longest(199, u'x');
  const std::u16string tooLong(200, u'x');
  struct Case {
    ScriptedManager::Node node;
    std::u16string description, id;
  };
  const Case cases[] = {
      {{.id = u"A/B\\C/", .description = u"A/B"}, u"A/B", u"A\\B\\C\\"},
      {{}, u"", u""},
      {{.id = longest, .description = longest}, longest, longest},
      {{.id = tooLong, .description = tooLong}, u"", u""},
      {{.id = tooLong, .description = tooLong, .withoutZero = true}, u"", u""},
      {{.id = u"AB", .description = u"AB", .withoutZero = true}, u"AB", u"AB"},
      {{.description = u"ABC", .claimedBytes = 5}, u"AB", u""},
      {{.description = u"ABC", .claimedBytes = 0}, u"", u""},
      {{.description = u"ABC", .claimedBytes = 100000}, u"ABC", u""},
  };
  for (const Case& c : cases) {
    ScriptedManager manager;
    manager.nodes[5] = c.node;
    EXPECT_EQ(GetDeviceDescription(manager, 5), c.description);
    EXPECT_EQ(GetDeviceId(manager, 5), c.id);
  }
  // No node: the system is not even asked for a handle of 0, and ids of unknown handles are empty.
  ScriptedManager manager;
  manager.nodes[0] = manager.nodes[kUnknownDevInst] = {.id = u"A", .description = u"A"};
  EXPECT_EQ(GetDeviceDescription(manager, 0), u"");
  EXPECT_EQ(GetDeviceId(manager, 0), u"");
  EXPECT_EQ(GetDeviceId(manager, kUnknownDevInst), u"");
  EXPECT_EQ(manager.calls, 0);
}

TEST(DevNode, ParentIsResolved) {
  struct Case {
    const char16_t *id, *parentId, *resolved;
  };
  const Case cases[] = {
      {u"USB\\A", u"USB/HUB\\1", u"USB\\HUB\\1"},
      {u"V\\_??_USBSTOR#DISK#1#{x}", u"ROOT\\VOLMGR\\0000", u"USBSTOR\\DISK\\1"},
      {u"V\\_??_#{x}", u"ROOT\\VOLMGR\\0000", u""},
      {u"V\\_??_USBSTOR#DISK#1", u"ROOT\\VOLMGR\\0000", u"ROOT\\VOLMGR\\0000"},
      {u"V\\USBSTOR#DISK#1#{x}", u"ROOT\\VOLMGR\\0000", u"ROOT\\VOLMGR\\0000"},
      {u"V\\_??_A#{x}", u"root\\volmgr\\0000", u"root\\volmgr\\0000"},
      {u"V\\_??_A#{x}", u"ROOT\\VOLMGR", u"ROOT\\VOLMGR"},
      {u"V\\_??_A#{x}", u"X\\ROOT\\VOLMGR\\", u"X\\ROOT\\VOLMGR\\"},
  };
  for (const Case& c : cases) {
    ScriptedManager manager;
    manager.nodes[2] = {.parent = 3};
    manager.nodes[3] = {.id = c.parentId};
    NodeIdentity node;
    node.m_strDevInstId = c.id;
    node.m_devInstHandle = 2;
    ResolveParentInstanceId(manager, node);
    EXPECT_EQ(node.m_devInstHandleParent, 3u);
    EXPECT_EQ(node.m_strDevInstIdParent, c.resolved);

    // A call that fails leaves the handle, and the id is read all the same.
    manager.nodes[2].parent.reset();
    manager.nodes[3].id = u"OTHER";
    ResolveParentInstanceId(manager, node);
    EXPECT_EQ(node.m_devInstHandleParent, 3u);
    EXPECT_EQ(node.m_strDevInstIdParent, u"OTHER");
  }
}

// 1 -- 2 -- 4
//   \    \- 5
//    \- 3 -- 6
std::map<DevInst, ScriptedManager::Node> SmallTree() {
  return {{1, {.child = 2}},
          {2, {.parent = 1, .child = 4, .sibling = 3, .driver = u"Two"}},
          {3, {.parent = 1, .child = 6, .driver = u"Twice"}},
          {4, {.parent = 2, .sibling = 5, .driver = u"\u00C4\\4"}},
          {5, {.parent = 2, .driver = u"TWICE"}},
          {6, {.parent = 3, .driver = u""}}};
}

TEST(DriverKey, FindsTheFirstNodeIgnoringCase) {
  ScriptedManager manager;
  manager.nodes = SmallTree();
  DriverKeyIndex index(manager);
  EXPECT_EQ(manager.calls, 0);  // nothing is read before the first question
  const std::pair<const char16_t*, DevInst> cases[] = {
      {u"two", 2}, {u"twice", 5}, {u"\u00E4\\4", 4}, {u"", 6}, {u"tw", 0}, {u"none", 0}};
  for (const auto& [key, node] : cases) {
    EXPECT_EQ(FindDevNodeByDriverKey(manager, key), node);
    const int before = manager.calls;
    EXPECT_EQ(index.Find(key), node);
    if (key != cases[0].first) {
      EXPECT_EQ(manager.calls, before);
    }
  }
  manager.nodes[6].driver = u"late";
  EXPECT_EQ(index.Find(u"late"), 0u);
  EXPECT_EQ(FindDevNodeByDriverKey(manager, u"late"), 6u);
}

TEST(DriverKey, WalksEndOnEverySystem) {
  struct Case {
    const char* what;
    void (*change)(ScriptedManager&);
    DevInst six;  // what the search for the last node's key gives
  };
  const Case cases[] = {
      {"links that succeed with 0",
       [](ScriptedManager& m) {
         for (auto& [handle, node] : m.nodes) {
           for (auto* link : {&node.parent, &node.child, &node.sibling}) *link = link->value_or(0);
         }
       },
       6},
      {"no root", [](ScriptedManager& m) { m.root.reset(); }, 0},
      {"a root of 0", [](ScriptedManager& m) { m.root = 0; }, 0},
      {"a node that is its own child", [](ScriptedManager& m) { m.nodes[4].child = 4; }, 0},
      {"siblings in a circle", [](ScriptedManager& m) { m.nodes[5].sibling = 4; }, 0},
      {"a child that is its ancestor", [](ScriptedManager& m) { m.nodes[5].child = 1; }, 0},
      {"parents in a circle",
       [](ScriptedManager& m) {
         m.nodes[5].parent = 6;
         m.nodes[6].parent = 5;
       },
       0},
      {"a node that is its own parent", [](ScriptedManager& m) { m.nodes[5].parent = 5; }, 0},
      {"a node without parent", [](ScriptedManager& m) { m.nodes[5].parent.reset(); }, 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    ScriptedManager manager;
    manager.nodes = SmallTree();
    c.change(manager);
    EXPECT_EQ(FindDevNodeByDriverKey(manager, u""), c.six);
    EXPECT_EQ(DriverKeyIndex(manager).Find(u""), c.six);
  }
}

}  // namespace
}  // namespace KelvoUHW
