// zkusb, the command-line client: the whole program except its main function. Each command is a
// file NAME_command.cpp here. It creates the component's classes through COM and reads the tree
// through their interfaces (node_reader.h), as any client would.
#pragma once

#include <ostream>
#include <string>
#include <vector>

namespace zkusb {

enum ExitCode : int {
  kDone = 0,          // did what was asked
  kNothingFound = 1,  // `err` names what was not found
  kRefused = 2,  // wrong usage, a bad file, output that cannot be written; the reason is on `err`
};

// Carries out one command line, given without the program's name, as main does. Once in a process:
// the component, which is loaded for it, stays. Never throws.
int Run(const std::vector<std::string>& args, std::ostream& out, std::ostream& err);

}  // namespace zkusb
