// Descriptions of well-known device classes.
#pragma once

#include <string_view>

#include "platform/guid.h"

namespace platform::simulated {

// What the system's class installers call the class, or empty for a class that is not well known.
std::u16string_view WellKnownClassDescription(const Guid& classGuid);

}  // namespace platform::simulated
