// PCs of any size, for measurements and stress: the same call gives the same PC every time.
#pragma once

#include <cstddef>

#include "simulation/machine/machine.h"
#include "simulation/machine/script.h"

namespace platform::simulated {

enum class GeneratedShape {
  Wide,  // ten controllers; external hubs only where a root hub of 255 ports is too small
  Deep,  // ten controllers; every device below a chain of five external hubs
};

// A PC with exactly `devices` plugged-in USB devices that are no hubs, in turn a mouse, a keyboard,
// a stick and a composite device of two functions. At least one port stays free. The first sticks
// have the drive letters from D to Z, the others a volume without one. Throws std::length_error
// when so many do not fit: 15,300 in a deep PC, 650,240 in a wide one.
Machine GenerateMachine(GeneratedShape shape, std::size_t devices);

// A step that plugs one more stick into a free port of a generated PC, one beside other devices
// where there is such a port. Its nodes are new to that PC; the first device of the plug is the one
// to unplug. Throws std::logic_error when no port is free.
Step PlugOneMoreStick(const Machine& machine);

}  // namespace platform::simulated
