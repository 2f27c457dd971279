#include "devinfo/info_device_cache.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <array>
#include <memory>
#include <random>
#include <set>

#include "devinfo/devnode.h"
#include "devinfo/info_device_linking.h"
#include "platform/simulated/simulated_pc.h"
#include "platform/text.h"
#include "platform/wrappers/failing_host.h"

namespace KelvoUHW {
namespace {

using platform::simulated::Device;
using platform::simulated::Machine;
using platform::simulated::OpenCounts;
using platform::simulated::Plug;
using platform::simulated::SimulatedPc;
using platform::simulated::Unplug;

Device Node(std::u16string id, std::u16string parent = {}) {
  Device device;
  device.id = std::move(id);
  device.parent = std::move(parent);
  return device;
}

template <class Records>
std::string Ids(const Records& records) {
  std::string ids;
  for (const auto& record : records) {
    if (!ids.empty()) ids += ' ';
    ids += platform::ToUtf8(record->m_strDevInstId);
  }
  return ids;
}

// A PC and a cache over it. Nothing may stay open.
class InfoDeviceCacheTest : public testing::Test {
 protected:
  void Start(std::vector<Device> devices) {
    Machine machine;
    machine.devices = std::move(devices);
    pc = std::make_unique<SimulatedPc>(machine);
    host = std::make_unique<platform::wrappers::FailingHost>(*pc);
    cache = std::make_unique<InfoDeviceCache>(*host, *host);
  }
  void TearDown() override {
    EXPECT_EQ(pc->Open(), OpenCounts{});
    EXPECT_TRUE(pc->Misuses().empty());
  }
  void Apply(decltype(platform::simulated::Step::change) change) {
    platform::simulated::Step step;
    step.change = std::move(change);
    ASSERT_EQ(platform::ToUtf8(pc->Apply(step)), "");
  }
  void Add(Device device) {
    Plug plug;
    plug.fragment.devices.push_back(std::move(device));
    Apply(plug);
  }
  // A pass with a tree that shows all present devices but the hidden ones, two levels deep.
  bool Collect(const std::set<std::u16string>& hidden = {}) {
    const NodePtr root(new CZKUMUsbTreeNodeImpl);
    for (const Device& device : pc->Snapshot().devices) {
      if (hidden.contains(device.id)) continue;
      const NodePtr port(new CZKUMUsbTreeNodeImpl);
      port->SetInstanceId(u"port of " + device.id);
      const NodePtr node(new CZKUMUsbTreeNodeImpl);
      node->SetInstanceId(device.id);
      AddChild(node, port.Get());
      AddChild(port, root.Get());
    }
    return cache->Collect(root);
  }
  // A pass that is committed at once, as text: what it reports, "current | added | removed | held".
  std::string Pass(const std::set<std::u16string>& hidden = {}) {
    const bool changed = Collect(hidden);
    EXPECT_EQ(changed, cache->AddedCount() > 0 || cache->RemovedCount() > 0);
    EXPECT_EQ(static_cast<std::size_t>(cache->AddedCount()), cache->Added().size());
    const std::string sets = Ids(cache->Current()) + " | " + Ids(cache->Added()) + " | " +
                             Ids(cache->Removed()) + " | " + Ids(cache->Held());
    cache->Commit();
    return (changed ? "changed: " : "same: ") + sets;
  }

