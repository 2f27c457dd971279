// What help, manual and completion say about each command.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace zkusb {

struct Example {
  std::string command;  // without "zkusb"
  std::string meaning;
};

struct CommandHelp {
  std::string name;         // empty: the whole program
  std::string summary;      // one line
  std::string description;  // for the manual, in sentences
  std::vector<Example> examples;
};

// The program first, then its commands.
const std::vector<CommandHelp>& AllHelp();
// Throws std::out_of_range for what is no command.
const CommandHelp& FindHelp(std::string_view name);

// As it stands at the end of a help text.
std::string ExamplesText(const CommandHelp& help);

}  // namespace zkusb
