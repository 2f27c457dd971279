// The device messages that the system sends when a PC changes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "platform/device_broadcast.h"
#include "simulation/machine/machine.h"

namespace platform::simulated {

// One WM_DEVICECHANGE: the event and its record, byte for byte; empty where the event has none.
struct DeviceBroadcast {
  std::uint32_t event = 0;
  std::vector<std::byte> record;
};

DeviceBroadcast InterfaceBroadcast(std::uint32_t event, const Guid& interfaceClass,
                                   const Text& path);
DeviceBroadcast VolumeBroadcast(std::uint32_t event, char16_t letter, std::uint16_t flags);

// What the system sends for the difference between two states of a PC, in its order:
//  1. drive letters that lost their volume, or show another one now, one message a letter;
//  2. device interfaces that went, in the reverse of the order below;
//  3. device interfaces that came, in the order of the file's devices, but those of a parent before
//     those of its children;
//  4. drive letters that got a volume, which are assigned when the volume's interface is there;
//  5. once, that nodes of the device manager came or went.
// A letter that belongs to a drive before and after is told as a change of the medium. Folders in
// which volumes are mounted are not told. Paths and ids are compared without regard to case.
std::vector<DeviceBroadcast> BroadcastsOf(const Machine& before, const Machine& after);

}  // namespace platform::simulated
