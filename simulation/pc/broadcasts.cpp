#include "simulation/pc/broadcasts.h"

#include <algorithm>
#include <cstring>
#include <map>
#include <unordered_map>
#include <unordered_set>
#include <utility>

#include "platform/text.h"
#include "simulation/machine/machine_index.h"
#include "simulation/machine/steps.h"

namespace platform::simulated {
namespace {

// The order in which the devices of a machine start: that of the file, but each behind its parents.
class StartOrder {
 public:
  explicit StartOrder(const Machine& machine) {
    std::unordered_map<Text, const Device*> devices;
    for (const Device& device : machine.devices) devices.emplace(ToLower(device.id), &device);
    for (const Device& device : machine.devices) {
      std::vector<Text> chain;
      // Ends in a circle of parents, too.
      for (auto node = devices.find(ToLower(device.id));
           node != devices.end() && !m_ranks.contains(node->first) &&
           chain.size() <= devices.size();
           node = devices.find(ToLower(node->second->parent))) {
        chain.push_back(node->first);
      }
      for (auto id = chain.rbegin(); id != chain.rend(); ++id) m_ranks.emplace(*id, m_ranks.size());
    }
  }
  std::size_t Of(const Text& id) const {
    const auto rank = m_ranks.find(ToLower(id));
    return rank == m_ranks.end() ? m_ranks.size() : rank->second;
  }

 private:
  std::unordered_map<Text, std::size_t> m_ranks;
};

// The interfaces of `machine` that `other` lacks, in the order in which their devices start.
std::vector<const Interface*> InterfacesOnlyIn(const Machine& machine, const Machine& other) {
  NameSet there;
  for (const Interface& entry : other.interfaces) there.Add(entry.path);
  const StartOrder order(machine);
  std::multimap<std::size_t, const Interface*> found;
  for (const Interface& entry : machine.interfaces) {
    if (!there.Has(entry.path)) found.emplace(order.Of(entry.device), &entry);
  }
  std::vector<const Interface*> interfaces;
  for (const auto& [rank, entry] : found) interfaces.push_back(entry);
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
