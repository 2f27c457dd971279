#include <iostream>
#include <string>
#include <vector>

#include "tools/zkusb/run.h"

#ifdef _WIN32
#include "platform/windows/console.h"

int main() {
  platform::windows::PassOutputThrough();
  return zkusb::Run(platform::windows::Arguments(), std::cout, std::cerr);
}
#else
int main(int argc, char** argv) {
  return zkusb::Run(std::vector<std::string>(argv + 1, argv + argc), std::cout, std::cerr);
}
#endif
