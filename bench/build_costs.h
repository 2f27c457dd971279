// The exact costs of builds over one PC, and of what a program would do without the component.
#pragma once

#include "bench/prices.h"
#include "simulation/machine/machine.h"

namespace bench {

struct BuildCosts {
  std::size_t deviceNodes = 0;  // of the device manager
  std::size_t ports = 0;        // of all hubs
  Cost first;
  Cost unchanged;  // the third build of one builder: the second may still settle
};
BuildCosts CostsOfBuilds(const platform::simulated::Machine& machine);

// Calls about device-manager nodes, for each of them.
double CallsForEachNode(const Cost& cost, std::size_t deviceNodes) noexcept;

// A walk over all device-manager nodes with the id and one property of each, which tells neither
// ports nor volumes.
Cost CostOfDevNodeWalk(const platform::simulated::Machine& machine);
// One full query of all devices with all their properties, each asked for its size and then for its
// value, as the management layer of the system does for whoever queries it.
Cost CostOfFullQuery(const platform::simulated::Machine& machine);

// The bytes that a first build leaves on the heap for each record (nodes of the tree and device
// records); 0 where the C library does not tell.
double RetainedBytesForEachNode(const platform::simulated::Machine& machine);

}  // namespace bench
