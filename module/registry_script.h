// Registry scripts in the registrar's text format: replacement and parsing.
//
//   script    = { root "{" { statement } "}" }          root = HKCR | HKEY_CLASSES_ROOT
//   statement = [NoRemove | ForceRemove] key [= data] [ "{" { statement } "}" ]
//             | Delete key
//             | [NoRemove] val name = data
//   data      = s text | d number | b hexadecimal digits
//
// Words end at a blank, a tab or a line end, so a brace is a block mark only when it stands alone.
// A text in single quotes is never a key word; two quotes inside it are one. Key words compare
// without case. A number is decimal, or hexadecimal behind &H. Keys are single names, without a
// backslash. Public source: the registrar's documentation of its script syntax and replaceable
// parameters.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace KelvoUHW {

struct Replacement {
  std::u16string_view name;
  std::u16string text;
};

// Puts the texts in the place of each %NAME%; names compare without case, %% is a percent sign. One
// pass: what was put in is not looked at again. No result where a name is unknown or has no end.
std::optional<std::u16string> WithReplacements(std::u16string_view script,
                                               std::span<const Replacement> replacements);

struct ScriptData {
  std::uint32_t type = 0;  // kREG_SZ with its terminator, kREG_DWORD or kREG_BINARY
  std::vector<std::uint8_t> bytes;
};

// One thing to do, in the order of the script. Flat, because how deep the blocks of a script are
// nested is up to its author and the stack is not.
struct ScriptStep {
  enum class Kind : std::uint8_t {
    OpenKey,    // what follows, up to the CloseKey that belongs to it, stands below that key
    CloseKey,   // the key opened last
    DeleteKey,  // with all below it
    Value,      // of the key opened last
  };

  Kind kind = Kind::CloseKey;
  bool noRemove = false;
  bool forceRemove = false;
  std::u16string name;
  std::optional<ScriptData> data;  // of a Value; of OpenKey: its default value
};

// The steps of a script below HKEY_CLASSES_ROOT; each OpenKey has its CloseKey. No result for a
// text that is no such script, whatever it is.
std::optional<std::vector<ScriptStep>> ParseRegistryScript(std::u16string_view script);

}  // namespace KelvoUHW
