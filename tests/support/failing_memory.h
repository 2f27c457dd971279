// Makes the memory run out for the thread that asks for it. A program that links failing_memory.cpp
// has its global allocation replaced; the others of its tests notice nothing.
#pragma once

#include <cstdint>

#include "platform/wrappers/intercepting_host.h"

namespace testing_support {

// From construction to destruction the n-th allocation of this thread fails, counted from 1, and
// all behind it succeed. One at a time.
class FailingAllocation {
 public:
  explicit FailingAllocation(std::uint64_t allocation) noexcept;
  ~FailingAllocation();
  FailingAllocation(const FailingAllocation&) = delete;
  FailingAllocation& operator=(const FailingAllocation&) = delete;

  // Whether it came to the failure.
  bool Failed() const noexcept;
};

// Platform calls of the component get their memory from the system: what a simulated PC allocates
// does not count and does not fail.
class WellFedHost final : public platform::wrappers::InterceptingHost {
 public:
  using InterceptingHost::InterceptingHost;

 private:
  platform::Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override;
  void AfterCall(const platform::wrappers::HostCall& call, const platform::Status& status,
                 const std::intptr_t* opened) noexcept override;
};

}  // namespace testing_support
