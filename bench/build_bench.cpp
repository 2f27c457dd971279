// Whole builds over generated PCs: the first, one without a change, one with one device more.
#include "bench/workload_bench.h"

namespace {

[[maybe_unused]] const bool buildRegistered = [] {
  for (const bench::Work work :
       {bench::Work::First, bench::Work::Unchanged, bench::Work::OneMore}) {
    bench::RegisterWork(work);
  }
  return true;
}();

}  // namespace
