// What each command prints. The trees belong to the caller.
#pragma once

#include <cstdint>
#include <optional>

#include "tools/zkusb/node_view.h"
#include "tools/zkusb/topology.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

void PrintTree(const NodeView& root, bool json, Writer& out);

// The devices with these ids, one a line; false when there is none (JSON is then an empty list).
bool PrintFound(const NodeView& root, std::uint16_t vendor, std::optional<std::uint16_t> product,
                bool json, Writer& out);

// The devices with a volume or a disk that has a letter, in the same way.
bool PrintVolumes(const NodeView& root, bool json, Writer& out);

// Takes the script step by step and tells after each what came, went and changed. Throws
// MachineFileError when the PC refuses a step.
void Watch(Topology& topology, bool json, Writer& out);

}  // namespace zkusb
