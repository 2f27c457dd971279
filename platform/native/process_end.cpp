#include "platform/process_end.h"

#include <atomic>
#include <cstdlib>

namespace platform {

namespace {

constinit std::atomic<bool> g_processEnds = false;

// Handlers of exit run before any library is finalised, and not when one is unloaded alone.
[[maybe_unused]] const int g_registered = std::atexit([] { g_processEnds = true; });

}  // namespace

bool ProcessEnds() noexcept { return g_processEnds; }

}  // namespace platform
