// A step of a script on a PC, with the messages that the system sends about it.
#pragma once

#include <cstdint>
#include <functional>

#include "simulation/machine/script.h"
#include "simulation/pc/broadcasts.h"
#include "simulation/pc/simulated_pc.h"

namespace platform::simulated {

// What messages that come before the change set off gets so long on the real clock.
inline constexpr std::uint32_t kRealLeadMilliseconds = 100;

// Changes the PC and calls `send` for each message about it, in the order that the step asks for;
// `lead` lets what messages before the change set off come first. A step that the PC refuses
// changes and sends nothing, and the result is the reason; otherwise it is empty. One call at a
// time; waiting for the step's moment is the caller's business.
Text PlayStep(SimulatedPc& pc, const Step& step,
              const std::function<void(const DeviceBroadcast&)>& send,
              const std::function<void()>& lead);

}  // namespace platform::simulated
