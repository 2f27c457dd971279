#include "recorder/difference.h"

#include <algorithm>
#include <map>
#include <utility>

#include "platform/text.h"
#include "simulation/machine/machine_index.h"
#include "simulation/machine/machine_writer.h"
#include "simulation/machine/steps.h"

namespace recorder {
namespace {

using platform::ToLower;
using platform::simulated::CarryOut;
using platform::simulated::Device;
using platform::simulated::Drive;
using platform::simulated::Hub;
using platform::simulated::Machine;
using platform::simulated::NameSet;
using platform::simulated::Plug;
using platform::simulated::Port;
using platform::simulated::Step;
using platform::simulated::Text;
using platform::simulated::Volume;

const Text& KeyOf(const Device& device) { return device.id; }
const Text& KeyOf(const platform::simulated::Interface& entry) { return entry.path; }
const Text& KeyOf(const platform::simulated::HostController& controller) {
  return controller.names.front();
}
const Text& KeyOf(const Hub& hub) { return hub.name; }
const Text& KeyOf(const platform::simulated::Storage& storage) { return storage.path; }
const Text& KeyOf(const Volume& volume) { return volume.name; }
Text KeyOf(const Drive& drive) { return Text(1, drive.letter); }

template <class Record>
std::map<Text, const Record*> ByKey(const std::vector<Record>& records) {
  std::map<Text, const Record*> found;
  for (const Record& record : records) found.emplace(ToLower(KeyOf(record)), &record);
  return found;
}

// Those of `records` that `there` does not have.
template <class Record>
std::vector<Record> New(const std::vector<Record>& there, const std::vector<Record>& records) {
  const auto known = ByKey(there);
  std::vector<Record> added;
  std::copy_if(records.begin(), records.end(), std::back_inserter(added),
               [&](const Record& record) { return !known.contains(ToLower(KeyOf(record))); });
  return added;
}

bool HasPath(const Volume& volume, const Text& path) {
  return std::any_of(volume.paths.begin(), volume.paths.end(),
                     [&](const Text& known) { return platform::EqualIgnoringCase(known, path); });
}

// Where each driver key is plugged in.
std::map<Text, Text> Sockets(const Machine& machine) {
  std::map<Text, Text> sockets;
  for (const Hub& hub : machine.hubs) {
    for (std::size_t port = 0; port < hub.ports.size(); ++port) {
      const auto& key = hub.ports[port].driverKey;
      if (!key) continue;
      const Text number = platform::Decimal(static_cast<std::int32_t>(port));
      sockets.emplace(ToLower(*key), ToLower(hub.name) + u" " + number);
    }
  }
  return sockets;
}

bool IsFree(const Port& port) {
  return port.status == platform::NoDeviceConnected && !port.driverKey && !port.hubName;
}

// Independent of the order of records, and without what is for people.
Machine Sorted(Machine machine) {
  const auto sort = [](auto& records) {
    std::stable_sort(records.begin(), records.end(), [](const auto& a, const auto& b) {
      return ToLower(KeyOf(a)) < ToLower(KeyOf(b));
    });
  };
  machine.name.clear();
  machine.notes.clear();
  sort(machine.devices);
  sort(machine.interfaces);
  sort(machine.hostControllers);
  sort(machine.hubs);
  sort(machine.storage);
  sort(machine.volumes);
  sort(machine.drives);
  for (Volume& volume : machine.volumes) std::sort(volume.paths.begin(), volume.paths.end());
  return machine;
}

class Comparison {
 public:
  Comparison(const Machine& before, const Machine& after, std::uint32_t at)
      : m_after(after), m_at(at) {
    m_result.after = before;
  }

  Difference Run() {
    Unplug();
    Dismount();
    PlugIn();
    Mount();
    m_result.complete = platform::simulated::WriteMachine(Sorted(m_result.after)) ==
                        platform::simulated::WriteMachine(Sorted(m_after));
    return std::move(m_result);
  }

 private:
  template <class Change>
  void Do(Change change, Text name) {
    Machine next = m_result.after;
    if (!CarryOut(next, change).empty()) return;
    m_result.after = std::move(next);
    m_result.steps.push_back({m_at, std::move(name), std::move(change)});
  }

