#include "records/identifiers.h"

#include <array>
#include <limits>

#include "platform/text.h"

namespace KelvoUHW {

namespace {

constexpr std::size_t kNoCount = std::numeric_limits<std::size_t>::max();
constexpr std::size_t kNoWidth = kNoCount;

bool IsBlank(char16_t unit) noexcept { return unit == u' ' || (unit >= u'\t' && unit <= u'\r'); }

int HexDigit(char16_t unit) noexcept {
  if (unit >= u'0' && unit <= u'9') return unit - u'0';
  if (unit >= u'a' && unit <= u'f') return unit - u'a' + 10;
  if (unit >= u'A' && unit <= u'F') return unit - u'A' + 10;
  return -1;
}

// A counted scan of a text. It stops for good at the count or at the terminating zero, whichever
// comes first: Peek answers zero there, and nothing takes a zero.
class Scanner {
 public:
  explicit Scanner(const char16_t* text, std::size_t count = kNoCount) noexcept
      : m_text(text), m_count(count) {}

  // Characters taken so far, skipped blanks included.
  std::size_t Taken() const noexcept { return m_taken; }

  bool Literal(std::u16string_view text) noexcept {
    for (const char16_t unit : text) {
      if (Peek() != unit) return false;
      ++m_taken;
    }
    return true;
  }

  // One "%x" field of one character at least. Blanks in front do not count against `width`, sign
  // and "0x" do. A "0x" without a digit behind it within the width is no number.
  bool Hex(std::uint32_t& value, std::size_t width = kNoWidth) noexcept {
    while (IsBlank(Peek())) ++m_taken;
    std::size_t left = width;
    const auto take = [&] {
      ++m_taken;
      --left;
    };
    const bool negative = Peek() == u'-';
    if (negative || Peek() == u'+') take();
    if (left >= 2 && Peek() == u'0' && (Peek(1) == u'x' || Peek(1) == u'X')) {
      take();
      take();
    }
    bool any = false;
    std::uint32_t number = 0;
    for (int digit = 0; left > 0 && (digit = HexDigit(Peek())) >= 0; take(), any = true) {
      number = (number << 4) | static_cast<std::uint32_t>(digit);
    }
    if (any) value = negative ? 0U - number : number;
    return any;
  }

 private:
  // With an offset: only where the characters before it are not zero.
  char16_t Peek(std::size_t offset = 0) const noexcept {
    return offset < m_count - m_taken ? m_text[m_taken + offset] : u'\0';
  }

