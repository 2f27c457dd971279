#include "simulation/machine/json_reader.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <filesystem>
#include <fstream>
#include <system_error>

#include "platform/text.h"
#include "simulation/machine/machine_file.h"

namespace platform::simulated {
namespace {

constexpr std::size_t kMostBytes = std::size_t{64} << 20;
constexpr std::size_t kMostLevels = 16;
// A document takes many times the memory of its bytes where these are all small values.
constexpr std::size_t kMostValues = 2'000'000;
constexpr std::size_t kMostShown = 250;

bool IsContinuation(char byte) { return (static_cast<unsigned char>(byte) & 0xC0) == 0x80; }

// Fit for one line of a message: no control characters, cut when very long.
std::string Printable(std::string_view utf8) {
  std::size_t length = std::min(utf8.size(), kMostShown);
  while (length > 0 && length < utf8.size() && IsContinuation(utf8[length])) --length;
  std::string shown(utf8.substr(0, length));
  std::replace_if(
      shown.begin(), shown.end(),
      [](char byte) { return static_cast<unsigned char>(byte) < 0x20 || byte == 0x7F; }, '?');
  return length < utf8.size() ? shown + "..." : shown;
}

std::string MemberPlace(const std::string& object, std::string_view name) {
  return (object.empty() ? "" : object + ".") + Printable(name);
}

std::string ElementPlace(const std::string& list, std::size_t index) {
  return list + "[" + std::to_string(index) + "]";
}

// "line L, column C" of a byte; columns count characters.
std::string LineAndColumn(std::string_view bytes, std::size_t offset) {
  const std::string_view before = bytes.substr(0, std::min(offset, bytes.size()));
  const std::size_t newline = before.rfind('\n');
  const std::string_view line =
      newline == std::string_view::npos ? before : before.substr(newline + 1);
  const auto lines = std::count(before.begin(), before.end(), '\n');
  const auto characters =
      std::count_if(line.begin(), line.end(), [](char byte) { return !IsContinuation(byte); });
  return "line " + std::to_string(lines + 1) + ", column " + std::to_string(characters + 1);
}

// "; expected WHAT" at the end of the parser's message, where it is the parser's: the text last
// read stands before it and may look the same.
std::string ExpectedPart(std::string_view reason) {
  static constexpr std::array<std::string_view, 11> kNames = {"'['",
                                                              "'{'",
                                                              "']'",
                                                              "'}'",
                                                              "':'",
                                                              "','",
                                                              "end of input",
                                                              "string literal",
                                                              "number literal",
                                                              "'[', '{', or a literal",
                                                              "object key"};
  for (const std::string_view name : kNames) {
    std::string part("; expected ");
    part += name;
    if (reason.ends_with("'" + part)) return part;
  }
  return {};
}

// What is left of the parser's message without its number, its position and the text it last read,
// which may be a whole malformed string.
std::string ParserReason(std::string_view what) {
  const std::size_t position = what.find(", column ");
  const std::size_t start =
      position == std::string_view::npos ? what.find("] ") : what.find(": ", position);
  std::string reason(start == std::string_view::npos ? what : what.substr(start + 2));
  if (const std::size_t last = reason.find("; last read: "); last != std::string::npos) {
    const std::string expected = ExpectedPart(reason);
    reason.resize(last);
    reason += expected;
  }
  return ToUtf8(FromUtf8(reason));
}

// Builds the document. The parser works without recursion, and so does this; the limit of levels
// bounds what destroys and prints documents.
class DocumentBuilder final : public nlohmann::json_sax<Json> {
 public:
  DocumentBuilder(std::string_view bytes, const FileReport& file) : m_bytes(bytes), m_file(file) {}

  Json Take() { return std::move(m_root); }

  bool null() override { return Put(nullptr); }
  bool boolean(bool value) override { return Put(value); }
  bool number_integer(number_integer_t value) override { return Put(value); }
  bool number_unsigned(number_unsigned_t value) override { return Put(value); }
  bool number_float(number_float_t value, const string_t&) override { return Put(value); }
  bool string(string_t& value) override { return Put(std::move(value)); }
  bool binary(binary_t&) override { return false; }  // JSON text has none
  bool start_object(std::size_t) override { return Enter(Json::object()); }
  bool start_array(std::size_t) override { return Enter(Json::array()); }
  bool end_object() override { return Leave(); }
  bool end_array() override { return Leave(); }

