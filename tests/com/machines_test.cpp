// What clients see of whole PCs: the dump, the children and the subtrees of every node, trees that were replaced.
#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <utility>
#include <vector>

#include "platform/simulated/machine_file.h"
#include "platform/text.h"
#include "tests/support/object_reader.h"
#include "tests/support/tree_desk.h"
#include "tree/records.h"
#include "tree/tree_builder.h"

namespace KelvoUHW {
namespace {

using platform::ToUtf8;
using testing_support::ForEachNode;
using testing_support::InstanceIdOf;
using testing_support::WalkChilds;
using Node = ComPtr<IZKUMUsbTreeNode>;
using Nodes = ComPtr<IZKUMUsbTreeNodeEnumerator>;
using Ids = std::vector<std::string>;  // "kind: instance id"

constexpr char kFolder[] = ZKUSB_SOURCE_DIR "/machines/";
constexpr const char* kMachines[] = {"asus-b560", "dell-precision", "hp-cardreader", "vmware-win7"};

platform::simulated::Machine Load(const std::string& name) {
  return platform::simulated::LoadMachine(kFolder + name + ".json");
}

// Every property but ToString, a line each.
std::string Properties(const Node& node) {
  std::string text;
  testing_support::ReadProperties(node, [&](const char* name, HRESULT result, auto value) {
    text.append(name).append(result == S_OK ? "=" : " fails=");
    if constexpr (std::is_same_v<decltype(value), std::u16string_view>) {
      text += ToUtf8(value) + "\n";
    } else {
      text += std::to_string(value) + "\n";
    }
  });
  return text;
}

std::string IdText(std::int64_t kind, const std::u16string& id) { return std::to_string(kind) + ": " + ToUtf8(id); }

Ids IdsOf(const Nodes& nodes) {
  Ids ids;
  ForEachNode(*nodes.Get(), [&](HRESULT result, const Node& node) {
    EXPECT_EQ(result, S_OK);
    TUsbDeviceType kind = KUDTUnknown;
    if (node) node->get_Type(&kind);
    ids.push_back(IdText(kind, InstanceIdOf(node)));
  });
  return ids;
}

// Compares a subtree seen through the interfaces with its records; returns how many nodes it has.
std::size_t CompareNodes(const Node& root, const NodePtr& model) {
  std::vector<NodePtr> records;
  VisitPreOrder(model, [&](const NodePtr& record) {
    records.push_back(record);
    return true;
  });
  std::size_t next = 0;
  WalkChilds(root, [&](const Node& node) {
    if (next >= records.size()) return;
    const NodePtr& record = records[next++];
    std::u16string dump;
    record->ToString(dump, u"");
    EXPECT_TRUE(testing_support::DumpOf(node) == dump) << ToUtf8(record->m_strDevInstId);
    Ids childs;
    for (const NodePtr& child : record->m_childs) childs.push_back(IdText(child->m_nType, child->m_strDevInstId));
    Nodes list;
    EXPECT_EQ(node->get_Childs(list.Put()), S_OK);
    EXPECT_EQ(IdsOf(list), childs);
    for (int kind = KUDTUnknown; kind <= KUDTInterfaceDevice; ++kind) {
      EXPECT_EQ(node->get_InSubtreeDevicesOfType(static_cast<TUsbDeviceType>(kind), list.Put()), S_OK);
      Ids ofKind;
      VisitPreOrder(record, [&](const NodePtr& below) {
        if (below->m_nType == kind) ofKind.push_back(IdText(kind, below->m_strDevInstId));
        return true;
      });
      EXPECT_EQ(IdsOf(list), ofKind) << kind;
    }
  });
  EXPECT_EQ(next, records.size());
  return next;
}

TEST(Machines, ClientsSeeWhatTheRecordsHold) {
  std::size_t nodes = 0;
  for (const char* name : kMachines) {
    TreeDesk desk(Load(name));
    ASSERT_EQ(desk.Rebuild(), S_OK) << name;
    // A builder of its own over the same PC makes the same tree of records.
    CZKUMUsbTreeBuilder model(desk.pc);
    ASSERT_TRUE(model.Build());
    const Node root = desk.Root();
    nodes += CompareNodes(root, model.Root());

    std::ifstream stream(ZKUSB_SOURCE_DIR "/tests/golden/" + std::string(name) + ".txt", std::ios::binary);
    const std::string golden{std::istreambuf_iterator<char>(stream), {}};
    const std::string dump = ToUtf8(testing_support::DumpOf(root));
    ASSERT_FALSE(golden.empty()) << name;
    EXPECT_TRUE(dump == golden) << name << " differs from byte "
                                << std::ranges::mismatch(dump, golden).in1 - dump.begin();
    ASSERT_FALSE(HasFailure()) << name;
  }
  EXPECT_GE(nodes, 200u);
  std::size_t files = 0;
  for (const auto& entry : std::filesystem::directory_iterator(kFolder)) files += entry.path().extension() == ".json";
  EXPECT_EQ(files, std::size(kMachines));
}

// A tree that a client holds when it is replaced: its nodes, and what they said.
struct HeldTree {
  std::vector<Node> nodes;
  std::vector<std::string> properties;
  int replaced = 0;
};

TEST(Machines, ReplacedTreesGoOnAnswering) {
  const struct {
    const char* machine;
    const char* script;
  } cases[] = {{"dell-precision", "stick-comes-and-goes"},
               {"dell-precision", "usb-hard-disk"},
               {"asus-b560", "hub-with-four-devices"},
               {"hp-cardreader", "card-in-slot"}};
  for (const auto& [machine, script] : cases) {
    const auto start = Load(machine);
    const auto steps = platform::simulated::LoadScript(std::string(kFolder) + "scripts/" + script + ".json", start);
    TreeDesk desk(start);
    std::vector<HeldTree> held;
    // What is owed for parents that were held back comes with the builds behind the last step.
    for (std::size_t step = 0; step < steps.size() + 2; ++step) {
      if (step < steps.size()) {
        ASSERT_EQ(desk.pc.Apply(steps[step]), u"");
      }
      if (desk.Rebuild() != S_OK) continue;
      for (HeldTree& tree : held) ++tree.replaced;
      held.emplace_back();
      WalkChilds(desk.Root(), [&](const Node& node) {
        held.back().nodes.push_back(node);
        held.back().properties.push_back(Properties(node));
      });
    }
    ASSERT_FALSE(held.empty()) << script;
    EXPECT_GE(held.front().replaced, 2) << script;
    for (const HeldTree& tree : held) {
      for (std::size_t i = 0; i < tree.nodes.size(); ++i) {
        EXPECT_EQ(Properties(tree.nodes[i]), tree.properties[i])
            << script << ", replaced " << tree.replaced << " times";
      }
      EXPECT_GT(tree.nodes.size(), 20u);
    }
  }
}

}  // namespace
}  // namespace KelvoUHW
