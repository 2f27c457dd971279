// Device-manager nodes with their properties.
#include <algorithm>
#include <array>
#include <cstring>
#include <functional>
#include <type_traits>
#include <unordered_set>

#include "recorder/recording.h"
#include "records/device_set.h"

namespace recorder {
namespace {

using platform::DevInst;
using platform::simulated::Device;

constexpr std::uint32_t kIdChars = 200;  // with the zero behind it

class ClassImages {
 public:
  explicit ClassImages(platform::DeviceSets& sets) noexcept : m_sets(sets) {
    m_sets.GetClassImageList(m_list);
  }
  ~ClassImages() {
    if (m_list != platform::kInvalidHandle) m_sets.DestroyClassImageList(m_list);
  }
  ClassImages(const ClassImages&) = delete;
  ClassImages& operator=(const ClassImages&) = delete;

  bool Has(const platform::Guid& classGuid) const noexcept {
    std::int32_t index = 0;
    return m_list != platform::kInvalidHandle &&
           m_sets.GetClassImageIndex(m_list, classGuid, index).ok;
  }

 private:
  platform::DeviceSets& m_sets;
  platform::DeviceSetHandle m_list = platform::kInvalidHandle;
};

// A property of one kind of type, as the units that were received.
using Ask =
    std::function<platform::Status(std::uint32_t property, std::uint32_t& type, void* buffer,
                                   std::uint32_t bytes, std::uint32_t& required)>;

struct Value {
  std::uint32_t type = 0;
  std::u16string units;
};

std::optional<Value> ReadValue(const Ask& ask, std::uint32_t property) {
  Value value{0, std::u16string(128, u'\0')};
  for (int reads = 0; reads < kMostReads; ++reads) {
    const auto bytes = static_cast<std::uint32_t>(value.units.size() * sizeof(char16_t));
    std::uint32_t required = 0;
    if (ask(property, value.type, value.units.data(), bytes, required)) {
      value.units.resize(std::min(required, bytes) / sizeof(char16_t));
      return value;
    }
    if (required <= bytes || required > kMostBytes) return std::nullopt;
    value.units.resize(required / sizeof(char16_t) + 1);
  }
  return std::nullopt;
}

void ReadProperties(const Ask& ask, Device& device) {
  const auto text = [&ask](std::uint32_t property, std::optional<Text>& out) {
    const auto value = ReadValue(ask, property);
    if (value && value->type == platform::kREG_SZ) out = Text(platform::UpToZero(value->units));
  };
  const auto number = [&ask](std::uint32_t property, auto& out) {
    const auto value = ReadValue(ask, property);
    std::uint32_t bits = 0;
    if (!value || value->type != platform::kREG_DWORD || value->units.size() != 2) return;
    std::memcpy(&bits, value->units.data(), sizeof bits);
    out = static_cast<typename std::remove_reference_t<decltype(out)>::value_type>(bits);
  };
  text(platform::kSPDRP_CLASS, device.deviceClass);
  text(platform::kSPDRP_CLASSGUID, device.classGuid);
  text(platform::kSPDRP_SERVICE, device.service);
  text(platform::kSPDRP_DRIVER, device.driver);
  text(platform::kSPDRP_DEVICEDESC, device.description);
  text(platform::kSPDRP_FRIENDLYNAME, device.friendlyName);
  text(platform::kSPDRP_MFG, device.manufacturer);
  text(platform::kSPDRP_LOCATION_INFORMATION, device.location);
  text(platform::kSPDRP_PHYSICAL_DEVICE_OBJECT_NAME, device.physicalName);
  text(platform::kSPDRP_ENUMERATOR_NAME, device.enumerator);
  if (const auto ids = ReadValue(ask, platform::kSPDRP_HARDWAREID)) {
    if (ids->type == platform::kREG_MULTI_SZ) device.hardwareIds = SplitTexts(ids->units);
  }
  number(platform::kSPDRP_LEGACYBUSTYPE, device.legacyBusType);
  number(platform::kSPDRP_UI_NUMBER, device.uiNumber);
  // Nobody looks at the value of either, so one that a file cannot hold is as good as another.
  if (device.classGuid && !platform::ParseGuid(*device.classGuid)) device.classGuid.reset();
  if (device.legacyBusType && (*device.legacyBusType < -1 || *device.legacyBusType > 17)) {
    device.legacyBusType = -1;
  }
}

Text IdOf(platform::DeviceManager& manager, DevInst node) {
  std::array<char16_t, kIdChars> buffer{};
  if (!manager.GetDeviceId(node, buffer.data(), kIdChars)) return {};
  const std::u16string_view id = platform::UpToZero({buffer.data(), buffer.size()});
  return id.size() < buffer.size() ? Text(id) : Text();
}

class DeviceRecorder {
 public:
  explicit DeviceRecorder(Recording& recording)
      : m_recording(recording), m_host(recording.host), m_images(recording.host) {}

  void Run() {
    RecordSet();
    if (m_host.LocateRootDevNode(m_root)) WalkTree();
    for (const auto& [node, position] : m_recording.positions) {
      SetParent(node, m_recording.machine.devices[position]);
    }
    MendParents();
  }

