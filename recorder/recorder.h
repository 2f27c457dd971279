// Records a PC as the data of a machine file: makes the platform calls that the component makes and
// keeps the answers. Removing what identifies a person, and turning later changes into steps of a
// script, are separate files of this room.
#pragma once

#include "platform/host.h"
#include "simulation/machine/machine.h"

namespace recorder {

// The PC behind `host` as a machine: a component that looks at the machine gives the tree, lists
// and dumps that it gives on the PC. Nothing is taken from such a tree: each answer comes from the
// call that gives it there. Blocks on drivers, as a build does, and opens devices as a build does.
//
// What a machine cannot say is left out, and `notes` names it. A call that fails leaves out what it
// would have told. A PC that changes meanwhile may give a machine that mixes both states.
//
// Callable from every thread; throws std::bad_alloc only.
platform::simulated::Machine RecordMachine(platform::Host& host);

}  // namespace recorder
