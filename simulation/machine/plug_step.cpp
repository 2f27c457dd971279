#include "simulation/machine/steps.h"

#include <algorithm>
#include <optional>
#include <unordered_map>
#include <vector>

#include "platform/text.h"

namespace platform::simulated {
namespace {

// The first of `added` whose name is taken, by one of `there` or by another of `added`. `namesOf`
// calls its second argument with each name of a record.
template <class Record, class NamesOf>
std::optional<Text> FindTaken(const std::vector<Record>& there, const std::vector<Record>& added,
                              NamesOf namesOf) {
  NameSet names;
  std::optional<Text> taken;
  for (const Record& record : there) {
    namesOf(record, [&](const Text& name) { names.Add(name); });
  }
  for (const Record& record : added) {
    namesOf(record, [&](const Text& name) {
      if (!names.Add(name) && !taken) taken = name;
    });
  }
  return taken;
}

// What would stand twice.
Text CheckTaken(const Machine& machine, const Machine& fragment) {
  Text reason;
  const auto check = [&](const char16_t* what, auto records, auto namesOf) {
    const auto taken = FindTaken(machine.*records, fragment.*records, namesOf);
    if (taken && reason.empty()) reason = what + (u" " + *taken) + u" is there already";
  };
  check(u"device", &Machine::devices, [](const Device& r, auto each) { each(r.id); });
  check(u"interface", &Machine::interfaces, [](const Interface& r, auto each) { each(r.path); });
  check(u"host controller", &Machine::hostControllers, [](const HostController& r, auto each) {
    for (const Text& name : r.names) each(name);
  });
  check(u"hub", &Machine::hubs, [](const Hub& r, auto each) { each(r.name); });
  check(u"storage", &Machine::storage, [](const Storage& r, auto each) { each(r.path); });
  check(u"volume", &Machine::volumes, [](const Volume& r, auto each) { each(r.name); });
  check(u"path", &Machine::volumes, [](const Volume& r, auto each) {
    for (const Text& path : r.paths) each(path);
  });
  check(u"drive", &Machine::drives, [](const Drive& r, auto each) { each(Text(1, r.letter)); });
  return reason;
}

// What the newcomers name and is not there.
Text CheckMissing(const Machine& machine, const Machine& fragment) {
  NameSet devices;
  for (const Device& device : machine.devices) devices.Add(device.id);
  for (const Device& device : fragment.devices) devices.Add(device.id);
  for (const Device& device : fragment.devices) {
    if (IsRootDevice(device.id)) return u"device " + device.id + u" is there already";
    if (!IsRootDevice(device.parent) && !devices.Has(device.parent)) {
      return u"parent " + device.parent + u" is missing";
    }
  }
  const auto missing = [&](const Text& id) { return !id.empty() && !devices.Has(id); };
  for (const Interface& entry : fragment.interfaces) {
    if (entry.device.empty() || missing(entry.device)) {
      return u"device " + entry.device + u" of interface " + entry.path + u" is missing";
    }
  }
  for (const Volume& volume : fragment.volumes) {
    if (missing(volume.device)) {
      return u"device " + volume.device + u" of volume " + volume.name + u" is missing";
    }
  }
  for (const Drive& drive : fragment.drives) {
    if (missing(drive.device)) {
      return u"device " + drive.device + u" of drive " + Text(1, drive.letter) + u": is missing";
    }
  }
  return {};
}

// Newcomers whose parents never lead out of themselves.
Text CheckCircles(const Machine& fragment) {
  std::unordered_map<Text, const Device*> newcomers;
  for (const Device& device : fragment.devices) newcomers.emplace(ToLower(device.id), &device);
  NameSet leadOut;
  for (const Device& device : fragment.devices) {
    NameSet onTheWay;
    std::vector<const Device*> way;
    const Device* node = &device;
    while (node != nullptr && !leadOut.Has(node->id)) {
      if (!onTheWay.Add(node->id)) return u"the parents of " + node->id + u" form a circle";
      way.push_back(node);
      const auto parent = newcomers.find(ToLower(node->parent));
      node = parent == newcomers.end() ? nullptr : parent->second;
    }
    for (const Device* passed : way) leadOut.Add(passed->id);
  }
  return {};
}

template <class Record>
void Append(std::vector<Record>& records, const std::vector<Record>& added) {
  records.insert(records.end(), added.begin(), added.end());
}

bool IsFree(const Port& port) {
  return port.status == NoDeviceConnected && !port.driverKey && !port.hubName;
}

Text SetPort(std::vector<Hub>& hubs, const PortChange& change) {
  const auto hub = std::find_if(hubs.begin(), hubs.end(), [&](const Hub& candidate) {
    return EqualIgnoringCase(candidate.name, change.hub);
  });
  if (hub == hubs.end()) return u"hub " + change.hub + u" is missing";
  const Text place =
      u"port " + Decimal(static_cast<std::int32_t>(change.index)) + u" of hub " + change.hub;
  if (change.index == 0 || change.index > hub->ports.size()) return place + u" is missing";
  Port& port = hub->ports[change.index - 1];
  if (!IsFree(port)) return place + u" is taken";
  port = change.port;
  return {};
}

}  // namespace

Text CarryOut(Machine& machine, const Plug& plug) {
  const Machine& fragment = plug.fragment;
  for (const Text& reason :
       {CheckTaken(machine, fragment), CheckMissing(machine, fragment), CheckCircles(fragment)}) {
    if (!reason.empty()) return reason;
  }
  Append(machine.devices, fragment.devices);
  Append(machine.interfaces, fragment.interfaces);
  Append(machine.hostControllers, fragment.hostControllers);
  Append(machine.hubs, fragment.hubs);
  Append(machine.storage, fragment.storage);
  Append(machine.volumes, fragment.volumes);
  Append(machine.drives, fragment.drives);
  for (const PortChange& change : plug.ports) {
    if (Text reason = SetPort(machine.hubs, change); !reason.empty()) return reason;
  }
  return {};
}

}  // namespace platform::simulated
