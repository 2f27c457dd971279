#include "tree/device_forest.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "devinfo/property_reader.h"
#include "platform/flat_index.h"
#include "platform/text.h"
#include "records/device_set.h"
#include "records/devnode.h"
#include "records/port_device.h"
#include "records/received_text.h"
#include "records/records.h"

namespace KelvoUHW {

namespace {

constexpr std::uint32_t kClassNameBytes = 520;
constexpr std::uint32_t kNameBytes = 126;
constexpr std::uint32_t kClassDescriptionChars = 260;

bool IsClass(const DeviceNodeRecord& record, std::u16string_view name) noexcept {
  return platform::EqualIgnoringCase(record.ClassName, name);
}

class ClassImageList {
 public:
  explicit ClassImageList(platform::DeviceSets& sets) noexcept : m_sets(sets) {
    m_sets.GetClassImageList(m_handle);
  }
  ~ClassImageList() {
    if (m_handle != platform::kInvalidHandle) m_sets.DestroyClassImageList(m_handle);
  }
  ClassImageList(const ClassImageList&) = delete;
  ClassImageList& operator=(const ClassImageList&) = delete;

  platform::DeviceSetHandle Get() const noexcept { return m_handle; }

 private:
  platform::DeviceSets& m_sets;
  platform::DeviceSetHandle m_handle = platform::kInvalidHandle;
};

// The text of a property that fits a buffer of fixed size; a longer one counts as not there.
std::optional<std::u16string> ReadText(ElementReader& elements,
                                       const platform::SP_DEVINFO_DATA& element,
                                       std::uint32_t property, std::uint32_t bufferBytes) {
  PropertyAnswer answer;
  if (!elements.ReadAndKeep(element, property, answer)) return std::nullopt;
  const std::optional<std::u16string_view> text = TextWithin(answer, bufferBytes);
  return text ? std::optional<std::u16string>(*text) : std::nullopt;
}

}  // namespace

const DeviceRecordReader::SetupClass* DeviceRecordReader::FindClass(
    const platform::Guid& guid) const noexcept {
  const auto found = std::ranges::find(m_classes, guid, &SetupClass::guid);
  return found == m_classes.end() ? nullptr : &*found;
}

// A class is shown when it has an image and a description. It is asked for until it is found to be
// shown: once, where all goes well.
bool DeviceRecordReader::IsShown(const platform::Guid& guid, platform::DeviceSetHandle images) {
  if (FindClass(guid) != nullptr) return true;
  std::int32_t index = 0;
  if (images == platform::kInvalidHandle || !m_host.GetClassImageIndex(images, guid, index)) {
    return false;
  }
  std::array<char16_t, kClassDescriptionChars> buffer{};
  if (!m_host.GetClassDescription(guid, buffer.data(), kClassDescriptionChars, nullptr)) {
    return false;
  }
  std::optional<std::u16string> description = ReceivedText(buffer);
  if (!description) return false;
  m_classes.push_back({guid, *std::move(description)});
  return true;
}

std::vector<DeviceNodeRecord> DeviceRecordReader::Read() {
  std::vector<DeviceNodeRecord> records;
  const ClassImageList images(m_host);
  m_set.Open(nullptr,
             platform::kDIGCF_PRESENT | platform::kDIGCF_ALLCLASSES | platform::kDIGCF_PROFILE);
  if (m_set.Get() == platform::kInvalidHandle) return records;
  m_elements.emplace(m_host, m_set.Get(), m_answers);

  for (std::uint32_t index = 0; index < kMostElements; ++index) {
    platform::SP_DEVINFO_DATA data{.cbSize = sizeof data};
    if (!m_host.EnumDeviceInfo(m_set.Get(), index, data)) break;
    std::optional<std::u16string> className =
        ReadText(*m_elements, data, platform::kSPDRP_CLASS, kClassNameBytes);
    if (!className || !IsShown(data.ClassGuid, images.Get())) continue;

    DeviceNodeRecord record;
    record.DevInst = data.DevInst;
    if (!m_answers.GetParent(data.DevInst, record.ParentDevInst)) {
      // Everything read so far is dropped and the set stays open. Deliberate: a PC that shows a
      // device without parent has no device-manager side at all.
      m_set.Release();
      return {};
    }
    record.ClassName = std::move(*className);
    if (IsClass(record, u"Processor") || IsClass(record, u"Computer")) continue;
    record.Element = data;
    records.push_back(std::move(record));
  }
  return records;
}

void DeviceRecordReader::Complete(DeviceNodeRecord& record) {
  const auto read = [&](std::uint32_t property, std::uint32_t bufferBytes) {
    return ReadText(*m_elements, record.Element, property, bufferBytes);
  };
  record.InstanceId = m_elements->InstanceId(record.Element);
  record.ParentInstanceId = GetDeviceId(m_answers, record.ParentDevInst);
  std::optional<std::u16string> name = read(platform::kSPDRP_FRIENDLYNAME, kNameBytes);
  if (!name) name = read(platform::kSPDRP_DEVICEDESC, kNameBytes);
  if (const SetupClass* setupClass = FindClass(record.Element.ClassGuid)) {
    record.ClassDescription = setupClass->description;
  }
  record.Name = std::move(name).value_or(u"");
  record.Location = read(platform::kSPDRP_LOCATION_INFORMATION, kClassNameBytes).value_or(u"");
  record.HardwareId = read(platform::kSPDRP_HARDWAREID, kClassNameBytes).value_or(u"");
}

namespace {

// The forest as indexes into the records, so that linking takes one pass: a record that comes takes
// the top-level records that wait for it, then goes below its own parent or waits at the top.
class Forest {
 public:
  explicit Forest(std::vector<DeviceNodeRecord>& records) : m_records(records) {
    m_places.resize(records.size());
    for (Index index = 0; index < records.size(); ++index) Link(index);
    for (Index index = 0; index < records.size(); ++index) {
      if (IsClass(records[index], u"DiskDrive")) MarkWayTo(index);
    }
  }

