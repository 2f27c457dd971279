#include "platform/simulated/play_step.h"

#include <variant>

#include "platform/simulated/broadcasts.h"
#include "platform/simulated/steps.h"

namespace platform::simulated {

namespace {
constexpr std::uint32_t kRealLead = 100;
}  // namespace

Text PlayStep(SimulatedPc& pc, SimulatedDesktop& desktop, const Step& step) {
  const Machine before = pc.Snapshot();
  Machine after = before;
  Text reason =
      std::visit([&](const auto& change) { return CarryOut(after, change); }, step.change);
  if (!reason.empty()) return reason;

  const auto tell = [&] {
    for (const DeviceBroadcast& broadcast : BroadcastsOf(before, after)) {
      desktop.Broadcast(broadcast);
    }
  };
  if (step.broadcast == BroadcastTime::Before) {
    tell();
    desktop.RunFor(desktop.Mode() == ClockMode::Virtual ? 0 : kRealLead);
  }
  reason = pc.Apply(step);
  if (step.broadcast == BroadcastTime::After) tell();
  return reason;
}

}  // namespace platform::simulated
