// Machines and scripts as the text of their files, see docs/machine-file.md.
#pragma once

#include <string>
#include <vector>

#include "simulation/machine/machine.h"
#include "simulation/machine/script.h"

namespace platform::simulated {

// UTF-8, for people too: what is short stands on one line. A member is left out where that means
// the same, so reading the text gives an equal machine, and writing that gives the same text.
// Unpaired surrogates become U+FFFD.
std::string WriteMachine(const Machine& machine);

struct ScriptText {
  Text name;
  std::vector<Text> notes;
};
std::string WriteScript(const Script& script, const ScriptText& about);

}  // namespace platform::simulated
