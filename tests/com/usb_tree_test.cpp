#include "com/usb_tree.h"

#include <functional>
#include <limits>
#include <set>

#include "simulation/desktop/simulated_desktop.h"
#include "tests/support/com_objects.h"
#include "tests/support/desk_pc.h"
#include "tests/support/tree_desk.h"

namespace KelvoUHW {
namespace {

using platform::simulated::SimulatedDesktop;
using testing_support::ForEachNode;
using testing_support::InstanceIdOf;
using Nodes = ComPtr<IZKUMUsbTreeNodeEnumerator>;

constexpr std::uint32_t kUnknown = 0xFFFFFFFF;

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

using Query = std::function<HRESULT(IZKUMUsbTree&, IZKUMUsbTreeNodeEnumerator**)>;

Query OfVendor(std::uint32_t vendor) {
  return [=](IZKUMUsbTree& tree, auto out) { return tree.get_PortDevicesWithVendorId(vendor, out); };
}
Query OfProduct(std::uint32_t vendor, std::uint32_t product) {
  return [=](IZKUMUsbTree& tree, auto out) { return tree.get_VendorProductDevices(vendor, product, out); };
}
const Query kMice = OfVendor(0x046D);
const Query kMouse = OfProduct(0x046D, 0xC31C);
const Query kVolumes = [](IZKUMUsbTree& tree, auto out) { return tree.get_PortDevicesWithVolume(out); };

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
  EXPECT_EQ(query(*desk.tree.Get(), nodes.Put()), S_OK);
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

TEST(UsbTree, BeforeTheFirstBuildThereIsNothing) {
  TreeDesk desk(QueriedPc());
  auto* root = Mark<IZKUMUsbTreeNode>();
  EXPECT_EQ(desk.tree->get_RootNode(&root), E_POINTER);
  EXPECT_EQ(root, nullptr);
  for (const Query& query : {kMice, kMouse, kVolumes}) EXPECT_EQ(Found(desk, query), "");
  EXPECT_EQ(Lists(desk), "- | - | - | -");
  for (const bool built : {false, true}) {  // a null out pointer is the same before and after
    EXPECT_EQ(desk.tree->get_RootNode(nullptr), E_POINTER) << built;
    for (const Query& query : {kMice, kMouse, kVolumes}) EXPECT_EQ(query(*desk.tree.Get(), nullptr), E_POINTER);
    EXPECT_EQ(desk.build->GetDeviceList(0, nullptr), S_OK);
    ASSERT_EQ(desk.build->BuildTree(), S_OK);
  }
}

TEST(UsbTree, QueriesFindPortDevicesInTheOrderOfTheTree) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  const std::tuple<const char*, Query, const char*> cases[] = {
      {"behind one hub and behind two", kMice, "M2 M1"},
      {"a product of several", kMouse, "M2"},
      {"another vendor's product", OfProduct(0x0781, 0xC31C), ""},
      {"several of one vendor", OfVendor(0x0781), "S1 CR"},
      {"an id nobody has", OfVendor(0x1234), ""},
      {"more than 16 bits", OfVendor(0x1'046D), ""},
      {"the hubs' own id", OfVendor(0x05E3), ""},
      {"unknown ids", OfVendor(kUnknown), "D1"},
      {"unknown ids, both", OfProduct(kUnknown, kUnknown), "D1"},
      {"volumes: a stick's, the disk of an empty slot", kVolumes, "S1 CR"},
  };
  for (const auto& [what, query, names] : cases) EXPECT_EQ(Found(desk, query), names) << what;
}

TEST(UsbTree, EachQueryMakesObjectsOfItsOwn) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  std::vector<ComPtr<IZKUMUsbTreeNode>> objects{desk.Root()};
  for (const Query& query : {kMouse, kMouse, kMice}) {
    Nodes nodes;
    ASSERT_EQ(query(*desk.tree.Get(), nodes.Put()), S_OK);
    ForEachNode(*nodes.Get(), [&](HRESULT, const ComPtr<IZKUMUsbTreeNode>& node) { objects.push_back(node); });
  }
  EXPECT_EQ(objects.size(), 5u);
  std::set<IUnknown*> different;
  for (const auto& object : objects) different.insert(object.Get());
  EXPECT_EQ(different.size(), 5u);
}

// Objects that cannot be made are missing from the list of the volume query, and stand in that of an id query as
// elements without an object. The list itself is the last object.
TEST(UsbTree, QueriesWithoutAnObjectOrMemory) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.Rebuild(), S_OK);
  bool failed = false;
  const auto ask = [&](const Query& query, std::uint64_t object, std::uint64_t allocation) {
    auto* list = Mark<IZKUMUsbTreeNodeEnumerator>();
    platform::controls::FailCriticalSection(object, E_ACCESSDENIED);
    const HRESULT result = WithoutAllocation(allocation, failed, [&] { return query(*desk.tree.Get(), &list); });
    platform::controls::FailCriticalSection(0, S_OK);
    const Nodes nodes = Nodes::Attach(list);
    EXPECT_TRUE(result == S_OK || !nodes) << "a list with a failure";
    return result == S_OK ? Names(nodes) : CodeName(result);
  };
  const std::string denied = CodeName(E_ACCESSDENIED), noResults = CodeName(E_POINTER);
  const std::string noMemory = CodeName(E_OUTOFMEMORY);
  const struct {
    Query query;
    std::string whole;
    std::set<std::string> objects, memory;  // the outcomes when each object, each allocation in turn cannot be had
  } cases[] = {{kMice, "M2 M1", {"0 M1", "M2 0", denied}, {noResults, noMemory, "0 M1", "M2 0", "M2 M1"}},
               {kMouse, "M2", {"0", denied}, {noResults, noMemory, "0", "M2"}},
               {kVolumes, "S1 CR", {"S1 CR", "CR", "S1", denied}, {noResults, noMemory, "CR", "S1", "S1 CR"}}};
  for (const auto& [query, whole, objects, memory] : cases) {
    std::set<std::string> outcomes;
    std::uint64_t object = 1;
    for (std::string last; last != denied; ++object) outcomes.insert(last = ask(query, object, 0));
    EXPECT_EQ(outcomes, objects);
    EXPECT_EQ(ask(query, object, 0), whole);
    // The first allocation is that of the list of results.
    std::uint64_t allocation = 1;
    outcomes = {ask(query, 0, allocation)};
    EXPECT_TRUE(outcomes.contains(noResults));
    while (failed) outcomes.insert(ask(query, 0, ++allocation));
    EXPECT_EQ(outcomes, memory);
  }
}

