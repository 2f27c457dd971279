// What a type library says, as text.
#pragma once

#include <string>

// The library of a file, a line for itself and for each type, function, value and interface in it. Throws
// std::runtime_error where the library does not answer.
std::string DumpTypeLibrary(const std::u16string& path);
