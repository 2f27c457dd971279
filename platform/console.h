// What a command-line program asks of the system about its output and its end.
//
// Every function may be called from every thread once PrepareConsole has returned.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

namespace platform {

// Once, before anything is printed. From then on bytes of standard output and standard error pass
// unchanged, as UTF-8, and a reader that closes its end of a pipe makes a write fail in place of
// ending the process. The console of Windows, which others use after this program, gets its code
// page back when main returns and at exit, abort, Ctrl-C and their like; not where the process is
// killed.
void PrepareConsole() noexcept;

// The width of the terminal that standard output goes to, in columns; 0 where it goes elsewhere.
std::size_t OutputColumns() noexcept;

// Whether standard output is a pipe that nobody reads any more. Known on Windows only after a write
// has failed, and there true for any pipe.
bool OutputIsClosedPipe() noexcept;

// From then on Ctrl-C, and what else asks the process to end, makes Interrupted true and ends
// waits, and does not end the process. Once in a process.
void CatchInterrupts() noexcept;
// As if Ctrl-C had been pressed, after CatchInterrupts.
void Interrupt() noexcept;
bool Interrupted() noexcept;
// Waits so many milliseconds, or for ever, until it is interrupted or, elsewhere than on Windows,
// until nobody reads standard output any more. Returns at once where that has happened.
void WaitForInterrupt(std::optional<std::uint32_t> milliseconds) noexcept;

}  // namespace platform
