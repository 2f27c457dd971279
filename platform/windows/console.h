// What a command-line program on Windows needs beyond platform/console.h.
#pragma once

#include <string>
#include <vector>

namespace platform::windows {

// The arguments without the program's name, in UTF-8. What main is given is in the language of the
// system, and has lost what that one does not know. Throws std::bad_alloc.
std::vector<std::string> Arguments();

}  // namespace platform::windows
