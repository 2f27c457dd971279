#include "platform/text.h"

#include <algorithm>
#include <array>

namespace platform {
namespace {

constexpr char16_t kReplacement = 0xFFFD;

constexpr bool IsHighSurrogate(char16_t unit) { return unit >= 0xD800 && unit <= 0xDBFF; }
constexpr bool IsLowSurrogate(char16_t unit) { return unit >= 0xDC00 && unit <= 0xDFFF; }

std::u16string Digits(std::uint32_t value, unsigned base, unsigned width, char16_t pad,
                      const char16_t* digits) {
  std::u16string text;
  do {
    text += digits[value % base];
    value /= base;
  } while (value != 0);
  if (text.size() < width) text.append(width - text.size(), pad);
  std::reverse(text.begin(), text.end());
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

std::u16string ToLower(std::u16string_view text) {
  std::u16string lowered(text);
  for (char16_t& unit : lowered) unit = ToLower(unit);
  return lowered;
}

std::u16string ToUpper(std::u16string_view text) {
  std::u16string raised(text);
  for (char16_t& unit : raised) unit = ToUpper(unit);
  return raised;
}

bool EqualIgnoringCase(std::u16string_view a, std::u16string_view b) noexcept {
  return std::equal(a.begin(), a.end(), b.begin(), b.end(), [](char16_t left, char16_t right) {
    return left == right || ToLower(left) == ToLower(right);
  });
}

std::u16string Replaced(std::u16string text, char16_t from, char16_t to) {
  std::replace(text.begin(), text.end(), from, to);
  return text;
}

std::u16string_view UpToZero(std::u16string_view buffer) noexcept {
  return buffer.substr(0, buffer.find(u'\0'));
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
  std::u16string text = u"{";
  text += Hex(guid.Data1, 8) + u"-" + Hex(guid.Data2, 4) + u"-" + Hex(guid.Data3, 4) + u"-";
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
