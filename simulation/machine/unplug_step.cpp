#include "simulation/machine/steps.h"

#include <algorithm>
#include <optional>
#include <unordered_set>
#include <utility>
#include <vector>

#include "platform/text.h"
#include "simulation/machine/machine_index.h"

namespace platform::simulated {
namespace {

constexpr MachineIndex::Position kNobody = MachineIndex::kNone;

// Whether the id carries that of a removed disk, `_??_` before and `#{` behind it, # for each \.
bool CarriesRemoved(const Text& loweredId, const std::unordered_set<Text>& removedMarks) {
  constexpr std::u16string_view kBefore = u"_??_";
  constexpr std::u16string_view kBehind = u"#{";
  std::size_t start = loweredId.find(kBefore);
  if (start == Text::npos) return false;
  start += kBefore.size();
  for (std::size_t end = loweredId.find(kBehind, start); end != Text::npos;
       end = loweredId.find(kBehind, end + 1)) {
    if (removedMarks.contains(loweredId.substr(start, end - start))) return true;
  }
  return false;
}

// Collects what goes with a device: its subtree, and the nodes elsewhere that carry a removed id,
// with theirs.
class Removal {
 public:
  explicit Removal(const Machine& machine) : m_machine(machine), m_index(machine, m_numbers) {}

  void Take(MachineIndex::Position device) {
    TakeSubtree(device);
    for (bool again = true; again;) {
      again = false;
      for (MachineIndex::Position i = 0; i < m_machine.devices.size(); ++i) {
        const Text id = ToLower(m_machine.devices[i].id);
        if (m_ids.contains(id) || !CarriesRemoved(id, m_marks)) continue;
        TakeSubtree(i);
        again = true;
      }
    }
  }

  bool HasDevice(const Text& id) const { return m_ids.contains(ToLower(id)); }
  bool HasDriver(const std::optional<Text>& key) const { return key && m_drivers.Has(*key); }
  bool Carries(const Text& id) const { return CarriesRemoved(ToLower(id), m_marks); }

  // A hub's name is its device's id with # for \, and an interface class behind it.
  bool HasHub(const Text& name) const {
    const std::size_t end = name.rfind(u"#{");
    return m_marks.contains(Mark(ToLower(name.substr(0, end))));
  }

 private:
  // An id as another id carries it: made from an interface path, where every separator is a #.
  static Text Mark(Text id) { return Replaced(Replaced(std::move(id), u'\\', u'#'), u'/', u'#'); }

  void TakeSubtree(MachineIndex::Position top) {
    std::vector<MachineIndex::Position> pending{top};
    while (!pending.empty()) {
      const MachineIndex::Position device = pending.back();
      pending.pop_back();
      const Text id = ToLower(m_machine.devices[device].id);
      if (!m_ids.insert(id).second) continue;
      m_marks.insert(Mark(id));
      if (m_machine.devices[device].driver) m_drivers.Add(*m_machine.devices[device].driver);
      for (MachineIndex::Position child = m_index.FirstChild(device); child != kNobody;
           child = m_index.NextSibling(child)) {
        pending.push_back(child);
      }
    }
  }

  const Machine& m_machine;
  DeviceNumbers m_numbers;
  MachineIndex m_index;
  std::unordered_set<Text> m_ids;
  std::unordered_set<Text> m_marks;  // the ids as other ids carry them
  NameSet m_drivers;
};

void EmptyPorts(Machine& machine, const Removal& removal) {
  for (Hub& hub : machine.hubs) {
    for (Port& port : hub.ports) {
      const bool hubGone = port.hubName && removal.HasHub(*port.hubName);
      if (removal.HasDriver(port.driverKey) || hubGone) port = Port{};
    }
  }
}

// Volumes go with their devices; what was mounted in their folders loses those paths, and their own
// folders elsewhere are plain folders again.
void RemoveVolumes(Machine& machine, const Removal& removal) {
  const auto goes = [&](const Volume& volume) {
    return removal.HasDevice(volume.device) || removal.Carries(volume.device);
  };
  NameSet names;
  std::vector<Text> paths;
  for (const Volume& volume : machine.volumes) {
    if (!goes(volume)) continue;
    names.Add(volume.name);
    for (const Text& path : volume.paths) paths.push_back(ToLower(path));
  }
  std::erase_if(machine.volumes, goes);
  for (Volume& volume : machine.volumes) {
    std::erase_if(volume.folderMounts,
                  [&](const FolderMount& mount) { return names.Has(mount.volume); });
    std::erase_if(volume.paths, [&](const Text& path) {
      const Text lowered = ToLower(path);
      return std::any_of(paths.begin(), paths.end(),
                         [&](const Text& above) { return lowered.starts_with(above); });
    });
  }
}

}  // namespace

Text CarryOut(Machine& machine, const Unplug& unplug) {
  if (IsRootDevice(unplug.device)) return u"the root device stays";
  Removal removal(machine);
  {
    const auto device = std::find_if(
        machine.devices.begin(), machine.devices.end(),
        [&](const Device& candidate) { return EqualIgnoringCase(candidate.id, unplug.device); });
    if (device == machine.devices.end()) return u"device " + unplug.device + u" is missing";
    removal.Take(static_cast<MachineIndex::Position>(device - machine.devices.begin()));
  }
  // Nothing below may ask the removal for positions: it knows the machine as it was.
  NameSet storage;
  for (const Interface& entry : machine.interfaces) {
    if (removal.HasDevice(entry.device)) storage.Add(entry.path);
  }
  for (const Drive& drive : machine.drives) {
    if (removal.HasDevice(drive.device)) storage.Add(u"\\\\.\\" + Text(1, drive.letter) + u":");
  }
  EmptyPorts(machine, removal);
  RemoveVolumes(machine, removal);
  std::erase_if(machine.storage, [&](const Storage& entry) { return storage.Has(entry.path); });
  std::erase_if(machine.drives,
                [&](const Drive& drive) { return removal.HasDevice(drive.device); });
  std::erase_if(machine.hubs, [&](const Hub& hub) { return removal.HasHub(hub.name); });
  std::erase_if(machine.hostControllers, [&](const HostController& controller) {
    return removal.HasDriver(controller.driverKey);
  });
  std::erase_if(machine.interfaces,
                [&](const Interface& entry) { return removal.HasDevice(entry.device); });
  std::erase_if(machine.devices,
                [&](const Device& device) { return removal.HasDevice(device.id); });
  return {};
}

}  // namespace platform::simulated
