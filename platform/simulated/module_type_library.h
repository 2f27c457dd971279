// The component's type library. On Windows the module carries it as a resource; here the simulated
// system knows what is in it.
#pragma once

#include "platform/simulated/type_libraries.h"

namespace platform::simulated {

// What registering ZKUsbMonitorLib 1.0 needs to know of it.
TypeLibrary ModuleTypeLibrary();

}  // namespace platform::simulated
