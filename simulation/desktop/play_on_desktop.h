// A step of a script on a PC and in the process that watches it.
#pragma once

#include "simulation/desktop/simulated_desktop.h"
#include "simulation/machine/script.h"
#include "simulation/pc/simulated_pc.h"

namespace platform::simulated {

// Plays the step as play_step.h says, with its messages sent to a simulated process: it returns
// when they have been answered. Empty, or the reason why the PC refuses the step.
Text PlayStep(SimulatedPc& pc, SimulatedDesktop& desktop, const Step& step);

}  // namespace platform::simulated
