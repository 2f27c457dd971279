// The contents of a type library as text: what the program zkusb_typelib prints. Comparing two such
// texts shows whether the interfaces that client programs are compiled against have changed.
#pragma once

#include <string>

// The library of a file (its own or that of a module), a line for itself and for each type,
// function, value and interface in it, in UTF-8. Throws std::runtime_error where there is none or
// it does not answer.
std::string DumpTypeLibrary(const std::u16string& path);
