#include "bench/start_state.h"

#include <cstddef>
#include <vector>

#ifdef __GLIBC__
#include <malloc.h>
#endif

#include <benchmark/benchmark.h>

namespace bench {

void KeepFreedMemory() noexcept {
#ifdef __GLIBC__
  constexpr int kNever = 1 << 30;
  mallopt(M_TRIM_THRESHOLD, kNever);
  mallopt(M_MMAP_THRESHOLD, kNever);
  mallopt(M_MXFAST, 0);
#endif
}

void StartCold() {
  // More than the second level of any processor's caches and of its page tables; the last level,
  // where it is larger, keeps what it has for PCs of every size.
  constexpr std::size_t kBytes = std::size_t{64} << 20;
  constexpr std::size_t kLine = 64;
  static std::vector<unsigned char> other(kBytes);
  for (std::size_t at = 0; at < kBytes; at += kLine) ++other[at];
  benchmark::ClobberMemory();
}

}  // namespace bench
