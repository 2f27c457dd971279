#include "com/usb_tree.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "tests/support/desk_pc.h"
#include "tests/support/tree_desk.h"

namespace KelvoUHW {
namespace {

using testing_support::ForEachNode;
using testing_support::InstanceIdOf;
using Nodes = ComPtr<IZKUMUsbTreeNodeEnumerator>;

constexpr std::uint32_t kUnknown = 0xFFFFFFFF;
constexpr std::uint32_t kHubVendor = 0x05E3;

Text HubId(const Text& serial) { return u"USB\\VID_05E3&PID_0610\\" + serial; }

Plug HubBelow(const Text& serial, const Text& parent, std::uint32_t port) {
  Plug plug;
  AddNode(plug, HubId(serial), parent, u"USB", kOldHubService);
  plug.fragment.hubs.push_back({HubName(HubId(serial)), {{}, {}}, false});
  plug.ports.push_back({HubName(parent), port, HubOnPort(DriverKey(HubId(serial)), HubName(HubId(serial)))});
  return plug;
}

Plug Mouse(const Text& serial, std::uint32_t port, const Text& hub, std::uint16_t product) {
  Plug plug = Gadget(serial, port, hub);
  plug.ports[0].port.descriptor.idVendor = 0x046D;
  plug.ports[0].port.descriptor.idProduct = product;
  return plug;
}

// A disk on a channel of a storage controller: a port device that the device manager alone knows, without ids.
Plug DiskOnChannel() {
  Plug plug;
  AddNode(plug, u"PCI\\VEN_8086&DEV_2922\\3&0", u"ACPI\\PNP0A08\\0", u"HDC", u"atapi");
  AddNode(plug, u"PCIIDE\\IDECHANNEL\\4&0", u"PCI\\VEN_8086&DEV_2922\\3&0", u"HDC", u"atapi");
  AddNode(plug, u"IDE\\DISKWDC\\D1", u"PCIIDE\\IDECHANNEL\\4&0", u"DiskDrive", u"disk");
  return plug;
}

// What the queries find, in the order of the tree: a stick S1, an empty card reader CR, a mouse M2 behind two hubs, M1
// behind one, and the disk D1.
Machine QueriedPc() {
  return Desk<WellFedHost>(BarePc(), {DiskOnChannel(), Stick(u"S1", 1, u'E'), CardReader(u"CR", 2),
                                      HubBelow(u"H1", kRootHubId, 3), HubBelow(u"H2", HubId(u"H1"), 1),
                                      Mouse(u"M1", 2, HubId(u"H1"), 0xC077), Mouse(u"M2", 1, HubId(u"H2"), 0xC31C)})
      .pc.Snapshot();
}

struct Query {
  enum class Kind { Vendor, Product, Volume } kind;
  std::uint32_t vendor = 0;
  std::uint32_t product = 0;

