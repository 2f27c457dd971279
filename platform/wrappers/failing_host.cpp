#include "platform/wrappers/failing_host.h"

namespace platform::wrappers {

void FailingHost::SetPlan(const FailurePlan& plan) {
  const std::lock_guard lock(m_mutex);
  m_plan = plan;
  m_calls = 0;
  m_failures = 0;
}

std::uint64_t FailingHost::Calls() const {
  const std::lock_guard lock(m_mutex);
  return m_calls;
}

std::uint64_t FailingHost::Failures() const {
  const std::lock_guard lock(m_mutex);
  return m_failures;
}

Status FailingHost::BeforeCall(const HostCall& call) noexcept {
  if (IsReleasing(call.operation) || call.operation == Operation::WriteDebugText) {
    return Status::Success();
  }
  const std::lock_guard lock(m_mutex);
  if (m_plan.operation && *m_plan.operation != call.operation) return Status::Success();
  if (m_plan.code && (call.operation != Operation::DeviceControl || *m_plan.code != call.code)) {
    return Status::Success();
  }
  ++m_calls;
  if (m_plan.onwards ? m_calls < m_plan.call : m_calls != m_plan.call) return Status::Success();
  ++m_failures;
  return Status::Failure(IsConfigurationManager(call.operation) ? m_plan.configurationManagerError
                                                                : m_plan.error);
}

}  // namespace platform::wrappers