  NameSet Gone() const {
    const auto present = ByKey(m_after.devices);
    const auto before = Sockets(m_result.after);
    const auto now = Sockets(m_after);
    const auto socketOf = [](const auto& sockets, const Device& device) {
      const auto found = device.driver ? sockets.find(ToLower(*device.driver)) : sockets.end();
      return found == sockets.end() ? Text() : found->second;
    };
    NameSet gone;
    for (const Device& device : m_result.after.devices) {
      const auto stays = present.find(ToLower(device.id));
      const Text socket = socketOf(before, device);
      if (stays == present.end() ||
          !platform::EqualIgnoringCase(stays->second->parent, device.parent) ||
          (!socket.empty() && socketOf(now, device) != socket)) {
        gone.Add(device.id);
      }
    }
    return gone;
  }

  // The topmost first; what stands for another device in its id goes with that one.
  void Unplug() {
    const NameSet gone = Gone();
    const std::vector<Device> devices = m_result.after.devices;
    for (const bool standsForAnother : {false, true}) {
      for (const Device& device : devices) {
        if (!gone.Has(device.id) || gone.Has(device.parent)) continue;
        if ((device.id.find(u"_??_") != Text::npos) != standsForAnother) continue;
        Do(platform::simulated::Unplug{device.id}, NameOf(device) + u" goes");
      }
    }
  }

  void Dismount() {
    const auto now = ByKey(m_after.volumes);
    const std::vector<Volume> volumes = m_result.after.volumes;
    for (const Volume& volume : volumes) {
      const auto stays = now.find(ToLower(volume.name));
      if (stays == now.end()) continue;
      for (const Text& path : volume.paths) {
        if (HasPath(*stays->second, path)) continue;
        Do(platform::simulated::Dismount{volume.name, path}, path + u" is dismounted");
      }
    }
  }

  void PlugIn() {
    const Machine& there = m_result.after;
    Plug plug;
    Machine& fragment = plug.fragment;
    fragment.devices = New(there.devices, m_after.devices);
    fragment.interfaces = New(there.interfaces, m_after.interfaces);
    fragment.hostControllers = New(there.hostControllers, m_after.hostControllers);
    fragment.hubs = New(there.hubs, m_after.hubs);
    fragment.storage = New(there.storage, m_after.storage);
    fragment.volumes = New(there.volumes, m_after.volumes);
    fragment.drives = New(there.drives, m_after.drives);
    std::erase_if(fragment.drives, [this](const Drive& drive) { return ComesByMount(drive); });
    const auto hubs = ByKey(m_after.hubs);
    for (const Hub& hub : there.hubs) {
      const auto stays = hubs.find(ToLower(hub.name));
      if (stays == hubs.end()) continue;
      const std::vector<Port>& ports = stays->second->ports;
      for (std::size_t i = 0; i < std::min(ports.size(), hub.ports.size()); ++i) {
        if (!IsFree(hub.ports[i]) || IsFree(ports[i])) continue;
        plug.ports.push_back({hub.name, static_cast<std::uint32_t>(i + 1), ports[i]});
      }
    }
    const bool anything = !fragment.devices.empty() || !fragment.interfaces.empty() ||
                          !fragment.hostControllers.empty() || !fragment.hubs.empty() ||
                          !fragment.storage.empty() || !fragment.volumes.empty() ||
                          !fragment.drives.empty() || !plug.ports.empty();
    Text name = fragment.devices.empty() ? Text() : NameOf(fragment.devices.front()) + u" comes";
    if (anything) Do(std::move(plug), std::move(name));
  }

  // A letter of the volume's own, which a mount brings.
  bool ComesByMount(const Drive& drive) const {
    const Text root = Text(1, drive.letter) + u":\\";
    const auto before = ByKey(m_result.after.volumes);
    return std::any_of(m_after.volumes.begin(), m_after.volumes.end(), [&](const Volume& volume) {
      return before.contains(ToLower(volume.name)) && HasPath(volume, root) &&
             platform::EqualIgnoringCase(volume.device, drive.device) &&
             volume.driveType == drive.type;
    });
  }

  void Mount() {
    const auto now = ByKey(m_after.volumes);
    const std::vector<Volume> volumes = m_result.after.volumes;
    for (const Volume& volume : volumes) {
      const auto stays = now.find(ToLower(volume.name));
      if (stays == now.end()) continue;
      for (const Text& path : stays->second->paths) {
        if (!HasPath(volume, path)) {
          Do(platform::simulated::Mount{volume.name, path}, path + u" is mounted");
        }
      }
    }
  }

  static Text NameOf(const Device& device) {
    return device.friendlyName.value_or(device.description.value_or(device.id));
  }

  const Machine& m_after;
  const std::uint32_t m_at;
  Difference m_result;
};

}  // namespace

Difference StepsBetween(const Machine& before, const Machine& after, std::uint32_t atMilliseconds) {
  return Comparison(before, after, atMilliseconds).Run();
}

}  // namespace recorder
