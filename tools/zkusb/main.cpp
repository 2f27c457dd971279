#include <iostream>
#include <string>
#include <vector>

#include "tools/zkusb/run.h"

#ifdef _WIN32
#include "platform/windows/console.h"
#include "platform/windows/windows_host.h"

int main() {
  platform::windows::PassOutputThrough();
  platform::windows::WindowsHost thisPc;
  return zkusb::Run(platform::windows::Arguments(), std::cout, std::cerr, &thisPc);
}
#else
int main(int argc, char** argv) {
  return zkusb::Run(std::vector<std::string>(argv + 1, argv + argc), std::cout, std::cerr);
}
#endif
