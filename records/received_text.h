// Texts in buffers that the system filled.
#pragma once

#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "platform/text.h"

namespace KelvoUHW {

// The text before the first zero. None where the buffer holds no zero: such a text was not received
// whole, and the call that gave it counts as failed.
inline std::optional<std::u16string_view> ReceivedView(std::span<const char16_t> buffer) noexcept {
  const std::u16string_view text = platform::UpToZero({buffer.data(), buffer.size()});
  if (text.size() == buffer.size()) return std::nullopt;
  return text;
}
inline std::optional<std::u16string> ReceivedText(std::span<const char16_t> buffer) {
  const std::optional<std::u16string_view> text = ReceivedView(buffer);
  return text ? std::optional<std::u16string>(*text) : std::nullopt;
}

}  // namespace KelvoUHW
