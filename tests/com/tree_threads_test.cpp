// Clients on threads of their own read and release while builds replace the tree. Made for the thread sanitizer.
#include <algorithm>
#include <array>
#include <atomic>
#include <cstddef>
#include <deque>
#include <thread>

#include "tests/support/cases.h"
#include "tests/support/desk_pc.h"
#include "tests/support/rendezvous.h"
#include "tests/support/tree_desk.h"

namespace KelvoUHW {
namespace {

using Node = ComPtr<IZKUMUsbTreeNode>;
using Nodes = ComPtr<IZKUMUsbTreeNodeEnumerator>;

constexpr int kReaders = 4;
constexpr int kEnd = -1;

struct Seen {
  std::size_t nodes = 0;
  std::size_t texts = 0;  // that are not empty
  std::size_t failures = 0;
};

// One client. It keeps some nodes for a while, so that trees are released long after they were replaced.
class Reader {
 public:
  explicit Reader(IZKUMUsbTree& tree) : m_tree(tree) {}

  // A walk whenever it is told of a publication: while the next builds run.
  void Run(const testing_support::Announcement& publications) {
    for (int seen = publications.Get(); seen != kEnd; seen = publications.WaitForAnother(seen), ++m_walks) Walk();
    for (Node& node : m_kept) node.Reset();
  }
  const Seen& Result() const { return m_seen; }
  std::size_t Walks() const { return m_walks; }

 private:
  void Walk() {
    Node root;
    Expect(m_tree.get_RootNode(root.Put()));
    m_seen.nodes += testing_support::WalkChilds(root, [&](const Node& node) {
      testing_support::ReadProperties(node, [&](const char*, HRESULT result, auto value) {
        // The device-manager data of a device that came between two passes is not there yet.
        if (result != E_FAIL) Expect(result);
        if constexpr (std::is_same_v<decltype(value), std::u16string_view>) m_seen.texts += !value.empty();
      });
      if (++m_read % 16 == 0 && testing_support::DumpOf(node).empty()) ++m_seen.failures;
      if (m_read % 32 == 0) m_kept[m_read / 32 % m_kept.size()] = node;
    });
    Nodes list;
    Expect(root->get_InSubtreeDevicesOfType(KUDTInfoDevice, list.Put()));
    Expect(m_tree.get_PortDevicesWithVendorId(0x0781, list.Put()));
    Expect(m_tree.get_VendorProductDevices(0x0781, 0x5567, list.Put()));
    Expect(m_tree.get_PortDevicesWithVolume(list.Put()));
  }
  void Expect(HRESULT result) { m_seen.failures += result != S_OK; }

