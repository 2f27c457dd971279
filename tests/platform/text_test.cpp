#include "platform/text.h"

#include <gtest/gtest.h>

#include <limits>

namespace platform {
namespace {

TEST(Case, PairsMapToEachOther) {
#ifdef _WIN32
  GTEST_SKIP() << "the mapping is the system's, which tests/windows compares";
#endif
  EXPECT_EQ(ToUpper(u'\x03C2'), u'\x03A3') << "final sigma is raised";
  EXPECT_EQ(ToLower(u'\x03C2'), u'\x03C2');
  unsigned raised = 0, raisedBack = 0, sum = 0;
  for (unsigned unit = 0; unit < 0x10000; ++unit) {
    const auto lowered = ToLower(static_cast<char16_t>(unit));
    raised += lowered == unit ? 0 : 1;
    raisedBack += ToUpper(static_cast<char16_t>(unit)) == unit ? 0 : 1;
    sum += lowered == unit ? 0 : unit * lowered;
    ASSERT_TRUE(lowered == unit || ToUpper(lowered) == unit) << std::hex << unit;
  }
  EXPECT_EQ(raised, 531u) << "letters of which the upper one is lowered";
  EXPECT_EQ(raisedBack, 532u) << "and the final sigma";
  EXPECT_EQ(sum, 0x7998CACAu)
      << "of upper by lower, over the one-to-one pairs of these scripts in the tables of Unicode";
}

TEST(Texts, CasePartsAndReplacement) {
  EXPECT_EQ(ToUpper(std::u16string_view(u"usb\0äß", 6)), std::u16string_view(u"USB\0Äß", 6));
  EXPECT_TRUE(EqualIgnoringCase(u"Straße", u"STRAßE"));
  EXPECT_FALSE(EqualIgnoringCase(u"abc", u"ab"));
  EXPECT_FALSE(EqualIgnoringCase(u"{", u"["));
  EXPECT_EQ(Replaced(u"a/b//c", u'/', u'\\'), u"a\\b\\\\c");
  EXPECT_EQ(UpToZero(std::u16string_view(u"ab\0cd\0", 6)), u"ab");
  EXPECT_EQ(UpToZero(std::u16string_view(u"\0ab", 3)), u"");
  // Many units are looked at together; 0x100 has a byte that is zero.
  for (const std::size_t size : {std::size_t{63}, std::size_t{64}, std::size_t{200}}) {
    for (std::size_t zero = 0; zero <= size; ++zero) {
      std::u16string text(size, u'\x100');
      if (zero < size) text[zero] = u'\0';
      if (zero + 1 < size) text[size - 1] = u'\0';
      EXPECT_EQ(UpToZero(text).size(), zero) << size;
    }
  }
}

TEST(Texts, Numbers) {
  const Guid guid = {0x3869C27A, 0x31B8, 0x01E8, {0x9B, 0x02, 0xEC, 0xF4, 0xBB, 0x48, 0x7F, 0x0D}};
  const std::u16string kCases[][2] = {{Hex(0), u"0"},
                                      {Hex(0xC52B, 4), u"C52B"},
                                      {Hex(0xFFFFFFFF, 4), u"FFFFFFFF"},
                                      {HexLower(0xA, 2), u"0a"},
                                      {Decimal(0), u"0"},
                                      {Decimal(-1, 4), u"  -1"},
                                      {Decimal(12345, 2), u"12345"},
                                      {Decimal(std::numeric_limits<std::int32_t>::min()), u"-2147483648"},
                                      {GuidText(guid), u"{3869C27A-31B8-01E8-9B02-ECF4BB487F0D}"},
                                      {GuidText(kNullGuid), u"{00000000-0000-0000-0000-000000000000}"}};
  for (const auto& [text, expected] : kCases) EXPECT_EQ(text, expected);
}

TEST(Utf8, RoundTripsAndReplacesWhatIsMalformed) {
  const std::pair<std::u16string_view, std::string_view> kCases[] = {
      {u"", ""},
      {u"USB", "USB"},
      {u"\x7F\x80\x7FF\x800", "\x7F\xC2\x80\xDF\xBF\xE0\xA0\x80"},
      {u"\xFFFD\xFFFF", "\xEF\xBF\xBD\xEF\xBF\xBF"},
      {u"\xD800\xDC00\xDBFF\xDFFF", "\xF0\x90\x80\x80\xF4\x8F\xBF\xBF"},
      {{u"a\0b", 3}, {"a\0b", 3}}};
  for (const auto& [text, bytes] : kCases) {
    EXPECT_EQ(ToUtf8(text), bytes);
    EXPECT_EQ(FromUtf8(bytes), text) << bytes;
  }
  EXPECT_EQ(ToUtf8(u"\xDE00\xD83D"), "\xEF\xBF\xBD\xEF\xBF\xBD");
  const std::pair<std::string_view, std::u16string_view> kMalformed[] = {
      {"\x80", u"\xFFFD"},                                // a continuation alone
      {"\xC3", u"\xFFFD"},                                // cut short
      {"\xE2\x82", u"\xFFFD\xFFFD"},                      // cut short
      {"\xC3z", u"\xFFFDz"},                              // what follows is not swallowed
      {"\xC0\x80", u"\xFFFD\xFFFD"},                      // longer than needed
      {"\xE0\x9F\xBF", u"\xFFFD\xFFFD\xFFFD"},            // longer than needed
      {"\xED\xA0\x80", u"\xFFFD\xFFFD\xFFFD"},            // a surrogate
      {"\xF4\x90\x80\x80", u"\xFFFD\xFFFD\xFFFD\xFFFD"},  // beyond the last code point
      {"\xFF", u"\xFFFD"}};
  for (const auto& [bytes, text] : kMalformed) EXPECT_EQ(FromUtf8(bytes), text) << bytes;
}

}  // namespace
}  // namespace platform
