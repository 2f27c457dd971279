// Runs a workload as a benchmark.
#pragma once

#include <benchmark/benchmark.h>

#include "bench/workload.h"

namespace bench {

// Registers the work for PCs of 10 to 10,000 devices in both shapes. Reported are the mean time and
// median_ms, the median of the iterations; the exact numbers of platform calls by kind and of
// allocations, from a run of their own; floor_ms, the time of the same platform calls with nothing
// done between them; x_floor, the one median divided by the other; and own_us, what the component
// itself takes for each device.
//
// "growth/..." shows how time grows from 1,000 to 10,000 devices: both sizes take turns in one run,
// and x_time is the median of the large PC divided by that of the small one.
//
// Measured is the work alone, on a warm heap and with cold caches (see start_state.h). What
// prepares it is left out: plugging the stick, the builds before, and the end of the previous
// walk's tree. A build that replaces a tree, or drops the one it walked, does that itself, so it is
// in.
void RegisterWork(Work work);

}  // namespace bench
