#include "platform/process_end.h"

#include <dlfcn.h>

#include <atomic>
#include <cstdlib>

namespace platform {

namespace {

constinit std::atomic<bool> g_processEnds = false;

}  // namespace

bool ProcessEnds() noexcept { return g_processEnds; }

namespace native {
// Handlers of exit run before any library is finalised, provided that they were registered after
// the program began, and not when a library is unloaded alone.
void WatchForProcessEnd() noexcept {
  static const int s_registered = std::atexit([] { g_processEnds = true; });
  static_cast<void>(s_registered);
}

void KeepMapped(const void* address) noexcept {
  Dl_info library{};
  if (dladdr(address, &library) == 0) return;
  // Opened once more, it is marked, and its count may go down again.
  if (void* handle = dlopen(library.dli_fname, RTLD_NOW | RTLD_NOLOAD | RTLD_NODELETE)) {
    dlclose(handle);
  }
}
}  // namespace native

}  // namespace platform
