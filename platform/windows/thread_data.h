// The thread-local variables of a module, its run-time's included; see thread_data.cpp. Linked into
// modules alone.
#pragma once

namespace platform::windows {

// Frees those of the calling thread, which ends.
void ForgetThread() noexcept;

// Frees those of every thread, and what the run-time keeps for exceptions: the last thing that a
// module does when it is unloaded. None of its other threads runs code of it any more.
void ForgetAllThreads() noexcept;

}  // namespace platform::windows
