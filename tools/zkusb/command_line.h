// What the person at the keyboard asks for.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <vector>

namespace zkusb {

enum class Command {
  kTree,
  kDump,
  kFind,
  kVolumes,
  kPage,
  kWatch,
  kRecord,
  kCheck,
  kRegister,
  kUnregister
};

struct Options {
  Command command = Command::kTree;
  std::string machineFile;  // empty: this PC or the built-in machine
  std::string scriptFile;   // empty: none
  bool json = false;
  std::optional<std::size_t> columns;  // of --width; 0 is without limit
  // Of watch: how long behind the script's end. Of record: how long it watches.
  std::optional<std::uint32_t> watchMilliseconds;
  std::vector<std::string> terms;  // of find, with vendor and product: all must hold
  std::optional<std::uint16_t> vendor;
  std::optional<std::uint16_t> product;
  std::string file;          // of page and record, which write it, and of check, which reads it
  bool withSerials = false;  // of record: nothing is replaced
  bool recordWatch = false;  // of record: the changes, too
};

// One line for people, in UTF-8, which points to --help.
class UsageError : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

struct CommandLine {
  std::optional<Options> options;
  std::string information;  // the help, version, completion or manual that was asked for instead
};

// Options may stand before and after the command. Throws UsageError.
CommandLine ParseCommandLine(const std::vector<std::string>& args);

// Whether it stands for a drive: "E:" or "E:\", in either case.
bool IsDriveLetter(const std::string& text);

}  // namespace zkusb
