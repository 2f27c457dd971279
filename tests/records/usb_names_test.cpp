#include "records/usb_names.h"

#include <map>
#include <vector>

#include "platform/text.h"
#include "records/vendor_table.h"
#include "tests/support/cases.h"
#include "tests/support/golden.h"

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
  ExpectRowsOf("tests/records/odd-vendors.tsv", kOddVendors);

  auto row = table.begin();  // ids ascend, so one walk meets them all
  for (unsigned id = 0; id <= 0xFFFF; ++id) {
    const auto name = VendorName(static_cast<std::uint16_t>(id));
    const bool known = id != 0 && id == row->Id;
    EXPECT_EQ(name.has_value(), known) << id;
    EXPECT_EQ(name.value_or(u""), known ? row++->Name : u"") << id;
  }
}

// Each name with the first number that has it, "x" and how many numbers do if several. Of the numbers that begin with
// a byte without a class `some` leaves out most.
template <class NameOf>
std::string AllNames(unsigned end, NameOf nameOf, bool some = false) {
  std::map<std::u16string_view, unsigned> times;
  std::vector<std::pair<std::u16string, std::u16string_view>> names;
  for (unsigned number = 0; number < end; ++number) {
    if (some && number % 0x10000 == 0x100 && UsbClassName(static_cast<std::uint8_t>(number >> 16)) == u"Unknown") {
      number |= 0xFFFF;
      continue;
    }
    const std::u16string_view name =
        nameOf(number, static_cast<std::uint8_t>(number >> 8), static_cast<std::uint8_t>(number));
    if (name.empty() || name == u"Unknown") continue;
    if (++times[name] == 1) names.emplace_back(platform::Hex(number), name);
  }
  std::string text;
  for (const auto& [number, name] : names) {
    text += ToUtf8(number) + (times[name] == 1 ? "" : "x" + std::to_string(times[name])) + " " + ToUtf8(name) + "\n";
  }
  return text;
}

TEST(UsbNames, AreExactlyThese) {
  using Byte = std::uint8_t;
  std::string names = "classes\n" + AllNames(0x100, [](unsigned, Byte, Byte c) { return UsbClassName(c); });
  names += "subclasses\n" + AllNames(0x10000, [](unsigned, Byte b, Byte c) { return UsbSubClassName(b, c); });
  // A protocol of any subclass counts 256 times.
  const auto protocol = [](unsigned n, Byte b, Byte c) { return UsbProtocolName(static_cast<Byte>(n >> 16), b, c); };
  names += "protocols\n" + AllNames(0x1000000, protocol, !testing_support::EveryCase());
  names += "connection statuses\n" + AllNames(0x100, [](unsigned n, Byte, Byte) { return ConnectionStatusName(n); });
  EXPECT_EQ(names, testing_support::Golden("usb-names"));
  EXPECT_EQ(UsbClassName(4), u"Unknown");
  EXPECT_EQ(ConnectionStatusName(0xFFFFFFFF), u"(unknown)");
}

}  // namespace
}  // namespace KelvoUHW
