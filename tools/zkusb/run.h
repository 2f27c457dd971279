// The whole program but for its main function.
#pragma once

#include <ostream>
#include <string>
#include <vector>

#include "platform/host.h"

namespace zkusb {

enum ExitCode : int {
  kDone = 0,          // did what was asked
  kNothingFound = 1,  // what was not found is said on `err`
  kRefused = 2,  // wrong usage, a bad file, output that cannot be written; the reason is on `err`
};

// Carries out one command line, given without the program's name, as main does. `thisPc` is what is
// looked at when no machine file is named; null: a machine that is built in. Never throws.
int Run(const std::vector<std::string>& args, std::ostream& out, std::ostream& err,
        platform::Host* thisPc = nullptr);

}  // namespace zkusb
