// Registry properties of a device as bytes.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "platform/simulated/machine.h"

namespace platform::simulated {

struct PropertyValue {
  std::uint32_t type;  // a registry data type
  std::vector<std::uint8_t> bytes;
};

// The property of that number (a kSPDRP_ constant), or none: not set, or not one that a machine
// knows.
std::optional<PropertyValue> PropertyOf(const Device& device, std::uint32_t property);

}  // namespace platform::simulated
