// What a simulated PC consists of; only its own sources include this.
#pragma once

#include <mutex>
#include <vector>

#include "simulation/machine/machine.h"
#include "simulation/machine/machine_index.h"
#include "simulation/pc/handle_table.h"
#include "simulation/pc/property_table.h"
#include "simulation/pc/simulated_pc.h"

namespace platform::simulated {

// One state of the machine with its index and tables, which refer to it: none moves or changes.
struct IndexedMachine {
  IndexedMachine(Machine state, DeviceNumbers& numbers)
      : machine(std::move(state)), index(machine, numbers), properties(machine.devices) {}
  IndexedMachine(const IndexedMachine&) = delete;
  IndexedMachine& operator=(const IndexedMachine&) = delete;

  const Machine machine;
  const MachineIndex index;
  const PropertyTable properties;
};

struct SimulatedPc::State {
  explicit State(Machine machine)
      : now(std::make_unique<const IndexedMachine>(std::move(machine), numbers)) {}

  std::mutex mutex;  // guards everything below
  DeviceNumbers numbers;
  std::unique_ptr<const IndexedMachine> now;
  HandleTable handles;
  Text debugText;
};

}  // namespace platform::simulated
