#include "tools/zkusb/json_document.h"

#include <algorithm>

#include "platform/text.h"

namespace zkusb {

Json DocumentHead(const char* command) {
  return {{"schema", kJsonSchema}, {"version", ZKUSB_VERSION}, {"command", command}};
}

JsonDocument::JsonDocument(const char* command, Writer& out) : m_out(out) {
  Begin(nullptr, u'{', u'}');
  Members(DocumentHead(command));
}

void JsonDocument::Next() {
  if (m_open.empty()) return;
  m_out.Json(m_first ? u"\n" : u",\n");
  m_out.Json(m_indent);
  m_first = false;
}

void JsonDocument::Begin(const char* name, char16_t open, char16_t close) {
  Next();
  if (name) m_out.Json(platform::FromUtf8(Json(name).dump()) + u": ");
  m_out.Json(std::u16string(1, open));
  m_open += close;
  m_indent += u"  ";
  m_first = true;
}

// The lines of a value stand below each other; no text in it holds a line end.
void JsonDocument::Value(const Json& value) {
  std::u16string lines;
  for (const char16_t unit : platform::FromUtf8(value.dump(2))) {
    lines += unit;
    if (unit == u'\n') lines += m_indent;
  }
  m_out.Json(lines);
}

void JsonDocument::Members(const Json& object) {
  for (const auto& [name, value] : object.items()) {
    Next();
    m_out.Json(platform::FromUtf8(Json(name).dump()) + u": ");
    Value(value);
  }
}

void JsonDocument::BeginArray(const char* name) { Begin(name, u'[', u']'); }

void JsonDocument::BeginObject(const char* name) { Begin(name, u'{', u'}'); }

void JsonDocument::BeginElement() { Begin(nullptr, u'{', u'}'); }

void JsonDocument::Element(const Json& value) {
  Next();
  Value(value);
}

void JsonDocument::Text(const char* name, std::u16string_view text) {
  Next();
  m_out.Json(platform::FromUtf8(Json(name).dump()) + u": \"");
  while (!text.empty()) {
    constexpr std::size_t kPart = 1 << 14;
    std::size_t size = std::min(text.size(), kPart);
    if (size < text.size() && text[size - 1] >= 0xD800 && text[size - 1] <= 0xDBFF) --size;
    const std::string part = TextJson(text.substr(0, size)).dump();
    m_out.Json(platform::FromUtf8(std::string_view(part).substr(1, part.size() - 2)));
    text.remove_prefix(size);
  }
  m_out.Json(u"\"");
}

void JsonDocument::End() {
  m_indent.resize(m_indent.size() - 2);
  // An empty list stands on one line.
  if (!m_first) m_out.Json(u"\n" + m_indent);
  m_out.Json(std::u16string(1, m_open.back()));
  m_open.pop_back();
  m_first = false;
}

void JsonDocument::Finish() {
  while (!m_open.empty()) End();
  m_out.Line(u"");
}

}  // namespace zkusb
