// The PC that a program or module on Windows looks at. Each links one of two definitions: the PC
// it runs on (machine.cpp, what the platform library holds), or one that is simulated.
#pragma once

#include "platform/host.h"

namespace platform::windows {

// Lives until the process ends. Callable from every thread.
Host& Machine() noexcept;

}  // namespace platform::windows
