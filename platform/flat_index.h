// Hash tables in a few flat arrays. A PC with ten thousand devices is walked through several of
// them in every build; one heap node per entry would cost a cache miss per entry.
//
// One thread at a time may change them. Functions that add may throw std::bad_alloc and change
// nothing then.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/text.h"

namespace platform {

// Spreads the bits of a number over all of a hash.
inline std::size_t HashOf(std::uint64_t number) noexcept {
  number *= 0x9E3779B97F4A7C15u;  // 2^64 divided by the golden ratio
  return static_cast<std::size_t>(number ^ (number >> 32));
}
// Four units at a time: ids are hashed in every pass of a build.
inline std::size_t HashOf(std::u16string_view text) noexcept {
  constexpr std::uint64_t kFactor = 0xD6E8FEB86659FD93u;
  std::uint64_t hash = text.size() * kFactor;
  const auto add = [&hash](std::uint64_t units) {
    hash = (hash ^ units) * kFactor;
    hash ^= hash >> 29;
  };
  std::size_t at = 0;
  for (; at + 4 <= text.size(); at += 4) {
    std::uint64_t four;
    std::memcpy(&four, text.data() + at, sizeof four);
    add(four);
  }
  std::uint64_t rest = 0;
  for (; at < text.size(); ++at) rest = rest << 16 | text[at];
  add(rest);
  hash *= kFactor;  // a difference in the last units has to reach the lowest bits
  return static_cast<std::size_t>(hash ^ (hash >> 29));
}

// Finds entries by a key. The entries are the caller's and known by small numbers, as positions in
// an array; the index keeps neither entries nor keys, but asks `same(entry)` whether an entry has
// the key in question. Entries with one key keep the order in which they were added.
class FlatIndex {
 public:
  using Entry = std::uint32_t;
  static constexpr Entry kNone = std::numeric_limits<Entry>::max();

  FlatIndex() = default;
  FlatIndex(FlatIndex&& other) noexcept { *this = std::move(other); }
  FlatIndex& operator=(FlatIndex&& other) noexcept {
    m_slots = std::exchange(other.m_slots, {});
    m_links = std::exchange(other.m_links, {});
    m_used = std::exchange(other.m_used, 0);
    return *this;
  }

  // The first entry with the key, or kNone.
  template <class Same>
  Entry First(std::size_t hash, Same same) const noexcept {
    const std::size_t slot = SlotOf(hash, same);
    return slot == kNoSlot ? kNone : m_slots[slot].first;
  }
  // The next one with the same key, or kNone.
  Entry Next(Entry entry) const noexcept {
    return entry < m_links.size() ? m_links[entry].next : kNone;
  }

  // Makes room for so many keys at once: growing moves them all.
  void Reserve(std::size_t keys) {
    if (keys * 4 <= m_slots.size() * 3) return;
    std::size_t slots = std::max(m_slots.size(), kFewestSlots);
    while (keys * 4 > slots * 3) slots *= 2;
    Resize(slots);
  }

  // `entry` must not be in the index.
  template <class Same>
  void Add(std::size_t hash, Entry entry, Same same) {
    Reserve(m_used + 1);
    const std::size_t slot = SlotOf(hash, same);
    if (slot == kNoSlot) {
      if (entry < m_links.size()) m_links[entry] = {};
      Put({Folded(hash), entry, entry});
      ++m_used;
      return;
    }
    Slot& key = m_slots[slot];
    const std::size_t linked = std::max(entry, key.last) + std::size_t{1};
    if (m_links.size() < linked) m_links.resize(linked);
    m_links[entry] = {key.last, kNone};
    m_links[key.last].next = entry;
    key.last = entry;
  }

  // `same` must be true of `entry` itself.
  template <class Same>
  void Remove(std::size_t hash, Entry entry, Same same) noexcept {
    const std::size_t slot = SlotOf(hash, same);
    if (slot == kNoSlot) return;
    Slot& key = m_slots[slot];
    if (key.first == key.last) {
      Vacate(slot);
      return;
    }
    const Links links = m_links[entry];
    (links.previous == kNone ? key.first : m_links[links.previous].next) = links.next;
    (links.next == kNone ? key.last : m_links[links.next].previous) = links.previous;
  }

  void Clear() noexcept {
    m_slots.clear();
    m_links.clear();
    m_used = 0;
  }

