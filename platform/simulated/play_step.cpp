#include "platform/simulated/play_step.h"

#include <variant>

#include "platform/simulated/steps.h"

namespace platform::simulated {

Text PlayStep(SimulatedPc& pc, const Step& step,
              const std::function<void(const DeviceBroadcast&)>& send,
              const std::function<void()>& lead) {
  const Machine before = pc.Snapshot();
  Machine after = before;
  Text reason =
      std::visit([&](const auto& change) { return CarryOut(after, change); }, step.change);
  if (!reason.empty()) return reason;

  const auto tell = [&] {
    for (const DeviceBroadcast& broadcast : BroadcastsOf(before, after)) send(broadcast);
  };
  if (step.broadcast == BroadcastTime::Before) {
    tell();
    lead();
  }
  reason = pc.Apply(step);
  if (step.broadcast == BroadcastTime::After) tell();
  return reason;
}

Text PlayStep(SimulatedPc& pc, SimulatedDesktop& desktop, const Step& step) {
  return PlayStep(
      pc, step, [&](const DeviceBroadcast& broadcast) { desktop.Broadcast(broadcast); },
      [&] { desktop.RunFor(desktop.Mode() == ClockMode::Virtual ? 0 : kRealLeadMilliseconds); });
}

}  // namespace platform::simulated
