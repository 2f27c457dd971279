// Counts what the calling thread takes from the heap: the program's operator new is a counting one.
#pragma once

#include <cstdint>

namespace bench {

// Calls of operator new by this thread so far, those under a pause left out.
std::uint64_t AllocationCount() noexcept;

// What the simulated PC takes for its own bookkeeping is not the component's.
void PauseAllocationCount() noexcept;
void ResumeAllocationCount() noexcept;

}  // namespace bench