  std::vector<DeviceNodeRecord> TakePruned() {
    std::vector<DeviceNodeRecord> top;
    for (Index index = 0; index < m_records.size(); ++index) {
      if (m_places[index].parent == kNone && m_places[index].leadsToDisk) {
        top.push_back(std::move(m_records[index]));
        TakeWhatIsBelow(index, top.back());
      }
    }
    return top;
  }

 private:
  using Index = platform::FlatIndex::Entry;
  static constexpr Index kNone = platform::FlatIndex::kNone;
  struct Place {
    Index parent = kNone;
    Index above = kNone;  // the parent, or a record further up
    Index firstChild = kNone;
    Index lastChild = kNone;
    Index nextSibling = kNone;
    bool leadsToDisk = false;
  };

  // Where a number is entered twice the first record counts.
  auto HasHandle(platform::DevInst handle) const {
    return [this, handle](Index index) { return m_records[index].DevInst == handle; };
  }
  auto WaitsFor(platform::DevInst parent) const {
    return [this, parent](Index index) { return m_records[index].ParentDevInst == parent; };
  }

  void Link(Index index) {
    const DeviceNodeRecord& record = m_records[index];
    const std::size_t hash = platform::HashOf(record.DevInst);
    for (Index child; (child = m_waiting.First(hash, WaitsFor(record.DevInst))) != kNone;) {
      m_waiting.Remove(hash, child, WaitsFor(record.DevInst));
      Adopt(index, child);
    }
    const std::size_t parentHash = platform::HashOf(record.ParentDevInst);
    const Index parent = m_byHandle.First(parentHash, HasHandle(record.ParentDevInst));
    // Parents that form a circle leave the record that closes it at the top.
    if (parent != kNone && TopOf(parent) != index) {
      Adopt(parent, index);
    } else {
      m_waiting.Add(parentHash, index, WaitsFor(record.ParentDevInst));
    }
    m_byHandle.Add(hash, index, HasHandle(record.DevInst));
  }

  void Adopt(Index parent, Index child) {
    Place& place = m_places[parent];
    (place.lastChild == kNone ? place.firstChild : m_places[place.lastChild].nextSibling) = child;
    place.lastChild = child;
    m_places[child].parent = m_places[child].above = parent;
  }

  // The top-level record above a record, or itself. Shortens the way for the next one that asks: a
  // chain of devices would take its length at each device.
  Index TopOf(Index index) {
    Index top = index;
    while (m_places[top].above != kNone) top = m_places[top].above;
    while (index != top) index = std::exchange(m_places[index].above, top);
    return top;
  }

  void MarkWayTo(Index index) {
    while (index != kNone && !m_places[index].leadsToDisk) {
      m_places[index].leadsToDisk = true;
      index = m_places[index].parent;
    }
  }

