// A step of a script on a PC and in the process that watches it.
#pragma once

#include <cstdint>
#include <functional>

#include "platform/simulated/broadcasts.h"
#include "platform/simulated/script.h"
#include "platform/simulated/simulated_desktop.h"
#include "platform/simulated/simulated_pc.h"

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

// The same, with messages sent to a simulated process: it returns when they have been answered.
Text PlayStep(SimulatedPc& pc, SimulatedDesktop& desktop, const Step& step);

}  // namespace platform::simulated
