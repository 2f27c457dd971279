// What all fuzz targets use.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <span>
#include <string_view>

namespace fuzz {

inline void Require(bool holds, const char* what) {
  if (holds) return;
  std::fprintf(stderr, "does not hold: %s\n", what);
  std::abort();
}

// The input, taken from its front. Where nothing is left it gives zeros.
class Input {
 public:
  Input(const std::uint8_t* data, std::size_t size) noexcept : m_rest(data, size) {}

  bool Empty() const noexcept { return m_rest.empty(); }
  std::uint8_t Byte() noexcept {
    if (m_rest.empty()) return 0;
    const std::uint8_t byte = m_rest.front();
    m_rest = m_rest.subspan(1);
    return byte;
  }
  std::uint32_t Number() noexcept {
    std::uint32_t number = 0;
    for (int i = 0; i < 4; ++i) number = number << 8 | Byte();
    return number;
  }
  std::span<const std::uint8_t> Rest() const noexcept { return m_rest; }
  std::string_view RestAsText() const noexcept {
    return {reinterpret_cast<const char*>(m_rest.data()), m_rest.size()};
  }

 private:
  std::span<const std::uint8_t> m_rest;
};

}  // namespace fuzz
