#include "simulation/machine/machine_index.h"

#include <cstring>
#include <utility>

#include "platform/text.h"

namespace platform::simulated {

bool GuidOrder::operator()(const Guid& a, const Guid& b) const noexcept {
  return std::memcmp(&a, &b, sizeof(Guid)) < 0;
}

Guid GuidOf(const std::optional<Text>& text) {
  return text ? ParseGuid(*text).value_or(kNullGuid) : kNullGuid;
}

bool IsDriveName(std::u16string_view loweredName) {
  return loweredName.size() == 6 && loweredName.starts_with(u"\\\\.\\") && loweredName[4] >= u'a' &&
         loweredName[4] <= u'z' && loweredName[5] == u':';
}

bool IsDriveRoot(std::u16string_view path) {
  if (path.size() != 3 || path.substr(1) != u":\\") return false;
  const char16_t letter = ToLower(path[0]);
  return letter >= u'a' && letter <= u'z';
}

DevInst DeviceNumbers::NumberOf(const Text& loweredId) {
  return m_numbers.try_emplace(loweredId, static_cast<DevInst>(m_numbers.size() + 1)).first->second;
}

void NameTable::Enter(std::u16string_view loweredName, std::uint32_t position) {
  m_names.push_back({m_texts.size(), loweredName.size(), position});
  m_texts += loweredName;
  m_index.Add(HashOf(loweredName), static_cast<FlatIndex::Entry>(m_names.size() - 1),
              [&](auto entry) { return TextOf(entry) == loweredName; });
}

std::uint32_t NameTable::Find(std::u16string_view loweredName) const noexcept {
  const FlatIndex::Entry found =
      m_index.First(HashOf(loweredName), [&](auto entry) { return TextOf(entry) == loweredName; });
  return found == FlatIndex::kNone ? kNone : m_names[found].position;
}

std::u16string_view NameTable::TextOf(FlatIndex::Entry entry) const noexcept {
  return std::u16string_view(m_texts).substr(m_names[entry].begin, m_names[entry].length);
}

MachineIndex::MachineIndex(const Machine& machine, DeviceNumbers& numbers) : m_machine(machine) {
  IndexDevices(numbers);
  IndexNames();
}

void MachineIndex::IndexDevices(DeviceNumbers& numbers) {
  const std::vector<simulated::Device>& devices = m_machine.devices;
  m_links.resize(devices.size());
  for (Position i = 0; i < devices.size(); ++i) {
    const Text id = ToLower(devices[i].id);
    m_devices.Enter(id, i);
    const DevInst number = numbers.NumberOf(id);
    m_numbers.push_back(number);
    if (m_byNumber.size() <= number) m_byNumber.resize(number + std::size_t{1}, kNone);
    if (m_byNumber[number] == kNone) m_byNumber[number] = i;
    m_classGuids.push_back(GuidOf(devices[i].classGuid));

    ClassInfo& info = m_classes[m_classGuids.back()];
    if (devices[i].noClassImage) info.hasImage = false;
    if (devices[i].noClassDescription) info.hasDescription = false;
    if (info.name.empty() && devices[i].deviceClass) info.name = *devices[i].deviceClass;
  }
  // A parent that is not there counts as the root, as an absent one does.
  for (Position i = 0; i < devices.size(); ++i) {
    m_links[i].showsParent = !devices[i].noParent;
    const Position parent = Device(ToLower(devices[i].parent));
    if (parent != kNone) m_links[i].parent = parent;
  }
  // Backwards, so that each list of children comes out in the order of the file.
  for (auto i = static_cast<Position>(devices.size()); i-- > 0;) {
    const Position parent = m_links[i].parent;
    Position& first = parent == kRoot ? m_rootChild : m_links[parent].firstChild;
    m_links[i].nextSibling = std::exchange(first, i);
  }
}

void MachineIndex::IndexNames() {
  for (Position i = 0; i < m_machine.hostControllers.size(); ++i) {
    for (const Text& name : m_machine.hostControllers[i].names) {
      m_controllers.Enter(ToLower(name), i);
    }
  }
  const auto addAll = [](NameTable& names, const auto& records, auto name) {
    for (Position i = 0; i < records.size(); ++i) names.Enter(ToLower(records[i].*name), i);
  };
  addAll(m_hubs, m_machine.hubs, &simulated::Hub::name);
  addAll(m_interfaces, m_machine.interfaces, &simulated::Interface::path);
  addAll(m_storage, m_machine.storage, &simulated::Storage::path);
  addAll(m_volumes, m_machine.volumes, &simulated::Volume::name);
  for (Position i = 0; i < m_machine.volumes.size(); ++i) {
    const simulated::Volume& volume = m_machine.volumes[i];
    if (!volume.device.empty()) m_volumeDevices.Enter(ToLower(volume.device), i);
    for (const Text& path : volume.paths) m_volumePaths.Enter(ToLower(path), i);
  }
  m_drives.fill(kNone);
  for (auto i = static_cast<Position>(m_machine.drives.size()); i-- > 0;) {
    const char16_t letter = ToLower(m_machine.drives[i].letter);
    if (letter >= u'a' && letter <= u'z') m_drives[static_cast<std::size_t>(letter - u'a')] = i;
  }
}

MachineIndex::Position MachineIndex::DeviceByNumber(DevInst number) const {
  if (number == kRootDeviceNumber) return kRoot;
  return number < m_byNumber.size() ? m_byNumber[number] : kNone;
}

DevInst MachineIndex::NumberOf(Position device) const {
  return device == kRoot ? kRootDeviceNumber : m_numbers[device];
}

MachineIndex::Position MachineIndex::Parent(Position device) const {
  if (device == kRoot || !m_links[device].showsParent) return kNone;
  return m_links[device].parent;
}

MachineIndex::Position MachineIndex::FirstChild(Position device) const {
  return device == kRoot ? m_rootChild : m_links[device].firstChild;
}

MachineIndex::Position MachineIndex::NextSibling(Position device) const {
  return device == kRoot ? kNone : m_links[device].nextSibling;
}

MachineIndex::Position MachineIndex::Drive(char16_t letter) const {
  const char16_t lowered = ToLower(letter);
  if (lowered < u'a' || lowered > u'z') return kNone;
  return m_drives[static_cast<std::size_t>(lowered - u'a')];
}

const ClassInfo* MachineIndex::Class(const Guid& classGuid) const {
  const auto found = m_classes.find(classGuid);
  return found == m_classes.end() ? nullptr : &found->second;
}

std::shared_ptr<const SetContents> MachineIndex::Devices(const Guid* classGuid) const {
  std::shared_ptr<const SetContents>& set =
      classGuid == nullptr ? m_allDevices : m_deviceSets[*classGuid];
  if (set != nullptr) return set;
  auto contents = std::make_shared<SetContents>();
  for (Position i = 0; i < m_numbers.size(); ++i) {
    if (classGuid != nullptr && m_classGuids[i] != *classGuid) continue;
    contents->devices.push_back({m_numbers[i], m_classGuids[i]});
  }
  return set = std::move(contents);
}

std::shared_ptr<const SetContents> MachineIndex::Interfaces(const Guid* interfaceClass) const {
  std::shared_ptr<const SetContents>& set =
      interfaceClass == nullptr ? m_allInterfaces : m_interfaceSets[*interfaceClass];
  if (set != nullptr) return set;
  auto contents = std::make_shared<SetContents>();
  std::unordered_map<Position, std::uint32_t> elements;
  for (const simulated::Interface& entry : m_machine.interfaces) {
    if (interfaceClass != nullptr && entry.interfaceClass != *interfaceClass) continue;
    const Position device = Device(ToLower(entry.device));
    if (device == kNone) continue;
    const auto element =
        elements.try_emplace(device, static_cast<std::uint32_t>(contents->devices.size()));
    if (element.second) contents->devices.push_back({m_numbers[device], m_classGuids[device]});
    contents->byClass[entry.interfaceClass].push_back(
        static_cast<std::uint32_t>(contents->interfaces.size()));
    contents->interfaces.push_back({entry.interfaceClass, entry.path, element.first->second});
  }
  return set = std::move(contents);
}

}  // namespace platform::simulated
