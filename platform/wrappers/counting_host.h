// Counts the calls that reach a host.
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <mutex>

#include "platform/wrappers/intercepting_host.h"

namespace platform::wrappers {

// Exact numbers, calls that fail included. Thread-safe.
class CountingHost final : public InterceptingHost {
 public:
  using InterceptingHost::InterceptingHost;

  std::uint64_t Count(Operation operation) const;
  // DeviceControl calls with that request code.
  std::uint64_t CountOfCode(std::uint32_t code) const;
  // All operations but WriteDebugText, which asks the system nothing.
  std::uint64_t Total() const;
  void Reset();

 private:
  Status BeforeCall(const HostCall& call) noexcept override;

  mutable std::mutex m_mutex;
  std::array<std::uint64_t, kOperations> m_counts{};
  std::map<std::uint32_t, std::uint64_t> m_codes;
};

}  // namespace platform::wrappers
