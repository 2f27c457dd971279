#include "tools/zkusb/topology.h"

#include <utility>

#include "platform/simulated/machine_file.h"
#include "platform/text.h"
#include "tools/zkusb/built_in_machine.h"

namespace zkusb {

namespace {

using platform::simulated::Machine;
using platform::simulated::MachineFileError;
using platform::simulated::Script;

Machine ReadMachine(const std::string& file) {
  return file.empty() ? platform::simulated::ParseMachine(BuiltInMachine(), kBuiltInMachineName)
                      : platform::simulated::LoadMachine(file);
}

Script ReadScript(const std::string& file, const Machine& machine) {
  return file.empty() ? Script() : platform::simulated::LoadScript(file, machine);
}

}  // namespace

Topology::Topology(const std::string& machineFile, const std::string& scriptFile)
    : Topology(scriptFile, ReadMachine(machineFile)) {}

Topology::Topology(const std::string& scriptFile, Machine machine)
    : m_scriptFile(scriptFile),
      m_script(ReadScript(scriptFile, machine)),
      m_pc(std::move(machine)),
      m_builder(m_pc) {}

void Topology::Apply(std::size_t step) {
  const std::u16string reason = m_pc.Apply(m_script.at(step));
  if (reason.empty()) return;
  throw MachineFileError(m_scriptFile + ": steps[" + std::to_string(step) +
                         "]: " + platform::ToUtf8(reason));
}

bool Topology::Refresh() {
  m_events.clear();
  const bool changed = m_builder.Build();
  if (changed) CollectEvents();
  m_builder.CommitDeviceCache();
  return changed;
}

void Topology::CollectEvents() {
  for (const EventKind kind :
       {EventKind::kAttached, EventKind::kConnected, EventKind::kRemoved, EventKind::kModified}) {
    for (const KelvoUHW::NodePtr& node : *m_builder.GetDeviceList(static_cast<std::size_t>(kind))) {
      // Clients hear of a device only while it hangs on a port.
      const KelvoUHW::CZKUMUsbTreeNodeImpl* parent = node->m_pParent;
      if (parent == nullptr || parent->m_nType != KelvoUHW::KUDTHubPort) continue;
      m_events.push_back({kind, ReadNode(node)});
    }
  }
}

std::optional<NodeView> Topology::Root() const {
  const KelvoUHW::NodePtr root = m_builder.Root();
  if (!root) return std::nullopt;
  return ReadNode(root);
}

std::u16string Topology::Dump() const {
  std::u16string text;
  if (const KelvoUHW::NodePtr root = m_builder.Root()) root->ToString(text, u"");
  return text;
}

}  // namespace zkusb
