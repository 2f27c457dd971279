#include "recorder/replacements.h"

#include <algorithm>

#include "platform/text.h"

namespace recorder {
namespace {

constexpr std::size_t kGuidChars = 38;
constexpr int kMostTries = 10'000;

// Without vowels no word comes about, and none of those by which the component tells buses.
constexpr std::u16string_view kLetters = u"bcdfghjklmnpqrstvwxz";
constexpr std::u16string_view kHexLetters = u"bcdf";

bool IsDigit(char16_t unit) noexcept { return unit >= u'0' && unit <= u'9'; }
bool IsLetter(char16_t unit) noexcept {
  const char16_t lowered = platform::ToLower(unit);
  return (lowered >= u'a' && lowered <= u'z') || unit >= 0x80;
}

bool IsHexText(std::u16string_view text) {
  return std::all_of(text.begin(), text.end(), [](char16_t unit) {
    return !IsLetter(unit) || (platform::ToLower(unit) >= u'a' && platform::ToLower(unit) <= u'f');
  });
}

std::u16string_view FirstWord(std::u16string_view text) noexcept {
  const auto end = std::find_if_not(text.begin(), text.end(), IsWordUnit);
  return text.substr(0, static_cast<std::size_t>(end - text.begin()));
}

Text InCaseOf(std::u16string_view model, Text text) {
  for (std::size_t i = 0; i < text.size() && i < model.size(); ++i) {
    if (platform::ToLower(model[i]) != model[i]) text[i] = platform::ToUpper(text[i]);
  }
  return text;
}

}  // namespace

bool IsWordUnit(char16_t unit) noexcept { return IsDigit(unit) || IsLetter(unit); }

std::size_t CountWordUnits(std::u16string_view text) noexcept {
  return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), IsWordUnit));
}

std::u16string_view TrimmedToWords(std::u16string_view text) noexcept {
  while (!text.empty() && !IsWordUnit(text.front())) text.remove_prefix(1);
  while (!text.empty() && !IsWordUnit(text.back())) text.remove_suffix(1);
  return text;
}

std::size_t GuidLength(std::u16string_view text) {
  return platform::ParseGuid(text.substr(0, kGuidChars)) ? kGuidChars : 0;
}

Text Replacements::Make(const Text& secret) {
  const std::u16string_view letters = IsHexText(secret) ? kHexLetters : kLetters;
  Text made;
  for (int tries = 0; tries < kMostTries; ++tries) {
    made = secret;
    for (char16_t& unit : made) {
      if (IsDigit(unit)) {
        unit = static_cast<char16_t>(u'0' + m_series() % 10);
      } else if (IsLetter(unit)) {
        unit = letters[m_series() % letters.size()];
      }
    }
    if (made != secret && !m_replacements.contains(made) && !m_used.contains(made)) break;
  }
  return made;
}

bool Replacements::Add(std::u16string_view secret) {
  const Text lowered = platform::ToLower(secret);
  if (CountWordUnits(lowered) == 0 || m_replacements.contains(lowered)) return false;
  Add(lowered, Make(lowered));
  return true;
}

void Replacements::Add(std::u16string_view secret, const Text& replacement) {
  Text lowered = platform::ToLower(secret);
  const Text other = platform::ToLower(replacement);
  if (!m_replacements.emplace(lowered, other).second) return;
  m_used.insert(other);
  m_byFirstWord.emplace(Text(FirstWord(lowered)), std::move(lowered));
}

bool Replacements::Has(std::u16string_view text) const {
  return m_replacements.contains(platform::ToLower(text));
}

Text Replacements::Of(std::u16string_view text) const {
  const auto found = m_replacements.find(platform::ToLower(text));
  return found == m_replacements.end() ? Text(text) : InCaseOf(text, found->second);
}

Text Replacements::In(std::u16string_view text) const {
  const Text lowered = platform::ToLower(text);
  Text out;
  std::size_t at = 0;
  const auto copy = [&](std::size_t units) {
    out += text.substr(at, units);
    at += units;
  };
  while (at < text.size()) {
    const std::u16string_view rest = std::u16string_view(lowered).substr(at);
    if (const std::size_t guid = GuidLength(rest); guid != 0) {
      out += Of(text.substr(at, guid));
      at += guid;
      continue;
    }
    const std::u16string_view word = FirstWord(rest);
    if (word.empty()) {
      copy(1);
      continue;
    }
    std::size_t longest = 0;
    const auto [begin, end] = m_byFirstWord.equal_range(Text(word));
    for (auto entry = begin; entry != end; ++entry) {
      const Text& secret = entry->second;
      const bool whole = rest.starts_with(secret) &&
                         (rest.size() == secret.size() || !IsWordUnit(rest[secret.size()]));
      if (whole) longest = std::max(longest, secret.size());
    }
    if (longest != 0) {
      out += Of(text.substr(at, longest));
      at += longest;
    } else {
      copy(word.size());
    }
  }
  return out;
}

}  // namespace recorder
