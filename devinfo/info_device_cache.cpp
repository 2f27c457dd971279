#include "devinfo/info_device_cache.h"

#include <algorithm>
#include <array>
#include <string>
#include <utility>

#include "devinfo/device_answers.h"
#include "devinfo/info_device_linking.h"
#include "devinfo/property_reader.h"
#include "platform/flat_index.h"
#include "platform/text.h"
#include "records/device_set.h"
#include "records/devnode.h"
#include "records/record_lock.h"

namespace KelvoUHW {

namespace {

// Parents by how their ids begin: a device below any other bus is not reported.
bool HasAdmittedParent(const NodeIdentity& node) noexcept {
  static constexpr std::array<std::u16string_view, 5> kPrefixes{u"USB", u"IUSB", u"SD", u"PCI",
                                                                u"SCSI"};
  return std::ranges::any_of(kPrefixes, [&](std::u16string_view prefix) {
    return node.m_strDevInstIdParent.starts_with(prefix);
  });
}

// Whether all records of a growing set name the same parent, ignoring case.
class CommonParent {
 public:
  explicit CommonParent(const InfoDeviceSet& records) {
    for (const InfoDevicePtr& record : records) {
      Add(record->m_strDevInstIdParent);
      if (m_differ) return;
    }
  }
  void Add(std::u16string_view parentId) {
    if (m_any) {
      m_differ = m_differ || !platform::EqualIgnoringCase(parentId, m_parentId);
    } else {
      m_parentId = parentId;
      m_any = true;
    }
  }
  bool AllName(std::u16string_view parentId) const noexcept {
    return !m_any || (!m_differ && platform::EqualIgnoringCase(parentId, m_parentId));
  }

