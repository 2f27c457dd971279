#include "records/descriptor_dump.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <set>

#include "platform/text.h"
#include "tests/support/golden.h"

namespace KelvoUHW {
namespace {

using Bytes = std::vector<std::uint8_t>;
using testing::HasSubstr;
using testing_support::Golden;

constexpr char kUnknown[] = "\r\nUnknown Descriptor:\r\n";

// The dump of a configuration and of its interfaces.
std::string Dump(const Bytes& bytes, const StringDescriptorNode* strings = nullptr, std::u16string_view prefix = u"") {
  const auto descriptors = SplitConfiguration(bytes);
  std::u16string out;
  DumpConfiguration(descriptors, strings, prefix, out);
  for (const auto& entry : MakeInterfaceEntries(descriptors, strings)) DumpInterface(*entry, prefix, out);
  return platform::ToUtf8(out);
}

// The dump of one descriptor, whatever its length byte says.
std::string One(const Bytes& bytes) {
  const RawDescriptor one = bytes;
  std::u16string out;
  DumpConfiguration({&one, 1}, nullptr, u"", out);
  return platform::ToUtf8(out);
}

std::vector<std::string> Lines(std::string_view text) {
  std::vector<std::string> lines;
  for (std::size_t end; (end = text.find("\r\n")) != text.npos; text.remove_prefix(end + 2)) {
    lines.emplace_back(text.substr(0, end));
  }
  EXPECT_EQ(text, "");
  return lines;
}

// The prefix stands before a line end that begins a text, and inside the bmAttributes line.
TEST(DescriptorDump, WritesEveryLineAndOfACutOneWhatWasReceived) {
  const Bytes whole = {9,  2,    69,   0, 3, 1, 4,    0xE0, 50,                   //
                       9,  4,    0,    2, 1, 8, 6,    0x50, 4,                    //
                       11, 4,    1,    0, 0, 4, 0,    0,    0,    2,    1,        //
                       12, 0x21, 0x11, 1, 9, 2, 0x22, 65,   0,    0x23, 7,    1,  //
                       7,  5,    0x8A, 3, 8, 2, 10,                               //
                       9,  5,    0x02, 1, 8, 0, 0x34, 0x12, 0x83,                 //
                       12, 0x24, 1,    2, 3, 4, 5,    6,    7,    8,    0xAB, 0xCD};
  StringDescriptorNode strings;
  strings.DescriptorIndex = 4;
  strings.LanguageID = 0x409;
  strings.StringDescriptor = {6, 3, 'U', 0, 'S', 0};
  const std::string full = Dump(whole, &strings, u"|");
  EXPECT_EQ(full, Golden("configuration-descriptors"));
  EXPECT_GT(full.size(), 1000u);
  const std::vector<std::string> all = Lines(full);
  const std::set<std::string> known(all.begin(), all.end());
  std::size_t before = 2;
  for (std::size_t n = 0; n <= whole.size(); ++n) {
    // Memory of exactly n bytes, where the address sanitizer sees a read behind them.
    const auto some = Lines(Dump(Bytes(whole.begin(), whole.begin() + static_cast<int>(n)), &strings, u"|"));
    EXPECT_GE(some.size(), before) << n;
    before = some.size();
    for (const std::string& line : some) {
      // The bytes of an unknown descriptor are the only line that may end early.
      EXPECT_TRUE(known.contains(line) || line.find_first_not_of("0123456789ABCDEF ") == line.npos) << n << " " << line;
    }
  }
  EXPECT_EQ(before, all.size());
}

TEST(DescriptorDump, BitsAndLengthsThatLie) {
  const std::pair<Bytes, const char*> cases[] = {
      {{9, 2, 9, 0, 1, 1, 0, 0x00, 255}, "0x00 ()\r\nMaxPower:             0xFF (510 Ma)\r\n"},
      {{9, 2, 9, 0, 1, 1, 0, 0xA0, 0}, "0xA0 (Bus Powered Remote Wakeup)\r\n"},
      {{7, 5, 0x80, 0x3C, 8, 0, 1}, "0x80  IN\r\nTransfer Type:        Control\r\n"},
      {{7, 5, 0x7F, 0x02, 8, 0, 1}, "0x7F  OUT\r\nTransfer Type:        Bulk\r\n"},
      // Ends with the bytes, in the middle of the second of 255 entries.
      {{10, 0x21, 0, 1, 0, 255, 0x22, 5, 0, 0x24},
       "0xFF\r\nbDescriptorType:      0x22\r\nwDescriptorLength:  0x0005\r\n"
       "bDescriptorType:      0x24\r\nEnd ConfigDesc"},
      // Ends with its count.
      {{12, 0x21, 0x11, 1, 9, 1, 0x22, 65, 0, 0x23, 7, 1}, "wDescriptorLength:  0x0041\r\nEnd ConfigDesc"},
      {{0, 5}, "bDescriptorType:      0x05\r\nbLength:              0x00\r\nEnd ConfigDesc"},
      {{1, 5, 7}, "bLength:              0x01\r\n01 \r\nEnd ConfigDesc"},
      {{}, "ConfigDesc :::\r\nEnd ConfigDesc"},
  };
  for (const auto& [descriptor, text] : cases) EXPECT_THAT(One(descriptor), HasSubstr(text));

  const std::pair<std::uint8_t, std::set<unsigned>> types[] = {
      {1, {}}, {2, {9}}, {4, {9, 11}}, {5, {7, 9}}, {0x21, {9, 10, 11, 12, 255}}};
  for (const auto& [type, known] : types) {
    for (const unsigned length : {0u, 1u, 2u, 6u, 7u, 8u, 9u, 10u, 11u, 12u, 255u}) {
      const bool unknown = One({static_cast<std::uint8_t>(length), type}).find(kUnknown) != std::string::npos;
      EXPECT_EQ(unknown, !known.contains(length)) << unsigned{type} << " " << length;
    }
  }
}

TEST(DescriptorDump, UnknownBytesStandSixteenToALine) {
  for (const std::size_t received : {2u, 15u, 16u, 17u, 20u, 32u, 33u}) {
    Bytes bytes(received, 0xEE);
    bytes[0] = 255;
    std::string expected = "bLength:              0xFF\r\nFF ";
    for (std::size_t i = 1; i < received; ++i) expected += i % 16 == 0 ? "\r\nEE " : "EE ";
    EXPECT_THAT(One(bytes), HasSubstr(expected + "\r\nEnd ConfigDesc"));
  }
}

std::string ConnectionText(const platform::ConnectionInformationEx& record) {
  std::u16string out;
  DumpConnectionInformation(record, u"-", out);
  return platform::ToUtf8(out);
}

TEST(ConnectionDump, WritesTheDeviceThePortAndTheOpenPipes) {
  platform::ConnectionInformationEx record{};
  EXPECT_EQ(ConnectionText(record), "-ConnectionStatus: NoDeviceConnected\r\n");
  record.Info = {1, {18, 1, 0x0200, 9, 1, 2, 64, 0x46D, 0xC018, 0x4301, 1, 2, 3, 4}, 5, 2, 1, 0x107, 1, 1};
  // It says 9 bytes: its last two come from the place behind the descriptor.
  record.PipeList[0] = {{9, 5, 0x81, 3, 8, 10}, 0x0000BBAA};
  EXPECT_EQ(ConnectionText(record), Golden("connection-information"));
}

TEST(ConnectionDump, TakesNoNumberFromTheRecordAtItsWord) {
  struct {
    std::uint32_t Pipes, Status;
    std::uint8_t Speed;
    std::size_t Endpoints;
    std::set<std::string> Lines;
  } const cases[] = {
      {0, 2, 0, 0, {"-ConnectionStatus: DeviceFailedEnumeration", "-Device Bus Speed:     Low"}},
      {30, 5, 1, 30, {"-Open Pipes:             30", "-Device Bus Speed:     Full"}},
      {31, 6, 3, 30, {"-ConnectionStatus: (unknown)", "-Device Bus Speed:     Unknown"}},
      {~0u, ~0u, 255, 30, {"-Open Pipes:             -1", "-Device Bus Speed:     Unknown"}},
  };
  for (const auto& c : cases) {
    // On the heap, where a read behind the 365 bytes is seen.
    const auto record = std::make_unique<platform::ConnectionInformationEx>();
    record->Info.NumberOfOpenPipes = c.Pipes;
    record->Info.ConnectionStatus = c.Status;
    record->Info.Speed = c.Speed;
    record->PipeList.back().EndpointDescriptor.bLength = 9;
    const auto lines = Lines(ConnectionText(*record));
    // With a bLength of 0, too, an endpoint is shown in the long form.
    EXPECT_EQ(std::ranges::count(lines, "-bSyncAddress:         0x00"), c.Endpoints);
    for (const std::string& line : c.Lines) EXPECT_EQ(std::ranges::count(lines, line), 1) << line;
  }
}

}  // namespace
}  // namespace KelvoUHW
