#include "bench/allocation_count.h"

#include <new>

#include "platform/heap.h"

namespace {

constinit thread_local std::uint64_t t_allocations = 0;
constinit thread_local bool t_paused = false;

}  // namespace

namespace bench {

std::uint64_t AllocationCount() noexcept { return t_allocations; }
void PauseAllocationCount() noexcept { t_paused = true; }
void ResumeAllocationCount() noexcept { t_paused = false; }

}  // namespace bench

// The other forms of operator new end up here, but for the over-aligned one, which nobody uses.
void* operator new(std::size_t size) {
  if (!t_paused) ++t_allocations;
  if (void* memory = heap::Take(size)) return memory;
  throw std::bad_alloc();
}
void operator delete(void* memory) noexcept { heap::Give(memory); }
void operator delete(void* memory, std::size_t) noexcept { heap::Give(memory); }
