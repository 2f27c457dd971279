// UTF-16 text: case folding, formatting of numbers, conversion to and from UTF-8.
//
// Pure functions, callable from every thread. Functions that return text may throw std::bad_alloc.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>

#include "platform/guid.h"

namespace platform {

// One code unit, lowered or raised without regard to context. On Windows this is the system's own
// CharLowerW and CharUpperW. Elsewhere 531 letters of the common alphabets
// (native/case_mapping.cpp) map to their one partner, and all else, such as what Unicode added
// later, to itself.
char16_t ToLower(char16_t unit) noexcept;
char16_t ToUpper(char16_t unit) noexcept;

std::u16string ToLower(std::u16string_view text);
// The same into a text whose memory is used again.
void ToLower(std::u16string_view text, std::u16string& lowered);
std::u16string ToUpper(std::u16string_view text);

// Equal when both sides are lowered.
bool EqualIgnoringCase(std::u16string_view a, std::u16string_view b) noexcept;

// The text with every `from` replaced by `to`.
std::u16string Replaced(std::u16string text, char16_t from, char16_t to);

// Whether both are the same units; the operator of the standard library compares them one by one.
inline bool SameText(std::u16string_view a, std::u16string_view b) noexcept {
  return a.size() == b.size() &&
         (a.empty() || std::memcmp(a.data(), b.data(), a.size() * sizeof(char16_t)) == 0);
}

// Where the four units stand first, and `text.size()` where they do not. Much faster than a search
// for a text of any length.
std::size_t FindFour(std::u16string_view text, const char16_t (&units)[5]) noexcept;

// The characters before the first zero, or all of `buffer` where it holds none.
std::u16string_view UpToZero(std::u16string_view buffer) noexcept;

// Upper-case hexadecimal digits, padded with zeros to `width`; no prefix ("%X", "%04X").
std::u16string Hex(std::uint32_t value, unsigned width = 0);
// The same with lower-case digits ("%x").
std::u16string HexLower(std::uint32_t value, unsigned width = 0);
// Signed decimal, padded with blanks on the left to `width` ("%d", "%2d").
std::u16string Decimal(std::int32_t value, unsigned width = 0);

// "{8-4-4-4-12}" with upper-case digits, 38 characters, as the system prints a GUID.
std::u16string GuidText(const Guid& guid);
// The GUID whose text that is, in either case; nothing for any other text.
std::optional<Guid> ParseGuid(std::u16string_view text);

// UTF-8 with U+FFFD for each unpaired surrogate or malformed byte.
std::string ToUtf8(std::u16string_view text);
std::u16string FromUtf8(std::string_view bytes);

}  // namespace platform
