#include "simulation/pc/play_step.h"

#include <variant>

#include "simulation/machine/steps.h"

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

}  // namespace platform::simulated
