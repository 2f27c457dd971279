#include "platform/text.h"

#include <algorithm>
#include <array>
#include <cstring>

namespace platform {
namespace {

constexpr char16_t kReplacement = 0xFFFD;

// Four units as one number, the first one in the lowest place on every system that this runs on.
std::uint64_t FourUnits(const char16_t* units) noexcept {
  std::uint64_t four;
  std::memcpy(&four, units, sizeof four);
  return four;
}

// In a loop of its own, without a branch, which compilers turn into one over many units at a time.
bool IsAscii(std::u16string_view text) noexcept {
  unsigned all = 0;
  for (const char16_t unit : text) all |= unit;
  return all < 0x80;
}

constexpr bool IsHighSurrogate(char16_t unit) { return unit >= 0xD800 && unit <= 0xDBFF; }
constexpr bool IsLowSurrogate(char16_t unit) { return unit >= 0xDC00 && unit <= 0xDFFF; }

std::u16string Digits(std::uint32_t value, unsigned base, unsigned width, char16_t pad,
                      const char16_t* digits) {
  std::array<char16_t, 10> reversed;  // the longest number is 4294967295
  std::size_t length = 0;
  do {
    reversed[length++] = digits[value % base];
    value /= base;
  } while (value != 0);
  std::u16string text(std::max<std::size_t>(width, length), pad);
  std::reverse_copy(reversed.begin(), reversed.begin() + static_cast<std::ptrdiff_t>(length),
                    text.end() - static_cast<std::ptrdiff_t>(length));
  return text;
}

// Appends the low six bits of `point` >> `shift` as a continuation byte.
void AppendContinuation(std::string& bytes, char32_t point, unsigned shift) {
  bytes += static_cast<char>(0x80 | ((point >> shift) & 0x3F));
}

void AppendUtf8(std::string& bytes, char32_t point) {
  if (point < 0x80) {
    bytes += static_cast<char>(point);
  } else if (point < 0x800) {
    bytes += static_cast<char>(0xC0 | (point >> 6));
    AppendContinuation(bytes, point, 0);
  } else if (point < 0x10000) {
    bytes += static_cast<char>(0xE0 | (point >> 12));
    AppendContinuation(bytes, point, 6);
    AppendContinuation(bytes, point, 0);
  } else {
    bytes += static_cast<char>(0xF0 | (point >> 18));
    AppendContinuation(bytes, point, 12);
    AppendContinuation(bytes, point, 6);
    AppendContinuation(bytes, point, 0);
  }
}

// The code point at the start of `bytes` (not empty) and its length; length 0 where it is
// malformed: cut short, longer than needed, a surrogate or beyond U+10FFFF.
struct Decoded {
  char32_t point;
  std::size_t length;
};

Decoded DecodeUtf8(std::string_view bytes) {
  constexpr Decoded kMalformed{0, 0};
  const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(bytes[i]); };
  const unsigned char lead = byte(0);
  if (lead < 0x80) return {lead, 1};
  const std::size_t length = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
  if (lead < 0xC2 || lead > 0xF4 || bytes.size() < length) return kMalformed;
  char32_t point = lead & (0x7Fu >> length);
  for (std::size_t i = 1; i < length; ++i) {
    if ((byte(i) & 0xC0) != 0x80) return kMalformed;
    point = (point << 6) | (byte(i) & 0x3Fu);
  }
  constexpr std::array<char32_t, 5> kSmallest = {0, 0, 0x80, 0x800, 0x10000};
  if (point < kSmallest[length] || point > 0x10FFFF) return kMalformed;
  if (point >= 0xD800 && point <= 0xDFFF) return kMalformed;
  return {point, length};
}

}  // namespace

void ToLower(std::u16string_view text, std::u16string& lowered) {
  lowered = text;
  if (IsAscii(text)) {
    for (char16_t& unit : lowered) {
      unit = static_cast<char16_t>(unit + (static_cast<unsigned>(unit - u'A') < 26u ? 32 : 0));
    }
    return;
  }
  for (char16_t& unit : lowered) unit = ToLower(unit);
}

std::u16string ToLower(std::u16string_view text) {
  std::u16string lowered;
  ToLower(text, lowered);
  return lowered;
}

std::u16string ToUpper(std::u16string_view text) {
  std::u16string raised(text);
  if (IsAscii(text)) {
    for (char16_t& unit : raised) {
      unit = static_cast<char16_t>(unit - (static_cast<unsigned>(unit - u'a') < 26u ? 32 : 0));
    }
    return raised;
  }
  for (char16_t& unit : raised) unit = ToUpper(unit);
  return raised;
}

bool EqualIgnoringCase(std::u16string_view a, std::u16string_view b) noexcept {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](char16_t left, char16_t right) {
    return left == right || ToLower(left) == ToLower(right);
  });
}

std::u16string Replaced(std::u16string text, char16_t from, char16_t to) {
  // Without a branch, over many units at a time.
  for (char16_t& unit : text) unit = unit == from ? to : unit;
  return text;
}