TEST(UsbTree, DeviceLists) {
  TreeDesk desk(QueriedPc());
  ASSERT_EQ(desk.build->BuildTree(), S_OK);
  std::set<const DeviceList*> lists;
  for (const LONG number : std::initializer_list<LONG>{-1, 0, 1, 2, 3, 4, std::numeric_limits<LONG>::min(),
                                                       std::numeric_limits<LONG>::max()}) {
    const auto* list = Mark<const DeviceList>();
    EXPECT_EQ(desk.build->GetDeviceList(number, &list), S_OK);
    EXPECT_EQ(list != nullptr, number >= 0 && number <= 3) << number;
    lists.insert(list);
  }
  EXPECT_EQ(lists.size(), 5u);  // four lists and none
}

TEST(UsbTree, BuildsTellWhetherSomethingChanged) {
  TreeDesk desk(BarePc());
  // The cache is reset, or not, behind the build before.
  const std::tuple<const char*, Change, bool, HRESULT, const char*> steps[] = {
      {"nothing to report", {}, false, S_FALSE, "- | - | - | -"},
      {"a stick", Stick(u"S1", 1, u'E'), false, S_OK, "S1 | S1 | - | -"},
      {"no commit, so it comes once more", {}, false, S_OK, "S1 | S1 S1 | - | -"},
      {"nothing", {}, true, S_FALSE, "S1 | S1 S1 | - | -"},
      {"a mouse", Gadget(u"M1", 2), true, S_OK, "S1 M1 | M1 | - | S1"},
      {"the mouse goes", Unplug{UsbId(u"M1")}, true, S_OK, "S1 | - | M1 | S1"},
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
    bool failed = false;
    EXPECT_EQ(WithoutAllocation(allocation, failed, [&] { return desk.build->BuildTree(); }), E_OUTOFMEMORY);
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
  const HRESULT result = WithoutAllocation(allocation, failed, [&] { return ComObject<CZKUMUsbTree>::Create(tree); });
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
  SimulatedDesktop desktop;
  EXPECT_EQ(CreateWithout({.threads = &desktop}, 0, failed), E_FAIL) << "no PC";
  EXPECT_EQ(CreateWithout({.host = &host}, 1, failed), E_OUTOFMEMORY) << "the object itself";
  std::set<HRESULT> results;  // without what it is made of
  for (std::uint64_t allocation = 2; failed; ++allocation) {
    results.insert(CreateWithout({.host = &host}, allocation, failed));
  }
  EXPECT_EQ(results, (std::set<HRESULT>{E_FAIL, S_OK}));
}

}  // namespace
}  // namespace KelvoUHW
