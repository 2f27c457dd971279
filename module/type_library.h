// The component's type library. On Windows the module carries it as a resource; on the simulated
// system it is told to the type libraries of the simulated process, for the path of the module. Not
// part of the component.
#pragma once

#include "platform/type_library.h"

namespace KelvoUHW {

// What registering ZKUsbMonitorLib 1.0 needs to know of it.
platform::TypeLibrary ModuleTypeLibrary();

}  // namespace KelvoUHW
