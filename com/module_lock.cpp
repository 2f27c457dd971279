#include "com/module_lock.h"

#include <atomic>

namespace KelvoUHW {

namespace {
constinit std::atomic<std::int32_t> g_nLocks = 0;
}  // namespace

std::int32_t LockModule() noexcept { return ++g_nLocks; }
std::int32_t UnlockModule() noexcept { return --g_nLocks; }
std::int32_t ModuleLockCount() noexcept { return g_nLocks; }

}  // namespace KelvoUHW
