// Says what is wrong with machine files and scripts.
#pragma once

#include "tools/zkusb/command_line.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

// Prints a line for each fault and each suspicion of the file and, where one is named, the script
// over it; kDone where there is none, else kNothingFound's value: something was found. Throws
// std::runtime_error for a file that cannot be read.
int Check(const Options& options, Writer& out);

}  // namespace zkusb
