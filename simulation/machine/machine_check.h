// What must hold between the records of a machine: names that stand once, references that lead to
// something, parents that form no circle.
#pragma once

#include <string>

#include "simulation/machine/machine.h"

namespace platform::simulated {

// Checks `added` on top of `there`, which is taken to be sound and may be empty. Throws a
// MachineFileError that carries `file` and the place in `added`, with `prefix` before it.
void CheckMachine(const Machine& there, const Machine& added, const std::string& file,
                  const std::string& prefix);

}  // namespace platform::simulated
