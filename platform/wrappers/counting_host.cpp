#include "platform/wrappers/counting_host.h"

#include <numeric>

namespace platform::wrappers {

std::uint64_t CountingHost::Count(Operation operation) const {
  const std::lock_guard lock(m_mutex);
  return m_counts[static_cast<std::size_t>(operation)];
}

std::uint64_t CountingHost::CountOfCode(std::uint32_t code) const {
  const std::lock_guard lock(m_mutex);
  const auto found = m_codes.find(code);
  return found == m_codes.end() ? 0 : found->second;
}

std::uint64_t CountingHost::Total() const {
  const std::lock_guard lock(m_mutex);
  const std::uint64_t all = std::accumulate(m_counts.begin(), m_counts.end(), std::uint64_t{0});
  return all - m_counts[static_cast<std::size_t>(Operation::WriteDebugText)];
}

void CountingHost::Reset() {
  const std::lock_guard lock(m_mutex);
  m_counts.fill(0);
  m_codes.clear();
}

Status CountingHost::BeforeCall(const HostCall& call) noexcept {
  const std::lock_guard lock(m_mutex);
  ++m_counts[static_cast<std::size_t>(call.operation)];
  if (call.operation == Operation::DeviceControl) ++m_codes[call.code];
  return Status::Success();
}

}  // namespace platform::wrappers
