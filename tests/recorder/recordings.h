// What a build over a PC shows, and PCs to look at.
#pragma once

#include <span>

#include "simulation/machine/machine_file.h"
#include "simulation/machine/machine_writer.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/cases.h"
#include "tests/support/outline.h"
#include "tests/support/random_pc.h"
#include "tree/tree_builder.h"

namespace recorder {

using platform::simulated::Machine;

inline constexpr const char* kMachines[] = {"hp-cardreader", "asus-b560", "dell-precision", "vmware-win7"};
inline std::span<const char* const> SomeMachines() {
  return std::span(kMachines).first(testing_support::Cases<std::size_t>(4, 1));
}

inline Machine LoadMachine(const std::string& name) {
  return platform::simulated::LoadMachine(ZKUSB_SOURCE_DIR "/machines/" + name + ".json");
}
inline Machine ReadBack(const Machine& machine) {
  return platform::simulated::ParseMachine(platform::simulated::WriteMachine(machine), "recorded");
}

// Everything that a first build publishes: the dump of the tree, where each node hangs, and the four lists.
inline std::string BuildOver(const Machine& machine) {
  platform::simulated::SimulatedPc pc(machine);
  KelvoUHW::CZKUMUsbTreeBuilder builder(pc);
  std::string text = builder.Build() ? "published\n" : "nothing\n";
  if (builder.Root()) text += KelvoUHW::DumpOf(*builder.Root()) + KelvoUHW::OutlineOf(builder.Root());
  for (std::size_t kind = 0; kind < 4; ++kind) {
    text += "list " + std::to_string(kind) + "\n";
    for (const KelvoUHW::NodePtr& node : *builder.GetDeviceList(kind)) text += KelvoUHW::DumpOf(*node, u"  ");
  }
  return text;
}

// A small PC after some changes.
inline Machine RandomMachine(std::uint32_t seed) {
  testing_support::RandomPc pc(seed);
  for (int change = 0; change < 14; ++change) pc.Change();
  return pc.Pc().Snapshot();
}

}  // namespace recorder
