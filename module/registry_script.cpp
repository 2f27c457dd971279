#include "module/registry_script.h"

#include <algorithm>
#include <cstring>
#include <limits>
#include <utility>

#include "platform/registry.h"
#include "platform/text.h"

namespace KelvoUHW {
namespace {

using platform::EqualIgnoringCase;

constexpr std::u16string_view kBlanks = u" \t\r\n";

struct Token {
  enum class Kind : std::uint8_t { End, Word, Quoted, Unfinished };

  Kind kind = Kind::End;
  std::u16string text;

  bool IsWord(std::u16string_view word) const {
    return kind == Kind::Word && EqualIgnoringCase(text, word);
  }
  // A name or a text: not one of the marks, which have to be quoted to be one.
  bool IsText() const {
    return kind == Kind::Quoted ||
           (kind == Kind::Word && text != u"{" && text != u"}" && text != u"=");
  }
};

class Tokens {
 public:
  explicit Tokens(std::u16string_view text) : m_rest(text) { Advance(); }

  const Token& Current() const { return m_current; }
  Token Take() {
    Token token = std::exchange(m_current, {});
    Advance();
    return token;
  }
  bool TakeWord(std::u16string_view word) {
    if (!m_current.IsWord(word)) return false;
    Advance();
    return true;
  }

 private:
  void Advance() {
    m_current = {};
    m_rest.remove_prefix(std::min(m_rest.find_first_not_of(kBlanks), m_rest.size()));
    if (m_rest.empty()) return;
    if (m_rest.front() == u'\'') {
      m_current.kind = Token::Kind::Unfinished;
      m_rest.remove_prefix(1);
      while (!m_rest.empty()) {
        const char16_t unit = m_rest.front();
        m_rest.remove_prefix(1);
        if (unit == u'\'') {
          if (!m_rest.starts_with(u'\'')) {
            m_current.kind = Token::Kind::Quoted;
            return;
          }
          m_rest.remove_prefix(1);
        }
        m_current.text += unit;
      }
      return;
    }
    m_current.kind = Token::Kind::Word;
    m_current.text = m_rest.substr(0, m_rest.find_first_of(kBlanks));
    m_rest.remove_prefix(m_current.text.size());
  }

