// The module's lock count: how many live objects and locks keep the module loaded.
#pragma once

#include <cstdint>

namespace KelvoUHW {

// Interlocked; both return the new count. Callable from every thread.
std::int32_t LockModule() noexcept;
std::int32_t UnlockModule() noexcept;
std::int32_t ModuleLockCount() noexcept;

}  // namespace KelvoUHW
