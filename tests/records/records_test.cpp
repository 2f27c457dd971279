#include "records/records.h"

#include <gtest/gtest.h>

#include "tests/support/outline.h"

namespace KelvoUHW {
namespace {

const std::string kNoChildren = "childvector size0\r\nChildsToString End\r\n";

RingPtr<CZKUMUsbTreeNodeImpl> Node(const char16_t* id) {
  auto node = MakeRecord<CZKUMUsbTreeNodeImpl>();
  node->SetInstanceId(id);
  return node;
}

TEST(Node, BaseLinesAppearOnlyWithTheirValues) {
  const std::tuple<const char*, void (*)(CZKUMUsbTreeNodeImpl&), const char*> cases[] = {
      {"nothing", [](auto&) {}, ""},
      {"one id known", [](auto& n) { n.m_nVendorId = 0x1234; }, "> VendorId; productId: 0x1234; 0xFFFFFFFF\r\n"},
      {"a vendor alone", [](auto& n) { n.m_strVendor = u"8086"; }, "> Vendor; product: 8086;\r\n"},
      {"a product alone", [](auto& n) { n.m_strProduct = u"CRUZER"; }, "> Vendor; product: ;CRUZER\r\n"},
      {"names", [](auto& n) { n.m_strVendor = u"SANDISK", n.m_strProduct = u"CRUZER"; },
       "> Vendor; product: SANDISK;CRUZER\r\n"},
      {"handles", [](auto& n) { n.m_devInstHandle = 7, n.m_devInstHandleParent = kUnknownId; },
       "> devInstHandle        : 7\r\n> devInstHandleParent  : -1\r\n"}};
  for (const auto& [what, fill, lines] : cases) {
    const auto node = MakeRecord<CZKUMUsbTreeNodeImpl>();
    fill(*node);
    EXPECT_EQ(DumpOf(*node, u"> "), lines + kNoChildren) << what;
  }
}

TEST(Node, SameNodeComparesAllButTheVendorId) {
  const std::pair<void (*)(CZKUMUsbTreeNodeImpl&), bool> cases[] = {
      {[](auto& n) { n.m_nVendorId = 1, n.m_strVendor = u"x"; }, true},
      {[](auto& n) { n.m_strDevInstId = u"a"; }, false},  // exact: "A" is another
      {[](auto& n) { n.m_nProductId = 1; }, false},
      {[](auto& n) { n.m_strProduct = u"x"; }, false},
      {[](auto& n) { n.m_strSerialNumber = u"x"; }, false},
      {[](auto& n) { n.m_strDeviceDescr = u"x"; }, false}};
  for (const auto& [change, same] : cases) {
    const auto parent = Node(u"parent"), first = Node(u"A"), second = Node(u"A");
    change(*second);
    AddChild(first, parent.Get());
    AddChild(second, parent.Get());
    EXPECT_EQ(parent->m_childs.size(), same ? 1u : 2u);
    EXPECT_EQ(second->m_pParent, same ? nullptr : parent.Get());
  }
  const auto orphan = Node(u"A");
  AddChild(orphan, nullptr);
  EXPECT_EQ(orphan->m_pParent, nullptr);
  orphan->SetParentInstanceId(u"p");
  orphan->SetParentInstanceId(u"");
  EXPECT_EQ(orphan->m_strDevInstIdParent, u"");
}

TEST(Node, FindsTheFirstInPreOrderExactlyAndDriverKeysIgnoringCase) {
  const auto root = Node(u"root"), a = Node(u"a"), deep = Node(u"x"), shallow = Node(u"x");
  shallow->m_strDeviceDescr = u"second";
  shallow->m_strDriverKeyName = u"{Key\u00c4}\\0001";
  AddChild(a, root.Get());
  AddChild(deep, a.Get());
  AddChild(shallow, root.Get());
  EXPECT_EQ(FindByInstanceId(root, u"x"), deep);
  EXPECT_EQ(FindByInstanceId(root, u"root"), root);
  EXPECT_EQ(FindByInstanceId(root, u"X"), nullptr);
  EXPECT_EQ(FindByInstanceId(nullptr, u"x"), nullptr);
  EXPECT_TRUE(root->HasChildWithDriverKey(u"{kEY\u00e4}\\0001"));
  EXPECT_FALSE(root->HasChildWithDriverKey(u"{key\u00e4}\\0002"));
  EXPECT_FALSE(a->HasChildWithDriverKey(u"{key\u00e4}\\0001"));
}

TEST(Node, ParentLinksOfADyingRecordGoToNull) {
  const auto child = Node(u"child"), info = Node(u"info"), moved = Node(u"moved"), other = Node(u"other");
  {
    const auto parent = Node(u"parent");
    AddChild(child, parent.Get());
    AddChild(moved, parent.Get());
    moved->m_pParent = other.Get();  // a child that names another parent meanwhile
    const auto port = MakeRecord<CZKUMHubPortImpl>(1u);
    const auto device = MakeRecord<CZKUMPortDeviceImpl>(1u, nullptr, nullptr, nullptr, u"", u"", u"");
    AddChild(device, port.Get());
    device->m_infoDevice = info;
    info->m_pParent = port.Get();
  }
  EXPECT_EQ(child->m_pParent, nullptr);
  EXPECT_EQ(info->m_pParent, nullptr);
  EXPECT_EQ(moved->m_pParent, other.Get());
}

// Whoever holds a node of its own takes it from its parent, whose list keeps an empty place.
TEST(Node, ChildrenThatWereDestroyedLeaveEmptyPlaces) {
  const auto destroy = [](const NodePtr& node) { NodePtr::InARingOfItsOwn(node.Get()).Reset(); };
  const auto first = Node(u"1"), second = Node(u"2"), third = Node(u"1");
  const auto device = MakeRecord<CZKUMPortDeviceImpl>(1u, nullptr, nullptr, nullptr, u"", u"", u"");
  {
    const auto parent = MakeRecord<CZKUMUsbTreeNodeImpl>();
    const auto port = MakeRecord<CZKUMHubPortImpl>(1u);
    device->m_infoDevice = Node(u"info");
    for (const NodePtr& child : {first, second}) AddChild(child, parent.Get());
    for (const NodePtr& child : {first, NodePtr(device)}) AddChild(child, port.Get());
    destroy(first);
    AddChild(third, parent.Get());  // compared with those that are there
    second->m_strDriverKeyName = u"key";
    EXPECT_TRUE(parent->HasChildWithDriverKey(u"KEY"));
    const std::string rest = kNoChildren;
    EXPECT_EQ(DumpOf(*parent, u""),
              "childvector size0\r\nchild 0\r\nchild 1\r\n- DevInstId            : 2\r\n- driverKeyName : key\r\n" +
                  rest + "child 2\r\n- DevInstId            : 1\r\n" + rest + "ChildsToString End\r\n");
    EXPECT_EQ(FindByInstanceId(parent, u"1"), third);
    device->m_infoDevice->m_pParent = port.Get();
  }
  EXPECT_EQ(second->m_pParent, nullptr);
  EXPECT_EQ(device->m_infoDevice->m_pParent, nullptr);
}

CZKUMUsbTreeNodeImpl* HangChainBelow(CZKUMUsbTreeNodeImpl* last, int depth) {
  for (int i = 1; i < depth; ++i) {
    const auto next = Node(platform::Decimal(i).c_str());
    AddChild(next, last);
    last = next.Get();
  }
  return last;
}

TEST(Node, ADeepChainNeedsNoDeepStackAndIsDumped) {
  auto root = Node(u"0");
  CZKUMUsbTreeNodeImpl* const last = HangChainBelow(root.Get(), 10000);
  EXPECT_EQ(FindByInstanceId(root, u"9999").Get(), last);
  const NodePtr kept = FindByInstanceId(root, u"5000");
  root.Reset();
  EXPECT_EQ(kept->m_pParent, nullptr);
  EXPECT_NE(FindByInstanceId(kept, u"9999"), nullptr);
  root = Node(u"0");
  HangChainBelow(root.Get(), 500);
  std::string indent;
  for (int i = 1; i < 500; ++i) indent += "- ";
  const std::string last499 = "\r\n" + indent + "DevInstId            : 499\r\nchildvector size0\r\n";
  EXPECT_NE(DumpOf(*root).find(last499), std::string::npos);
}

// The golden dumps of whole PCs have ports that work, and ports without device.
TEST(Records, PortsTellTheirStatusAndHubsAreNamedAfterTheirPaths) {
  EXPECT_EQ(MakeRecord<CZKUMUsbTreeRootImpl>()->m_strDevInstId, u"Abstract root");
  for (const std::uint32_t status : {2u, 3u}) {
    const auto port = MakeRecord<CZKUMHubPortImpl>(7u);
    port->SetInstanceId(u"a port");
    port->m_nStatus = status;
    EXPECT_EQ(DumpOf(*port, u"+"), "+HubPort 7:\r\n+status : bad device\r\n" + kNoChildren);
  }
  const auto hub = MakeRecord<CZKUMHubDeviceImpl>();
  hub->SetHubName(u"USB#Root_Hub#1#{f18a0e88-c30c-11d0-8815-00a0c906bed8}");
  EXPECT_EQ(hub->m_strDevInstId, u"USB\\ROOT_HUB\\1");
  EXPECT_EQ(platform::GuidText(hub->m_guid), u"{F18A0E88-C30C-11D0-8815-00A0C906BED8}");
}

TEST(Records, HubNamesAndTheRecordThatIsKept) {
  const std::size_t live = ConnectionRecord::LiveCount(), kept = ConnectionRecord::KeptCount();
  const std::tuple<std::uint32_t, const char16_t*, const char16_t*> cases[] = {
      {1, u"Generic USB Hub", u"[Port3] DeviceConnected :  Generic USB Hub"},
      {5, u"", u"[Port3] DeviceNotEnoughPower :  HUB"},
      {6, u"", u"[Port3] (unknown) :  HUB"},
      {0xFFFFFFFF, u"", u"[Port3] (unknown) :  HUB"}};
  for (const auto& [status, description, leafName] : cases) {
    const auto hub = MakeRecord<CZKUMHubDeviceImpl>();
    hub->SetHubName(u"HUB");
    EXPECT_EQ(std::tuple(hub->m_strDevInstId, hub->m_guid, hub->LeafName()), std::tuple(u"", platform::Guid{}, u"HUB"));
    auto record = std::make_unique<ConnectionRecord>();
    record->Info.ConnectionIndex = 3;
    record->Info.ConnectionStatus = status;
    hub->SetConnectionInfo(std::move(record), nullptr, nullptr);
    hub->m_strDeviceDescr = description;
    EXPECT_EQ(hub->LeafName(), leafName);
  }
  // A hub never frees its connection record.
  EXPECT_EQ(ConnectionRecord::LiveCount() - live, std::size(cases));
  EXPECT_EQ(ConnectionRecord::KeptCount() - kept, std::size(cases));
  EXPECT_EQ(ConnectionRecord::LiveCount(), ConnectionRecord::KeptCount());
}

}  // namespace
}  // namespace KelvoUHW
