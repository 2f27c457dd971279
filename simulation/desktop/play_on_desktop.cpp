#include "simulation/desktop/play_on_desktop.h"

#include "simulation/pc/play_step.h"

namespace platform::simulated {

Text PlayStep(SimulatedPc& pc, SimulatedDesktop& desktop, const Step& step) {
  return PlayStep(
      pc, step, [&](const DeviceBroadcast& broadcast) { desktop.Broadcast(broadcast); },
      [&] { desktop.RunFor(desktop.Mode() == ClockMode::Virtual ? 0 : kRealLeadMilliseconds); });
}

}  // namespace platform::simulated
