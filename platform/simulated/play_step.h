// A step of a script on a PC and in the process that watches it.
#pragma once

#include "platform/simulated/script.h"
#include "platform/simulated/simulated_desktop.h"
#include "platform/simulated/simulated_pc.h"

namespace platform::simulated {

// Changes the PC and sends the messages about it to the process, in the order that the step asks
// for; returns when they have been answered. A step that the PC refuses changes and sends nothing,
// and the result is the reason; otherwise it is empty. One call at a time; waiting for the step's
// moment is the caller's business. "Before" needs virtual time: on the real clock what the messages
// set off gets a hundred milliseconds.
Text PlayStep(SimulatedPc& pc, SimulatedDesktop& desktop, const Step& step);

}  // namespace platform::simulated
