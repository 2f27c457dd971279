// What tests and benchmarks order and count of the system's COM functions and locks. Elsewhere than
// on Windows it is part of the platform layer; on Windows it stands between a program that links it
// and the system's DLLs.
#pragma once

#include <cstddef>
#include <cstdint>

#include "platform/com.h"

namespace platform::controls {

// Texts alive now, and those ever allocated, by SysAllocString, SysAllocStringLen and VariantCopy.
struct BstrCounts {
  std::int64_t alive = 0;
  std::int64_t allocated = 0;
};
BstrCounts CountBstrs() noexcept;

// From construction to destruction the n-th text this thread allocates, counted from 1, fails, and
// all behind it succeed. One at a time.
class FailingBstr {
 public:
  explicit FailingBstr(std::uint64_t allocation) noexcept;
  ~FailingBstr();
  FailingBstr(const FailingBstr&) = delete;
  FailingBstr& operator=(const FailingBstr&) = delete;
  bool Failed() const noexcept;  // whether it came to the failure
};

// The result of this thread's next CoInitializeEx in place of what it would be.
void FailNextCoInitialize(HRESULT result) noexcept;
// How often the calling thread has entered an apartment that it has not left.
std::uint32_t ApartmentDepth() noexcept;

// The code of this thread's n-th CriticalSection::Initialize from now on (1: the next; 0: of none);
// the others succeed. It has to be one that HRESULT_FROM_WIN32 makes.
void FailCriticalSection(std::uint64_t call, HRESULT result) noexcept;

}  // namespace platform::controls
