// The PC of the storm: which devices it may have, what can happen to them, and what a client has
// to be told of it in the end.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <mutex>
#include <random>
#include <set>
#include <string>
#include <vector>

#include "bench/plugs.h"
#include "simulation/pc/simulated_pc.h"

namespace bench {

using Names = std::set<std::string>;  // serial numbers; empty for a device that could not be read

// What happened to the PC, seen from the builds: a build reads for a while, and a device that comes
// or goes meanwhile is there for one half of it and not for the other.
class Disturbances {
 public:
  void BuildBegins();
  // Everything that was touched while the build ran, and since the last one that found a change.
  void BuildEnds(bool changed, Names& during, Names& since);
  // Around a change to these devices.
  template <class Change>
  auto Touch(const Names& devices, Change change) {
    Note(devices);
    const auto result = change();
    Note(devices);
    return result;
  }

 private:
  void Note(const Names& devices);

  std::mutex m_mutex;
  bool m_building = false;
  Names m_during, m_since;
};

// Up to nine devices on a root hub of six ports and a hub of three. Any thread may change it: a
// device belongs to one thread as long as something happens to it.
class StormPc {
 public:
  StormPc();

  // Something happens to some device. `pause` runs between the two halves of a reset or a move.
  void ChangeSomething(std::mt19937& random, const std::function<void()>& pause);
  // Volumes go back where they were taken from; nothing else happens meanwhile.
  void PutVolumesBack();
  // A device that nothing else happens to.
  void PlugProbe();
  void UnplugProbe();
  // What has a port and a node of its own in the device manager, hubs left out.
  Names Present();
  std::size_t Hubs();

  platform::simulated::SimulatedPc pc;
  Disturbances disturbances;

 private:
  enum class Kind : std::uint8_t { Gadget, Stick, Reader, Hub };
  struct Device {
    Kind kind;
    char16_t letter;
    bool onHub = false;        // of the external hub
    std::uint32_t port = 0;    // 0: not plugged in
    bool volume = true;        // of a stick; of a reader, whether it has a card
    bool otherLetter = false;  // mounted elsewhere
    bool busy = false;
  };
  using Entry = std::map<std::string, Device>::value_type;

  bool Apply(const Names& touched, const KelvoUHW::Change& change);
  Names WithThoseBelow(const Entry& entry) const;
  bool IsFree(std::uint32_t port, bool onHub) const;
  std::uint32_t FreePort(std::mt19937& random, bool onHub) const;
  void Plug(Entry& entry, std::uint32_t port, bool onHub);
  void Unplug(Entry& entry);
  void SetVolume(Entry& entry, bool there);
  void ToggleLetter(Entry& entry);

  std::mutex m_mutex;
  std::map<std::string, Device> m_devices;
};

}  // namespace bench
