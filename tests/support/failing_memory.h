// Makes the memory run out for the thread that asks for it. A program that links failing_memory.cpp
// has its global allocation replaced; the others of its tests notice nothing.
#pragma once

#include <cstdint>
#include <vector>

#include "platform/wrappers/intercepting_host.h"

namespace KelvoUHW {

// From construction to destruction the n-th allocation of this thread fails, counted from 1, and
// all behind it succeed. One at a time.
struct FailingAllocation {
  explicit FailingAllocation(std::uint64_t allocation) noexcept;
  ~FailingAllocation();
  bool Failed() const noexcept;  // whether it came to the failure
};

// From construction to destruction each allocation of this thread takes a millisecond: time for others to pass where
// nothing keeps them out.
struct SlowAllocations {
  SlowAllocations() noexcept;
  ~SlowAllocations();
};

void BeginRecordingAllocations();
std::vector<std::uint64_t> EndRecordingAllocations();

// What a call returns while its n-th allocation fails, and whether it came to that. With 0 none fails, and
// `failed` says nothing.
template <class Call>
auto WithoutAllocation(std::uint64_t allocation, bool& failed, Call call) {
  const FailingAllocation failing(allocation);
  const auto result = call();
  failed = failing.Failed();
  return result;
}

// The allocations of one call by this thread that differ in where they are asked for: of those with the same calls
// behind them the first and the last, counted from 1. What fails at one of them fails alike at those between.
template <class Call>
std::vector<std::uint64_t> DistinctAllocations(Call call) {
  BeginRecordingAllocations();
  call();
  return EndRecordingAllocations();
}

// Platform calls of the component get their memory from the system: what a simulated PC allocates
// does not count and does not fail.
struct WellFedHost final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  platform::Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override;
  void AfterCall(const platform::wrappers::HostCall& call, const platform::Status& status,
                 const std::intptr_t* opened) noexcept override;
};

}  // namespace KelvoUHW