 private:
  struct Slot {
    std::uint32_t hash = 0;
    Entry first = kNone;  // kNone: free
    Entry last = kNone;
  };
  struct Links {
    Entry previous = kNone;
    Entry next = kNone;
  };
  static constexpr std::size_t kNoSlot = std::numeric_limits<std::size_t>::max();
  static constexpr std::size_t kFewestSlots = 16;

  static std::uint32_t Folded(std::size_t hash) noexcept {
    return static_cast<std::uint32_t>(hash ^ (static_cast<std::uint64_t>(hash) >> 32));
  }
  // The number of slots is a power of two, and a quarter of them are free at least: fuller ones
  // make searches long, emptier ones spread a large table over more memory than the caches hold.
  std::size_t Mask() const noexcept { return m_slots.size() - 1; }

  template <class Same>
  std::size_t SlotOf(std::size_t hash, Same same) const noexcept {
    if (m_slots.empty()) return kNoSlot;
    const std::uint32_t folded = Folded(hash);
    for (std::size_t slot = folded & Mask(); m_slots[slot].first != kNone;
         slot = (slot + 1) & Mask()) {
      if (m_slots[slot].hash == folded && same(m_slots[slot].first)) return slot;
    }
    return kNoSlot;
  }

  void Put(const Slot& key) noexcept {
    std::size_t slot = key.hash & Mask();
    while (m_slots[slot].first != kNone) slot = (slot + 1) & Mask();
    m_slots[slot] = key;
  }

  // Moves back what stood further on because this slot was taken.
  void Vacate(std::size_t free) noexcept {
    --m_used;
    for (std::size_t slot = (free + 1) & Mask(); m_slots[slot].first != kNone;
         slot = (slot + 1) & Mask()) {
      const std::size_t wanted = m_slots[slot].hash & Mask();
      if (((slot - wanted) & Mask()) < ((slot - free) & Mask())) continue;
      m_slots[free] = m_slots[slot];
      free = slot;
    }
    m_slots[free] = {};
  }

  void Resize(std::size_t slots) {
    std::vector<Slot> old(slots);
    old.swap(m_slots);
    for (const Slot& key : old) {
      if (key.first != kNone) Put(key);
    }
  }

  std::vector<Slot> m_slots;
  std::vector<Links> m_links;  // by entry, as far as entries share keys; missing ones are empty
  std::size_t m_used = 0;
};

// A set of texts, which are the caller's: they stay where they are and do not change.
class FlatTextSet {
 public:
  // False where the text was in the set already.
  bool Insert(std::u16string_view text) {
    const std::size_t hash = HashOf(text);
    if (First(hash, text) != FlatIndex::kNone) return false;
    m_texts.push_back(text);
    m_index.Add(hash, static_cast<FlatIndex::Entry>(m_texts.size() - 1),
                [&](auto entry) { return SameText(m_texts[entry], text); });
    return true;
  }
  bool Contains(std::u16string_view text) const noexcept {
    return First(HashOf(text), text) != FlatIndex::kNone;
  }

 private:
  FlatIndex::Entry First(std::size_t hash, std::u16string_view text) const noexcept {
    return m_index.First(hash, [&](auto entry) { return SameText(m_texts[entry], text); });
  }

  std::vector<std::u16string_view> m_texts;
  FlatIndex m_index;
};

// A set of numbers other than 0.
class FlatNumberSet {
 public:
  // False where the number was in the set already.
  bool Insert(std::uint32_t number) {
    if ((m_used + 1) * 4 > m_slots.size() * 3) Grow();
    std::uint32_t& slot = m_slots[PlaceOf(number)];
    if (slot == number) return false;
    slot = number;
    ++m_used;
    return true;
  }

 private:
  static constexpr std::size_t kFewestSlots = 16;

  std::size_t PlaceOf(std::uint32_t number) const noexcept {
    const std::size_t mask = m_slots.size() - 1;
    std::size_t place = HashOf(number) & mask;
    while (m_slots[place] != 0 && m_slots[place] != number) place = (place + 1) & mask;
    return place;
  }

  void Grow() {
    std::vector<std::uint32_t> old(m_slots.empty() ? kFewestSlots : m_slots.size() * 2);
    old.swap(m_slots);
    for (const std::uint32_t number : old) {
      if (number != 0) m_slots[PlaceOf(number)] = number;
    }
  }

  std::vector<std::uint32_t> m_slots;  // a power of two of them, a quarter free
  std::size_t m_used = 0;
};

}  // namespace platform
