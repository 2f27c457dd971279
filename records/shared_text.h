// Texts that many records have alike: one copy serves all of them.
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/flat_index.h"

namespace KelvoUHW {

// A text that does not change, and that its copies share. Different objects may be used by
// different threads even where they share a text.
class SharedText {
 public:
  SharedText() noexcept = default;
  // A text of its own, shared with nobody yet. May throw std::bad_alloc.
  SharedText(std::u16string_view text)
      : m_text(text.empty() ? nullptr : std::make_shared<const std::u16string>(text)) {}
  SharedText(const std::u16string& text) : SharedText(std::u16string_view(text)) {}
  SharedText(const char16_t* text) : SharedText(std::u16string_view(text)) {}

  // Both are valid until this object is assigned to.
  operator std::u16string_view() const noexcept {
    return m_text ? std::u16string_view(*m_text) : std::u16string_view();
  }
  const char16_t* c_str() const noexcept { return m_text ? m_text->c_str() : u""; }
  bool empty() const noexcept { return !m_text; }
  void clear() noexcept { m_text.reset(); }

  friend bool operator==(const SharedText& a, std::u16string_view b) noexcept {
    return std::u16string_view(a) == b;
  }

 private:
  std::shared_ptr<const std::u16string> m_text;  // null: empty
};

// Gives equal texts one copy. One thread at a time; lives as long as texts are handed out, which
// outlive it.
class SharedTexts {
 public:
  // May throw std::bad_alloc.
  SharedText Of(std::u16string_view text) {
    const std::size_t hash = platform::HashOf(text);
    const auto same = [&](auto entry) { return platform::SameText(m_texts[entry], text); };
    const auto known = m_index.First(hash, same);
    if (known != platform::FlatIndex::kNone) return m_texts[known];
    m_texts.push_back(text);
    m_index.Add(hash, static_cast<platform::FlatIndex::Entry>(m_texts.size() - 1), same);
    return m_texts.back();
  }

 private:
  std::vector<SharedText> m_texts;
  platform::FlatIndex m_index;
};

}  // namespace KelvoUHW
