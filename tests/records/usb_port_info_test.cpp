#include "records/usb_port_info.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <span>

#include "platform/text.h"

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
  EXPECT_LE(sizeof(ConnectionRecord), 384u);  // what each build keeps for a hub
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
  const std::pair<std::vector<std::uint8_t>, std::u16string_view> cases[] = {{{}, u""},
                                                                             {{6}, u""},
                                                                             {{3, 3, 'A', 0}, u""},
                                                                             {{5, 3, 'A', 0, 'B', 0}, u"A"},
                                                                             {{6, 3, 0x34, 0x12, 'B', 0}, u"\u1234B"},
                                                                             {{200, 3, 'A', 0, 'B'}, u"A"}};
  for (const auto& [bytes, text] : cases) {
    StringDescriptorNode node;
    node.StringDescriptor = bytes;
    EXPECT_TRUE(node.Text() == text) << platform::ToUtf8(text);
  }
}

// Taking a list apart may not need stack for each of its nodes.
TEST(StringDescriptor, IsFoundByIndexInAListOfAnyLength) {
  std::unique_ptr<StringDescriptorNode> head;
  for (int i = 0; i < 1'000'000; ++i) {
    auto node = std::make_unique<StringDescriptorNode>();
    node->DescriptorIndex = static_cast<std::uint8_t>(i % 200);
    node->Next = std::move(head);
    head = std::move(node);
  }
  EXPECT_EQ(FindStringDescriptor(head.get(), 199), head.get());  // the first of many
  EXPECT_EQ(FindStringDescriptor(head.get(), 198), head->Next.get());
  EXPECT_EQ(FindStringDescriptor(head.get(), 0), nullptr);
  EXPECT_EQ(FindStringDescriptor(head.get(), 200), nullptr);
  EXPECT_EQ(FindStringDescriptor(nullptr, 1), nullptr);
}

}  // namespace
}  // namespace KelvoUHW
