// What a machine may say and hardly means.
#pragma once

#include <string>
#include <vector>

#include "simulation/machine/machine.h"

namespace platform::simulated {

// "PLACE: reason" in UTF-8, section by section: references that lead nowhere, driver keys that no
// device has, devices that are in one place, hubs that nobody names, controllers that show no
// ports, drives without volume and the like. None of a PC as Windows shows it.
std::vector<std::string> Suspicions(const Machine& machine);

}  // namespace platform::simulated
