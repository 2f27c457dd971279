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

// Of a record or a present device.
template <class Device>
bool IsClass(const Device& device, std::u16string_view name) noexcept {
  return platform::EqualIgnoringCase(device.ClassName, name);
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

// The text of a property that fits a buffer of fixed size; a longer one counts as not there. Valid
// until the next one is read.
std::optional<std::u16string_view> ReadText(ElementReader& elements,
                                            const platform::SP_DEVINFO_DATA& element,
                                            std::uint32_t property, std::uint32_t bufferBytes) {
  PropertyAnswer answer;
  if (!elements.ReadAndKeep(element, property, answer)) return std::nullopt;
  return TextWithin(answer, bufferBytes);
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

std::vector<PresentDevice> DeviceRecordReader::Read() {
  std::vector<PresentDevice> devices;
  const ClassImageList images(m_host);
  m_set.Open(nullptr,
             platform::kDIGCF_PRESENT | platform::kDIGCF_ALLCLASSES | platform::kDIGCF_PROFILE);
  if (m_set.Get() == platform::kInvalidHandle) return devices;
  m_elements.emplace(m_host, m_set.Get(), m_answers);

  for (std::uint32_t index = 0; index < kMostElements; ++index) {
    PresentDevice device;
    platform::SP_DEVINFO_DATA& data = device.Element;
    data = {.cbSize = sizeof data};
    if (!m_host.EnumDeviceInfo(m_set.Get(), index, data)) break;
    const auto className = ReadText(*m_elements, data, platform::kSPDRP_CLASS, kClassNameBytes);
    if (!className || !IsShown(data.ClassGuid, images.Get())) continue;

    device.DevInst = data.DevInst;
    if (!m_answers.GetParent(data.DevInst, device.ParentDevInst)) {
      // Everything read so far is dropped and the set stays open. Deliberate: a PC that shows a
      // device without parent has no device-manager side at all.
      m_set.Release();
      return {};
    }
    device.ClassName = m_elements->Texts().Of(*className);
    if (IsClass(device, u"Processor") || IsClass(device, u"Computer")) continue;
    devices.push_back(std::move(device));
  }
  return devices;
}

DeviceNodeRecord RecordOf(const PresentDevice& device) {
  DeviceNodeRecord record;
  record.DevInst = device.DevInst;
  record.ParentDevInst = device.ParentDevInst;
  record.Element = device.Element;
  record.ClassName = device.ClassName;
  return record;
}

void DeviceRecordReader::Complete(DeviceNodeRecord& record) {
  const auto read = [&](std::uint32_t property, std::uint32_t bufferBytes, std::u16string& text) {
    const auto answer = ReadText(*m_elements, record.Element, property, bufferBytes);
    text = answer.value_or(u"");
    return answer.has_value();
  };
  record.InstanceId = m_elements->InstanceId(record.Element);
  record.ParentInstanceId = GetDeviceId(m_answers, record.ParentDevInst);
  if (!read(platform::kSPDRP_FRIENDLYNAME, kNameBytes, record.Name)) {
    read(platform::kSPDRP_DEVICEDESC, kNameBytes, record.Name);
  }
  if (const SetupClass* setupClass = FindClass(record.Element.ClassGuid)) {
    record.ClassDescription = setupClass->description;
  }
  read(platform::kSPDRP_LOCATION_INFORMATION, kClassNameBytes, record.Location);
  read(platform::kSPDRP_HARDWAREID, kClassNameBytes, record.HardwareId);
}

namespace {

// The forest as indexes into the records, so that linking takes one pass: a record that comes takes
// the top-level records that wait for it, then goes below its own parent or waits at the top.
class Forest {
 public:
  explicit Forest(const std::vector<PresentDevice>& devices) : m_devices(devices) {
    m_places.resize(devices.size());
    m_byHandle.Reserve(devices.size());
    for (Index index = 0; index < devices.size(); ++index) Link(index);
    for (Index index = 0; index < devices.size(); ++index) {
      if (IsClass(devices[index], u"DiskDrive")) MarkWayTo(index);
    }
  }

  std::vector<DeviceNodeRecord> TakePruned() {
    std::vector<DeviceNodeRecord> top;
    for (Index index = 0; index < m_devices.size(); ++index) {
      if (m_places[index].parent == kNone && m_places[index].leadsToDisk) {
        top.push_back(RecordOf(m_devices[index]));
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
    return [this, handle](Index index) { return m_devices[index].DevInst == handle; };
  }
  auto WaitsFor(platform::DevInst parent) const {
    return [this, parent](Index index) { return m_devices[index].ParentDevInst == parent; };
  }

  void Link(Index index) {
    const PresentDevice& device = m_devices[index];
    const std::size_t hash = platform::HashOf(device.DevInst);
    for (Index child; (child = m_waiting.First(hash, WaitsFor(device.DevInst))) != kNone;) {
      m_waiting.Remove(hash, child, WaitsFor(device.DevInst));
      Adopt(index, child);
    }
    const std::size_t parentHash = platform::HashOf(device.ParentDevInst);
    const Index parent = m_byHandle.First(parentHash, HasHandle(device.ParentDevInst));
    // Parents that form a circle leave the record that closes it at the top.
    if (parent != kNone && TopOf(parent) != index) {
      Adopt(parent, index);
    } else {
      m_waiting.Add(parentHash, index, WaitsFor(device.ParentDevInst));
    }
    m_byHandle.Add(hash, index, HasHandle(device.DevInst));
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
        if (!m_places[child].leadsToDisk || IsClass(m_devices[child], u"USB")) continue;
        record->Children.push_back(RecordOf(m_devices[child]));
        waiting.push_back({child, nullptr});
      }
      for (DeviceNodeRecord& child : record->Children) waiting[place++].record = &child;
    }
  }

  const std::vector<PresentDevice>& m_devices;
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

std::vector<DeviceNodeRecord> LinkDeviceForest(const std::vector<PresentDevice>& devices) {
  return Forest(devices).TakePruned();
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
