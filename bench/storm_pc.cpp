#include "bench/storm_pc.h"

#include <algorithm>
#include <iterator>
#include <stdexcept>
#include <utility>

namespace bench {

using KelvoUHW::DiskId;
using KelvoUHW::Text;
using KelvoUHW::UsbId;
using KelvoUHW::VolumeId;

namespace {

constexpr std::uint32_t kRootPorts = 5;  // the sixth is the probe's
constexpr std::uint32_t kHubPorts = 3;
constexpr char kHub[] = "HUB";
constexpr char kProbe[] = "PROBE";

Text Serial(const std::string& name) { return platform::FromUtf8(name); }

}  // namespace

void Disturbances::BuildBegins() {
  const std::lock_guard lock(m_mutex);
  m_building = true;
}

void Disturbances::BuildEnds(bool changed, Names& during, Names& since) {
  const std::lock_guard lock(m_mutex);
  m_building = false;
  during = std::exchange(m_during, {});
  since = m_since;
  // What was touched during this build belongs to the next one as well.
  if (changed) m_since = during;
}

void Disturbances::Note(const Names& devices) {
  const std::lock_guard lock(m_mutex);
  m_since.insert(devices.begin(), devices.end());
  if (m_building) m_during.insert(devices.begin(), devices.end());
}

StormPc::StormPc() : pc(KelvoUHW::BarePc()) {
  m_devices = {{"S1", {Kind::Stick, u'E'}},  {"S2", {Kind::Stick, u'F'}},
               {"S3", {Kind::Stick, u'G'}},  {"S4", {Kind::Stick, u'H'}},
               {"M1", {Kind::Gadget, u' '}}, {"M2", {Kind::Gadget, u' '}},
               {"CR", {Kind::Reader, u'K'}}, {kHub, {Kind::Hub, u' '}}};
}

bool StormPc::Apply(const Names& touched, const KelvoUHW::Change& change) {
  return disturbances.Touch(touched, [&] { return pc.Apply({0, u"", change}).empty(); });
}

Names StormPc::WithThoseBelow(const Entry& entry) const {
  Names names{entry.first};
  if (entry.second.kind != Kind::Hub) return names;
  for (const auto& [name, device] : m_devices) {
    if (device.onHub && device.port != 0) names.insert(name);
  }
  return names;
}

bool StormPc::IsFree(std::uint32_t port, bool onHub) const {
  return std::ranges::none_of(m_devices, [&](const Entry& entry) {
    return entry.second.port == port && entry.second.onHub == onHub;
  });
}

// 0 when there is none.
std::uint32_t StormPc::FreePort(std::mt19937& random, bool onHub) const {
  const std::uint32_t ports = onHub ? kHubPorts : kRootPorts;
  const auto first = static_cast<std::uint32_t>(random() % ports);
  for (std::uint32_t i = 0; i < ports; ++i) {
    const std::uint32_t port = 1 + (first + i) % ports;
    if (IsFree(port, onHub)) return port;
  }
  return 0;
}

void StormPc::Plug(Entry& entry, std::uint32_t port, bool onHub) {
  auto& [name, device] = entry;
  const Text serial = Serial(name), hub = onHub ? UsbId(Serial(kHub)) : Text(KelvoUHW::kRootHubId);
  KelvoUHW::Plug plug;
  switch (device.kind) {
    case Kind::Gadget:
      plug = KelvoUHW::Gadget(serial, port, hub);
      break;
    case Kind::Stick:
      plug = KelvoUHW::Stick(serial, port, device.letter, hub);
      break;
    case Kind::Reader:
      plug = KelvoUHW::CardReader(serial, port);
      break;
    case Kind::Hub:
      plug = KelvoUHW::ExternalHub(serial, port);
      break;
  }
  if (!Apply({name}, plug)) throw std::runtime_error("a device cannot be plugged in: " + name);
  device.port = port;
  device.onHub = onHub;
  device.volume = device.kind == Kind::Stick;
  device.otherLetter = false;
}

void StormPc::Unplug(Entry& entry) {
  const Names gone = WithThoseBelow(entry);
  if (!Apply(gone, KelvoUHW::Unplug{UsbId(Serial(entry.first))})) {
    throw std::runtime_error("a device cannot be unplugged: " + entry.first);
  }
  for (const std::string& name : gone) m_devices.at(name).port = 0;
}

void StormPc::SetVolume(Entry& entry, bool there) {
  auto& [name, device] = entry;
  if (device.volume == there) return;
  const Text disk = DiskId(Serial(name));
  const bool done = there ? Apply({name}, KelvoUHW::Volume(disk, device.letter))
                          : Apply({name}, KelvoUHW::Unplug{VolumeId(disk)});
  if (!done) throw std::runtime_error("a volume cannot come or go: " + name);
  device.volume = there;
  device.otherLetter = false;
}

void StormPc::ToggleLetter(Entry& entry) {
  auto& [name, device] = entry;
  if (!device.volume) return;
  const Text drive(1, device.letter), volume = u"\\\\?\\Volume{of " + drive + u":}\\";
  const Text other = u"C:\\Folder " + drive + u"\\";
  const bool done = device.otherLetter ? Apply({name}, platform::simulated::Dismount{volume, other})
                                       : Apply({name}, platform::simulated::Mount{volume, other});
  if (!done) throw std::runtime_error("a volume cannot be mounted: " + name);
  device.otherLetter = !device.otherLetter;
}

void StormPc::ChangeSomething(std::mt19937& random, const std::function<void()>& pause) {
  std::unique_lock lock(m_mutex);
  Entry& entry = *std::next(m_devices.begin(), static_cast<int>(random() % m_devices.size()));
  Device& device = entry.second;
  Device& hub = m_devices.at(kHub);
  if (device.busy) return;
  if (device.port == 0) {
    const bool onHub = (device.kind == Kind::Gadget || device.kind == Kind::Stick) &&
                       hub.port != 0 && random() % 2 == 0;
    if (const std::uint32_t port = FreePort(random, onHub)) Plug(entry, port, onHub);
    return;
  }
  // A hub that came back would come without its devices.
  const auto what = device.kind == Kind::Hub ? 0 : random() % 8;
  if (what < 3) {
    Unplug(entry);
  } else if (what < 5) {
    // A reset brings it back where it was, a move to another port.
    const std::uint32_t port = device.port;
    const bool onHub = device.onHub, moves = what == 4;
    device.busy = true;
    Unplug(entry);
    // Nobody else gets its port.
    device.port = port;
    lock.unlock();
    pause();
    lock.lock();
    device.port = 0;
    device.busy = false;
    // Its hub may be gone by now, or be there anew with others on it.
    if (onHub && hub.port == 0) return;
    const std::uint32_t place = moves || !IsFree(port, onHub) ? FreePort(random, onHub) : port;
    if (place != 0) Plug(entry, place, onHub);
  } else if (device.kind == Kind::Gadget) {
    Unplug(entry);
  } else if (what < 7) {
    SetVolume(entry, !device.volume);
  } else {
    ToggleLetter(entry);
  }
}

void StormPc::PutVolumesBack() {
  const std::lock_guard lock(m_mutex);
  for (Entry& entry : m_devices) {
    if (entry.second.kind == Kind::Stick && entry.second.port != 0) SetVolume(entry, true);
  }
}

void StormPc::PlugProbe() {
  if (!Apply({kProbe}, KelvoUHW::Gadget(Serial(kProbe), kRootPorts + 1))) {
    throw std::runtime_error("the probe cannot be plugged in");
  }
}

void StormPc::UnplugProbe() { Apply({kProbe}, KelvoUHW::Unplug{UsbId(Serial(kProbe))}); }

Names StormPc::Present() {
  const std::lock_guard lock(m_mutex);
  Names names;
  for (const auto& [name, device] : m_devices) {
    if (device.port != 0 && device.kind != Kind::Hub) names.insert(name);
  }
  return names;
}

std::size_t StormPc::Hubs() {
  const std::lock_guard lock(m_mutex);
  return m_devices.at(kHub).port != 0 ? 1 : 0;
}

}  // namespace bench