  HRESULT Ask(IZKUMUsbTree& tree, IZKUMUsbTreeNodeEnumerator** out) const {
    switch (kind) {
      case Kind::Vendor:
        return tree.get_PortDevicesWithVendorId(vendor, out);
      case Kind::Product:
        return tree.get_VendorProductDevices(vendor, product, out);
      case Kind::Volume:
        break;
    }
    return tree.get_PortDevicesWithVolume(out);
  }
};
constexpr Query kMice{Query::Kind::Vendor, 0x046D};
constexpr Query kMouse{Query::Kind::Product, 0x046D, 0xC31C};
constexpr Query kVolumes{Query::Kind::Volume};

std::string ShortId(const std::u16string& id) { return platform::ToUtf8(id.substr(id.rfind(u'\\') + 1)); }

// The last components of the ids, "0" for an element without object, which answers E_FAIL.
std::string Names(const Nodes& nodes) {
  std::string names;
  ForEachNode(*nodes.Get(), [&](HRESULT result, const ComPtr<IZKUMUsbTreeNode>& node) {
    EXPECT_EQ(result, node ? S_OK : E_FAIL);
    names += (names.empty() ? "" : " ") + (node ? ShortId(InstanceIdOf(node)) : "0");
  });
  return names;
}

std::string Found(const TreeDesk& desk, const Query& query) {
  Nodes nodes;
  EXPECT_EQ(query.Ask(*desk.tree.Get(), nodes.Put()), S_OK);
  return nodes ? Names(nodes) : "no list";
}

std::string Lists(const TreeDesk& desk) {
  std::string text;
  for (LONG kind = 0; kind < 4; ++kind) {
    const DeviceList* list = nullptr;
    EXPECT_EQ(desk.build->GetDeviceList(kind, &list), S_OK);
    text += (kind == 0 ? "" : " | ") + (list ? ShortNames(*list) : "none");
  }
  return text;
}

// No object can be at this address.
template <class T>
T* Mark() {
  return reinterpret_cast<T*>(std::uintptr_t{1});
}

TEST(UsbTree, BeforeTheFirstBuildThereIsNothing) {
  TreeDesk desk(QueriedPc());
  auto* root = Mark<IZKUMUsbTreeNode>();
  EXPECT_EQ(desk.tree->get_RootNode(&root), E_POINTER);
  EXPECT_EQ(root, nullptr);
  for (const Query& query : {kMice, Query{Query::Kind::Vendor, kUnknown}, kMouse, kVolumes}) {
    EXPECT_EQ(Found(desk, query), "");
  }
  EXPECT_EQ(Lists(desk), "- | - | - | -");
}

TEST(UsbTree, NullOutPointers) {
  TreeDesk desk(QueriedPc());
  for (const bool built : {false, true}) {
    EXPECT_EQ(desk.tree->get_RootNode(nullptr), E_POINTER) << built;
    for (const Query& query : {kMice, kMouse, kVolumes}) EXPECT_EQ(query.Ask(*desk.tree.Get(), nullptr), E_POINTER);
    EXPECT_EQ(desk.build->GetDeviceList(0, nullptr), S_OK);
    if (!built) {
      EXPECT_EQ(desk.build->BuildTree(), S_OK);
    }
  }
}

TEST(UsbTree, QueriesFindPortDevicesInTheOrderOfTheTree) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  const struct {
    const char* what;
    Query query;
    const char* names;
  } cases[] = {
      {"behind one hub and behind two", kMice, "M2 M1"},
      {"a product of several", kMouse, "M2"},
      {"another vendor's product", {Query::Kind::Product, 0x0781, 0xC31C}, ""},
      {"several of one vendor", {Query::Kind::Vendor, 0x0781}, "S1 CR"},
      {"an id nobody has", {Query::Kind::Vendor, 0x1234}, ""},
      {"more than 16 bits", {Query::Kind::Vendor, 0x1'046D}, ""},
      {"the hubs' own id", {Query::Kind::Vendor, kHubVendor}, ""},
      {"unknown ids", {Query::Kind::Vendor, kUnknown}, "D1"},
      {"unknown ids, both", {Query::Kind::Product, kUnknown, kUnknown}, "D1"},
      {"volumes: a stick's, the disk of an empty slot", kVolumes, "S1 CR"},
  };
  for (const auto& [what, query, names] : cases) EXPECT_EQ(Found(desk, query), names) << what;

  std::size_t hubs = 0;  // the hubs' own id is that of two hubs
  testing_support::WalkChilds(desk.Root(), [&](const ComPtr<IZKUMUsbTreeNode>& node) {
    LONG vendor = 0;
    EXPECT_EQ(node.As<IZKUMUsbDevice>()->get_VendorId(&vendor), S_OK);
    if (node.As<IZKUMHubDevice>() && static_cast<std::uint32_t>(vendor) == kHubVendor) ++hubs;
  });
  EXPECT_EQ(hubs, 2u);
}

TEST(UsbTree, EachQueryMakesObjectsOfItsOwn) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  std::vector<ComPtr<IZKUMUsbTreeNode>> mice;
  for (const Query& query : {kMouse, kMouse, Query{Query::Kind::Vendor, 0x046D}}) {
    Nodes nodes;
    ASSERT_EQ(query.Ask(*desk.tree.Get(), nodes.Put()), S_OK);
    VARIANT_BOOL more = VARIANT_FALSE;
    ASSERT_EQ(nodes->MoveNext(&more), S_OK);
    ASSERT_EQ(nodes->GetCurrent(mice.emplace_back().Put()), S_OK);
  }
  for (const auto& mouse : mice) {
    EXPECT_EQ(ShortId(InstanceIdOf(mouse)), "M2");
    EXPECT_EQ(mouse->AddRef(), 2u);  // the list is gone, with its reference
    EXPECT_EQ(mouse->Release(), 1u);
  }
  EXPECT_NE(mice[0].Get(), mice[1].Get());
  EXPECT_NE(mice[0].Get(), mice[2].Get());
  EXPECT_NE(desk.Root().Get(), mice[0].Get());
}

// One after the other the objects that a query makes cannot be made: those of the id queries are in the list without an
// object, those of the volume query are not in the list.
TEST(UsbTree, ObjectsThatCannotBeMade) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  const auto ask = [&](const Query& query, std::uint64_t object) {
    platform::native::FailCriticalSection(object, E_ACCESSDENIED);
    auto* list = Mark<IZKUMUsbTreeNodeEnumerator>();
    const HRESULT result = query.Ask(*desk.tree.Get(), &list);
    platform::native::FailCriticalSection(0, S_OK);
    const Nodes nodes = Nodes::Attach(list);
    return result == S_OK ? Names(nodes) : result == E_ACCESSDENIED && !nodes ? "denied" : "wrong code";
  };
  const struct {
    Query query;
    std::vector<std::string> names;  // by the object that fails
  } cases[] = {{{Query::Kind::Vendor, 0x046D}, {"0 M1", "M2 0", "denied", "M2 M1"}}, {kMouse, {"0", "denied", "M2"}}};
  for (const auto& [query, names] : cases) {
    for (std::size_t i = 0; i < names.size(); ++i) EXPECT_EQ(ask(query, i + 1), names[i]) << i;
  }

