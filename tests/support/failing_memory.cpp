#include "tests/support/failing_memory.h"

#include <new>

#include "platform/heap.h"

// Allocations until the one that fails; 0: none fails.
static thread_local std::uint64_t t_countdown = 0;
static thread_local bool t_paused = false;

void* operator new(std::size_t bytes) {
  if (t_countdown != 0 && !t_paused && --t_countdown == 0) throw std::bad_alloc();
  if (void* memory = heap::Take(bytes)) return memory;
  throw std::bad_alloc();
}
void* operator new(std::size_t bytes, const std::nothrow_t&) noexcept {
  try {
    return operator new(bytes);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}
void operator delete(void* memory) noexcept { heap::Give(memory); }
void operator delete(void* memory, std::size_t) noexcept { heap::Give(memory); }

namespace KelvoUHW {

FailingAllocation::FailingAllocation(std::uint64_t allocation) noexcept { t_countdown = allocation; }
FailingAllocation::~FailingAllocation() { t_countdown = 0; }
bool FailingAllocation::Failed() const noexcept { return t_countdown == 0; }

platform::Status WellFedHost::BeforeCall(const platform::wrappers::HostCall&) noexcept {
  t_paused = true;
  return {};
}
void WellFedHost::AfterCall(const platform::wrappers::HostCall&, const platform::Status&,
                            const std::intptr_t*) noexcept {
  t_paused = false;
}

}  // namespace KelvoUHW
