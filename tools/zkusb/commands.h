// What each command prints. The trees belong to the caller.
#pragma once

#include <cstdint>
#include <optional>

#include "tools/zkusb/node_view.h"
#include "tools/zkusb/pc.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

void PrintTree(const NodeView& root, bool json, Writer& out);

// The devices with these ids, one a line; false when there is none (JSON is then an empty list).
bool PrintFound(const NodeView& root, std::uint16_t vendor, std::optional<std::uint16_t> product,
                bool json, Writer& out);

// The devices with a volume or a disk that has a letter, in the same way.
bool PrintVolumes(const NodeView& root, bool json, Writer& out);

// Advises a sink and prints every event as it comes, while the script is played and for so long
// behind its end. Throws std::runtime_error when the PC refuses a step.
void Watch(Pc& pc, std::uint32_t milliseconds, bool json, Writer& out);

// Registers the component and prints what that has written.
void PrintRegistration(Pc& pc, bool json, Writer& out);
// Takes the registration back, and prints what went and what stays.
void PrintUnregistration(Pc& pc, bool json, Writer& out);

}  // namespace zkusb
