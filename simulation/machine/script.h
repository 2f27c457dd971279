// What happens to a simulated PC over time.
#pragma once

#include <cstdint>
#include <utility>
#include <variant>
#include <vector>

#include "simulation/machine/machine.h"

namespace platform::simulated {

// A port of a hub that is there already takes a device (1 is the first port).
struct PortChange {
  Text hub;
  std::uint32_t index = 0;
  Port port;
};

// Everything a newcomer brings: its nodes, interfaces, hubs, storage, volumes and drive letters,
// and the ports it is plugged into.
struct Plug {
  Machine fragment;
  std::vector<PortChange> ports;
};

// A device goes, and everything below it in the device manager; with them what names them: their
// interfaces, the ports whose driver key is theirs (which become empty), hubs, storage paths and
// drive letters, and every volume whose device id holds `_??_`, a disk's id with # for \, and `#{`.
struct Unplug {
  Text device;
};

// A volume gets or loses a path name.
struct Mount {
  Text volume;
  Text path;
};
struct Dismount {
  Text volume;
  Text path;
};

// When the system tells of a step's change.
enum class BroadcastTime : std::uint8_t {
  After,
  Before,  // what the messages set off has run, as far as it goes without waiting, before the
           // change
  None,
};

// A step with nothing in it is a pause: the PC stays as it is.
struct Step {
  std::uint32_t atMilliseconds =
      0;      // since the script's start; never smaller than the step's before
  Text name;  // for people; may be empty
  std::variant<std::monostate, Plug, Unplug, Mount, Dismount> change;
  BroadcastTime broadcast = BroadcastTime::After;
};

using Script = std::vector<Step>;

}  // namespace platform::simulated
