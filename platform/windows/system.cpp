#include "platform/system.h"

#include <mutex>

#include "platform/process_lock.h"
#include "platform/windows/machine.h"
#include "platform/windows/windows_desktop.h"
#include "platform/windows/windows_module.h"

namespace platform {

namespace {

constinit windows::WindowsThreads g_threads;
constinit windows::WindowsDesktop g_desktop;
constinit windows::WindowsRegistry g_registry;
constinit windows::WindowsTypeLibraries g_typeLibraries;
constinit windows::WindowsModuleEnvironment g_environment;

constinit ProcessLock g_lock;
constinit System g_set;
constinit bool g_isSet = false;

}  // namespace

System CurrentSystem() noexcept {
  {
    const std::lock_guard lock(g_lock);
    if (g_isSet) return g_set;
  }
  return {&windows::Machine(), &g_threads,       &g_desktop,
          &g_registry,         &g_typeLibraries, &g_environment};
}

void SetCurrentSystem(const System& system) noexcept {
  const std::lock_guard lock(g_lock);
  g_set = system;
  g_isSet = system.host || system.threads || system.desktop || system.registry ||
            system.typeLibraries || system.environment;
}

}  // namespace platform
