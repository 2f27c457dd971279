// zkusb_typelib FILE: the type library that a module carries, as text. Exits with 0 when it was
// printed, 1 where there is none that can be read, 2 on wrong usage; the reason on standard error.
#include <iostream>
#include <stdexcept>

#include "platform/com.h"
#include "platform/console.h"
#include "platform/text.h"
#include "platform/windows/console.h"
#include "tools/type_library/type_library_dump.h"

int main() {
  platform::PrepareConsole();
  const std::vector<std::string> arguments = platform::windows::Arguments();
  if (arguments.size() != 1 || arguments[0].starts_with("-")) {
    std::cerr << "usage: zkusb_typelib FILE\n";
    return 2;
  }
  try {
    std::cout << DumpTypeLibrary(platform::FromUtf8(arguments[0])) << std::flush;
    if (std::cout) return 0;
    std::cerr << "zkusb_typelib: the output cannot be written\n";
  } catch (const std::exception& error) {
    std::cerr << "zkusb_typelib: " << arguments[0]
              << ": no type library can be read: " << error.what() << "\n";
  }
  return 1;
}
