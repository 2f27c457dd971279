// What happened to a PC between two looks at it, as steps of a script.
#pragma once

#include <cstdint>

#include "simulation/machine/machine.h"
#include "simulation/machine/script.h"

namespace recorder {

struct Difference {
  platform::simulated::Script steps;   // all at the same moment; empty: nothing that a step can say
  platform::simulated::Machine after;  // what the steps make of the first machine
  // Whether that is the second machine. A script cannot say that a device stays and says something
  // else of itself, or that an interface, a hub or a volume goes without its device.
  bool complete = true;
};

// Both are sound, as a machine file is. First what goes, a device before what Windows hangs
// elsewhere for it, then what loses its path; then, in one plug, what comes; then what gets a path.
// A device that is on another port or below another parent has gone and come.
Difference StepsBetween(const platform::simulated::Machine& before,
                        const platform::simulated::Machine& after, std::uint32_t atMilliseconds);

}  // namespace recorder
