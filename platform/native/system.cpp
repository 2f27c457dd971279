#include "platform/system.h"

#include <mutex>

#include "platform/process_end.h"

namespace platform {

namespace {
constinit std::mutex g_mutex;
constinit System g_system;
}  // namespace

System CurrentSystem() noexcept {
  const std::lock_guard lock(g_mutex);
  return g_system;
}

void SetCurrentSystem(const System& system) noexcept {
  native::WatchForProcessEnd();
  const std::lock_guard lock(g_mutex);
  g_system = system;
}

}  // namespace platform
