// What an operator new that a test program replaces takes its memory from.
//
// Callable from every thread; a failure is null.
#pragma once

#include <cstddef>
#include <cstdlib>

namespace heap {

#ifdef _WIN32
// The heap of Wine looks through all its free blocks at each call, which makes minutes of the
// seconds that large PCs take. Here blocks of one size share a list, and are never given back.
void* Take(std::size_t bytes) noexcept;
void Give(void* memory) noexcept;
#else
inline void* Take(std::size_t bytes) noexcept { return std::malloc(bytes == 0 ? 1 : bytes); }
inline void Give(void* memory) noexcept { std::free(memory); }
#endif

}  // namespace heap
