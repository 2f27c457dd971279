#include "platform/windows/machine.h"

#include "platform/windows/windows_host.h"

namespace platform::windows {

namespace {
constinit WindowsHost g_host;
}  // namespace

Host& Machine() noexcept { return g_host; }

}  // namespace platform::windows