  std::u16string_view m_rest;
  Token m_current;
};

int DigitOf(char16_t unit) {
  const char16_t upper = platform::ToUpper(unit);
  if (upper >= u'0' && upper <= u'9') return upper - u'0';
  if (upper >= u'A' && upper <= u'F') return upper - u'A' + 10;
  return 16;
}

std::optional<std::uint32_t> NumberOf(std::u16string_view text) {
  std::uint64_t base = 10;
  if (EqualIgnoringCase(text.substr(0, 2), u"&H")) {
    base = 16;
    text.remove_prefix(2);
  }
  if (text.empty()) return std::nullopt;
  std::uint64_t number = 0;
  for (const char16_t unit : text) {
    const auto digit = static_cast<std::uint64_t>(DigitOf(unit));
    number = number * base + digit;
    if (digit >= base || number > std::numeric_limits<std::uint32_t>::max()) return std::nullopt;
  }
  return static_cast<std::uint32_t>(number);
}

std::optional<std::vector<std::uint8_t>> BytesOf(std::u16string_view digits) {
  if (digits.size() % 2 != 0) return std::nullopt;
  std::vector<std::uint8_t> bytes;
  for (std::size_t i = 0; i < digits.size(); i += 2) {
    const int high = DigitOf(digits[i]);
    const int low = DigitOf(digits[i + 1]);
    if (high > 15 || low > 15) return std::nullopt;
    bytes.push_back(static_cast<std::uint8_t>(high * 16 + low));
  }
  return bytes;
}

// The type and the text behind a "=".
std::optional<ScriptData> TakeData(Tokens& tokens) {
  const Token type = tokens.Take();
  if (!tokens.Current().IsText()) return std::nullopt;
  const std::u16string text = tokens.Take().text;
  ScriptData data;
  if (type.IsWord(u"s")) {
    data.type = platform::kREG_SZ;
    data.bytes.resize((text.size() + 1) * sizeof(char16_t));
    std::memcpy(data.bytes.data(), text.c_str(), data.bytes.size());
    return data;
  }
  if (type.IsWord(u"d")) {
    const auto number = NumberOf(text);
    if (!number) return std::nullopt;
    data.type = platform::kREG_DWORD;
    data.bytes.resize(sizeof *number);
    std::memcpy(data.bytes.data(), &*number, sizeof *number);
    return data;
  }
  if (!type.IsWord(u"b")) return std::nullopt;
  auto bytes = BytesOf(text);
  if (!bytes) return std::nullopt;
  data.type = platform::kREG_BINARY;
  data.bytes = std::move(*bytes);
  return data;
}

// One statement up to the brace that opens its block, which is told by `opensBlock`.
bool TakeStatement(Tokens& tokens, std::vector<ScriptStep>& steps, bool& opensBlock) {
  ScriptStep step;
  step.noRemove = tokens.TakeWord(u"NoRemove");
  step.forceRemove = !step.noRemove && tokens.TakeWord(u"ForceRemove");
  const bool plain = !step.noRemove && !step.forceRemove;
  if (plain && tokens.TakeWord(u"Delete")) {
    step.kind = ScriptStep::Kind::DeleteKey;
  } else if (!step.forceRemove && tokens.TakeWord(u"val")) {
    step.kind = ScriptStep::Kind::Value;
  } else {
    step.kind = ScriptStep::Kind::OpenKey;
  }
  const bool isValue = step.kind == ScriptStep::Kind::Value;
  if (!isValue) {
    // A second key word would otherwise be taken for the name of a key, and that key be deleted.
    for (const char16_t* word : {u"NoRemove", u"ForceRemove", u"Delete", u"val"}) {
      if (tokens.Current().IsWord(word)) return false;
    }
  }

  if (!tokens.Current().IsText()) return false;
  step.name = tokens.Take().text;
  // An empty name stands for the key above, which is not this script's to delete.
  if (!isValue && (step.name.empty() || step.name.find(u'\\') != step.name.npos)) return false;

  if (step.kind != ScriptStep::Kind::DeleteKey && tokens.TakeWord(u"=")) {
    step.data = TakeData(tokens);
    if (!step.data) return false;
  } else if (isValue) {
    return false;
  }
  const bool isKey = step.kind == ScriptStep::Kind::OpenKey;
  steps.push_back(std::move(step));
  opensBlock = isKey && tokens.TakeWord(u"{");
  if (isKey && !opensBlock) steps.push_back({});
  return true;
}

}  // namespace

std::optional<std::u16string> WithReplacements(std::u16string_view script,
                                               std::span<const Replacement> replacements) {
  std::u16string text;
  for (;;) {
    const std::size_t start = script.find(u'%');
    text += script.substr(0, start);
    if (start == script.npos) return text;
    const std::size_t end = script.find(u'%', start + 1);
    if (end == script.npos) return std::nullopt;
    const std::u16string_view name = script.substr(start + 1, end - start - 1);
    script.remove_prefix(end + 1);
    if (name.empty()) {
      text += u'%';
      continue;
    }
    const auto found =
        std::find_if(replacements.begin(), replacements.end(),
                     [&](const Replacement& entry) { return EqualIgnoringCase(entry.name, name); });
    if (found == replacements.end()) return std::nullopt;
    text += found->text;
  }
}

std::optional<std::vector<ScriptStep>> ParseRegistryScript(std::u16string_view script) {
  // The registry would take a name or a text only up to there.
  if (script.find(u'\0') != script.npos) return std::nullopt;
  std::vector<ScriptStep> steps;
  Tokens tokens(script);
  std::size_t depth = 0;
  while (depth != 0 || tokens.Current().kind != Token::Kind::End) {
    if (depth == 0) {
      if (!tokens.TakeWord(u"HKCR") && !tokens.TakeWord(u"HKEY_CLASSES_ROOT")) return std::nullopt;
      if (!tokens.TakeWord(u"{")) return std::nullopt;
      ++depth;
    } else if (tokens.TakeWord(u"}")) {
      if (--depth != 0) steps.push_back({});
    } else {
      bool opensBlock = false;
      if (!TakeStatement(tokens, steps, opensBlock)) return std::nullopt;
      if (opensBlock) ++depth;
    }
  }
  return steps;
}

}  // namespace KelvoUHW
