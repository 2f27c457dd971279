// What the person at the keyboard asks for.
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace zkusb {

enum class Command { kTree, kDump, kFind, kVolumes, kWatch, kRegister, kUnregister };

struct Options {
  Command command = Command::kTree;
  std::string machineFile;  // empty: this PC or the built-in machine
  std::string scriptFile;   // empty: none
  bool json = false;
  std::uint32_t watchMilliseconds = 0;  // of watch: how long behind the script's end
  std::uint16_t vendor = 0;             // of find
  std::optional<std::uint16_t> product;
};

// One line for people, in UTF-8, which points to --help.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

struct CommandLine {
  std::optional<Options> options;
  std::string information;  // the help or version text that was asked for instead
};

// Options may stand before and after the command. Throws UsageError.
CommandLine ParseCommandLine(const std::vector<std::string>& args);

}  // namespace zkusb