 private:
  bool m_any = false;
  bool m_differ = false;
  std::u16string m_parentId;
};

// The instance ids of a tree. The texts are the nodes' own.
platform::FlatTextSet InstanceIdsOf(const NodePtr& root) {
  platform::FlatTextSet ids;
  std::vector<const CZKUMUsbTreeNodeImpl*> waiting;
  if (root) waiting.push_back(root.Get());
  while (!waiting.empty()) {
    const CZKUMUsbTreeNodeImpl* node = waiting.back();
    waiting.pop_back();
    ids.Insert(node->m_strDevInstId);
    for (const NodePtr& child : node->m_childs) waiting.push_back(child.Get());
  }
  return ids;
}

}  // namespace

const platform::Guid* DeviceClassByName(std::u16string_view name) noexcept {
  static constexpr std::array<std::pair<std::u16string_view, const platform::Guid*>, 6> kClasses{
      {{u"usb", &platform::GUID_DEVCLASS_USB},
       {u"volume", &platform::GUID_DEVCLASS_VOLUME},
       {u"image", &platform::GUID_DEVCLASS_IMAGE},
       {u"wceusbs", &platform::GUID_DEVCLASS_WCEUSBS},
       {u"unknown", &platform::GUID_DEVCLASS_UNKNOWN},
       {u"diskdrive", &platform::GUID_DEVCLASS_DISKDRIVE}}};
  for (const auto& [className, guid] : kClasses) {
    if (className == name) return guid;
  }
  return nullptr;
}

void InfoDeviceCache::SetDiskDrives(std::vector<DeviceNodeRecord> diskDrives) {
  m_diskDrives = std::move(diskDrives);
}

void InfoDeviceCache::DropDestroyed() noexcept {
  for (InfoDeviceSet* set : {&m_previous, &m_current, &m_removed, &m_added, &m_held, &m_pending}) {
    set->DropDestroyed();
  }
}

bool InfoDeviceCache::Collect(const NodePtr& treeRoot) {
  m_nAddedCount = 0;
  m_nRemovedCount = 0;
  for (const InfoDevicePtr& record : m_held) record->m_pParent = nullptr;
  if (EnumerateDeviceNodes({}) != 0) return false;
  ReturnHeldParents();
  FindRemoved();
  HoldBack(AncestorsOfRemoved());
  {
    const RecordWriteLock lock;
    LinkToParents(m_current);
  }
  SortPending(treeRoot);
  return m_nAddedCount > 0 || m_nRemovedCount > 0;
}

std::uint32_t InfoDeviceCache::EnumerateDeviceNodes(std::u16string_view className) {
  const platform::Guid* classGuid = DeviceClassByName(className);
  DeviceSet set(m_sets);
  const platform::Status opened =
      set.Open(classGuid, platform::kDIGCF_PRESENT | (classGuid ? 0 : platform::kDIGCF_ALLCLASSES));
  if (!opened) {
    const bool noReason = opened.error == 0 || opened.error == platform::kERROR_NO_MORE_ITEMS;
    return noReason ? platform::kERROR_INVALID_FUNCTION : opened.error;
  }

  m_current.Clear();
  ElementReader reader(m_sets, set.Get(), m_answers);
  PassedElements passed;
  InfoDevicePtr record = MakeRecord<CZKUMInfoDeviceImpl>();
  for (std::uint32_t index = 0; index < kMostElements; ++index) {
    platform::SP_DEVINFO_DATA element;
    element.cbSize = sizeof element;
    if (!m_sets.EnumDeviceInfo(set.Get(), index, element)) break;
    // The service, which nobody else asks for, comes last.
    if (!ReadClass(reader, element, *record)) {
      passed.AddExcluded(element);
      continue;
    }
    if (!IsAdmitted(reader, element, *record)) {
      record->Reset();
      passed.AddUnwanted(element);
      continue;
    }
    if (!ReadService(reader, element, *record)) {
      record->Reset();
      passed.AddExcluded(element);
      continue;
    }
    if (IsKnown(element.DevInst)) {
      record->Reset();
    } else {
      const bool read = ReadNewNode(reader, element, passed, *record);
      if (read) KeepAsNewUnlessPrevious(record);
      record = MakeRecord<CZKUMInfoDeviceImpl>();
      if (!read) {
        passed.AddUnwanted(element);
        continue;
      }
    }
    passed.Clear();
  }
  CreateDiskDriveRecords();
  return 0;
}

// Fills handles and parent of a record that is admitted. The node's own id is read only where its
// parent's cannot be told without it.
bool InfoDeviceCache::IsAdmitted(const ElementReader& reader,
                                 const platform::SP_DEVINFO_DATA& element,
                                 CZKUMInfoDeviceImpl& record) {
  // Most elements are not admitted: their parents' ids take no memory.
  m_identity.m_devInstHandle = element.DevInst;
  m_identity.m_devInstHandleParent = kUnknownDevInst;
  m_identity.m_strDevInstId.clear();
  if (ReadParent(m_answers, m_identity)) {
    m_identity.m_strDevInstId = reader.InstanceId(element);
    NameDiskAsParent(m_identity);
  }
  if (!HasAdmittedParent(m_identity)) return false;
  record.m_devInstHandle = m_identity.m_devInstHandle;
  record.m_devInstHandleParent = m_identity.m_devInstHandleParent;
  record.m_strDevInstId = m_identity.m_strDevInstId;
  record.m_strDevInstIdParent = m_identity.m_strDevInstIdParent;
  return true;
}

// A node that was there before keeps the record it has, so nothing more of it is read. One that is
// held may return later.
bool InfoDeviceCache::IsKnown(platform::DevInst handle) {
  if (m_held.HasHandle(handle)) return true;
  const InfoDevicePtr& known = m_previous.FindByHandle(handle);
  if (known) m_current.Insert(known);
  return static_cast<bool>(known);
}

// False where the node is no longer there for anybody: a record that is made now would keep for
// good what cannot be read at the moment.
bool InfoDeviceCache::ReadNewNode(ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
                                  PassedElements& passed, CZKUMInfoDeviceImpl& record) {
  const std::size_t failures = reader.Failures();
  ReadOtherProperties(reader, element, passed, record);
  if (record.m_strDevInstId.empty()) record.m_strDevInstId = reader.InstanceId(element);
  const bool failed = record.m_strDevInstId.empty() || reader.Failures() != failures;
  platform::DevInst parent = 0;
  if (failed && !m_answers.AskParent(element.DevInst, parent)) return false;
  record.ParseInstanceId();
  if (record.m_strSerialNumber.empty()) record.SetSerialNumber(passed.SerialNumber(reader));
  return true;
}

void InfoDeviceCache::KeepAsNewUnlessPrevious(const InfoDevicePtr& record) {
  m_current.Insert(record);
  if (m_previous.HasHandle(record->m_devInstHandle)) return;
  m_added.Insert(record);
  ++m_nAddedCount;
}

void InfoDeviceCache::CreateDiskDriveRecords() {
  CommonParent common(m_current);
  for (const DeviceNodeRecord& drive : m_diskDrives) {
    // This is deliberate, though it reads the wrong way round: a drive gets a record of its own
    // only when every current record lies below it (or there is none), not when it has no record
    // yet.
    if (!common.AllName(drive.InstanceId)) continue;
    const InfoDevicePtr record = MakeRecord<CZKUMInfoDeviceImpl>();
    record->SetInstanceId(drive.InstanceId);
    record->SetParentInstanceId(drive.ParentInstanceId);
    record->FriendlyName = drive.Name;
    record->Location = drive.Location;
    record->HardwareId = drive.HardwareId;
    record->DevClass = drive.ClassName;
    KeepAsNewUnlessPrevious(record);
    common.Add(record->m_strDevInstIdParent);
  }
}

// Held records return when the pass has a child of them. All are collected before the first
// returns: a record that returns does not bring its own held parent along in the same pass.
void InfoDeviceCache::ReturnHeldParents() {
  InfoDeviceSet children;
  for (const InfoDevicePtr& held : m_held) {
    const InfoDevicePtr& child = m_current.FindByParentId(held->m_strDevInstId, held.Get());
    if (child) children.Insert(child);
  }
  InfoDeviceSet returning;
  for (const InfoDevicePtr& child : children) {
    if (m_held.HasRecord(child.Get())) returning.Insert(child);
    for (const InfoDevicePtr& held : m_held.AllByInstanceId(child->m_strDevInstIdParent)) {
      if (held != child) returning.Insert(held);
    }
  }
  for (const InfoDevicePtr& record : returning) {
    KeepAsNewUnlessPrevious(record);
    m_held.Erase(record.Get());
  }
}

void InfoDeviceCache::FindRemoved() {
  m_removed.Clear();
  for (const InfoDevicePtr& record : m_previous) {
    if (m_current.HasHandle(record->m_devInstHandle)) continue;
    m_removed.Insert(record);
    ++m_nRemovedCount;
  }
}

// Each text is looked up once however many records share it.
InfoDeviceSet InfoDeviceCache::AncestorsOfRemoved() const {
  InfoDeviceSet ancestors;
  platform::FlatTextSet parentIds;
  platform::FlatTextSet grandparentIds;
  for (const InfoDevicePtr& removed : m_removed) {
    if (!parentIds.Insert(removed->m_strDevInstIdParent)) continue;
    for (const InfoDevicePtr& parent : m_current.AllByInstanceId(removed->m_strDevInstIdParent)) {
      ancestors.Insert(parent);
      if (!grandparentIds.Insert(parent->m_strDevInstIdParent)) continue;
      for (const InfoDevicePtr& grandparent :
           m_current.AllByInstanceId(parent->m_strDevInstIdParent)) {
        ancestors.Insert(grandparent);
      }
    }
  }
  return ancestors;
}

// They count as removed too, but not in the count that decides whether something changed.
void InfoDeviceCache::HoldBack(const InfoDeviceSet& ancestors) {
  for (const InfoDevicePtr& record : ancestors) {
    m_removed.Insert(record);
    if (m_current.Erase(record.Get())) m_held.Insert(record);
  }
}

// New records wait until the tree shows their device, and count as added from then on.
void InfoDeviceCache::SortPending(const NodePtr& treeRoot) {
  const platform::FlatTextSet shown = InstanceIdsOf(treeRoot);
  InfoDeviceSet stillPending;
  InfoDeviceSet nowShown;
  // Nobody is in both sets that go into one: they are only appended to.
  for (const InfoDevicePtr& record : m_pending) {
    if (!m_current.HasRecord(record.Get()) || m_added.HasRecord(record.Get())) continue;
    (shown.Contains(record->m_strDevInstId) ? nowShown : stillPending).Append(record);
  }
  InfoDeviceSet added;
  for (const InfoDevicePtr& record : m_added) {
    if (shown.Contains(record->m_strDevInstId)) {
      added.Append(record);
    } else {
      stillPending.Append(record);
      --m_nAddedCount;
    }
  }
  for (const InfoDevicePtr& record : nowShown) {
    added.Append(record);
    ++m_nAddedCount;
  }
  m_pending = std::move(stillPending);
  m_added = std::move(added);
}

void InfoDeviceCache::Commit() {
  m_previous = std::move(m_current);
  m_current.Clear();
  m_removed.Clear();
  m_added.Clear();
}

void InfoDeviceCache::AttachToParentInfoDevice(const NodePtr& node) const {
  AddChild(node, m_current.FindByInstanceId(node->m_strDevInstIdParent).Get());
}

}  // namespace KelvoUHW
