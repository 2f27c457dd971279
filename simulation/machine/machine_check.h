// What must hold between the records of a machine: names that stand once, references that lead to
// something, parents that form no circle.
#pragma once

#include <string>

#include "simulation/machine/json_reader.h"
#include "simulation/machine/machine.h"

namespace platform::simulated {

// Checks `added` on top of `there`, which is taken to be sound and may be empty. What does
// not hold goes to `file`, with the place in `added` and `prefix` before it. A record without a
// name is one that could not be read, and is not asked for it.
void CheckMachine(const Machine& there, const Machine& added, const FileReport& file,
                  const std::string& prefix);

}  // namespace platform::simulated