  std::set<std::string> outcomes;
  std::uint64_t object = 1;
  // The list itself is the last object that the volume query makes.
  for (std::string last; last != "denied"; ++object) outcomes.insert(last = ask(kVolumes, object));
  EXPECT_EQ(outcomes, (std::set<std::string>{"S1 CR", "CR", "S1", "denied"}));
  EXPECT_EQ(ask(kVolumes, object), "S1 CR");
}

TEST(UsbTree, QueriesWithoutMemory) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  const struct {
    Query query;
    const char* first;  // without the memory for the list of results
    std::set<std::string> outcomes;
  } cases[] = {{kMice, "E_POINTER", {"E_POINTER", "E_OUTOFMEMORY", "0 M1", "M2 0", "M2 M1"}},
               {kMouse, "E_POINTER", {"E_POINTER", "E_OUTOFMEMORY", "0", "M2"}},
               {kVolumes, "E_POINTER", {"E_POINTER", "E_OUTOFMEMORY", "CR", "S1", "S1 CR"}}};
  for (const auto& [query, first, expected] : cases) {
    std::set<std::string> outcomes;
    std::uint64_t allocation = 1;
    for (bool failed = true; failed; ++allocation) {
      auto* list = Mark<IZKUMUsbTreeNodeEnumerator>();
      HRESULT result = S_OK;
      {
        const FailingAllocation failing(allocation);
        result = query.Ask(*desk.tree.Get(), &list);
        failed = failing.Failed();
      }
      const Nodes nodes = Nodes::Attach(list);
      const std::string outcome = result == S_OK            ? Names(nodes)
                                  : nodes                   ? "a list with a failure"
                                  : result == E_POINTER     ? "E_POINTER"
                                  : result == E_OUTOFMEMORY ? "E_OUTOFMEMORY"
                                                            : "another code";
      if (allocation == 1) {
        EXPECT_EQ(outcome, first);
      }
      outcomes.insert(outcome);
    }
    EXPECT_EQ(outcomes, expected);
    EXPECT_GT(allocation, 5u);
  }
}