  void TakeWhatIsBelow(Index top, DeviceNodeRecord& taken) {
    struct Step {
      Index index;
      DeviceNodeRecord* record;
    };
    std::vector<Step> waiting{{top, &taken}};
    while (!waiting.empty()) {
      const auto [index, record] = waiting.back();
      waiting.pop_back();
      // All children first: a record stays where it is once its siblings are there.
      std::size_t place = waiting.size();
      for (Index child = m_places[index].firstChild; child != kNone;
           child = m_places[child].nextSibling) {
        if (!m_places[child].leadsToDisk || IsClass(m_records[child], u"USB")) continue;
        record->Children.push_back(std::move(m_records[child]));
        waiting.push_back({child, nullptr});
      }
      for (DeviceNodeRecord& child : record->Children) waiting[place++].record = &child;
    }
  }

  std::vector<DeviceNodeRecord>& m_records;
  std::vector<Place> m_places;
  platform::FlatIndex m_byHandle;
  platform::FlatIndex m_waiting;  // top-level records, by the parent they wait for
};

// Calls `visit` with the records, a record before its children and both in their order; it returns
// whether the children are wanted.
template <class Visit>
void VisitForest(const std::vector<DeviceNodeRecord>& forest, Visit visit) {
  std::vector<const DeviceNodeRecord*> waiting;
  const auto wait = [&waiting](const std::vector<DeviceNodeRecord>& level) {
    for (auto record = level.rbegin(); record != level.rend(); ++record) {
      waiting.push_back(&*record);
    }
  };
  wait(forest);
  while (!waiting.empty()) {
    const DeviceNodeRecord& record = *waiting.back();
    waiting.pop_back();
    if (visit(record)) wait(record.Children);
  }
}

// A node of the tree with the two ids of a record.
template <class Node>
RingPtr<Node> NodeOf(RingPtr<Node> node, const DeviceNodeRecord& record) {
  node->SetInstanceId(record.InstanceId);
  node->SetParentInstanceId(record.ParentInstanceId);
  return node;
}

void AddController(const DeviceNodeRecord& record, CZKUMUsbTreeNodeImpl& root) {
  const auto controller = NodeOf(MakeRecord<CZKUMHostControllerImpl>(), record);
  AddChild(controller, &root);
  for (const DeviceNodeRecord& hubRecord : record.Children) {
    const auto hub = NodeOf(MakeRecord<CZKUMHubDeviceImpl>(), hubRecord);
    AddChild(hub, controller.Get());
    for (const DeviceNodeRecord& deviceRecord : hubRecord.Children) {
      const auto port = MakeRecord<CZKUMHubPortImpl>(0u);
      port->SetInstanceId(deviceRecord.InstanceId + u" port 0");
      port->SetParentInstanceId(deviceRecord.ParentInstanceId);
      AddChild(port, hub.Get());
      // The class name stands where a driver key belongs. This is deliberate.
      AddChild(MakeRecord<CZKUMPortDeviceImpl>(deviceRecord.DevInst, nullptr, nullptr, nullptr,
                                               deviceRecord.ClassName, deviceRecord.Name,
                                               deviceRecord.InstanceId),
               port.Get());
    }
  }
}

}  // namespace

std::vector<DeviceNodeRecord> LinkDeviceForest(std::vector<DeviceNodeRecord> records) {
  return Forest(records).TakePruned();
}

std::vector<DeviceNodeRecord> ReadDeviceForest(platform::Host& host, DeviceAnswers& answers) {
  DeviceRecordReader reader(host, answers);
  std::vector<DeviceNodeRecord> forest = LinkDeviceForest(reader.Read());
  std::vector<DeviceNodeRecord*> waiting;
  const auto wait = [&waiting](std::vector<DeviceNodeRecord>& level) {
    for (auto record = level.rbegin(); record != level.rend(); ++record) {
      waiting.push_back(&*record);
    }
  };
  wait(forest);
  while (!waiting.empty()) {
    DeviceNodeRecord& record = *waiting.back();
    waiting.pop_back();
    reader.Complete(record);
    wait(record.Children);
  }
  return forest;
}

void AddForestNodes(const std::vector<DeviceNodeRecord>& forest, CZKUMUsbTreeNodeImpl& root) {
  VisitForest(forest, [&root](const DeviceNodeRecord& record) {
    // Anywhere in the id and exact in case; whatever the class, it becomes a controller. This is
    // deliberate.
    if (record.InstanceId.find(u"PCI\\") == std::u16string::npos) return true;
    AddController(record, root);
    return false;
  });
}

std::vector<DeviceNodeRecord> DiskDriveRecords(const std::vector<DeviceNodeRecord>& forest) {
  std::vector<DeviceNodeRecord> disks;
  VisitForest(forest, [&disks](const DeviceNodeRecord& record) {
    if (!IsClass(record, u"DiskDrive")) return true;
    disks.push_back(record);
    return false;
  });
  return disks;
}

}  // namespace KelvoUHW
