// Fails chosen calls to a host.
#pragma once

#include <cstdint>
#include <limits>
#include <mutex>
#include <optional>

#include "platform/wrappers/intercepting_host.h"

namespace platform::wrappers {

struct FailurePlan {
  static constexpr std::uint64_t kNever = std::numeric_limits<std::uint64_t>::max();

  std::uint64_t call = kNever;  // the first call to fail, counted from 1
  bool onwards = false;         // that call and all after it; else that one alone
  std::uint32_t error = 31;     // ERROR_GEN_FAILURE
  std::uint32_t configurationManagerError = 0x13;  // CR_FAILURE
  // Only calls of this operation, or requests of this code, are counted and fail; none: all.
  std::optional<Operation> operation = std::nullopt;
  std::optional<std::uint32_t> code = std::nullopt;
};

// Releasing operations and debug texts never fail and are not counted. Thread-safe.
class FailingHost final : public InterceptingHost {
 public:
  explicit FailingHost(Host& base, const FailurePlan& plan = {}) noexcept
      : InterceptingHost(base), m_plan(plan) {}

  // Starts counting anew under that plan.
  void SetPlan(const FailurePlan& plan);
  // The calls counted, and those that failed, since the plan was set.
  std::uint64_t Calls() const;
  std::uint64_t Failures() const;

 private:
  Status BeforeCall(const HostCall& call) noexcept override;

  mutable std::mutex m_mutex;
  FailurePlan m_plan;
  std::uint64_t m_calls = 0;
  std::uint64_t m_failures = 0;
};

}  // namespace platform::wrappers
