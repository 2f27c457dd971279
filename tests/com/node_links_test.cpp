// The way from node to node: Parent, Childs, InSubtreeDevicesOfType.
#include <algorithm>

#include <gmock/gmock.h>

#include "platform/com_controls.h"
#include "tests/support/com_objects.h"
#include "tests/support/outline.h"

namespace KelvoUHW {
namespace {

using platform::controls::FailCriticalSection;

struct NodeLinks : ComObjects {
  SampleTree sample;
};

// The parent's object owns the parent's record by itself. The record here belongs to nobody else.
TEST_F(NodeLinks, ParentOwnsItsRecordAndTakesItAlong) {
  auto* parent = new CZKUMHubDeviceImpl;
  parent->m_strDevInstId = u"parent";
  const NodePtr child = MakeNode<CZKUMHubPortImpl>(u"child", {}, 1u);
  child->m_pParent = parent;
  parent->m_childs.push_back(child);
  const auto object = Wrap(child);
  const std::size_t ring = child.RingSize();

  IZKUMUsbTreeNode* out = Mark<IZKUMUsbTreeNode>();
  // Without an object nobody has taken the record over.
  FailCriticalSection(1, E_ACCESSDENIED);
  EXPECT_EQ(object->get_Parent(&out), E_ACCESSDENIED);
  EXPECT_EQ(out, nullptr);
  ASSERT_EQ(child->m_pParent, parent);
  EXPECT_EQ(child.RingSize(), ring);

  ASSERT_EQ(object->get_Parent(&out), S_OK);
  EXPECT_EQ(References(out), 1u);
  EXPECT_EQ(InstanceId(out), "S_OK parent");
  EXPECT_TRUE(ComPtr<IUnknown>(out).As<IZKUMHubDevice>());
  EXPECT_EQ(child.RingSize(), ring);
  EXPECT_EQ(out->Release(), 0u);
  // The dying record took its child's way up along.
  EXPECT_EQ(child->m_pParent, nullptr);
  EXPECT_EQ(child.RingSize(), ring - 1);
  EXPECT_EQ(object->get_Parent(&out), E_POINTER);
}

// A record that the object of a Parent destroyed is held by nobody: not by the tree, not by other objects.
TEST_F(NodeLinks, WhatAParentDestroyedIsNobodysAnyMore) {
  for (const bool bySecond : {false, true}) {
    SampleTree tree;
    const auto root = Wrap(tree.root), controller = Wrap(tree.controller), hub = Wrap(tree.hub), port = Wrap(tree.port);
    ComPtr<IZKUMUsbTreeNode> first, second;
    ASSERT_EQ(port->get_Parent(first.Put()), S_OK);
    ASSERT_EQ(port->get_Parent(second.Put()), S_OK);
    EXPECT_EQ(tree.hub.RingSize(), 1u + 1 + 2);  // its own, the tree's, the object's two: none of the two parents'
    (bySecond ? second : first).Reset();
    EXPECT_FALSE(tree.hub);
    EXPECT_EQ(tree.port->m_pParent, nullptr);
    for (const auto& node : {hub, bySecond ? first : second}) {
      const auto typed = ComPtr<IUnknown>(node.Get()).As<IZKUMHubDevice>();
      EXPECT_EQ(InstanceId(node.Get()), "E_FAIL null");
      EXPECT_EQ(TextOf(&Read<&IZKUMHubDevice::get_PathName>, typed.Get()), "E_POINTER null");
      EXPECT_EQ(TextOf(&Read<&IZKUMUsbDevice::get_Vendor>, typed.Get()), "E_POINTER null");
      EXPECT_EQ(NumberOf<&IZKUMUsbTreeNode::get_Type>(node.Get()), "E_INVALIDARG 1515870810");
      ComPtr<IZKUMUsbTreeNode> parent;
      EXPECT_EQ(node->get_Parent(parent.Put()), E_POINTER);
    }
    // The tree goes on without it, and what hung below lives as long as it is held.
    ComPtr<IZKUMUsbTreeNodeEnumerator> list;
    EXPECT_EQ(controller->get_Childs(list.Put()), E_POINTER);
    EXPECT_EQ(root->get_InSubtreeDevicesOfType(KUDTHub, list.Put()), S_OK);
    EXPECT_EQ(InstanceId(port.Get()), "S_OK port.InstanceId");
    EXPECT_THAT(DumpOf(*tree.root), testing::HasSubstr("child 0"));
    const NodePtr added = MakeRecord<CZKUMUsbTreeNodeImpl>();
    AddChild(added, tree.controller.Get());
    EXPECT_EQ(tree.controller->m_childs.back(), added);
  }
}

// The tree of a parent's object goes first: the object holds no record then.
TEST_F(NodeLinks, AParentWhoseTreeIsGoneHoldsNothing) {
  ComPtr<IZKUMUsbTreeNode> device, port, info;
  {
    SampleTree tree;
    ASSERT_EQ(Wrap(tree.disk)->get_Parent(info.Put()), S_OK);
    ASSERT_EQ(Wrap(tree.info)->get_Parent(device.Put()), S_OK);
    ASSERT_EQ(Wrap(tree.device)->get_Parent(port.Put()), S_OK);
    EXPECT_EQ(InstanceId(port.Get()), "S_OK port.InstanceId");
  }
  for (const auto& [node, what] : {std::pair(device, "device"), {port, "port"}, {info, "info"}}) {
    EXPECT_EQ(InstanceId(node.Get()), "E_FAIL null") << what;
    ComPtr<IZKUMUsbTreeNodeEnumerator> list;
    EXPECT_EQ(node->get_Childs(list.Put()), E_POINTER);
  }
  const std::string noRecord = " 1515870810";
  EXPECT_EQ(NumberOf<&IZKUMHubPort::get_PortIndex>(port.Get()), "E_POINTER" + noRecord);
  EXPECT_EQ(NumberOf<&IZKUMPortDevice::get_Speed>(device.Get()), "E_POINTER" + noRecord);
  EXPECT_EQ(NumberOf<&IZKUMPortDevice::get_NumberInterfaces>(device.Get()), "E_POINTER 90");
  EXPECT_EQ(TextOf(&Read<&IZKUMInfoDevice::get_Service>, device.Get()), "E_FAIL null");
  EXPECT_EQ(TextOf(&Read<&IZKUMInfoDevice::get_Service>, info.Get()), "E_FAIL null");
  ComPtr<IEnumVARIANT> list;
  EXPECT_EQ(device.As<IZKUMPortDevice>()->get_InterfaceDescriptors(list.Put()), E_POINTER);
}

TEST_F(NodeLinks, WhatIsAnsweredInTheirPlace) {
  ComObject<CZKUMUsbTreeNode>* created = nullptr;
  ASSERT_EQ(ComObject<CZKUMUsbTreeNode>::Create(created), S_OK);
  const auto empty = ComPtr<IZKUMUsbTreeNode>::Attach(created);
  const auto root = Wrap(sample.root);
  for (const auto& node : {empty, root}) {
    IZKUMUsbTreeNode* parent = Mark<IZKUMUsbTreeNode>();
    EXPECT_EQ(node->get_Parent(&parent), E_POINTER);
    EXPECT_EQ(parent, nullptr);
    EXPECT_EQ(node->get_Parent(nullptr), E_POINTER);
    EXPECT_EQ(node->get_Childs(nullptr), E_POINTER);
    EXPECT_EQ(node->get_InSubtreeDevicesOfType(KUDTRoot, nullptr), E_POINTER);
  }
  // A child without a record, which no walk of the topology makes.
  sample.root->m_childs.insert(sample.root->m_childs.begin() + 1, NodePtr());
  for (const int call : {0, 1, 2}) {
    auto* list = Mark<IZKUMUsbTreeNodeEnumerator>();
    EXPECT_EQ(call == 0   ? empty->get_Childs(&list)
              : call == 1 ? empty->get_InSubtreeDevicesOfType(KUDTUnknown, &list)
                          : root->get_Childs(&list),
              E_POINTER);
    EXPECT_EQ(list, nullptr) << call;
  }
  sample.root->m_childs.erase(sample.root->m_childs.begin() + 1);
}

// The n-th object that is made cannot be: the children's, then the list's own.
TEST_F(NodeLinks, ListsWithoutTheirObjects) {
  const auto root = Wrap(sample.root);
  const std::size_t ring = sample.controller.RingSize();
  const HRESULT expected[] = {E_POINTER, E_POINTER, E_ACCESSDENIED, S_OK};
  for (std::size_t call = 1; call <= std::size(expected); ++call) {
    for (const bool subtree : {false, true}) {
      FailCriticalSection(call, E_ACCESSDENIED);
      ComPtr<IZKUMUsbTreeNodeEnumerator> list;
      // Kind 0 is in the sample once, so the subtree comes to its list one object sooner.
      const HRESULT result =
          subtree ? root->get_InSubtreeDevicesOfType(KUDTUnknown, list.Put()) : root->get_Childs(list.Put());
      EXPECT_EQ(result, expected[std::min<std::size_t>(call - (subtree ? 0 : 1), 3)]) << call << subtree;
      EXPECT_EQ(static_cast<bool>(list), result == S_OK);
      FailCriticalSection(0, S_OK);
    }
    EXPECT_EQ(sample.controller.RingSize(), ring);
  }
}

}  // namespace
}  // namespace KelvoUHW
