#include <iostream>
#include <string>
#include <vector>

#include "tools/zkusb/run.h"

int main(int argc, char** argv) {
  return zkusb::Run(std::vector<std::string>(argv + 1, argv + argc), std::cout, std::cerr);
}