  bool key(string_t& name) override {
    Json& object = *m_open.back();
    if (object.contains(name)) FailAt(m_file, PlaceOfOpen(), "two members " + Quoted(name));
    object[name] = nullptr;
    m_keys.back() = name;
    return true;
  }

  bool parse_error(std::size_t position, const std::string&,
                   const nlohmann::detail::exception& error) override {
    // The position counts the bytes read, the offending one included.
    FailAt(m_file, LineAndColumn(m_bytes, position == 0 ? 0 : position - 1),
           ParserReason(error.what()));
  }

 private:
  Json* Add(Json&& value) {
    if (++m_values > kMostValues)
      FailAt(m_file, PlaceOfOpen(), "the file has more than 2000000 values");
    if (m_open.empty()) {
      m_root = std::move(value);
      return &m_root;
    }
    Json& parent = *m_open.back();
    if (parent.is_array()) {
      parent.push_back(std::move(value));
      return &parent.back();
    }
    Json& member = parent[m_keys.back()];
    member = std::move(value);
    return &member;
  }

  bool Put(Json&& value) {
    Add(std::move(value));
    return true;
  }

  bool Enter(Json&& container) {
    Json* added = Add(std::move(container));
    if (m_open.size() == kMostLevels) {
      FailAt(m_file, PlaceOfOpen(), "is nested too deeply (at most 16 levels)");
    }
    m_open.push_back(added);
    m_keys.emplace_back();
    return true;
  }

  bool Leave() {
    m_open.pop_back();
    m_keys.pop_back();
    return true;
  }

  std::string PlaceOfOpen() const {
    std::string place;
    for (std::size_t level = 0; level + 1 < m_open.size(); ++level) {
      place = m_open[level]->is_array() ? ElementPlace(place, m_open[level]->size() - 1)
                                        : MemberPlace(place, m_keys[level]);
    }
    return place;
  }

  std::string_view m_bytes;
  const FileReport& m_file;
  Json m_root;
  std::size_t m_values = 0;
  std::vector<Json*> m_open;  // stays valid: only the innermost container grows
  std::vector<std::string> m_keys;
};

std::optional<std::int64_t> HexNumber(std::string_view text) {
  if (!text.starts_with("0x") || text.size() < 3 || text.size() > 10) return std::nullopt;
  text.remove_prefix(2);
  std::uint32_t number = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, 16);
  if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return number;
}

}  // namespace

std::string ReadFileBytes(const std::string& path) {
  const auto fail = [&path] {
    const std::error_code error(errno, std::generic_category());
    throw MachineFileError(path + ": cannot be read: " + error.message());
  };
  // The path is UTF-8 on every system.
  std::ifstream file(std::filesystem::path(std::u8string(path.begin(), path.end())),
                     std::ios::binary);
  if (!file) fail();
  std::string bytes;
  std::string block(std::size_t{1} << 16, '\0');
  while (file.read(block.data(), static_cast<std::streamsize>(block.size())) || file.gcount() > 0) {
    bytes.append(block, 0, static_cast<std::size_t>(file.gcount()));
    if (bytes.size() > kMostBytes) {
      throw MachineFileError(path + ": cannot be read: it has more than 64 MiB");
    }
  }
  if (file.bad()) fail();
  return bytes;
}

Json ParseJson(std::string_view bytes, const FileReport& file) {
  // The parser takes a zero byte for the end of the text.
  if (const std::size_t zero = bytes.find('\0'); zero != std::string_view::npos) {
    FailAt(file, LineAndColumn(bytes, zero), "unexpected zero byte");
  }
  DocumentBuilder builder(bytes, file);
  Json::sax_parse(bytes, &builder);
  return builder.Take();
}

void FailAt(const FileReport& file, const std::string& place, const std::string& reason) {
  throw MachineFileError(file.Name() + ": " + (place.empty() ? "(file)" : place) + ": " + reason);
}

std::string Quoted(std::string_view utf8) { return std::string("\"") += Printable(utf8) + "\""; }
std::string Quoted(std::u16string_view text) { return Quoted(ToUtf8(text)); }

JsonValue::JsonValue(const Json& json, const FileReport& file, std::string place)
    : m_json(&json), m_file(&file), m_place(std::move(place)) {}

void JsonValue::Fail(const std::string& reason) const { FailAt(*m_file, m_place, reason); }

