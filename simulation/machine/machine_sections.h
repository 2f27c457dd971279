// The sections of a machine file, from JSON to records. What one object says by itself is checked
// here; what spans objects (a parent that must be there, a path that stands once) by
// machine_check.h.
#pragma once

#include "simulation/machine/json_reader.h"
#include "simulation/machine/machine.h"

namespace platform::simulated {

// Reads every section that the object has; the object may have further members.
void ReadSections(JsonObject& object, Machine& machine);

// Reads the members of a port out of an object that may have further ones.
void ReadPort(JsonObject& object, Port& port);

}  // namespace platform::simulated
