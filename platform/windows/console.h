// What a command-line program needs from the system at its start.
#pragma once

#include <string>
#include <vector>

namespace platform::windows {

// The arguments without the program's name, in UTF-8. What main is given is in the language of the
// system, and has lost what that one does not know. Throws std::bad_alloc.
std::vector<std::string> Arguments();

// From now on standard output takes UTF-8, byte for byte: no line end is changed. The console,
// which others use after this program, gets its code page back when main returns and at exit,
// abort, Ctrl-C and their like; not where the process is killed.
void PassOutputThrough() noexcept;

}  // namespace platform::windows
