#include <iostream>
#include <string>
#include <vector>

#include "platform/console.h"
#include "tools/zkusb/run.h"

#ifdef _WIN32
#include "platform/windows/console.h"

int main() {
  platform::PrepareConsole();
  return zkusb::Run(platform::windows::Arguments(), std::cout, std::cerr);
}
#else
int main(int argc, char** argv) {
  platform::PrepareConsole();
  return zkusb::Run(std::vector<std::string>(argv + 1, argv + argc), std::cout, std::cerr);
}
#endif
