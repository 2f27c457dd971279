// What a module asks about the process it is loaded into.
#pragma once

#include "platform/com.h"

namespace platform {

#ifdef _WIN32
// Tells the platform layer which module the component is; when it is loaded.
void SetModuleInstance(HINSTANCE instance) noexcept;
#else
// Whether the process is ending, so that a library which is unloaded now leaves everything as it
// is. Callable from every thread.
bool ProcessEnds() noexcept;

namespace native {
// Called when a system is set, which a program does once it runs.
void WatchForProcessEnd() noexcept;
// The library that holds `address` stays mapped until the process ends, whoever closes it. Nothing
// happens for an address in the program itself, which stays anyway.
void KeepMapped(const void* address) noexcept;
}  // namespace native
#endif

}  // namespace platform
