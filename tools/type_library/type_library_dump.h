// The contents of a type library as text: what the program zkusb_typelib prints. Comparing two such
// texts shows whether the interfaces that client programs are compiled against have changed.
#pragma once

#include <string>

// The library in the file `path`, a type library or a module that contains one: a line for the
// library and for each type, function, value and interface in it, in UTF-8. Throws
// std::runtime_error when there is none or it cannot be read.
std::string DumpTypeLibrary(const std::u16string& path);
