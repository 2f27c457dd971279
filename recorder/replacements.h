// Secrets and what stands in their place.
#pragma once

#include <cstdint>
#include <functional>
#include <random>
#include <string_view>
#include <unordered_map>
#include <unordered_set>

#include "simulation/machine/machine.h"

namespace recorder {

using platform::simulated::Text;

// Texts without regard to case. A replacement has the shape of its secret: a digit for each digit,
// a letter for each letter (of a hexadecimal text, a hexadecimal one), everything else as it is, in
// the case in which the secret stands where it is replaced. It says nothing of the secret but its
// shape: replacements come from a series that is the same for every PC. No two secrets share one,
// and none is a secret.
class Replacements {
 public:
  // True where the secret is new. One without letter and digit stays as it is and is not entered.
  bool Add(std::u16string_view secret);
  // With a replacement that the caller has made.
  void Add(std::u16string_view secret, const Text& replacement);

  bool Has(std::u16string_view text) const;
  // The replacement of a secret in the case of `text`; `text` itself where it is none.
  Text Of(std::u16string_view text) const;

  // Replaces each secret in the text that stands there whole, between letters and digits of others.
  // GUIDs in braces are one word: no part of one is replaced. Where secrets begin alike the longest
  // counts.
  Text In(std::u16string_view text) const;

  std::size_t Size() const noexcept { return m_replacements.size(); }

 private:
  Text Make(const Text& secret);

  std::unordered_map<Text, Text> m_replacements;      // lowered
  std::unordered_multimap<Text, Text> m_byFirstWord;  // lowered
  std::unordered_set<Text> m_used;                    // lowered
  std::mt19937 m_series{20};
};

// Letters and digits; whatever lies beyond ASCII is a letter.
bool IsWordUnit(char16_t unit) noexcept;
std::size_t CountWordUnits(std::u16string_view text) noexcept;
// Without what is neither letter nor digit at both ends.
std::u16string_view TrimmedToWords(std::u16string_view text) noexcept;
// The length of the GUID in braces that begins here, or 0.
std::size_t GuidLength(std::u16string_view text);

}  // namespace recorder
