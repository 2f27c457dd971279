// Machine files and scripts: JSON in UTF-8, see docs/machine-file.md.
#pragma once

#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "simulation/machine/machine.h"
#include "simulation/machine/script.h"

namespace platform::simulated {

// "FILE: PLACE: reason", in UTF-8: the first thing wrong in a file.
class MachineFileError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Reads a machine. `file` is the name that error messages carry. Throws MachineFileError.
Machine ParseMachine(std::string_view json, const std::string& file);
// Reads a script over that machine; steps are checked one after the other against what the steps
// before them leave. Throws MachineFileError.
Script ParseScript(std::string_view json, const std::string& file, const Machine& machine);

// The same, but everything that is wrong goes to `faults`, as "FILE: PLACE: reason" in the order in
// which it is met, and the result is what is left. A text that is no JSON has one fault, and a
// thousandth fault is the last. Of a step that is wrong nothing is carried out.
Machine ParseMachine(std::string_view json, const std::string& file,
                     std::vector<std::string>& faults);
Script ParseScript(std::string_view json, const std::string& file, const Machine& machine,
                   std::vector<std::string>& faults);

// The same from a file; one that cannot be read is a MachineFileError too ("FILE: cannot be read:
// ...").
Machine LoadMachine(const std::string& path);
Script LoadScript(const std::string& path, const Machine& machine);

}  // namespace platform::simulated
