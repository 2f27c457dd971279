#include "tree/usb_port_info.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <span>

namespace KelvoUHW {
namespace {

TEST(ConnectionRecord, BeginsAtZeroAndIsCounted) {
  const std::size_t live = ConnectionRecord::LiveCount(), kept = ConnectionRecord::KeptCount();
  // Memory that was not zero before.
  alignas(ConnectionRecord) unsigned char place[sizeof(ConnectionRecord)];
  std::fill(std::begin(place), std::end(place), static_cast<unsigned char>(0xAA));
  auto* const record = new (place) ConnectionRecord;
  const platform::ConnectionInformationEx& base = *record;
  const std::span bytes(reinterpret_cast<const unsigned char*>(&base), sizeof(base));
  EXPECT_EQ(std::ranges::count(bytes, 0), 365);
  EXPECT_EQ(ConnectionRecord::LiveCount(), live + 1);
  record->~ConnectionRecord();
  EXPECT_EQ(ConnectionRecord::LiveCount(), live);

  ConnectionRecord::KeepForProcessLife(nullptr);
  EXPECT_EQ(ConnectionRecord::KeptCount(), kept);
  // A leak checker that runs at the end of this program must find both of them.
  for (int i = 0; i < 2; ++i) ConnectionRecord::KeepForProcessLife(std::make_unique<ConnectionRecord>());
  EXPECT_EQ(ConnectionRecord::KeptCount(), kept + 2);
  EXPECT_EQ(ConnectionRecord::LiveCount(), live + 2);
}

TEST(StringDescriptor, TextEndsWithItsLengthOrTheBytes) {
  struct {
    std::vector<std::uint8_t> Bytes;
    std::u16string_view Text;
  } const cases[] = {
      {{}, u""},
      {{6}, u""},
      {{3, 3, 'A', 0}, u""},
      {{5, 3, 'A', 0, 'B', 0}, u"A"},
      {{6, 3, 0x34, 0x12, 'B', 0}, u"\u1234B"},
      {{200, 3, 'A', 0, 'B'}, u"A"},
  };
  for (const auto& c : cases) {
    StringDescriptorNode node;
    node.StringDescriptor = c.Bytes;
    EXPECT_TRUE(node.Text() == c.Text) << &c - cases;
  }
}

TEST(StringDescriptor, IsFoundByIndexAndTheFirstOneWins) {
  std::unique_ptr<StringDescriptorNode> head;
  for (const int index : {2, 1, 255, 2, 0}) {
    auto node = std::make_unique<StringDescriptorNode>();
    node->DescriptorIndex = static_cast<std::uint8_t>(index);
    node->Next = std::move(head);
    head = std::move(node);
  }
  EXPECT_EQ(FindStringDescriptor(head.get(), 2), head->Next.get());
  EXPECT_EQ(FindStringDescriptor(head.get(), 255), head->Next->Next.get());
  EXPECT_EQ(FindStringDescriptor(head.get(), 0), nullptr);
  EXPECT_EQ(FindStringDescriptor(head.get(), 3), nullptr);
  EXPECT_EQ(FindStringDescriptor(nullptr, 1), nullptr);

  // Taking a list apart may not need stack for each of its nodes.
  for (int i = 0; i < 1'000'000; ++i) {
    auto node = std::make_unique<StringDescriptorNode>();
    node->Next = std::move(head);
    head = std::move(node);
  }
  head.reset();
}

}  // namespace
}  // namespace KelvoUHW
