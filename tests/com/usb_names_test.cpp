#include "com/usb_names.h"

#include <gtest/gtest.h>

#include <fstream>
#include <set>
#include <string>

#include "com/vendor_table.h"
#include "platform/text.h"

namespace KelvoUHW {
namespace {

using platform::ToUtf8;

constexpr VendorRow kOddVendors[] = {
#include "odd_vendors.inc"
};

// The rows are those of the data file, read here without the generator.
void ExpectRowsOf(const std::string& file, std::span<const VendorRow> rows) {
  std::ifstream in(ZKUSB_SOURCE_DIR "/" + file, std::ios::binary);
  std::string line;
  for (const VendorRow& row : rows) {
    ASSERT_TRUE(std::getline(in, line)) << row.Id;
    EXPECT_EQ(row.Id, std::stoul(line.substr(0, 4), nullptr, 16)) << line;
    EXPECT_EQ(ToUtf8(row.Name), line.substr(5)) << line;
  }
  EXPECT_FALSE(std::getline(in, line)) << "more rows in the file: " << line;
}

TEST(VendorName, KnowsExactlyTheRowsOfTheFile) {
  const auto table = VendorTable();
  ASSERT_EQ(table.size(), 891u);
  EXPECT_EQ(table.back().Id, 0);
  EXPECT_EQ(table.back().Name, u"End");
  ExpectRowsOf("data/usb-vendors.tsv", table.first(890));
  ExpectRowsOf("tests/com/odd-vendors.tsv", kOddVendors);

  auto row = table.begin();  // ids ascend, so one walk meets them all
  for (unsigned id = 0; id <= 0xFFFF; ++id) {
    const auto name = VendorName(static_cast<std::uint16_t>(id));
    const bool known = id != 0 && id == row->Id;
    EXPECT_EQ(name.has_value(), known) << id;
    EXPECT_EQ(name.value_or(u""), known ? row++->Name : u"") << id;
  }
  EXPECT_EQ(VendorName(0x6A75), u"Shanghai Jujo Electronics Co., Ltd.");
  EXPECT_EQ(VendorName(0x8086), u"Intel Corporation");
}

TEST(UsbNames, OfChosenNumbers) {
  struct {
    std::u16string_view Got, Expected;
  } const cases[] = {
      {UsbClassName(0x00), u"Device: Use class information in the Interface Descriptors"},
      {UsbClassName(0x04), u"Unknown"},
      {UsbClassName(0x0E), u"Interface: Video"},
      {UsbClassName(0xFF), u"Device&Interface: Vendor Specific"},
      {UsbSubClassName(0x01, 0x03), u"MIDI Streaming"},
      {UsbSubClassName(0x08, 0x03), u""},
      {UsbSubClassName(0x08, 0x06), u"SCSI transparent"},
      {UsbProtocolName(0x03, 0xFF, 0x02), u"Mouse"},
      {UsbProtocolName(0x08, 0x77, 0x50), u"Bulk-Only Transport"},
      {UsbProtocolName(0xEF, 0x03, 0x01), u"Cable Based Association Framework"},
      {UsbProtocolName(0xFE, 0x03, 0x00), u"USB Test and Measurement Device"},
      {ConnectionStatusName(0), u"NoDeviceConnected"},
      {ConnectionStatusName(5), u"DeviceNotEnoughPower"},
      {ConnectionStatusName(6), u"(unknown)"},
      {ConnectionStatusName(0xFFFFFFFF), u"(unknown)"},
  };
  for (const auto& c : cases) EXPECT_EQ(ToUtf8(c.Got), ToUtf8(c.Expected));
}

// How many numbers have a name at all: any subclass counts 256 times.
TEST(UsbNames, NothingElseHasAName) {
  int classes = 0, subClasses = 0, protocols = 0, noProtocols = 0;
  for (unsigned i = 0; i <= 0xFFFFFF; ++i) {
    const auto a = static_cast<std::uint8_t>(i >> 16), b = static_cast<std::uint8_t>(i >> 8);
    const auto c = static_cast<std::uint8_t>(i);
    if (b == 0 && c == 0) classes += UsbClassName(a) != u"Unknown";
    if (c == 0) subClasses += !UsbSubClassName(a, b).empty();
    const bool mayHaveProtocols = a >= 0x03 && a != 0xFF;
    (mayHaveProtocols ? protocols : noProtocols) += !UsbProtocolName(a, b, c).empty();
  }
  EXPECT_EQ(classes, 18);
  EXPECT_EQ(subClasses, 9);
  EXPECT_EQ(protocols, 8 * 256 + 9);
  EXPECT_EQ(noProtocols, 0);
}

}  // namespace
}  // namespace KelvoUHW
