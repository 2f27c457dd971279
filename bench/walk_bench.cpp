// The USB walk alone, over generated PCs.
#include "bench/workload_bench.h"

namespace {

[[maybe_unused]] const bool registered = [] {
  bench::RegisterWork(bench::Work::Walk);
  return true;
}();

}  // namespace
