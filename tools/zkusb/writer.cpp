#include "tools/zkusb/writer.h"

#include <algorithm>

#include "platform/text.h"

namespace zkusb {

namespace {

constexpr char16_t kEllipsis[] = u"…";

bool IsHarmful(char16_t unit) noexcept {
  const auto within = [unit](char16_t first, char16_t last) {
    return unit >= first && unit <= last;
  };
  // C0 and C1; marks, embeddings, overrides and isolates of direction; line and paragraph
  // separators.
  return unit < 0x20 || within(0x7F, 0x9F) || unit == 0x061C || within(0x200E, 0x200F) ||
         within(0x2028, 0x202E) || within(0x2066, 0x2069);
}

std::u16string Escaped(std::u16string_view text) {
  std::u16string result;
  for (const char16_t unit : text) {
    if (!IsHarmful(unit)) {
      result += unit;
    } else if (unit <= 0xFF) {
      result += u"\\x" + platform::Hex(unit, 2);
    } else {
      result += u"\\u" + platform::Hex(unit, 4);
    }
  }
  return result;
}

// Where the code point that starts at `at` ends.
std::size_t NextPoint(std::u16string_view text, std::size_t at) noexcept {
  const bool pair = text[at] >= 0xD800 && text[at] <= 0xDBFF && at + 1 < text.size() &&
                    text[at + 1] >= 0xDC00 && text[at + 1] <= 0xDFFF;
  return at + (pair ? 2 : 1);
}

std::size_t Columns(std::u16string_view text) noexcept {
  std::size_t count = 0;
  for (std::size_t at = 0; at < text.size(); at = NextPoint(text, at)) ++count;
  return count;
}

// At most so many columns, the last one an ellipsis.
std::u16string CutTo(std::u16string_view text, std::size_t columns) {
  std::size_t at = 0;
  for (std::size_t count = 0; count + 1 < columns && at < text.size(); ++count) {
    at = NextPoint(text, at);
  }
  while (at > 0 && text[at - 1] == u' ') --at;
  return std::u16string(text.substr(0, at)) + kEllipsis;
}

}  // namespace

void Writer::EndLine() {
  m_stream << '\n';
  if (m_flushEachLine) m_stream.flush();
}

void Writer::Line(std::u16string_view text) {
  Verbatim(Escaped(text));
  EndLine();
}

void Writer::FittedLine(std::u16string_view head, std::u16string_view middle,
                        std::u16string_view tail) {
  const std::u16string start = Escaped(head);
  std::u16string name = Escaped(middle);
  const std::u16string end = Escaped(tail);
  const std::size_t around = Columns(start) + Columns(end);
  if (m_columns != 0 && around + Columns(name) > m_columns && around < m_columns) {
    name = CutTo(name, m_columns - around);
  }
  std::u16string line = start + name + end;
  if (m_columns != 0 && Columns(line) > m_columns) line = CutTo(line, m_columns);
  Verbatim(line);
  EndLine();
}

void Writer::Paragraph(std::u16string_view text) {
  Verbatim(text);
  if (!text.ends_with(u'\n')) EndLine();
}

void Writer::JsonLine(const nlohmann::ordered_json& value) {
  Json(platform::FromUtf8(value.dump()));
  EndLine();
}

void Writer::Json(std::u16string_view text) {
  // What wrote the text leaves some harmful characters as they are; they stand inside of texts
  // only, where JSON has an escape for each.
  std::u16string harmless;
  for (const char16_t unit : text) {
    const bool isMarkup = m_inMarkup && (unit == u'<' || unit == u'>' || unit == u'&');
    if (isMarkup || (unit != u'\n' && IsHarmful(unit))) {
      harmless += u"\\u" + platform::HexLower(unit, 4);
    } else {
      harmless += unit;
    }
  }
  Verbatim(harmless);
}

void Writer::Verbatim(std::u16string_view text) {
  // In parts: a dump of a big PC is large enough to be held once.
  constexpr std::size_t kPart = 1 << 16;
  while (!text.empty()) {
    std::size_t size = std::min(text.size(), kPart);
    if (size < text.size() && text[size - 1] >= 0xD800 && text[size - 1] <= 0xDBFF) --size;
    m_stream << platform::ToUtf8(text.substr(0, size));
    text.remove_prefix(size);
  }
}

std::u16string Tidied(std::u16string_view text) {
  std::u16string result;
  for (const char16_t unit : text) {
    if (unit != u' ') {
      result += unit;
    } else if (!result.empty() && result.back() != u' ') {
      result += u' ';
    }
  }
  if (result.ends_with(u' ')) result.pop_back();
  return result;
}

}  // namespace zkusb
