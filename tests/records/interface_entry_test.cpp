#include "records/interface_entry.h"

#include <gtest/gtest.h>

namespace KelvoUHW {
namespace {

using Bytes = std::vector<std::uint8_t>;

TEST(SplitConfiguration, EndsWithTheBytesOrTheTotalLength) {
  const std::tuple<const char*, Bytes, std::vector<std::size_t>> cases[] = {
      {"a total below what came", {9, 2, 11, 0, 1, 1, 0, 0, 0, 3, 7, 7}, {9, 2}},
      {"a total that leaves one byte over", {9, 2, 10, 0, 1, 1, 0, 0, 0, 3, 7, 7}, {9}},
      {"a total within the first descriptor", {9, 2, 4, 0, 1, 1, 0, 0, 0, 3, 7, 7}, {4}},
      {"a total of nothing", {9, 2, 1, 0, 1, 1, 0, 0, 0}, {}},
      {"a total above what came", {9, 2, 255, 255, 1, 1, 0, 0, 0, 3, 7, 7}, {9, 3}},
      {"the high byte of the total counts", {9, 2, 0, 1, 1, 1, 0, 0, 0, 2, 7}, {9, 2}},
      {"too short to have a total", {2, 2, 3, 0, 7}, {2, 3}},
      {"no configuration first", {4, 5, 1, 0, 2, 7}, {4, 2}},
      {"length beyond the end", {2, 7, 200, 7, 1}, {2, 3}},
      {"length one", {2, 7, 1, 7, 2, 7}, {2}},
      {"length zero first", {0, 2, 9, 0}, {}}};
  for (const auto& [Name, Data, Sizes] : cases) {
    std::vector<std::size_t> sizes;
    const std::uint8_t* expected = Data.data();
    for (const RawDescriptor& one : SplitConfiguration(Data)) {
      EXPECT_EQ(one.data(), expected) << Name;
      sizes.push_back(one.size());
      expected += one.size();
    }
    EXPECT_EQ(sizes, Sizes) << Name;
  }
}

TEST(MakeInterfaceEntries, TakesWholeInterfacesAndOwnsThem) {
  StringDescriptorNode strings;
  strings.DescriptorIndex = 8;
  strings.LanguageID = 0x407;
  strings.StringDescriptor = {4, 3, 'x', 0};
  std::vector<InterfaceEntryPtr> entries;
  {
    const Bytes data = {9,  4, 0, 0, 0, 0, 0, 0, 8,                                // taken
                        11, 4, 1, 0, 0, 0, 0, 0, 9, 1, 2,                          // taken, no string
                        10, 4, 2, 0, 0, 0, 0, 0, 8, 0, 9, 5, 3, 0, 0, 0, 0, 0, 8,  // neither
                        9,  4, 4, 0, 0, 0, 0, 0};                                  // a byte is missing
    entries = MakeInterfaceEntries(SplitConfiguration(data), &strings);
  }
  ASSERT_EQ(entries.size(), 2u);
  EXPECT_EQ(entries[0]->Descriptor, (Bytes{9, 4, 0, 0, 0, 0, 0, 0, 8}));
  ASSERT_TRUE(entries[0]->String);
  EXPECT_EQ(std::tuple(entries[0]->String->LanguageID, entries[0]->String->Value), std::tuple(0x407, u"x"));
  EXPECT_EQ(std::tuple(entries[1]->Byte(2), entries[1]->Descriptor.size()), std::tuple(1, 11u));
  EXPECT_FALSE(entries[1]->String);
}

}  // namespace
}  // namespace KelvoUHW
