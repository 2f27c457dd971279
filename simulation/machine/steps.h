// What a step does to a machine.
#pragma once

#include <unordered_set>
#include <variant>

#include "platform/text.h"
#include "simulation/machine/machine.h"
#include "simulation/machine/script.h"

namespace platform::simulated {

// Each carries its change out, or returns why it cannot be. The machine may be left half changed
// then: give it a copy. Names are compared without regard to case.
Text CarryOut(Machine& machine, const Plug& plug);
Text CarryOut(Machine& machine, const Unplug& unplug);
Text CarryOut(Machine& machine, const Mount& mount);
Text CarryOut(Machine& machine, const Dismount& dismount);
inline Text CarryOut(Machine&, std::monostate) { return {}; }

inline bool IsRootDevice(const Text& id) {
  return id.empty() || EqualIgnoringCase(id, kRootDeviceId);
}

// Names without regard to case.
class NameSet {
 public:
  // False where it is there already.
  bool Add(const Text& name) { return m_names.insert(ToLower(name)).second; }
  bool Has(const Text& name) const { return m_names.contains(ToLower(name)); }

 private:
  std::unordered_set<Text> m_names;
};

}  // namespace platform::simulated