  IZKUMUsbTree& m_tree;
  Seen m_seen;
  std::atomic<std::size_t> m_walks = 0;
  std::array<Node, 16> m_kept;
  std::size_t m_read = 0;
};

TEST(TreeThreads, ClientsReadAndReleaseWhileBuildsReplaceTheTree) {
  const Machine machine = Desk<WellFedHost>(BarePc(), {ExternalHub(u"HUB", 1), Gadget(u"M1", 1, UsbId(u"HUB")),
                                                       Stick(u"S1", 2, u'E'), CardReader(u"CR", 3)})
                              .pc.Snapshot();
  TreeDesk desk(machine);
  ASSERT_EQ(desk.Rebuild(), S_OK);

  std::deque<Reader> readers;
  for (int i = 0; i < kReaders; ++i) readers.emplace_back(*desk.tree.Get());
  testing_support::Announcement publications;
  const int fewest = testing_support::Cases(1000, 60);
  int builds = 0, published = 0;
  {
    std::vector<std::jthread> threads;
    for (Reader& reader : readers) threads.emplace_back([&] { reader.Run(publications); });
    // In turn these come and go, so every build meets a change: a stick on a root port, one behind the hub, and a third
    // slot of the reader with its card, a new child of a device that stays.
    Plug slot;
    AddDisk(slot, DiskId(u"CR", 2), UsbId(u"CR"));
    AddVolume(slot, DiskId(u"CR", 2), u'G');
    const struct {
      Plug comes;
      Text goes;
    } changes[] = {{Stick(u"S2", 4, u'F'), UsbId(u"S2")},
                   {Stick(u"S3", 2, u'F', UsbId(u"HUB")), UsbId(u"S3")},
                   {slot, DiskId(u"CR", 2)}};
    // However the system shares its time, each of them is at it meanwhile.
    const auto isTooEarly = [&] {
      return std::ranges::any_of(readers, [](const auto& reader) { return reader.Walks() < 20; });
    };
    for (int build = 0; (build < fewest || (build < 10'000 && isTooEarly())) && !HasFailure(); ++build) {
      const auto& [comes, goes] = changes[static_cast<std::size_t>(build) / 2 % std::size(changes)];
      desk.Do(build % 2 == 0 ? Change(comes) : Change(Unplug{goes}));
      published += desk.Rebuild() == S_OK;
      ++builds;
      if (build % 3 != 0) continue;
      publications.Tell(published);
    }
    publications.Tell(kEnd);
  }
  EXPECT_EQ(published, builds);
  for (const Reader& reader : readers) {
    const Seen& seen = reader.Result();
    EXPECT_EQ(seen.failures, 0u);
    EXPECT_GE(seen.nodes, static_cast<std::size_t>(fewest));
    EXPECT_GE(seen.texts, seen.nodes);
  }
}

// A client that asks each node for its parent, keeps some of the answers and lets go of the others, each of which
// destroys a record of the tree that is current.
void AskForParents(IZKUMUsbTree& tree, std::array<Node, 16>& kept, std::size_t& parents) {
  Node root;
  if (FAILED(tree.get_RootNode(root.Put()))) return;
  testing_support::WalkChilds(root, [&](const Node& node) {
    Node parent;
    if (FAILED(node->get_Parent(parent.Put()))) return;
    testing_support::ReadProperties(parent, [](const char*, HRESULT, auto) {});
    if (++parents % 3 != 0) kept[parents % kept.size()] = parent;
  });
}

TEST(TreeThreads, ClientsDestroyParentsWhileBuildsReplaceTheTree) {
  TreeDesk desk(Desk<WellFedHost>(BarePc(), {ExternalHub(u"HUB", 1), Gadget(u"M1", 1, UsbId(u"HUB")),
                                             Stick(u"S1", 2, u'E'), CardReader(u"CR", 3)})
                    .pc.Snapshot());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  const std::size_t builds = testing_support::Cases(150u, 40u);
  std::array<std::array<Node, 16>, 3> kept;
  std::array<std::atomic<std::size_t>, 3> parents{};
  {
    std::atomic<bool> done = false;
    std::vector<std::jthread> threads;
    for (std::size_t i = 0; i < kept.size(); ++i) {
      threads.emplace_back([&, i] {
        for (std::size_t asked = 0; !done; parents[i] = asked) AskForParents(*desk.tree.Get(), kept[i], asked);
      });
    }
    const auto isTooEarly = [&] { return std::ranges::any_of(parents, [](const auto& asked) { return asked < 100; }); };
    for (std::size_t build = 0; (build < builds || (build < 10'000 && isTooEarly())) && !HasFailure(); build += 2) {
      for (const Change& change : {Change(Stick(u"S2", 4, u'F')), Change(Unplug{UsbId(u"S2")})}) {
        desk.Do(change);
        EXPECT_EQ(desk.Rebuild(), S_OK);
      }
    }
    done = true;
  }
  for (const std::size_t asked : parents) EXPECT_GE(asked, 100u);
  kept = {};
  // Devices whose data was destroyed come anew: two builds later all is there again.
  for (const Change& change :
       {Change(Stick(u"S2", 4, u'F')), Change(Unplug{UsbId(u"S2")}), Change(Stick(u"S2", 4, u'F'))}) {
    desk.Do(change);
    EXPECT_EQ(desk.Rebuild(), S_OK);
  }
  Nodes list;
  EXPECT_EQ(desk.tree->get_PortDevicesWithVolume(list.Put()), S_OK);
  VARIANT_BOOL more = VARIANT_TRUE;
  int withVolume = -1;
  for (; more != VARIANT_FALSE; ++withVolume) list->MoveNext(&more);
  EXPECT_EQ(withVolume, 3);
}

// Kept until nobody else holds the tree, the last list of what left among them: the record is gone and the object says
// so.
TEST(TreeThreads, AParentThatIsKeptOverBuildsHoldsNothing) {
  TreeDesk desk(Desk<WellFedHost>(BarePc(), {Stick(u"S1", 2, u'E')}).pc.Snapshot());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  std::vector<Node> parents;
  testing_support::WalkChilds(desk.Root(), [&](const Node& node) {
    Node parent;
    if (node->get_Parent(parent.Put()) == S_OK) parents.push_back(parent);
  });
  ASSERT_GE(parents.size(), 5u);
  for (const Change& change : {Change(Gadget(u"M1", 1)), Change(Unplug{UsbId(u"S1")}), Change(Gadget(u"M2", 2))}) {
    desk.Do(change);
    EXPECT_EQ(desk.Rebuild(), S_OK);
  }
  for (const Node& parent : parents) {
    BSTR id = nullptr;
    EXPECT_EQ(parent->get_InstanceId(&id), E_FAIL);
    EXPECT_EQ(id, nullptr);
  }
}

}  // namespace
}  // namespace KelvoUHW