  std::unique_ptr<SimulatedPc> pc;
  std::unique_ptr<platform::wrappers::FailingHost> host;
  std::unique_ptr<InfoDeviceCache> cache;
};

TEST_F(InfoDeviceCacheTest, AdmitsByTheStartOfTheParentId) {
  const std::pair<const char16_t*, bool> cases[] = {
      {u"USB\\P", true},   {u"USBSTOR\\P", true}, {u"IUSB\\P", true},  {u"SD\\P", true},
      {u"SDX\\P", true},   {u"PCI\\P", true},     {u"SCSI\\P", true},  {u"usb\\P", false},
      {u"ACPI\\P", false}, {u"XUSB\\P", false},   {u"ROOT\\P", false}, {u"Scsi\\P", false}};
  for (const auto& [parent, admitted] : cases) {
    Start({Node(parent), Node(u"X\\CHILD", parent)});
    EXPECT_EQ(Collect(), admitted) << platform::ToUtf8(parent);
    EXPECT_EQ(Ids(cache->Current()), admitted ? "X\\CHILD" : "");
  }
  // A volume is judged by its disk.
  Start({Node(u"ROOT\\VOLMGR\\0"), Node(u"V\\_??_SCSI#DISK#1#{x}", u"ROOT\\VOLMGR\\0"),
         Node(u"V\\_??_SATA#DISK#1#{x}", u"ROOT\\VOLMGR\\0")});
  EXPECT_TRUE(Collect());
  EXPECT_EQ(Ids(cache->Current()), "V\\_??_SCSI#DISK#1#{x}");
}

// This is meant: what an excluded or a rejected node leaves in the record, the next node shows.
TEST_F(InfoDeviceCacheTest, LeftOversReachTheNextNode) {
  Device excluded = Node(u"USB\\P");
  excluded.friendlyName = excluded.location = excluded.enumerator = u"of another";
  excluded.manufacturer = u"of another";
  excluded.service = u"USBHUB";
  Device rejected = excluded;
  rejected.id = u"ACPI\\VID_1&PID_2\\SERIAL";
  rejected.service.reset();
  Device node = Node(u"USB\\A", u"USB\\P");
  node.manufacturer = u"own";
  Device second = Node(u"USB\\B", u"USB\\P");
  Start({excluded, node, second, rejected, Node(u"USB\\C", u"USB\\P")});
  ASSERT_TRUE(Collect());
  struct Case {
    const char16_t *id, *friendlyName, *manufacturer, *location, *enumName, *serial;
  };
  const Case cases[] = {{u"USB\\A", u"of another", u"own", u"of another", u"of another", u""},
                        {u"USB\\B", u"", u"", u"", u"", u""},
                        {u"USB\\C", u"", u"", u"of another", u"of another", u"SERIAL"}};
  for (const Case& c : cases) {
    const InfoDevicePtr record = cache->Current().FindByInstanceId(c.id);
    ASSERT_TRUE(record);
    EXPECT_EQ(record->FriendlyName, c.friendlyName);
    EXPECT_EQ(record->Manufacturer, c.manufacturer);
    EXPECT_EQ(record->Location, c.location);
    EXPECT_EQ(record->EnumName, c.enumName);
    EXPECT_EQ(record->m_strSerialNumber, c.serial);
    EXPECT_EQ(record->Service, u"");
  }
}

TEST_F(InfoDeviceCacheTest, APresentDeviceKeepsItsRecordAndFirstProperties) {
  Device node = Node(u"USB\\A", u"USB\\P");
  node.description = u"first";
  Start({Node(u"USB\\P"), node});
  EXPECT_TRUE(Collect());
  const InfoDevicePtr record = cache->Current().FindByInstanceId(u"USB\\A");
  ASSERT_TRUE(record);
  EXPECT_EQ(record->m_devInstHandle, 2u);
  EXPECT_EQ(record->m_devInstHandleParent, 1u);
  cache->Commit();
  EXPECT_TRUE(cache->Current().empty() && cache->Added().empty());

  Apply(Unplug{u"USB\\A"});
  node.description = u"second";
  Add(node);
  EXPECT_FALSE(Collect());
  EXPECT_TRUE(cache->Current().HasRecord(record.Get()));
  EXPECT_EQ(record->m_strDeviceDescr, u"first");
}

TEST_F(InfoDeviceCacheTest, HeldParentsReturnOneLevelPerPass) {
  Start({Node(u"PCI\\H"), Node(u"USB\\A", u"PCI\\H"), Node(u"USB\\B", u"USB\\A"),
         Node(u"USB\\C", u"USB\\B"), Node(u"USB\\D", u"USB\\C")});
  EXPECT_EQ(Pass(), "changed: USB\\A USB\\B USB\\C USB\\D | USB\\A USB\\B USB\\C USB\\D |  | ");
  EXPECT_EQ(Pass(), "same: USB\\A USB\\B USB\\C USB\\D |  |  | ");
  Apply(Unplug{u"USB\\D"});
  ASSERT_TRUE(Collect());
  EXPECT_EQ(cache->RemovedCount(), 1);  // the parents are in the set and not in the count
  const InfoDevicePtr parent = cache->Held().FindByInstanceId(u"USB\\C");
  ASSERT_TRUE(parent);
  EXPECT_NE(parent->m_pParent, nullptr);
  EXPECT_EQ(Ids(cache->Removed()), "USB\\D USB\\C USB\\B");
  EXPECT_EQ(Ids(cache->Current()), "USB\\A");
  cache->Commit();
  EXPECT_EQ(Pass(), "same: USB\\A |  |  | USB\\C USB\\B");
  EXPECT_EQ(parent->m_pParent, nullptr);
  Add(Node(u"USB\\D", u"USB\\C"));
  EXPECT_EQ(Pass(), "changed: USB\\A USB\\D USB\\C | USB\\D USB\\C |  | USB\\B");
  EXPECT_EQ(Pass(), "changed: USB\\A USB\\C USB\\D USB\\B | USB\\B |  | ");
  EXPECT_EQ(Pass(), "same: USB\\A USB\\B USB\\C USB\\D |  |  | ");
}

TEST_F(InfoDeviceCacheTest, AParentWithAnotherChildReturnsByItself) {
  Start({Node(u"PCI\\H"), Node(u"USB\\A", u"PCI\\H"), Node(u"USB\\B", u"USB\\A"),
         Node(u"USB\\C", u"USB\\B"), Node(u"USB\\D", u"USB\\B")});
  Pass();
  Apply(Unplug{u"USB\\C"});
  EXPECT_EQ(Pass(), "changed: USB\\D |  | USB\\C USB\\B USB\\A | USB\\B USB\\A");
  EXPECT_EQ(Pass(), "changed: USB\\D USB\\B | USB\\B |  | USB\\A");
  EXPECT_EQ(Pass(), "changed: USB\\B USB\\D USB\\A | USB\\A |  | ");
  // A whole branch that goes at once: every node counts.
  Apply(Unplug{u"USB\\A"});
  EXPECT_TRUE(Collect());
  EXPECT_EQ(cache->RemovedCount(), 3);
  EXPECT_EQ(Ids(cache->Held()), "");
}

TEST_F(InfoDeviceCacheTest, NewDevicesWaitForTheTree) {
  Start({Node(u"USB\\P"), Node(u"USB\\A", u"USB\\P"), Node(u"USB\\B", u"USB\\P")});
  EXPECT_EQ(Pass({u"USB\\A"}), "changed: USB\\A USB\\B | USB\\B |  | ");
  EXPECT_EQ(Ids(cache->Pending()), "USB\\A");
  EXPECT_EQ(Pass({u"USB\\A"}), "same: USB\\A USB\\B |  |  | ");
  EXPECT_EQ(Ids(cache->Pending()), "USB\\A");
  EXPECT_EQ(Pass(), "changed: USB\\A USB\\B | USB\\A |  | ");
  EXPECT_EQ(Ids(cache->Pending()), "");
  EXPECT_EQ(Pass(), "same: USB\\A USB\\B |  |  | ");

  Add(Node(u"USB\\C", u"USB\\P"));
  EXPECT_EQ(Pass({u"USB\\C"}), "same: USB\\A USB\\B USB\\C |  |  | ");
  Apply(Unplug{u"USB\\C"});
  EXPECT_EQ(Pass(), "changed: USB\\A USB\\B |  | USB\\C | ");
  EXPECT_EQ(Ids(cache->Pending()), "");

  // Without a tree nothing new is reported.
  Add(Node(u"USB\\D", u"USB\\P"));
  EXPECT_FALSE(cache->Collect(NodePtr()));
  EXPECT_EQ(Ids(cache->Pending()), "USB\\D");
}

// This is meant: a drive gets a record only when every current record names it as its parent.
TEST_F(InfoDeviceCacheTest, DiskDriveRecordsFollowTheInvertedTest) {
  const Device root = Node(u"USB\\DISK");
  const Device other = Node(u"USB\\OTHER");
  struct Case {
    std::vector<Device> devices;
    std::vector<std::pair<std::u16string, std::u16string>> drives;  // id and parent
    std::string current;
  };
  const Case cases[] = {
      {{root}, {{u"USB\\DISK", u"P"}}, "USB\\DISK"},  // no record at all
      {{root, Node(u"A", root.id)}, {{u"usb\\Disk", u"P"}}, "A usb\\Disk"},
      {{root, other, Node(u"A", other.id)}, {{u"USB\\DISK", u"P"}}, "A"},
      {{root, other, Node(u"A", root.id), Node(u"B", other.id)}, {{u"USB\\DISK", u"P"}}, "A B"},
      {{root, Node(u"A", root.id), Node(u"B", root.id)},
       {{u"USB\\X", u"P"}, {u"USB\\DISK", u"P"}},
       "A B USB\\DISK"},
      // A record made for a drive counts for the drives behind it.
      {{root}, {{u"D1", u"D2"}, {u"D2", u"d2"}, {u"D2", u"D3"}, {u"D2", u""}}, "D1 D2 D2"},
  };
  for (const Case& c : cases) {
    Start(c.devices);
    std::vector<DeviceNodeRecord> drives;
    for (const auto& [id, parent] : c.drives) {
      drives.emplace_back().InstanceId = id;
      drives.back().ParentInstanceId = parent;
    }
    cache->SetDiskDrives(drives);
    EXPECT_EQ(cache->EnumerateDeviceNodes({}), 0u);
    EXPECT_EQ(Ids(cache->Current()), c.current);
  }

  Start({});
  DeviceNodeRecord drive;
  drive.DevInst = 77;
  drive.InstanceId = u"SCSI\\DISK&VEN_V&PROD_P\\S";
  drive.ParentInstanceId = u"PCI\\P";
  drive.Name = u"name";
  drive.ClassName = u"DiskDrive";
  drive.Location = u"location";
  drive.HardwareId = u"hardware";
  cache->SetDiskDrives({drive});
  for (int pass = 0; pass < 2; ++pass) {
    // Known by the handle it does not have: only the first pass reports it.
    EXPECT_EQ(cache->EnumerateDeviceNodes({}), 0u);
    EXPECT_EQ(cache->Added().size(), pass == 0 ? 1u : 0u);
    ASSERT_EQ(cache->Current().size(), 1u);
    const InfoDevicePtr record = *cache->Current().begin();
    EXPECT_EQ(record->m_devInstHandle, kUnknownDevInst);
    EXPECT_EQ(record->m_strSerialNumber, u"S");
    EXPECT_THAT((std::array{record->m_strDevInstIdParent, record->FriendlyName, record->DevClass,
                            record->Location, record->HardwareId}),
                testing::ElementsAre(u"PCI\\P", u"name", u"DiskDrive", u"location", u"hardware"));
    cache->Commit();
  }
}

TEST_F(InfoDeviceCacheTest, WithoutAListOfDevicesNothingChanges) {
  Start({Node(u"USB\\P"), Node(u"USB\\A", u"USB\\P"), Node(u"USB\\B", u"USB\\A")});
  Pass();
  Apply(Unplug{u"USB\\B"});
  EXPECT_TRUE(Collect());
  const std::pair<std::uint32_t, std::uint32_t> codes[] = {{5, 5}, {0, 1}, {259, 1}};
  for (const auto& [code, reported] : codes) {
    platform::wrappers::FailurePlan plan{.call = 1, .onwards = true, .error = code};
    plan.operation = platform::wrappers::Operation::GetClassDevs;
    host->SetPlan(plan);
    EXPECT_EQ(cache->EnumerateDeviceNodes({}), reported);
    EXPECT_FALSE(Collect());
    EXPECT_EQ(cache->AddedCount(), 0);
    EXPECT_EQ(cache->RemovedCount(), 0);
    EXPECT_EQ(Ids(cache->Removed()), "USB\\B USB\\A");
    EXPECT_EQ(Ids(cache->Held()), "USB\\A");
  }
}

TEST_F(InfoDeviceCacheTest, ClassesAreChosenByExactName) {
  const std::pair<std::u16string, const platform::Guid*> classes[] = {
      {u"usb", &platform::GUID_DEVCLASS_USB},
      {u"volume", &platform::GUID_DEVCLASS_VOLUME},
      {u"image", &platform::GUID_DEVCLASS_IMAGE},
      {u"wceusbs", &platform::GUID_DEVCLASS_WCEUSBS},
      {u"unknown", &platform::GUID_DEVCLASS_UNKNOWN},
      {u"diskdrive", &platform::GUID_DEVCLASS_DISKDRIVE}};
  std::vector<Device> devices{Node(u"USB\\P")};
  for (const auto& [name, guid] : classes) {
    devices.push_back(Node(name, u"USB\\P"));
    devices.back().deviceClass = name;
    devices.back().classGuid = platform::GuidText(*guid);
  }
  Start(devices);
  const auto count = [&](std::u16string_view name) {
    EXPECT_EQ(cache->EnumerateDeviceNodes(name), 0u);
    return cache->Current().size();
  };
  for (const auto& [name, guid] : classes) {
    EXPECT_EQ(count(name), 1u);
    EXPECT_EQ(Ids(cache->Current()), platform::ToUtf8(name));
  }
  EXPECT_EQ(count(u"USB"), 6u);
  EXPECT_EQ(count(u""), 6u);
}

TEST_F(InfoDeviceCacheTest, NodesAreAttachedByTheirParentId) {
  Start({Node(u"USB\\P"), Node(u"USB\\A", u"USB\\P"), Node(u"USB\\B", u"USB\\A")});
  Pass();
  EXPECT_FALSE(Collect());
  const InfoDevicePtr a = cache->Current().FindByInstanceId(u"USB\\A");
  EXPECT_EQ(Ids(a->m_childs), "USB\\B");  // attached twice, there once
  const std::pair<const char16_t*, const char*> cases[] = {
      {u"USB\\A", "USB\\B X"}, {u"USB\\a", "USB\\B"}, {u"USB\\P", "USB\\B"}, {u"", "USB\\B"}};
  for (const auto& [parent, children] : cases) {
    const NodePtr node(new CZKUMUsbTreeNodeImpl);
    node->SetInstanceId(u"X");
    node->SetParentInstanceId(parent);
    cache->AttachToParentInfoDevice(node);
    EXPECT_EQ(Ids(a->m_childs), children);
    EXPECT_EQ(node->m_pParent, a->m_childs.size() > 1 ? a.Get() : nullptr);
    a->m_childs.resize(1);
  }
}

InfoDevicePtr Record(platform::DevInst handle, const std::u16string& id,
                     const std::u16string& parentId) {
  InfoDevicePtr record(new CZKUMInfoDeviceImpl);
  record->m_devInstHandle = handle;
  record->m_strDevInstId = id;
  record->m_strDevInstIdParent = parentId;
  return record;
}

TEST(LinkToParents, HangsEachRecordBelowTheFirstThatFits) {
  struct Case {
    std::vector<std::pair<const char16_t*, const char16_t*>> records;  // id and parent
    std::vector<std::string> children;                                 // of each
  };
  const Case cases[] = {
      {{{u"B", u"A"}, {u"A", u"R"}, {u"C", u"A"}}, {"", "B C", ""}},
      {{{u"A", u""}, {u"A", u""}, {u"B", u"A"}}, {"B", "", ""}},
      {{{u"A", u""}, {u"B", u"A"}, {u"B", u"A"}}, {"B", "", ""}},  // the same node
      {{{u"A", u"A"}}, {""}},
      {{{u"T", u"B"}, {u"A", u"C"}, {u"B", u"A"}, {u"C", u"B"}, {u"U", u"T"}},
       {"U", "", "T", "", ""}},
  };
  for (const Case& c : cases) {
    InfoDeviceSet set;
    for (const auto& [id, parent] : c.records) set.Insert(Record(1, id, parent));
    std::vector<std::string> children;
    LinkToParents(set);
    LinkToParents(set);
    for (const InfoDevicePtr& record : set) {
      children.push_back(Ids(record->m_childs));
      for (const NodePtr& child : record->m_childs) EXPECT_EQ(child->m_pParent, record.Get());
    }
    EXPECT_EQ(children, c.children);
  }
}

// The set against a plain list and searches from its front.
TEST(InfoDeviceSet, AnswersAsALinearSearchDoes) {
  std::mt19937 random(1);
  std::vector<InfoDevicePtr> all;
  const char16_t* texts[] = {u"", u"A", u"B", u"C"};
  for (unsigned i = 0; i < 40; ++i) {
    all.push_back(Record(i % 5, texts[i % 4], texts[random() % 4]));
  }
  InfoDeviceSet set;
  std::vector<InfoDevicePtr> model;
  const auto first = [&](auto fits) {
    const auto found = std::ranges::find_if(model, fits);
    return found == model.end() ? InfoDevicePtr() : *found;
  };
  for (int step = 0; step < 3000; ++step) {
    const InfoDevicePtr record = all[random() % all.size()];
    const auto place = std::ranges::find(model, record);
    const bool present = place != model.end();
    if (step % 500 == 499) {
      InfoDeviceSet taken = std::move(set);
      set = std::move(taken);
    }
    if (random() % 2 == 0) {
      EXPECT_EQ(set.Insert(record), !present);
      if (!present) model.push_back(record);
    } else {
      EXPECT_EQ(set.Erase(record.Get()), present);
      if (present) model.erase(place);
    }
    ASSERT_TRUE(std::ranges::equal(set, model));
    const auto handle = static_cast<platform::DevInst>(random() % 6);
    const std::u16string text = texts[random() % 4];
    const InfoDevicePtr byHandle =
        first([&](const InfoDevicePtr& r) { return r->m_devInstHandle == handle; });
    EXPECT_EQ(set.FindByHandle(handle), byHandle);
    EXPECT_EQ(set.HasHandle(handle), static_cast<bool>(byHandle));
    EXPECT_EQ(set.HasRecord(record.Get()), std::ranges::count(model, record) == 1);
    EXPECT_EQ(set.FindByInstanceId(text),
              first([&](const InfoDevicePtr& r) { return r->m_strDevInstId == text; }));
    EXPECT_EQ(set.FindByParentId(text, record.Get()), first([&](const InfoDevicePtr& r) {
                return r->m_strDevInstIdParent == text && r != record;
              }));
    std::vector<InfoDevicePtr> sameId;
    std::ranges::copy_if(model, std::back_inserter(sameId),
                         [&](const InfoDevicePtr& r) { return r->m_strDevInstId == text; });
    EXPECT_EQ(set.AllByInstanceId(text), sameId);
  }
  set.Clear();
  EXPECT_TRUE(set.empty());
  for (const InfoDevicePtr& record : all) EXPECT_FALSE(set.HasRecord(record.Get()));
}

}  // namespace
}  // namespace KelvoUHW
