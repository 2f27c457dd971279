#include "platform/flat_index.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <random>
#include <string>
#include <unordered_set>

namespace platform {
namespace {

// Against lists of entries by key. Few hashes for many keys, so that keys stand in each other's
// places and removal has to move them.
TEST(FlatIndex, AnswersAsListsByKeyDo) {
  constexpr std::uint32_t kEntries = 600;
  constexpr unsigned kKeys = 150;
  for (const std::size_t hashes : {std::size_t{1}, std::size_t{7}, std::size_t{kKeys}}) {
    std::mt19937 random(1);
    std::vector<unsigned> keyOf(kEntries);
    for (unsigned& key : keyOf) key = static_cast<unsigned>(random() % kKeys);
    std::vector<std::vector<std::uint32_t>> lists(kKeys);
    FlatIndex index;
    const auto hashOf = [&](unsigned key) { return HashOf(key % hashes); };
    const auto has = [&](unsigned key) { return [&keyOf, key](std::uint32_t entry) { return keyOf[entry] == key; }; };
    for (int step = 0; step < 6000; ++step) {
      if (step % 1000 == 999) {
        FlatIndex taken = std::move(index);
        EXPECT_EQ(index.First(hashOf(0), has(0)), FlatIndex::kNone);
        index = std::move(taken);
        index.Reserve(static_cast<std::size_t>(step) / 10);  // keeps what is there, whatever its size
      }
      const auto entry = static_cast<std::uint32_t>(random() % kEntries);
      const unsigned key = keyOf[entry];
      const auto place = std::ranges::find(lists[key], entry);
      if (place == lists[key].end()) {
        index.Add(hashOf(key), entry, has(key));
        lists[key].push_back(entry);
      } else {
        index.Remove(hashOf(key), entry, has(key));
        lists[key].erase(place);
      }
      const auto asked = static_cast<unsigned>(random() % kKeys);
      std::vector<std::uint32_t> found;
      for (std::uint32_t each = index.First(hashOf(asked), has(asked)); each != FlatIndex::kNone;
           each = index.Next(each)) {
        found.push_back(each);
      }
      ASSERT_EQ(found, lists[asked]) << hashes << " hashes, step " << step;
    }
    index.Clear();
    for (unsigned key = 0; key < kKeys; ++key) EXPECT_EQ(index.First(hashOf(key), has(key)), FlatIndex::kNone);
  }
}

TEST(FlatSets, HoldEachTextAndNumberOnce) {
  std::mt19937 random(2);
  std::unordered_set<std::uint32_t> model;
  std::vector<std::u16string> texts;
  for (std::uint32_t number = 0; number < 500; ++number) {
    const std::string digits = std::to_string(number);
    texts.emplace_back(digits.begin(), digits.end());
  }
  FlatNumberSet numbers;
  FlatTextSet set;
  EXPECT_FALSE(set.Contains(texts[0]));
  for (int step = 0; step < 2000; ++step) {
    // Some far apart and some alike in their low bits.
    const auto at = static_cast<std::uint32_t>(random() % texts.size());
    const bool fresh = model.insert(at).second;
    EXPECT_EQ(set.Contains(texts[at]), !fresh);
    EXPECT_EQ(set.Insert(texts[at]), fresh);
    EXPECT_EQ(numbers.Insert((at + 1) << (at % 2 == 0 ? 0 : 20)), fresh) << at;
  }
  EXPECT_FALSE(set.Contains(u""));
}

}  // namespace
}  // namespace platform
