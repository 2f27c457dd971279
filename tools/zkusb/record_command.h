// Writes a PC into a file.
#pragma once

#include "tools/zkusb/command_line.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

// Records the PC that the program runs on, or the simulated one that the options name, as a machine
// file, and tells what was written. With `recordWatch` it goes on: each change becomes a step of a
// script beside that file, which is written anew with each, until the script of the simulated PC
// ends or, on the PC itself, until Ctrl-C, a closed output or the given time. Asks the PC itself
// and not the component. Throws std::runtime_error for a file that is wrong or cannot be written.
void Record(const Options& options, Writer& out);

}  // namespace zkusb
