#include "platform/simulated/broadcasts.h"

#include <algorithm>
#include <cstring>
#include <iterator>
#include <map>
#include <unordered_map>
#include <unordered_set>
#include <utility>

#include "platform/simulated/machine_index.h"
#include "platform/simulated/steps.h"
#include "platform/text.h"

namespace platform::simulated {
namespace {

// Number of parents above each device, by lowered id. Ends in a circle of parents, too.
class Depths {
 public:
  explicit Depths(const Machine& machine) {
    for (const Device& device : machine.devices) m_parents[ToLower(device.id)] = device.parent;
  }
  std::size_t Of(const Text& id) const {
    std::size_t depth = 0;
    for (auto node = m_parents.find(ToLower(id));
         node != m_parents.end() && depth < m_parents.size();
         node = m_parents.find(ToLower(node->second))) {
      ++depth;
    }
    return depth;
  }

 private:
  std::unordered_map<Text, Text> m_parents;
};

// The interfaces of `machine` that `other` lacks, those of parents before those of children.
std::vector<const Interface*> InterfacesOnlyIn(const Machine& machine, const Machine& other) {
  NameSet there;
  for (const Interface& entry : other.interfaces) there.Add(entry.path);
  std::vector<std::pair<std::size_t, const Interface*>> found;
  const Depths depths(machine);
  for (const Interface& entry : machine.interfaces) {
    if (!there.Has(entry.path)) found.emplace_back(depths.Of(entry.device), &entry);
  }
  std::stable_sort(found.begin(), found.end(),
                   [](const auto& a, const auto& b) { return a.first < b.first; });
  std::vector<const Interface*> interfaces;
  std::transform(found.begin(), found.end(), std::back_inserter(interfaces),
                 [](const auto& entry) { return entry.second; });
  return interfaces;
}

// The volume behind each drive letter, by name in lower case.
std::map<char16_t, Text> VolumesByLetter(const Machine& machine) {
  std::map<char16_t, Text> volumes;
  for (const Volume& volume : machine.volumes) {
    for (const Text& path : volume.paths) {
      if (IsDriveRoot(path)) volumes.emplace(ToUpper(path[0]), ToLower(volume.name));
    }
  }
  return volumes;
}

bool HasDrive(const Machine& machine, char16_t letter) {
  return std::any_of(machine.drives.begin(), machine.drives.end(),
                     [&](const Drive& drive) { return ToUpper(drive.letter) == letter; });
}

std::unordered_set<Text> DeviceIds(const Machine& machine) {
  std::unordered_set<Text> ids;
  for (const Device& device : machine.devices) ids.insert(ToLower(device.id));
  return ids;
}

template <class Record>
DeviceBroadcast BroadcastWith(std::uint32_t event, const Record& record, std::size_t bytes) {
  DeviceBroadcast broadcast{event, std::vector<std::byte>(bytes)};
  std::memcpy(broadcast.record.data(), &record, std::min(bytes, sizeof record));
  return broadcast;
}

}  // namespace

DeviceBroadcast InterfaceBroadcast(std::uint32_t event, const Guid& interfaceClass,
                                   const Text& path) {
  const std::size_t nameBytes = (path.size() + 1) * sizeof(char16_t);
  DEV_BROADCAST_DEVICEINTERFACE_W record;
  const std::size_t bytes = std::max(sizeof record, kInterfaceBroadcastNameOffset + nameBytes);
  record.dbcc_size = static_cast<std::uint32_t>(bytes);
  record.dbcc_classguid = interfaceClass;
  DeviceBroadcast broadcast = BroadcastWith(event, record, bytes);
  std::memcpy(broadcast.record.data() + kInterfaceBroadcastNameOffset, path.c_str(), nameBytes);
  return broadcast;
}

DeviceBroadcast VolumeBroadcast(std::uint32_t event, char16_t letter, std::uint16_t flags) {
  DEV_BROADCAST_VOLUME record;
  record.dbcv_size = sizeof record;
  record.dbcv_unitmask = 1u << (ToUpper(letter) - u'A');
  record.dbcv_flags = flags;
  return BroadcastWith(event, record, sizeof record);
}

std::vector<DeviceBroadcast> BroadcastsOf(const Machine& before, const Machine& after) {
  std::vector<DeviceBroadcast> broadcasts;
  const auto lettersBefore = VolumesByLetter(before);
  const auto lettersAfter = VolumesByLetter(after);
  const auto tellLetters = [&](std::uint32_t event, const auto& these, const auto& others) {
    for (const auto& [letter, volume] : these) {
      const auto other = others.find(letter);
      if (other != others.end() && other->second == volume) continue;
      const bool driveStays = HasDrive(before, letter) && HasDrive(after, letter);
      broadcasts.push_back(VolumeBroadcast(event, letter, driveStays ? kDBTF_MEDIA : 0));
    }
  };

  tellLetters(kDBT_DEVICEREMOVECOMPLETE, lettersBefore, lettersAfter);
  auto gone = InterfacesOnlyIn(before, after);
  std::reverse(gone.begin(), gone.end());
  for (const Interface* entry : gone) {
    broadcasts.push_back(
        InterfaceBroadcast(kDBT_DEVICEREMOVECOMPLETE, entry->interfaceClass, entry->path));
  }
  for (const Interface* entry : InterfacesOnlyIn(after, before)) {
    broadcasts.push_back(
        InterfaceBroadcast(kDBT_DEVICEARRIVAL, entry->interfaceClass, entry->path));
  }
  tellLetters(kDBT_DEVICEARRIVAL, lettersAfter, lettersBefore);
  if (DeviceIds(before) != DeviceIds(after)) broadcasts.push_back({kDBT_DEVNODES_CHANGED, {}});
  return broadcasts;
}

}  // namespace platform::simulated