  const char16_t* m_text;
  std::size_t m_count;
  std::size_t m_taken = 0;
};

struct Field {
  std::u16string_view text;  // between the marks
  std::u16string_view rest;  // behind the end mark
};
// From a place in the text to the first `end` there; false where there is none.
bool TakeField(std::u16string_view from, char16_t end, Field& field) noexcept {
  const std::size_t length = from.find(end);
  if (length == from.npos) return false;
  field = {from.substr(0, length), from.substr(length + 1)};
  return true;
}
// The first `begin` and the first `end` behind it; false where one of the two is missing.
bool FindField(std::u16string_view text, const char16_t (&begin)[5], char16_t end,
               Field& field) noexcept {
  const std::size_t start = platform::FindFour(text, begin);
  return start != text.size() && TakeField(text.substr(start + 4), end, field);
}

}  // namespace

bool IsReadableText(const char16_t* text) noexcept { return text != nullptr; }

void NodeIdentity::SetInstanceId(std::u16string id) {
  m_strDevInstId = std::move(id);
  ParseInstanceId();
}

void NodeIdentity::ParseInstanceId() {
  const std::u16string_view id = m_strDevInstId;
  Field field;
  m_nVendorId = kUnknownId;
  if (FindField(id, u"VID_", u'&', field)) {
    m_nVendorId = ParseHexField(field.text.data(), field.text.size());
    m_nProductId = kUnknownId;
    if (!FindField(field.rest, u"PID_", u'\\', field)) return;
    m_nProductId = ParseHexField(field.text.data(), field.text.size());
  } else {
    m_strVendor.clear();
    if (!FindField(id, u"VEN_", u'&', field)) return;
    m_strVendor = field.text;
    m_strProduct.clear();
    // The product name runs up to the backslash, revision included. Deliberate: it is the name
    // under which storage devices are told apart.
    constexpr std::u16string_view kProduct = u"PROD_";
    const std::size_t product = field.rest.find(kProduct);
    if (product == field.rest.npos ||
        !TakeField(field.rest.substr(product + kProduct.size()), u'\\', field)) {
      return;
    }
    m_strProduct = field.text;
  }
  // The serial number is deliberately the whole last component, including a trailing "&0".
  const std::u16string_view serialNumber = id.substr(id.rfind(u'\\') + 1);
  if (!serialNumber.empty()) m_strSerialNumber = serialNumber;
}

void NodeIdentity::SetSerialNumber(std::u16string serialNumber) {
  if (!serialNumber.empty()) m_strSerialNumber = std::move(serialNumber);
}

std::uint32_t ParseHexField(const char16_t* text, std::size_t count) noexcept {
  std::uint32_t value = kUnknownId;
  if (IsReadableText(text)) Scanner(text, count).Hex(value);
  return value;
}

platform::Guid ParseGuidText(const char16_t* text) noexcept {
  platform::Guid guid;
  if (!IsReadableText(text) || *text == u'\0') return guid;

  struct Group {
    std::size_t width;
    std::u16string_view literal;  // in front of the group
    std::size_t end;              // where the group must end, counted from behind the brace
  };
  static constexpr std::array<Group, 11> kGroups{{{8, u"", 8},
                                                  {4, u"-", 13},
                                                  {4, u"-", 18},
                                                  {2, u"-", 21},
                                                  {2, u"", 23},
                                                  {2, u"-", 26},
                                                  {2, u"", 28},
                                                  {2, u"", 30},
                                                  {2, u"", 32},
                                                  {2, u"", 34},
                                                  {2, u"", 36}}};
  // Deliberate: the first three numbers stay when the text is broken behind them, or when a group
  // is shorter than it should be. Only the eight bytes wait for the whole text to be right.
  std::array<std::uint8_t, 8> bytes{};
  bool inPlace = true;
  Scanner scanner(text + 1);
  for (std::size_t i = 0; i < kGroups.size(); ++i) {
    std::uint32_t value = 0;
    if (!scanner.Literal(kGroups[i].literal) || !scanner.Hex(value, kGroups[i].width)) return guid;
    inPlace = inPlace && scanner.Taken() == kGroups[i].end;
    switch (i) {
      case 0:
        guid.Data1 = value;
        break;
      case 1:
        guid.Data2 = static_cast<std::uint16_t>(value);
        break;
      case 2:
        guid.Data3 = static_cast<std::uint16_t>(value);
        break;
      default:
        bytes[i - 3] = static_cast<std::uint8_t>(value);
    }
  }
  if (inPlace) guid.Data4 = bytes;
  return guid;
}

std::u16string InterfacePathToInstanceId(const char16_t* path) {
  if (!IsReadableText(path)) return {};
  const std::u16string_view text = path;
  const std::size_t end = text.rfind(u'#');
  if (end == text.npos) return {};
  return platform::ToUpper(platform::Replaced(std::u16string(text.substr(0, end)), u'#', u'\\'));
}

std::optional<std::u16string> DiskIdOfVolumeId(std::u16string_view volumeId) {
  constexpr std::u16string_view kBegin = u"_??_";
  const std::size_t begin = volumeId.find(kBegin);
  const std::size_t end = volumeId.find(u"#{");
  if (begin == volumeId.npos || end == volumeId.npos || end < begin + kBegin.size()) return {};
  const std::u16string_view between =
      volumeId.substr(begin + kBegin.size(), end - begin - kBegin.size());
  return platform::Replaced(std::u16string(between), u'#', u'\\');
}

PciHardwareId ParsePciHardwareId(const char16_t* text) noexcept {
  PciHardwareId id;
  if (!IsReadableText(text)) return id;
  Scanner scanner(text);
  id.Complete = scanner.Literal(u"PCI\\VEN_") && scanner.Hex(id.VendorId) &&
                scanner.Literal(u"&DEV_") && scanner.Hex(id.DeviceId) &&
                scanner.Literal(u"&SUBSYS_") && scanner.Hex(id.SubSysId) &&
                scanner.Literal(u"&REV_") && scanner.Hex(id.Revision);
  return id;
}

}  // namespace KelvoUHW
