// Registry properties and ids of all devices, as the bytes that a caller is given.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>
#include <vector>

#include "simulation/machine/machine.h"

namespace platform::simulated {

struct PropertyValue {
  std::uint32_t type;  // a registry data type
  std::span<const std::uint8_t> bytes;
};

// Made from one state of a machine. Values lie property by property in the order of the devices,
// and equal ones share their bytes: a program asks device after device for the same few properties,
// and a large PC must not answer more slowly because its texts are scattered over the memory.
class PropertyTable {
 public:
  explicit PropertyTable(const std::vector<Device>& devices);

  // The property of that number (a kSPDRP_ constant) of the device at that position, or none: not
  // set, or not one that a machine knows. The bytes are the table's.
  std::optional<PropertyValue> Value(std::size_t device, std::uint32_t property) const;
  std::u16string_view Id(std::size_t device) const;

 private:
  static constexpr std::size_t kProperties = 13;
  struct Place {
    std::uint32_t offset;
    std::uint32_t size;  // 0: not set, since no value is without bytes
  };

  std::array<std::vector<Place>, kProperties> m_places;  // by property and position
  std::vector<std::uint8_t> m_bytes;
  std::vector<std::size_t> m_idEnds;  // by position, in m_ids
  Text m_ids;
};

}  // namespace platform::simulated