TEST(UsbTree, DeviceLists) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.build->BuildTree(), S_OK);
  std::set<const DeviceList*> lists;
  constexpr LONG kMin = std::numeric_limits<LONG>::min();
  constexpr LONG kMax = std::numeric_limits<LONG>::max();
  for (const LONG number : {-1, 0, 1, 2, 3, 4, kMin, kMax}) {
    const auto* list = Mark<const DeviceList>();
    EXPECT_EQ(desk.build->GetDeviceList(number, &list), S_OK);
    EXPECT_EQ(list != nullptr, number >= 0 && number <= 3) << number;
    lists.insert(list);
  }
  EXPECT_EQ(lists.size(), 5u);  // four lists and none
}

TEST(UsbTree, BuildsTellWhetherSomethingChanged) {
  TreeDesk desk(BarePc());
  const struct {
    const char* what;
    Change change;
    bool reset;  // the cache, behind the build before
    HRESULT result;
    const char* lists;
  } steps[] = {
      {"nothing to report", {}, false, S_FALSE, "- | - | - | -"},
      {"a stick", Stick(u"S1", 1, u'E'), false, S_OK, "S1 | S1 | - | -"},
      {"no commit, so it comes once more", {}, false, S_OK, "S1 | S1 S1 | - | -"},
      {"nothing", {}, true, S_FALSE, "S1 | S1 S1 | - | -"},
      {"a mouse", Gadget(u"M1", 2), true, S_OK, "S1 M1 | M1 | - | S1"},
      {"the mouse goes", Unplug{UsbId(u"M1")}, true, S_OK, "S1 | - | M1 | S1"},
      {"nothing again", {}, true, S_FALSE, "S1 | - | M1 | S1"},
  };
  for (const auto& [what, change, reset, result, lists] : steps) {
    desk.Do(change);
    if (reset) {
      EXPECT_EQ(desk.build->ResetDeviceCache(), S_OK);
    }
    EXPECT_EQ(desk.build->BuildTree(), result) << what;
    EXPECT_EQ(Lists(desk), lists) << what;
  }
}

TEST(UsbTree, ABuildWithoutMemoryLeavesTheTreeAndIsOwed) {
  TreeDesk desk(BarePc());
  desk.Do(Stick(u"S1", 1, u'E'));
  ASSERT_EQ(desk.Rebuild(), S_OK);
  desk.Do(Mouse(u"M1", 2, kRootHubId, 0xC077));
  for (const std::uint64_t allocation : {1u, 50u, 200u}) {
    {
      const FailingAllocation failing(allocation);
      EXPECT_EQ(desk.build->BuildTree(), E_OUTOFMEMORY);
    }
    EXPECT_EQ(Lists(desk), "S1 | S1 | - | -");
    EXPECT_EQ(Found(desk, kMice), "");
  }
  EXPECT_EQ(desk.build->BuildTree(), S_OK);
  EXPECT_EQ(Found(desk, kMice), "M1");
}

// The code of a creation without one allocation (0: with all).
HRESULT CreateWithout(const platform::System& system, std::uint64_t allocation, bool& failed) {
  platform::SetCurrentSystem(system);
  auto* tree = Mark<ComObject<CZKUMUsbTree>>();
  HRESULT result = S_OK;
  {
    const FailingAllocation failing(allocation);
    result = ComObject<CZKUMUsbTree>::Create(tree);
    failed = failing.Failed();
  }
  EXPECT_EQ(tree == nullptr, FAILED(result));
  if (tree) {
    EXPECT_EQ(tree->Release(), 0u);
  }
  EXPECT_EQ(ModuleLockCount(), 0);
  platform::SetCurrentSystem({});
  return result;
}

TEST(UsbTree, CreationThatFails) {
  SimulatedPc pc(BarePc());
  WellFedHost host(pc);
  bool failed = false;
  EXPECT_EQ(CreateWithout({}, 0, failed), E_FAIL) << "no system";
  EXPECT_EQ(CreateWithout({.host = &host}, 1, failed), E_OUTOFMEMORY) << "the object itself";
  std::set<HRESULT> results;  // without what it is made of
  for (std::uint64_t allocation = 2; failed; ++allocation) {
    results.insert(CreateWithout({.host = &host}, allocation, failed));
  }
  EXPECT_EQ(results, (std::set<HRESULT>{E_FAIL, S_OK}));
}

}  // namespace
}  // namespace KelvoUHW
