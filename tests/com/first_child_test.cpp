// IZKUMPortDevice::FirstChildOfType, over the component's nodes and over nodes of a client's own.
#include "com/first_child.h"

#include <new>

#include "tests/support/client_node.h"
#include "tests/support/com_objects.h"

namespace KelvoUHW {
namespace {

class FirstChildOfType : public ComObjects {
 protected:
  // "CODE id", with a reference of the caller's; "same": the node passed in, deliberately without one.
  std::string Search(IZKUMUsbTreeNode* node, TUsbDeviceType kind) {
    const ULONG before = References(node);
    IZKUMUsbTreeNode* found = Mark<IZKUMUsbTreeNode>();
    const std::string code = CodeName(searcher->get_FirstChildOfType(node, kind, &found));
    EXPECT_EQ(References(node), before);
    if (found == Mark<IZKUMUsbTreeNode>()) return code + " untouched";
    if (found == node) return code + " same";
    const std::string id = InstanceId(found);
    EXPECT_EQ(found->Release(), 0u);
    return code + " " + id;
  }

  SampleTree sample;
  ComPtr<IZKUMPortDevice> searcher = Wrap(sample.device).As<IZKUMPortDevice>();
};

TEST_F(FirstChildOfType, FindsTheFirstInPreOrder) {
  const NodePtr tree = MakeNode<CZKUMUsbTreeRootImpl>(
      u"root", {MakeNode<CZKUMHubDeviceImpl>(
                    u"h1", {MakeNode<CZKUMHubPortImpl>(u"p1", {}, 1u),
                            MakeNode<CZKUMHubDeviceImpl>(u"h2", {MakeNode<CZKUMHostControllerImpl>(u"c1")})}),
                MakeNode<CZKUMHostControllerImpl>(u"c2")});
  const auto root = Wrap(tree);
  const std::pair<TUsbDeviceType, const char*> rows[] = {{KUDTRoot, "S_OK same"},
                                                         {KUDTHub, "S_OK S_OK h1"},
                                                         {KUDTHubPort, "S_OK S_OK p1"},
                                                         {KUDTHostController, "S_OK S_OK c1"},
                                                         {KUDTUnknown, "S_FALSE untouched"}};
  for (const auto& [kind, expected] : rows) EXPECT_EQ(Search(root.Get(), kind), expected) << kind;
  EXPECT_EQ(searcher->get_FirstChildOfType(root.Get(), KUDTHub, nullptr), E_POINTER);
  EXPECT_EQ(searcher->get_FirstChildOfType(root.Get(), KUDTInterfaceDevice, nullptr), S_FALSE);
  EXPECT_EQ(searcher->get_FirstChildOfType(nullptr, KUDTHub, nullptr), E_POINTER);
}

#ifndef _WIN32
// Deliberate: callers have always had to pass these two pointers.
TEST_F(FirstChildOfType, TwoPointersAreNotTestedForNull) {
  const auto root = Wrap(sample.root);
  EXPECT_DEATH(searcher->get_FirstChildOfType(root.Get(), KUDTRoot, nullptr), "");
  ComPtr<IZKUMUsbTreeNodeEnumerator> list;
  ASSERT_EQ(root->get_Childs(list.Put()), S_OK);
  EXPECT_DEATH(list->MoveNext(nullptr), "");
}
#endif

TEST_F(FirstChildOfType, DepthIsNoLimit) {
  NodePtr chain = MakeNode<CZKUMHostControllerImpl>(u"deepest");
  for (int depth = 0; depth < 1000; ++depth) chain = MakeNode<CZKUMHubDeviceImpl>(u"hub", {chain});
  const NodePtr root = MakeNode<CZKUMUsbTreeRootImpl>(u"root", {chain});
  EXPECT_EQ(Search(Wrap(root).Get(), KUDTHostController), "S_OK S_OK deepest");
  EXPECT_EQ(Search(Wrap(root).Get(), KUDTHubPort), "S_FALSE untouched");
}

// A list that is there and is none is an empty one.
TEST_F(FirstChildOfType, AClientsNodeMayGiveNoListAndSayItDid) {
  ClientNode leaf(KUDTHubPort), middle(KUDTHub, {&leaf}), last(KUDTHubPort), top(KUDTRoot, {&middle, &last});
  middle.givesNoList = true;
  IZKUMUsbTreeNode* found = nullptr;
  EXPECT_EQ(searcher->get_FirstChildOfType(&top, KUDTHubPort, &found), S_OK);
  EXPECT_EQ(found, &last);
  last.Release();
  EXPECT_EQ(searcher->get_FirstChildOfType(&middle, KUDTHubPort, &found), S_FALSE);
}

// The tree of a client: below top (root) are middle (hub), last (controller) and odd, below middle is leaf (port).
TEST_F(FirstChildOfType, NodesOfAClientMayFailAnywhere) {
  ClientNode leaf(KUDTHubPort), middle(KUDTHub, {&leaf}), last(KUDTHostController), odd(KUDTUnknown),
      top(KUDTRoot, {&middle, &last, &odd});
  const struct {
    const char* what;
    ClientNode* failing;  // null: none
    ClientNode::Method method;
    TUsbDeviceType kind;
    HRESULT result;
    ClientNode* found;
  } rows[] = {
      {"nothing fails", nullptr, ClientNode::kType, KUDTUnknown, S_OK, &odd},
      {"the kind of the first node", &top, ClientNode::kType, KUDTHubPort, S_FALSE, nullptr},
      {"the same, searched for unknown", &top, ClientNode::kType, KUDTUnknown, E_ABORT, nullptr},
      {"the first list", &top, ClientNode::kChilds, KUDTHubPort, S_FALSE, nullptr},
      {"the first step", &top, ClientNode::kMoveNext, KUDTHubPort, S_FALSE, nullptr},
      {"the first child", &top, ClientNode::kGetCurrent, KUDTHostController, S_FALSE, nullptr},
      // Below, it ends the search there and not beside it.
      {"a child's kind", &middle, ClientNode::kType, KUDTHostController, S_OK, &last},
      {"the same, searched for its own", &middle, ClientNode::kType, KUDTHubPort, S_FALSE, nullptr},
      // Searched for unknown it ends the list.
      {"a child's kind", &middle, ClientNode::kType, KUDTUnknown, S_FALSE, nullptr},
      {"a child's list", &middle, ClientNode::kChilds, KUDTHostController, S_OK, &last},
      {"a step below a child", &middle, ClientNode::kMoveNext, KUDTHostController, S_OK, &last},
      {"a grandchild", &middle, ClientNode::kGetCurrent, KUDTHostController, S_OK, &last},
  };
  ClientNode* const nodes[] = {&leaf, &middle, &last, &odd, &top};
  for (const auto& row : rows) {
    SCOPED_TRACE(row.what);
    // One that throws ends the search for good.
    for (const bool throws : {false, true}) {
      for (ClientNode* node : nodes) node->before = [](ClientNode::Method) { return S_OK; };
      if (row.failing != nullptr) {
        row.failing->before = [&](ClientNode::Method method) -> HRESULT {
          if (method == row.method && throws) throw std::bad_alloc();
          return method == row.method ? E_ABORT : S_OK;
        };
      }
      const bool ended = throws && row.failing != nullptr;
      IZKUMUsbTreeNode* found = Mark<IZKUMUsbTreeNode>();
      EXPECT_EQ(searcher->get_FirstChildOfType(&top, row.kind, &found), ended ? E_OUTOFMEMORY : row.result);
      EXPECT_EQ(found, row.found && !ended ? row.found : Mark<IZKUMUsbTreeNode>());
      if (found != Mark<IZKUMUsbTreeNode>()) found->Release();
      for (const ClientNode* node : nodes) EXPECT_EQ(node->references, 1u);
    }
  }
}

}  // namespace
}  // namespace KelvoUHW