 private:
  Device* Add(DevInst node, Text id) {
    if (id.empty() || id.size() >= kIdChars) {
      m_recording.Note(u"A device whose id cannot be read or written down is left out.");
      return nullptr;
    }
    if (platform::simulated::IsRootDevice(id) || !m_ids.Add(id)) return nullptr;
    m_recording.positions.try_emplace(node, m_recording.machine.devices.size());
    Device& device = m_recording.machine.devices.emplace_back();
    device.id = std::move(id);
    return &device;
  }

  // All present devices, in the order in which the component meets them.
  void RecordSet() {
    KelvoUHW::DeviceSet set(m_host);
    if (!set.Open(nullptr, platform::kDIGCF_PRESENT | platform::kDIGCF_ALLCLASSES)) return;
    for (std::uint32_t index = 0; index < kMostElements; ++index) {
      platform::SP_DEVINFO_DATA data{.cbSize = sizeof data};
      if (!m_host.EnumDeviceInfo(set.Get(), index, data)) return;
      RecordElement(set.Get(), data);
    }
  }

  void RecordElement(platform::DeviceSetHandle set, const platform::SP_DEVINFO_DATA& data) {
    std::uint32_t required = 0;
    m_host.GetDeviceInstanceId(set, data, nullptr, 0, &required);
    Text id(std::min(required, kMostBytes), u'\0');
    if (!m_host.GetDeviceInstanceId(set, data, id.data(), static_cast<std::uint32_t>(id.size()),
                                    nullptr)) {
      return;
    }
    Device* device = Add(data.DevInst, Text(platform::UpToZero(id)));
    if (device == nullptr) return;
    ReadProperties(
        [&](std::uint32_t property, std::uint32_t& type, void* buffer, std::uint32_t bytes,
            std::uint32_t& needed) {
          return m_host.GetDeviceRegistryProperty(set, data, property, &type, buffer, bytes,
                                                  &needed);
        },
        *device);
    std::array<char16_t, 260> description{};
    device->noClassImage = !m_images.Has(data.ClassGuid);
    device->noClassDescription =
        !m_host.GetClassDescription(data.ClassGuid, description.data(),
                                    static_cast<std::uint32_t>(description.size()), nullptr);
  }

  // The tree of nodes: it says where a node hangs that shows no parent, and has the nodes that the
  // set does not have.
  void WalkTree() {
    std::vector<DevInst> pending{m_root};
    std::unordered_set<DevInst> met{m_root};
    while (!pending.empty() && met.size() < kMostElements) {
      const DevInst above = pending.back();
      pending.pop_back();
      DevInst node = 0;
      for (bool there = m_host.GetChild(above, node).ok; there && node != 0;) {
        if (!met.insert(node).second) break;
        m_above.emplace(node, above);
        pending.push_back(node);
        RecordNode(node);
        DevInst next = 0;
        there = m_host.GetSibling(node, next).ok;
        node = next;
      }
    }
  }

  void RecordNode(DevInst node) {
    if (m_recording.positions.contains(node)) return;
    Device* device = Add(node, IdOf(m_host, node));
    if (device == nullptr) return;
    // The configuration manager counts properties from one and gives the size in the same argument.
    ReadProperties(
        [&](std::uint32_t property, std::uint32_t& type, void* buffer, std::uint32_t bytes,
            std::uint32_t& required) {
          required = bytes;
          return m_host.GetDevNodeRegistryProperty(node, property + 1, &type, buffer, required);
        },
        *device);
  }

  void SetParent(DevInst node, Device& device) {
    DevInst parent = 0;
    device.noParent = !m_host.GetParent(node, parent);
    if (device.noParent) {
      const auto above = m_above.find(node);
      parent = above == m_above.end() ? m_root : above->second;
    }
    if (parent == m_root) return;
    const auto known = m_recording.positions.find(parent);
    device.parent = known != m_recording.positions.end()
                        ? m_recording.machine.devices[known->second].id
                        : IdOf(m_host, parent);
  }

  // A parent that left while the PC was asked, and parents that lead back to themselves.
  void MendParents() {
    std::unordered_map<Text, Device*> devices;
    for (Device& device : m_recording.machine.devices) {
      devices.emplace(platform::ToLower(device.id), &device);
    }
    for (Device& device : m_recording.machine.devices) {
      std::unordered_set<const Device*> way;
      const Device* node = &device;
      while (node != nullptr && way.insert(node).second &&
             !platform::simulated::IsRootDevice(node->parent)) {
        const auto parent = devices.find(platform::ToLower(node->parent));
        node = parent == devices.end() ? nullptr : parent->second;
      }
      const bool inCircle = node != nullptr && !platform::simulated::IsRootDevice(node->parent);
      const bool missing = !platform::simulated::IsRootDevice(device.parent) &&
                           !devices.contains(platform::ToLower(device.parent));
      if (!inCircle && !missing) continue;
      m_recording.Note(device.id + u": its parent " + device.parent +
                       u" is not there; it hangs below the root here.");
      device.parent.clear();
    }
  }

  Recording& m_recording;
  platform::Host& m_host;
  ClassImages m_images;
  platform::simulated::NameSet m_ids;
  DevInst m_root = 0;
  std::unordered_map<DevInst, DevInst> m_above;
};

}  // namespace

void RecordDevices(Recording& recording) { DeviceRecorder(recording).Run(); }

}  // namespace recorder
