// A host that tells what the component costs: the platform calls it makes, and its allocations.
#pragma once

#include <array>
#include <cstdint>

#include "bench/allocation_count.h"
#include "platform/wrappers/counting_host.h"

namespace bench {

enum class CallKind : std::uint8_t { Open, Request, DeviceSet, DeviceManager, Volume, Close };
inline constexpr std::size_t kCallKinds = 6;
inline constexpr std::array<const char*, kCallKinds> kCallKindNames{
    "opens", "requests", "sets", "manager", "volumes", "closes"};

inline CallKind KindOf(platform::wrappers::Operation operation) noexcept {
  using platform::wrappers::Operation;
  switch (operation) {
    case Operation::OpenDevice:
      return CallKind::Open;
    case Operation::DeviceControl:
      return CallKind::Request;
    case Operation::CloseDevice:
      return CallKind::Close;
    default:
      break;
  }
  if (operation < Operation::LocateRootDevNode) return CallKind::DeviceSet;
  return operation < Operation::FirstVolume ? CallKind::DeviceManager : CallKind::Volume;
}

// What one piece of work cost.
struct Cost {
  std::array<std::uint64_t, platform::wrappers::kOperations> calls{};  // by operation
  std::uint64_t allocations = 0;

  std::uint64_t CallsOf(CallKind kind) const noexcept {
    std::uint64_t sum = 0;
    for (std::size_t i = 0; i < calls.size(); ++i) {
      if (KindOf(static_cast<platform::wrappers::Operation>(i)) == kind) sum += calls[i];
    }
    return sum;
  }
};

// What a host allocates to answer does not count.
class UncountedHost final : public platform::wrappers::InterceptingHost {
 public:
  using InterceptingHost::InterceptingHost;

 private:
  platform::Status BeforeCall(const platform::wrappers::HostCall&) noexcept override {
    PauseAllocationCount();
    return platform::Status::Success();
  }
  void AfterCall(const platform::wrappers::HostCall&, const platform::Status&,
                 const std::intptr_t*) noexcept override {
    ResumeAllocationCount();
  }
};

// A host around the PC, and what was asked of it.
class MeteredHost {
 public:
  explicit MeteredHost(platform::Host& pc) noexcept : m_counting(pc), m_host(m_counting) {}

  platform::Host& Host() noexcept { return m_host; }

  template <class Work>
  Cost Measure(Work work) {
    m_counting.Reset();
    const std::uint64_t before = AllocationCount();
    work();
    Cost cost;
    cost.allocations = AllocationCount() - before;
    for (std::size_t i = 0; i < cost.calls.size(); ++i) {
      cost.calls[i] = m_counting.Count(static_cast<platform::wrappers::Operation>(i));
    }
    return cost;
  }

 private:
  platform::wrappers::CountingHost m_counting;
  UncountedHost m_host;
};

}  // namespace bench