std::u16string_view UpToZero(std::u16string_view buffer) noexcept {
  // Subtracting one from each unit borrows from the one above where a unit is zero. A unit above a
  // zero may look like one then, so the four are looked at again.
  constexpr std::uint64_t kOnes = 0x0001000100010001u, kTops = 0x8000800080008000u;
  std::size_t at = 0;
  // Without a branch for each unit, over many units at a time.
  constexpr std::size_t kBlock = 64;
  for (; at + kBlock <= buffer.size(); at += kBlock) {
    unsigned zeros = 0;
    for (std::size_t i = 0; i < kBlock; ++i) zeros |= buffer[at + i] == u'\0' ? 1u : 0u;
    if (zeros != 0) break;
  }
  for (; at + 4 <= buffer.size(); at += 4) {
    const std::uint64_t four = FourUnits(buffer.data() + at);
    if (((four - kOnes) & ~four & kTops) != 0) break;
  }
  while (at < buffer.size() && buffer[at] != u'\0') ++at;
  return buffer.substr(0, at);
}

std::size_t FindFour(std::u16string_view text, const char16_t (&units)[5]) noexcept {
  const std::uint64_t wanted = FourUnits(units);
  for (std::size_t at = 0; at + 4 <= text.size(); ++at) {
    if (FourUnits(text.data() + at) == wanted) return at;
  }
  return text.size();
}

std::u16string Hex(std::uint32_t value, unsigned width) {
  return Digits(value, 16, width, u'0', u"0123456789ABCDEF");
}

std::u16string HexLower(std::uint32_t value, unsigned width) {
  return Digits(value, 16, width, u'0', u"0123456789abcdef");
}

std::u16string Decimal(std::int32_t value, unsigned width) {
  const bool negative = value < 0;
  const auto magnitude =
      negative ? 0u - static_cast<std::uint32_t>(value) : static_cast<std::uint32_t>(value);
  std::u16string text = Digits(magnitude, 10, 0, u' ', u"0123456789");
  if (negative) text.insert(text.begin(), u'-');
  if (text.size() < width) text.insert(text.begin(), width - text.size(), u' ');
  return text;
}

std::u16string GuidText(const Guid& guid) {
  std::u16string text;
  text.reserve(38);
  text += u'{';
  // Of four digits at most: those fit into the object of a text.
  text.append(Hex(guid.Data1 >> 16, 4)).append(Hex(guid.Data1 & 0xFFFF, 4)).append(u"-");
  text.append(Hex(guid.Data2, 4)).append(u"-").append(Hex(guid.Data3, 4)).append(u"-");
  for (std::size_t i = 0; i < guid.Data4.size(); ++i) {
    if (i == 2) text += u'-';
    text += Hex(guid.Data4[i], 2);
  }
  return text += u'}';
}

std::optional<Guid> ParseGuid(std::u16string_view text) {
  // The digits in their order; what stands between them is checked by writing the result again.
  std::array<std::uint8_t, 16> bytes{};
  std::size_t digits = 0;
  for (const char16_t unit : text) {
    const bool decimal = unit >= u'0' && unit <= u'9';
    const char16_t upper = ToUpper(unit);
    if (!decimal && (upper < u'A' || upper > u'F')) continue;
    if (digits == 2 * bytes.size()) return {};
    const int value = decimal ? unit - u'0' : upper - u'A' + 10;
    std::uint8_t& byte = bytes[digits++ / 2];
    byte = static_cast<std::uint8_t>(byte * 16 + value);
  }
  Guid guid;
  guid.Data1 = std::uint32_t{bytes[0]} << 24 | std::uint32_t{bytes[1]} << 16 |
               std::uint32_t{bytes[2]} << 8 | bytes[3];
  guid.Data2 = static_cast<std::uint16_t>(bytes[4] << 8 | bytes[5]);
  guid.Data3 = static_cast<std::uint16_t>(bytes[6] << 8 | bytes[7]);
  std::copy(bytes.begin() + 8, bytes.end(), guid.Data4.begin());
  if (!EqualIgnoringCase(GuidText(guid), text)) return {};
  return guid;
}

std::string ToUtf8(std::u16string_view text) {
  std::string bytes;
  bytes.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    char32_t point = text[i];
    if (IsHighSurrogate(text[i]) && i + 1 < text.size() && IsLowSurrogate(text[i + 1])) {
      point = 0x10000 + ((point - 0xD800) << 10) + (text[++i] - 0xDC00u);
    } else if (IsHighSurrogate(text[i]) || IsLowSurrogate(text[i])) {
      point = kReplacement;
    }
    AppendUtf8(bytes, point);
  }
  return bytes;
}

std::u16string FromUtf8(std::string_view bytes) {
  std::u16string text;
  text.reserve(bytes.size());
  while (!bytes.empty()) {
    const Decoded decoded = DecodeUtf8(bytes);
    if (decoded.length == 0) {
      text += kReplacement;
      bytes.remove_prefix(1);
      continue;
    }
    if (decoded.point < 0x10000) {
      text += static_cast<char16_t>(decoded.point);
    } else {
      text += static_cast<char16_t>(0xD800 + ((decoded.point - 0x10000) >> 10));
      text += static_cast<char16_t>(0xDC00 + ((decoded.point - 0x10000) & 0x3FF));
    }
    bytes.remove_prefix(decoded.length);
  }
  return text;
}

}  // namespace platform
