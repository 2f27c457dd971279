// The 16-byte identifier of interfaces, device classes and device interfaces.
#pragma once

#include <array>
#include <cstdint>

namespace platform {

// In memory as the system lays a GUID out: three little-endian numbers and eight bytes.
struct Guid {
  std::uint32_t Data1 = 0;
  std::uint16_t Data2 = 0;
  std::uint16_t Data3 = 0;
  std::array<std::uint8_t, 8> Data4{};

  friend bool operator==(const Guid&, const Guid&) = default;
};
static_assert(sizeof(Guid) == 16);

inline constexpr Guid kNullGuid{};

}  // namespace platform
