#include "com/usb_names.h"

#include <gtest/gtest.h>

#include <fstream>
#include <map>
#include <string>
#include <vector>

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
  EXPECT_TRUE(table.back().Id == 0 && table.back().Name == u"End");
  ExpectRowsOf("data/usb-vendors.tsv", table.first(890));
  ExpectRowsOf("tests/com/odd-vendors.tsv", kOddVendors);

  auto row = table.begin();  // ids ascend, so one walk meets them all
  for (unsigned id = 0; id <= 0xFFFF; ++id) {
    const auto name = VendorName(static_cast<std::uint16_t>(id));
    const bool known = id != 0 && id == row->Id;
    EXPECT_EQ(name.has_value(), known) << id;
    EXPECT_EQ(name.value_or(u""), known ? row++->Name : u"") << id;
  }
}

// Each name with the first number that has it, "x" and how many numbers do if several.
template <class NameOf>
std::string AllNames(unsigned end, NameOf nameOf) {
  std::map<std::u16string_view, unsigned> times;
  std::vector<std::pair<std::u16string, std::u16string_view>> names;
  for (unsigned number = 0; number < end; ++number) {
    const std::u16string_view name =
        nameOf(number, static_cast<std::uint8_t>(number >> 8), static_cast<std::uint8_t>(number));
    if (name.empty() || name == u"Unknown") continue;
    if (++times[name] == 1) names.emplace_back(platform::Hex(number), name);
  }
  std::string text;
  for (const auto& [number, name] : names) {
    text += ToUtf8(number) + (times[name] == 1 ? "" : "x" + std::to_string(times[name])) + " " + ToUtf8(name) + "; ";
  }
  return text;
}

TEST(UsbNames, AreExactlyThese) {
  using Byte = std::uint8_t;
  EXPECT_EQ(AllNames(0x100, [](unsigned, Byte, Byte c) { return UsbClassName(c); }),
            "0 Device: Use class information in the Interface Descriptors; 1 Interface: Audio; "
            "2 Device&Interface: Communications and CDC Control; 3 Interface: HID; 5 Interface: Physical; "
            "6 Interface: Image; 7 Interface: Printer; 8 Interface: Mass Storage; 9 Device: Hub; "
            "A Interface: CDC-Data; B Interface: Smart Card; D Interface: Content Security; E Interface: Video; "
            "DC Device&Interface: Diagnostic Device; E0 Interface: Wireless Controller; "
            "EF Device&Interface: Miscellaneous; FE Interface: Application Specific; "
            "FF Device&Interface: Vendor Specific; ");
  EXPECT_EQ(UsbClassName(4), u"Unknown");
  EXPECT_EQ(AllNames(0x10000, [](unsigned, Byte b, Byte c) { return UsbSubClassName(b, c); }),
            "101 Audio Control; 102 Audio Streaming; 103 MIDI Streaming; 301 Boot interface; "
            "801 Reduced Block Command (RBC); 802 SFF-8020i, MMC-2 (ATAPI); 804 UFI; 805 SFF-8070i; "
            "806 SCSI transparent; ");
  // A protocol of any subclass counts 256 times.
  EXPECT_EQ(
      AllNames(0x1000000, [](unsigned n, Byte b, Byte c) { return UsbProtocolName(static_cast<Byte>(n >> 16), b, c); }),
      "30001x256 Keyboard; 30002x256 Mouse; "
      "80000x256 Control/Bulk/Interrupt (with command completion interrupt); "
      "80001x256 Control/Bulk/Interrupt (with no command completion interrupt); "
      "80050x256 Bulk-Only Transport; 90000x256 Full speed Hub; 90001x256 Hi-speed hub with single TT; "
      "90002x256 Hi-speed hub with multiple TTs; EF0101 Active Sync device; EF0102 Palm Sync; "
      "EF0201 Interface Association Descriptor; "
      "EF0202 Wire Adapter Multifunction Peripheral programming interface; "
      "EF0301 Cable Based Association Framework; FE0101 Device Firmware Upgrade; "
      "FE0200 IRDA Bridge device; FE0300 USB Test and Measurement Device; "
      "FE0301 USB Test and Measurement Device conforming to the USBTMC USB488; ");
  EXPECT_EQ(AllNames(0x100, [](unsigned n, Byte, Byte) { return ConnectionStatusName(n); }),
            "0 NoDeviceConnected; 1 DeviceConnected; 2 DeviceFailedEnumeration; 3 DeviceGeneralFailure; "
            "4 DeviceCausedOvercurrent; 5 DeviceNotEnoughPower; 6x250 (unknown); ");
  EXPECT_EQ(ConnectionStatusName(0xFFFFFFFF), u"(unknown)");
}

}  // namespace
}  // namespace KelvoUHW
