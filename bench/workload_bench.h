// Runs a workload as a benchmark.
#pragma once

#include <benchmark/benchmark.h>

#include "bench/workload.h"

namespace bench {

// Registers the work for PCs of 10 to 10,000 devices in both shapes. Reported are the mean time and
// best_ms, the best of the iterations; the exact numbers of platform calls by kind and of
// allocations, from a run of their own; floor_ms, the time of the same platform calls with nothing
// done between them; and x_floor, the work's best time divided by that.
void RegisterWork(Work work);

}  // namespace bench
