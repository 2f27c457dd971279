#include "records/identifiers.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <array>
#include <vector>

#include "platform/text.h"

namespace KelvoUHW {
namespace {

using platform::Guid, platform::ToUtf8;
using testing::ElementsAre;
using Chars = const char16_t*;

TEST(HexField, ScansWithinTheCount) {
  // Blanks use the count up as well; a 0x whose digit lies behind the count is no number, but a
  // count of 1 looks at the 0 alone; full-width digits are none.
  using Scan = std::pair<const char16_t*, std::size_t>;
  const std::vector<std::pair<std::uint32_t, std::vector<Scan>>> cases = {
      {0x046D, {{u"046D", 4}, {u"046D", 100}, {u"+46d&MI", 7}}},
      {0x04, {{u"046D", 2}, {u" 46D", 2}, {u"00000000000004", 14}}},
      {0x1F, {{u" \t\r\n\v\f1F", 8}, {u"+1F", 3}, {u"0x1F", 4}, {u"0X1Fg", 5}}},
      {0, {{u"0", 1}, {u"0x1F", 1}, {u"00x1", 4}, {u"-0", 2}}},
      {0xFFFFFFFF, {{u"-1", 2}, {u"FFFFFFFFFFF", 11}}},
      {0xFFFFFFF0, {{u"-10", 3}, {u" -0X10", 6}, {u"FFFFFFFF0", 9}}},
      {0x23456789, {{u"123456789", 9}}},
      {kUnknownId, {{u"046D", 0}, {u"", 5}, {u"G", 1}, {u"   1F", 3}, {u"-", 1}, {u"+-1", 3}, {u" -", 2}}},
      {kUnknownId, {{u"- 1", 3}, {u"0x", 2}, {u"0xG", 3}, {u"0x1F", 2}, {u"\uFF11", 1}, {u"  ", 2}}}};
  for (const auto& [value, scans] : cases) {
    for (const auto& [text, count] : scans) {
      // Without what stands behind the count, so that a sanitizer sees a read too far.
      const std::size_t withZero = std::u16string_view(text).size() + 1;
      const std::vector<char16_t> exact(text, text + std::min(count, withZero));
      EXPECT_EQ(ParseHexField(exact.data(), count), value) << ToUtf8(text) << count;
    }
  }
  EXPECT_EQ(ParseHexField(nullptr, 4), kUnknownId);
}

TEST(InstanceId, IsTakenApart) {
  // The record held 7, 8, "V", "P", "S" before; a value that shows them was not touched.
  constexpr std::uint32_t kNone = kUnknownId;
  const std::tuple<Chars, std::uint32_t, std::uint32_t, Chars, Chars, Chars> cases[] = {
      {u"USB\\VID_046D&PID_C52B&MI_00\\6&1A&0&0000", 0x046D, 0xC52B, u"V", u"P", u"6&1A&0&0000"},
      {u"USBSTOR\\DISK&VEN_X&PROD_Y&REV_1.00\\4C53&0", kNone, 8, u"X", u"Y&REV_1.00", u"4C53&0"},
      {u"PCI\\VEN_8086&DEV_1E31&SUBSYS_1E318086&REV_04\\3&11583659&0&A0", kNone, 8, u"8086", u"", u"S"},
      {u"", kNone, 8, u"", u"P", u"S"},
      {u"USB\\VID_046D\\1", kNone, 8, u"", u"P", u"S"},
      {u"USB\\VID_046D\\VEN_A&PROD_B\\1", 0x046D, kNone, u"V", u"P", u"S"},
      {u"VID_&PID_\\X", kNone, kNone, u"V", u"P", u"X"},
      {u"USB\\VID_1&PID_2\\", 1, 2, u"V", u"P", u"S"},
      {u"USB\\VID_1&PID_2", 1, kNone, u"V", u"P", u"S"},
      {u"PID_2\\VID_1&X", 1, kNone, u"V", u"P", u"S"},
      {u"A\\VEN_X&PROD_Y", kNone, 8, u"X", u"", u"S"},
      {u"A\\VEN_X&PROD_Y\\", kNone, 8, u"X", u"Y", u"S"},
      {u"VEN_&PROD_\\X", kNone, 8, u"", u"", u"X"}};
  for (const auto& [id, vendorId, productId, vendor, product, serial] : cases) {
    NodeIdentity node;
    node.m_nVendorId = 7;
    node.m_nProductId = 8;
    node.m_strVendor = u"V";
    node.m_strProduct = u"P";
    node.m_strSerialNumber = u"S";
    node.SetInstanceId(id);
    node.SetSerialNumber(u"");
    EXPECT_EQ(std::tie(node.m_strDevInstId, node.m_nVendorId, node.m_nProductId), std::tie(id, vendorId, productId));
    EXPECT_THAT((std::array{node.m_strVendor, node.m_strProduct, node.m_strSerialNumber}),
                ElementsAre(vendor, product, serial))
        << ToUtf8(id);
  }
}

constexpr std::array<std::uint8_t, 8> kNoBytes{}, kGoodBytes{0x12, 0x34, 0x56, 0x78, 0x9A, 0xBC, 0xDE, 0xF0};

TEST(GuidText, KeepsWhatStandsBeforeABreak) {
  const std::string text = "12345678-9ABC-DEF0-1234-56789ABCDEF0";
  for (std::size_t good = 0; good <= text.size(); ++good) {  // characters behind the brace that are right
    const auto value = [&](std::size_t from, std::size_t digits) {
      return good <= from ? 0 : std::stoul(text.substr(from, std::min(good - from, digits)), nullptr, 16);
    };
    const Guid expected{static_cast<std::uint32_t>(value(0, 8)), static_cast<std::uint16_t>(value(9, 4)),
                        static_cast<std::uint16_t>(value(14, 4)), good == text.size() ? kGoodBytes : kNoBytes};
    std::u16string whole = platform::FromUtf8("{" + text + "}");
    EXPECT_EQ(ParseGuidText(whole.substr(0, good + 1).c_str()), expected) << good;
    whole[good + 1] = u'G';
    EXPECT_EQ(ParseGuidText(whole.c_str()), expected) << good;
  }
}

TEST(GuidText, FollowsTheRulesOfAScan) {
  // Blanks do not count against a width, but against the place where a group must end.
  const std::tuple<Chars, std::uint32_t, std::uint16_t, std::uint16_t, bool> cases[] = {
      {u"x12345678-9ABC-DEF0-1234-56789ABCDEF0 more", 0x12345678, 0x9ABC, 0xDEF0, true},
      {u"{ 2345678-9ABC-DEF0-1234-56789ABCDEF0}", 0x2345678, 0x9ABC, 0xDEF0, true},
      {u"{ 12345678-9ABC-DEF0-1234-56789ABCDEF0}", 0x12345678, 0x9ABC, 0xDEF0, false},
      {u"{12345678 -9ABC-DEF0-1234-56789ABCDEF0}", 0x12345678, 0, 0, false},
      {u"{-2345678--ABC-DEF0-1234-56789ABCDEF0}", 0xFDCBA988, 0xF544, 0xDEF0, true},
      {u"{0x345678-0XBC-DEF0-1234-56789ABCDEF0}", 0x345678, 0xBC, 0xDEF0, true},
      {u"{12345678-0x-DEF0-1234-56789ABCDEF0}", 0x12345678, 0, 0, false},
      {u"{12345678-9ABC-DEF0-0x12-56789ABCDEF0}", 0x12345678, 0x9ABC, 0xDEF0, false},
      {u"{1234567-9ABC-DEF0-1234-56789ABCDEF0}", 0x1234567, 0x9ABC, 0xDEF0, false},
      {u"{12345678-9ABCD-EF0-1234-56789ABCDEF0}", 0x12345678, 0x9ABC, 0, false},
      {u"12345678-1234-5678-9ABC-DEF012345678", 0x2345678, 0x1234, 0x5678, false},
      {nullptr, 0, 0, 0, false}};
  for (const auto& [text, data1, data2, data3, whole] : cases) {
    EXPECT_EQ(ParseGuidText(text), (Guid{data1, data2, data3, whole ? kGoodBytes : kNoBytes}))
        << (text ? ToUtf8(text) : "null");
  }
  // A signed byte is the low byte of its number.
  EXPECT_THAT(ParseGuidText(u"{00000000-0000-0000--1+2-000000000000}").Data4, ElementsAre(0xFF, 2, 0, 0, 0, 0, 0, 0));
}

TEST(DerivedIds, ComeFromPathsAndVolumes) {
  const std::pair<Chars, Chars> paths[] = {
      {u"USB#ROOT_HUB20#4&2f5a2f0&0#{f18a0e88-c30c-11d0-8815-00a0c906bed8}", u"USB\\ROOT_HUB20\\4&2F5A2F0&0"},
      {u"\\\\?\\usb#vid_1#2#{g}", u"\\\\?\\USB\\VID_1\\2"},
      {u"\u00E4#", u"\u00C4"}};
  for (const auto& [path, id] : paths) EXPECT_EQ(InterfacePathToInstanceId(path), id);
  for (const char16_t* none : {u"#", u"usb\\x", u"", Chars()}) EXPECT_EQ(InterfacePathToInstanceId(none), u"");
  const std::pair<std::u16string, std::u16string> volumes[] = {
      {u"STORAGE\\VOLUME\\_??_USBSTOR#DISK&VEN_X#4C53&0#{53f56307-b6bf}", u"USBSTOR\\DISK&VEN_X\\4C53&0"},
      {u"_??_A#{B#{_??_C", u"A"},
      {u"_??_#{", u""}};
  for (const auto& [volume, disk] : volumes) EXPECT_EQ(DiskIdOfVolumeId(volume), disk);
  for (const auto* none : {u"_??#{", u"#{_??_A", u"_??_A#", u"A#{", u""})
    EXPECT_EQ(DiskIdOfVolumeId(none), std::nullopt);
}

TEST(PciHardwareId, NeedsAllFourNumbers) {
  const std::tuple<Chars, bool, std::uint32_t, std::uint32_t, std::uint32_t, std::uint32_t> cases[] = {
      {u"PCI\\VEN_8086&DEV_1E31&SUBSYS_1E318086&REV_04", true, 0x8086, 0x1E31, 0x1E318086, 4},
      {u"PCI\\VEN_ 8086&DEV_+1&SUBSYS_-1&REV_0x4Z", true, 0x8086, 1, 0xFFFFFFFF, 4},
      {u"PCI\\VEN_8086&DEV_1E31&SUBSYS_1&REV_", false, 0x8086, 0x1E31, 1, 0},
      {u"PCI\\VEN_8086 &DEV_1E31", false, 0x8086, 0, 0, 0},
      {u"pci\\VEN_8086&DEV_1E31&SUBSYS_1&REV_1", false, 0, 0, 0, 0},
      {nullptr, false, 0, 0, 0, 0}};
  for (const auto& [text, complete, vendor, device, subSys, revision] : cases) {
    const PciHardwareId id = ParsePciHardwareId(text);
    EXPECT_EQ(std::tie(id.Complete, id.VendorId, id.DeviceId, id.SubSysId, id.Revision),
              std::tie(complete, vendor, device, subSys, revision))
        << (text ? ToUtf8(text) : "null");
  }
}

TEST(Identifiers, ReadabilitySetsNoLimitToTheLength) {
  EXPECT_FALSE(IsReadableText(nullptr));
  const std::u16string padding(100'000, u'A');
  EXPECT_TRUE(IsReadableText(padding.c_str()));
  NodeIdentity node;
  node.SetInstanceId(padding + u"VID_046D&" + padding + u"PID_C52B\\" + padding + u"\\S1");
  EXPECT_THAT((std::array{node.m_nVendorId, node.m_nProductId}), ElementsAre(0x46D, 0xC52B));
  EXPECT_EQ(node.m_strSerialNumber, u"S1");
  EXPECT_EQ(InterfacePathToInstanceId((padding + u"#b#{c}").c_str()), padding + u"\\B");
}

}  // namespace
}  // namespace KelvoUHW
