// What each command prints. The trees belong to the caller.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "tools/zkusb/component.h"
#include "tools/zkusb/node_view.h"
#include "tools/zkusb/pc.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

void PrintTree(const NodeView& root, bool json, Writer& out);

// Whatever the component prints; as JSON in one member.
void PrintDump(const Component* component, bool json, Writer& out);

// What find looks for: all of it must hold.
struct Wanted {
  std::vector<std::u16string> terms;
  std::optional<std::uint16_t> vendor;
  std::optional<std::uint16_t> product;
};

// The devices that match, one a line; false when there is none.
bool PrintFound(const NodeView& root, const Wanted& wanted, bool json, Writer& out);
// "sandisk" and "of vendor 0781", for a message.
std::u16string WantedText(const Wanted& wanted);

// The devices with a volume or a disk that has a letter, in the same way.
bool PrintVolumes(const NodeView& root, bool json, Writer& out);

// Advises a sink and prints every event as it comes, while the script is played and for so long
// behind its end. Without a time it ends with the script, and where there is none with Ctrl-C; in
// any case with Ctrl-C and when the output is lost. Throws std::runtime_error when the PC refuses a
// step.
void Watch(Pc& pc, std::optional<std::uint32_t> milliseconds, bool json, Writer& out);

// Plays the script, if there is one, and writes the PC as it is then, with what happened, as a
// page. False where there is no USB host controller: the page says so. Throws std::runtime_error
// when the file cannot be written.
bool PrintPage(Pc& pc, const std::string& file, bool json, Writer& out);

// Registers the component and prints what that has written.
void PrintRegistration(Pc& pc, bool json, Writer& out);
// Takes the registration back, and prints what went and what stays.
void PrintUnregistration(Pc& pc, bool json, Writer& out);

}  // namespace zkusb