const std::string& JsonValue::AsUtf8() const {
  if (!m_json->is_string()) Fail("must be a text");
  const std::string& text = m_json->get_ref<const std::string&>();
  if (text.find('\0') != std::string::npos) Fail("must not hold a zero character");
  return text;
}

Text JsonValue::AsText() const { return FromUtf8(AsUtf8()); }

std::string JsonValue::AsBytes() const {
  std::string bytes;
  for (const char16_t unit : AsText()) {
    if (unit > 0xFF) Fail("must be a text of 8-bit characters");
    bytes += static_cast<char>(static_cast<unsigned char>(unit));
  }
  return bytes;
}

bool JsonValue::AsBool() const {
  if (!m_json->is_boolean()) Fail("must be true or false");
  return m_json->get<bool>();
}

std::int64_t JsonValue::AsNumber(std::int64_t least, std::int64_t most) const {
  std::optional<std::int64_t> number;
  if (m_json->is_string()) {
    number = HexNumber(AsUtf8());
    if (!number) Fail("must be a number, or a text of 0x and one to eight hexadecimal digits");
  } else if (!m_json->is_number()) {
    Fail("must be a number");
  } else if (m_json->is_number_unsigned()) {
    const auto value = m_json->get<std::uint64_t>();
    if (value <= std::uint64_t{std::numeric_limits<std::int64_t>::max()}) {
      number = static_cast<std::int64_t>(value);
    }
  } else if (m_json->is_number_integer()) {
    number = m_json->get<std::int64_t>();
  } else if (const double value = m_json->get<double>(); value > -0x1p63 && value < 0x1p63) {
    Fail("must be a whole number, without point and exponent");
  }
  if (number && *number >= least && *number <= most) return *number;
  const std::string shown = m_json->is_string() ? m_json->get<std::string>() : m_json->dump();
  Fail(shown + " does not fit (" + std::to_string(least) + " to " + std::to_string(most) + ")");
}

std::size_t JsonValue::AsChoice(std::initializer_list<const char*> names) const {
  if (m_json->is_string()) {
    const auto* found = std::find(names.begin(), names.end(), AsUtf8());
    if (found != names.end()) return static_cast<std::size_t>(found - names.begin());
  }
  std::string reason = "must be one of ";
  for (const char* name : names) {
    reason += (name == *names.begin() ? "" : ", ") + Quoted(std::string_view(name));
  }
  Fail(reason);
}

std::vector<JsonValue> JsonValue::AsList() const {
  if (!m_json->is_array()) Fail("must be a list");
  std::vector<JsonValue> elements;
  elements.reserve(m_json->size());
  for (const Json& element : *m_json) {
    elements.emplace_back(element, *m_file, ElementPlace(m_place, elements.size()));
  }
  return elements;
}

JsonObject::JsonObject(const JsonValue& value) : m_value(value) {
  if (!value.Raw().is_object()) value.Fail("must be an object");
}

std::optional<JsonValue> JsonObject::Find(const char* name) {
  m_known.emplace_back(name);
  const auto member = m_value.Raw().find(name);
  if (member == m_value.Raw().end()) return std::nullopt;
  return JsonValue(*member, m_value.File(), PlaceOf(name));
}

std::string JsonObject::PlaceOf(std::string_view name) const {
  return MemberPlace(m_value.Place(), name);
}

void JsonObject::Finish() const {
  for (const auto& [name, member] : m_value.Raw().items()) {
    if (name == "filledIn") {
      m_value.File().Try([this] { CheckFilledIn(); });
    } else if (std::find(m_known.begin(), m_known.end(), name) == m_known.end()) {
      m_value.File().Try(
          [this, &unknown = name] { m_value.Fail("unknown member " + Quoted(unknown)); });
    }
  }
  for (const std::string& missing : m_missing) {
    m_value.File().Try([&] { FailAt(m_value.File(), PlaceOf(missing), "is missing"); });
  }
}

void JsonObject::CheckFilledIn() const {
  const JsonValue list(m_value.Raw().at("filledIn"), m_value.File(), PlaceOf("filledIn"));
  for (const JsonValue& element : list.AsList()) {
    const std::string name = ToUtf8(element.AsText());
    if (name == "filledIn" || !m_value.Raw().contains(name)) {
      element.Fail("this object has no member " + Quoted(name));
    }
  }
}

}  // namespace platform::simulated
