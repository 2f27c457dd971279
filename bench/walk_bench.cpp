// The USB walk alone, over generated PCs.
#include "bench/workload_bench.h"

namespace {

[[maybe_unused]] const bool walkRegistered = [] {
  bench::RegisterWork(bench::Work::Walk);
  return true;
}();

}  // namespace
