#include "devinfo/info_device_cache.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <array>
#include <random>

#include "bench/small_pcs.h"
#include "devinfo/info_device_linking.h"
#include "platform/text.h"
#include "platform/wrappers/failing_host.h"
#include "records/devnode.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/best_time.h"

namespace KelvoUHW {
namespace {

using platform::simulated::Device, platform::simulated::SimulatedPc, platform::simulated::Unplug;
using platform::wrappers::Operation;
using testing_support::BareDevice;

template <class Records>
std::string Ids(const Records& records) {
  std::string ids;
  for (const auto& record : records) ids += (ids.empty() ? "" : " ") + platform::ToUtf8(record->m_strDevInstId);
  return ids;
}

// A PC and a cache over it. Nothing may stay open.
class InfoDeviceCacheTest : public testing::Test {
 protected:
  void Start(std::vector<Device> devices) {
    platform::simulated::Machine machine;
    machine.devices = std::move(devices);
    pc = std::make_unique<SimulatedPc>(machine);
    host = std::make_unique<platform::wrappers::FailingHost>(*pc);
    answers = std::make_unique<DeviceAnswers>(*host);
    cache = std::make_unique<InfoDeviceCache>(*host, *answers);
  }
  void TearDown() override {
    EXPECT_EQ(pc->Open(), platform::simulated::OpenCounts{});
    EXPECT_TRUE(pc->Misuses().empty());
  }
  void Remove(std::u16string id) { ASSERT_EQ(pc->Apply({0, u"", Unplug{std::move(id)}}), u""); }
  void Add(Device device) {
    platform::simulated::Plug plug;
    plug.fragment.devices.push_back(std::move(device));
    ASSERT_EQ(pc->Apply({0, u"", plug}), u"");
  }
  // A pass with a tree that shows all present devices but the hidden one, two levels deep.
  bool Collect(const std::u16string& hidden = {}) {
    const NodePtr root(new CZKUMUsbTreeNodeImpl);
    for (const Device& device : pc->Snapshot().devices) {
      if (device.id == hidden) continue;
      const NodePtr port(new CZKUMUsbTreeNodeImpl), node(new CZKUMUsbTreeNodeImpl);
      port->SetInstanceId(u"port of " + device.id);
      node->SetInstanceId(device.id);
      AddChild(node, port.Get());
      AddChild(port, root.Get());
    }
    answers->Forget();
    return cache->Collect(root);
  }
  // A pass that is committed at once, as text: "current | added | 1 of removed | held | pending".
  std::string Pass(const std::u16string& hidden = {}) {
    const bool changed = Collect(hidden);
    EXPECT_EQ(changed, cache->AddedCount() > 0 || cache->RemovedCount() > 0);
    EXPECT_EQ(static_cast<std::size_t>(cache->AddedCount()), cache->Added().size());
    const std::string gone = cache->RemovedCount() > 0 ? std::to_string(cache->RemovedCount()) + " of " : "";
    const std::string sets = Ids(cache->Current()) + " | " + Ids(cache->Added()) + " | " + gone +
                             Ids(cache->Removed()) + " | " + Ids(cache->Held()) + " | " + Ids(cache->Pending());
    cache->Commit();
    EXPECT_TRUE(cache->Current().empty() && cache->Added().empty() && cache->Removed().empty());
    return (changed ? "changed: " : "same: ") + sets;
  }
  std::unique_ptr<SimulatedPc> pc;
  std::unique_ptr<platform::wrappers::FailingHost> host;
  std::unique_ptr<DeviceAnswers> answers;
  std::unique_ptr<InfoDeviceCache> cache;
};

TEST_F(InfoDeviceCacheTest, AdmitsByTheStartOfTheParentId) {
  // A volume is judged by its disk.
  std::vector<Device> devices = {BareDevice(u"ROOT\\VOLMGR\\0"),
                                 BareDevice(u"V\\_??_SCSI#DISK#1#{x}", u"ROOT\\VOLMGR\\0"),
                                 BareDevice(u"V\\_??_SATA#DISK#1#{x}", u"ROOT\\VOLMGR\\0")};
  for (const std::u16string parent : {u"USB\\P", u"USBSTOR\\P", u"IUSB\\P", u"SD\\P", u"SDX\\P", u"PCI\\P", u"SCSI\\P",
                                      u"usb\\Q", u"ACPI\\P", u"XUSB\\P", u"ROOT\\P", u"Scsi\\Q"}) {
    devices.insert(devices.end(), {BareDevice(parent), BareDevice(u"_" + parent, parent)});
  }
  Start(devices);
  host->SetPlan({.operation = Operation::EnumDeviceInfo});
  EXPECT_TRUE(Collect());
  EXPECT_EQ(host->Calls(), devices.size() + 1);
  EXPECT_EQ(Ids(cache->Current()),
            "V\\_??_SCSI#DISK#1#{x} _USB\\P _USBSTOR\\P _IUSB\\P _SD\\P _SDX\\P _PCI\\P _SCSI\\P");
}

// Deliberate: what an excluded or a rejected node leaves in the record, the next node shows.
TEST_F(InfoDeviceCacheTest, LeftOversReachTheNextNode) {
  Device excluded = BareDevice(u"USB\\P");
  excluded.friendlyName = excluded.location = excluded.enumerator = excluded.manufacturer = u"other";
  excluded.service = u"USBHUB";
  Device rejected = excluded;
  rejected.id = u"ACPI\\VID_1&PID_2\\SERIAL";
  rejected.service.reset();
  Device node = BareDevice(u"USB\\A", u"USB\\P");
  node.manufacturer = u"own";
  Start({excluded, node, BareDevice(u"USB\\B", u"USB\\P"), rejected, BareDevice(u"USB\\C", u"USB\\P")});
  ASSERT_TRUE(Collect());
  for (const auto& [id, texts] : {std::pair{u"USB\\A", u"other|own|other|other||"},
                                  {u"USB\\B", u"|||||"},
                                  {u"USB\\C", u"||other|other|SERIAL|"}}) {
    const InfoDevicePtr record = cache->Current().FindByInstanceId(id);
    ASSERT_TRUE(record);
    EXPECT_EQ(std::u16string(record->FriendlyName) + u"|" + std::u16string(record->Manufacturer) + u"|" +
                  record->Location + u"|" + std::u16string(record->EnumName) + u"|" + record->m_strSerialNumber + u"|" +
                  std::u16string(record->Service),
              texts);
  }
}

// What cannot be read at the moment is missing in the record of a device that is there.
TEST_F(InfoDeviceCacheTest, ADeviceThatIsThereIsKeptWhateverCannotBeRead) {
  for (std::uint64_t call = 1, failures = 1; failures != 0; ++call) {
    Start({BareDevice(u"USB\\P"), BareDevice(u"USB\\A", u"USB\\P")});
    host->SetPlan({.call = call, .operation = Operation::GetDeviceRegistryProperty});
    EXPECT_TRUE(Collect());
    EXPECT_EQ(Ids(cache->Current()), "USB\\A") << call;
    failures = host->Failures();
    EXPECT_TRUE(failures != 0 || call > 10);
  }
}

TEST_F(InfoDeviceCacheTest, APresentDeviceKeepsItsRecordAndFirstProperties) {
  Device node = BareDevice(u"USB\\A", u"USB\\P");
  node.description = u"first";
  Start({BareDevice(u"USB\\P"), node});
  EXPECT_TRUE(Collect());
  const InfoDevicePtr record = cache->Current().FindByInstanceId(u"USB\\A");
  ASSERT_TRUE(record);
  EXPECT_EQ(record->m_devInstHandle, 2u);
  EXPECT_EQ(record->m_devInstHandleParent, 1u);
  cache->Commit();
  Remove(u"USB\\A");
  node.description = u"second";
  Add(node);
  EXPECT_FALSE(Collect());
  EXPECT_TRUE(cache->Current().HasRecord(record.Get()));
  EXPECT_EQ(record->m_strDeviceDescr, u"first");
}

// One device may go or come before a pass, and one may be hidden from its tree.
TEST_F(InfoDeviceCacheTest, WhatPassesReport) {
  struct Beat {
    const char* pass;
    const char16_t *gone = nullptr, *came = nullptr, *below = nullptr, *hidden = u"";
  };
  const std::pair<std::vector<Device>, std::vector<Beat>> stories[] = {
      // Held parents return one level per pass. They are in the set of what left and not in its
      // count; of a whole branch that goes at once every node counts.
      {{BareDevice(u"PCI\\H"), BareDevice(u"USB\\A", u"PCI\\H"), BareDevice(u"USB\\B", u"USB\\A"),
        BareDevice(u"USB\\C", u"USB\\B"), BareDevice(u"USB\\D", u"USB\\C")},
       {{"changed: USB\\A USB\\B USB\\C USB\\D | USB\\A USB\\B USB\\C USB\\D |  |  | "},
        {"same: USB\\A USB\\B USB\\C USB\\D |  |  |  | "},
        {"changed: USB\\A |  | 1 of USB\\D USB\\C USB\\B | USB\\C USB\\B | ", u"USB\\D"},
        {"same: USB\\A |  |  | USB\\C USB\\B | "},
        {"changed: USB\\A USB\\D USB\\C | USB\\D USB\\C |  | USB\\B | ", nullptr, u"USB\\D", u"USB\\C"},
        {"changed: USB\\A USB\\C USB\\D USB\\B | USB\\B |  |  | "},
        {"same: USB\\A USB\\B USB\\C USB\\D |  |  |  | "},
        {"changed:  |  | 4 of USB\\A USB\\B USB\\C USB\\D |  | ", u"USB\\A"}}},
      // New devices wait for the tree.
      {{BareDevice(u"USB\\P"), BareDevice(u"USB\\A", u"USB\\P"), BareDevice(u"USB\\B", u"USB\\P")},
       {{"changed: USB\\A USB\\B | USB\\B |  |  | USB\\A", nullptr, nullptr, nullptr, u"USB\\A"},
        {"same: USB\\A USB\\B |  |  |  | USB\\A", nullptr, nullptr, nullptr, u"USB\\A"},
        {"changed: USB\\A USB\\B | USB\\A |  |  | "},
        {"same: USB\\A USB\\B USB\\C |  |  |  | USB\\C", nullptr, u"USB\\C", u"USB\\P", u"USB\\C"},
        {"changed: USB\\A USB\\B |  | 1 of USB\\C |  | ", u"USB\\C"}}}};
  for (const auto& [devices, beats] : stories) {
    Start(devices);
    for (const Beat& beat : beats) {
      if (beat.gone) Remove(beat.gone);
      if (beat.came) Add(BareDevice(beat.came, beat.below));
      EXPECT_EQ(Pass(beat.hidden), beat.pass);
    }
  }
  // Without a tree nothing new is reported.
  Add(BareDevice(u"USB\\D", u"USB\\P"));
  EXPECT_FALSE(cache->Collect(NodePtr()));
  EXPECT_EQ(Ids(cache->Pending()), "USB\\D");
}

// Deliberate: a drive gets a record only when every current record names it as its parent.
TEST_F(InfoDeviceCacheTest, DiskDriveRecordsFollowTheInvertedTest) {
  const auto drive = [](const char16_t* id, const char16_t* parent) {
    DeviceNodeRecord record;
    record.InstanceId = id;
    record.ParentInstanceId = parent;
    return record;
  };
  const Device root = BareDevice(u"USB\\DISK"), other = BareDevice(u"USB\\OTHER");
  const Device a = BareDevice(u"A", root.id), ofOther = BareDevice(u"B", other.id);
  const DeviceNodeRecord disk = drive(u"USB\\DISK", u"P");
  // A record made for a drive counts for the drives behind it.
  const std::tuple<std::vector<Device>, std::vector<DeviceNodeRecord>, std::string> cases[] = {
      {{root}, {disk}, "USB\\DISK"},  // no record at all
      {{root, a}, {drive(u"usb\\Disk", u"P")}, "A usb\\Disk"},
      {{root, other, a, ofOther}, {disk}, "A B"},
      {{root, a, BareDevice(u"C", root.id)}, {drive(u"USB\\X", u"P"), disk}, "A C USB\\DISK"},
      {{}, {drive(u"D1", u"D2"), drive(u"D2", u"d2"), drive(u"D2", u"D3"), drive(u"D2", u"")}, "D1 D2 D2"}};
  for (const auto& [devices, drives, current] : cases) {
    Start(devices);
    cache->SetDiskDrives(drives);
    EXPECT_EQ(cache->EnumerateDeviceNodes({}), 0u);
    EXPECT_EQ(Ids(cache->Current()), current);
  }
  Start({});
  DeviceNodeRecord full = drive(u"SCSI\\DISK&VEN_V&PROD_P\\S", u"PCI\\P");
  full.DevInst = 77;
  full.Name = u"name", full.ClassName = u"DiskDrive", full.Location = u"location", full.HardwareId = u"hardware";
  cache->SetDiskDrives({full});
  for (const std::size_t added : {1u, 0u}) {
    // Known by the handle it does not have: only the first pass reports it.
    EXPECT_EQ(cache->EnumerateDeviceNodes({}), 0u);
    EXPECT_EQ(cache->Added().size(), added);
    ASSERT_EQ(cache->Current().size(), 1u);
    const InfoDevicePtr record = *cache->Current().begin();
    EXPECT_EQ(record->m_devInstHandle, kUnknownDevInst);
    EXPECT_THAT((std::array<std::u16string_view, 6>{record->m_strSerialNumber, record->m_strDevInstIdParent,
                                                    record->FriendlyName, record->DevClass, record->Location,
                                                    record->HardwareId}),
                testing::ElementsAre(u"S", u"PCI\\P", u"name", u"DiskDrive", u"location", u"hardware"));
    cache->Commit();
  }
}

TEST_F(InfoDeviceCacheTest, WithoutAListOfDevicesNothingChanges) {
  Start({BareDevice(u"USB\\P"), BareDevice(u"USB\\A", u"USB\\P"), BareDevice(u"USB\\B", u"USB\\A")});
  Pass();
  Remove(u"USB\\B");
  EXPECT_TRUE(Collect());
  for (const auto& [code, reported] : {std::pair{5u, 5u}, {0u, 1u}, {259u, 1u}}) {
    host->SetPlan({.call = 1, .onwards = true, .error = code, .operation = Operation::GetClassDevs});
    EXPECT_EQ(cache->EnumerateDeviceNodes({}), reported);
    EXPECT_FALSE(Collect());
    EXPECT_EQ(cache->AddedCount() + cache->RemovedCount(), 0);
    EXPECT_EQ(Ids(cache->Removed()) + " | " + Ids(cache->Held()), "USB\\B USB\\A | USB\\A");
  }
}

InfoDevicePtr Record(platform::DevInst handle, const std::u16string& id, const std::u16string& parentId) {
  InfoDevicePtr record(new CZKUMInfoDeviceImpl);
  record->m_devInstHandle = handle;
  record->m_strDevInstId = id;
  record->m_strDevInstIdParent = parentId;
  return record;
}

TEST(LinkToParents, HangsEachRecordBelowTheFirstThatFits) {
  // Records by id and parent, and the children of each.
  using Links = std::vector<std::pair<const char16_t*, const char16_t*>>;
  const std::pair<Links, std::vector<std::string>> cases[] = {
      {{{u"B", u"A"}, {u"A", u"R"}, {u"C", u"A"}}, {"", "B C", ""}},
      {{{u"A", u""}, {u"A", u""}, {u"B", u"A"}}, {"B", "", ""}},
      {{{u"A", u""}, {u"B", u"A"}, {u"B", u"A"}}, {"B", "", ""}},  // the same node
      {{{u"A", u"A"}}, {""}},
      {{{u"T", u"B"}, {u"A", u"C"}, {u"B", u"A"}, {u"C", u"B"}, {u"U", u"T"}}, {"U", "", "T", "", ""}}};
  for (const auto& [links, expected] : cases) {
    InfoDeviceSet set;
    for (const auto& [id, parent] : links) set.Insert(Record(1, id, parent));
    LinkToParents(set);
    LinkToParents(set);
    std::vector<std::string> children;
    for (const InfoDevicePtr& record : set) {
      children.push_back(Ids(record->m_childs));
      for (const NodePtr& child : record->m_childs) EXPECT_EQ(child->m_pParent, record.Get());
    }
    EXPECT_EQ(children, expected);
  }
}

// Comparing each child with all of its parent's would take some hundred times as long.
TEST(LinkToParents, ManyChildrenOfOneParentTakeNoLonger) {
  const auto time = [](bool oneParent) {
    InfoDeviceSet set;
    for (std::int32_t i = 0; i < 3'000; ++i) {
      set.Insert(Record(1, platform::Decimal(i), platform::Decimal(oneParent ? 0 : i - 1)));
    }
    return testing_support::BestOfThree([&] { LinkToParents(set); });
  };
  EXPECT_LT(time(true), 20 * time(false));
}

// The set against a plain list and searches from its front.
TEST(InfoDeviceSet, AnswersAsALinearSearchDoes) {
  std::mt19937 random(1);
  std::vector<InfoDevicePtr> all, model;
  const char16_t* texts[] = {u"", u"A", u"a", u"C"};
  for (unsigned i = 0; i < 40; ++i) all.push_back(Record(i % 5, texts[i % 4], texts[random() % 4]));
  InfoDeviceSet set;
  const auto first = [&](auto fits) {
    const auto found = std::ranges::find_if(model, fits);
    return found == model.end() ? InfoDevicePtr() : *found;
  };
  for (int step = 0; step < 3000; ++step) {
    if (step % 500 == 499) {
      InfoDeviceSet taken = std::move(set);
      set = std::move(taken);
    }
    const InfoDevicePtr record = all[random() % all.size()];
    const auto place = std::ranges::find(model, record);
    const bool present = place != model.end();
    EXPECT_EQ(set.HasRecord(record.Get()), present);
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
    const auto hasText = [&](const InfoDevicePtr& r) { return r->m_strDevInstId == text; };
    const InfoDevicePtr byHandle = first([&](const InfoDevicePtr& r) { return r->m_devInstHandle == handle; });
    EXPECT_EQ(set.FindByHandle(handle), byHandle);
    EXPECT_EQ(set.HasHandle(handle), static_cast<bool>(byHandle));
    EXPECT_EQ(set.FindByInstanceId(text), first(hasText));
    EXPECT_EQ(set.FindByParentId(text, record.Get()),
              first([&](const InfoDevicePtr& r) { return r->m_strDevInstIdParent == text && r != record; }));
    std::vector<InfoDevicePtr> sameId;
    std::ranges::copy_if(model, std::back_inserter(sameId), hasText);
    EXPECT_EQ(set.AllByInstanceId(text), sameId);
  }
  set.Clear();
  EXPECT_TRUE(set.empty());
  for (const InfoDevicePtr& record : all) EXPECT_FALSE(set.HasRecord(record.Get()));
  // Those that left leave no room behind them for good.
  for (int round = 0; round < 100; ++round) {
    EXPECT_TRUE(set.Insert(all[0]) && set.Erase(all[0].Get()));
    EXPECT_LE(set.NumbersEnd(), 20u);
  }
}

// Places of records that were erased, and of records that others destroyed, are in no index made later.
TEST(InfoDeviceSet, FindsNothingOfErasedAndDestroyedRecords) {
  InfoDeviceSet set;
  std::vector<InfoDevicePtr> records;
  for (const platform::DevInst handle : {1u, 2u, 3u, 4u}) {
    records.push_back(Record(handle, std::u16string(1, static_cast<char16_t>(u'A' + handle)), u"P"));
    set.Insert(records.back());
  }
  EXPECT_TRUE(set.Erase(records[0].Get()));
  EXPECT_FALSE(set.HasHandle(1));
  InfoDevicePtr::InARingOfItsOwn(records[1].Get()).Reset();
  set.DropDestroyed();
  EXPECT_EQ(Ids(set), "D E");
  for (const auto& [handle, id] : {std::pair{1u, u"B"}, {2, u"C"}, {3, u"D"}, {4, u"E"}}) {
    EXPECT_EQ(set.HasHandle(handle), handle > 2);
    EXPECT_EQ(static_cast<bool>(set.FindByInstanceId(id)), handle > 2);
  }
  EXPECT_TRUE(set.Erase(records[2].Get()));
  EXPECT_EQ(set.FindByParentId(u"P", nullptr), records[3]);
}

}  // namespace
}  // namespace KelvoUHW
