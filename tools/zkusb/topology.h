// The PC that a run looks at, and what the component tells about it.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "platform/simulated/script.h"
#include "platform/simulated/simulated_pc.h"
#include "tools/zkusb/node_view.h"
#include "tree/tree_builder.h"

namespace zkusb {

// In the order of the published enumeration.
enum class EventKind { kConnected, kAttached, kRemoved, kModified };

struct DeviceEvent {
  EventKind kind;
  NodeView device;
};

// A simulated PC with the component at work on it. One thread.
class Topology {
 public:
  // Loads the files; an empty machine file stands for the built-in machine, an empty script file
  // for a script without steps. Throws platform::simulated::MachineFileError.
  Topology(const std::string& machineFile, const std::string& scriptFile);

  const platform::simulated::Script& Steps() const noexcept { return m_script; }
  // Carries out a step of the script. Throws MachineFileError when the PC refuses it.
  void Apply(std::size_t step);

  // Looks at the PC; true when something changed since the last look. The first look reports all
  // that is there.
  bool Refresh();
  // What the latest look reported, in the order in which clients are told; empty without a change.
  const std::vector<DeviceEvent>& Events() const noexcept { return m_events; }
  // Nothing as long as no look has reported anything.
  std::optional<NodeView> Root() const;
  // The component's own text for the root; empty when there is none.
  std::u16string Dump() const;

 private:
  Topology(const std::string& scriptFile, platform::simulated::Machine machine);
  void CollectEvents();

  std::string m_scriptFile;
  platform::simulated::Script m_script;
  platform::simulated::SimulatedPc m_pc;
  KelvoUHW::CZKUMUsbTreeBuilder m_builder;
  std::vector<DeviceEvent> m_events;
};

}  // namespace zkusb
