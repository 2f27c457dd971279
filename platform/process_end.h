// What a module asks about the process it is loaded into.
#pragma once

#include "platform/com.h"

namespace platform {

#ifdef _WIN32
// Tells the platform layer which module the component is; when it is loaded.
void SetModuleInstance(HINSTANCE instance) noexcept;

// The thread-local variables of a module, its run-time's included (windows/thread_data.cpp, which
// modules alone link). Frees those of the calling thread, which ends.
void ForgetThread() noexcept;
// Frees those of every thread, and what the run-time keeps for exceptions: the last thing that a
// module does when it is unloaded. None of its other threads runs code of it any more.
void ForgetAllThreads() noexcept;
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
