// Clients on threads of their own read and release while builds replace the tree. Made for the thread sanitizer.
#include <array>
#include <cstddef>
#include <thread>

#include "tests/support/desk_pc.h"
#include "tests/support/rendezvous.h"
#include "tests/support/tree_desk.h"

namespace KelvoUHW {
namespace {

using Node = ComPtr<IZKUMUsbTreeNode>;
using Nodes = ComPtr<IZKUMUsbTreeNodeEnumerator>;

constexpr int kReaders = 4;
constexpr int kBuilds = 1000;
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
    for (int seen = publications.Get(); seen != kEnd; seen = publications.WaitForAnother(seen)) Walk();
    for (Node& node : m_kept) node.Reset();
  }
  const Seen& Result() const { return m_seen; }

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
  std::array<Node, 16> m_kept;
  std::size_t m_read = 0;
};

TEST(TreeThreads, ClientsReadAndReleaseWhileBuildsReplaceTheTree) {
  const Machine machine = Desk<WellFedHost>(BarePc(), {ExternalHub(u"HUB", 1), Gadget(u"M1", 1, UsbId(u"HUB")),
                                                       Stick(u"S1", 2, u'E'), CardReader(u"CR", 3)})
                              .pc.Snapshot();
  TreeDesk desk(machine);
  ASSERT_EQ(desk.Rebuild(), S_OK);

  std::vector<Reader> readers(kReaders, Reader(*desk.tree.Get()));
  testing_support::Announcement publications;
  int published = 0;
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
    for (int build = 0; build < kBuilds && !HasFailure(); ++build) {
      const auto& [comes, goes] = changes[static_cast<std::size_t>(build) / 2 % std::size(changes)];
      desk.Do(build % 2 == 0 ? Change(comes) : Change(Unplug{goes}));
      published += desk.Rebuild() == S_OK;
      if (build % 3 != 0) continue;
      publications.Tell(published);
    }
    publications.Tell(kEnd);
  }
  EXPECT_EQ(published, kBuilds);
  for (const Reader& reader : readers) {
    const Seen& seen = reader.Result();
    EXPECT_EQ(seen.failures, 0u);
    EXPECT_GE(seen.nodes, 1000u);
    EXPECT_GE(seen.texts, seen.nodes);
  }
}

}  // namespace
}  // namespace KelvoUHW
