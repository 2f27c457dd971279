// The component's type library. On Windows the module carries it as a resource; on the simulated
// system it is told to SimulatedTypeLibraries, for the path of the module. Not part of the
// component.
#pragma once

#include "platform/simulated/type_libraries.h"

namespace KelvoUHW {

// What registering ZKUsbMonitorLib 1.0 needs to know of it.
platform::simulated::TypeLibrary ModuleTypeLibrary();

}  // namespace KelvoUHW
