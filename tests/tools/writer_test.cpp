#include "tools/zkusb/writer.h"

#include <gmock/gmock.h>

#include <functional>
#include <sstream>

namespace zkusb {
namespace {

std::string Written(const std::function<void(Writer&)>& write) {
  std::ostringstream stream;
  Writer writer(stream);
  write(writer);
  return stream.str();
}

TEST(Writer, EscapesWhatATerminalWouldObey) {
  const std::pair<std::u16string, std::string> cases[] = {
      {u"\\\\?\\Volume{1}\\", "\\\\?\\Volume{1}\\\n"},
      {u"\x1B[2J\r\n\t", "\\x1B[2J\\x0D\\x0A\\x09\n"},
      {std::u16string(u"a\0b", 3), "a\\x00b\n"},
      {u"\x7F\x80\x9F\xA0", "\\x7F\\x80\\x9F\u00A0\n"},
      {u"\u202Egnp.exe\u2069\u2028\u200F", "\\u202Egnp.exe\\u2069\\u2028\\u200F\n"},
      {u"\x1F \x7E\x061B\x061C\x061D\x200D\x200E\x2010\x2027\x202F\x2065\x2066\x206A",
       "\\x1F \x7E\u061B\\u061C\u061D\u200D\\u200E\u2010\u2027\u202F\u2065\\u2066\u206A\n"},
      {u"Gerät \U0001F5B4", "Gerät \U0001F5B4\n"},
      {std::u16string(1, char16_t{0xD83D}) + u"!", "\uFFFD!\n"},
  };
  for (const auto& [text, line] : cases) {
    EXPECT_EQ(Written([shown = text](Writer& out) { out.Line(shown); }), line);
  }
  const nlohmann::ordered_json json = {{"a", "\x1B\x7F\xC2\x9B\xE2\x80\xAE\n"}};
  const std::string written = Written([&](Writer& out) { out.JsonLine(json); });
  EXPECT_EQ(written, "{\"a\":\"\\u001b\\u007f\\u009b\\u202e\\n\"}\n");
  EXPECT_EQ(nlohmann::ordered_json::parse(written), json);
  EXPECT_EQ(Written([](Writer& out) { out.Verbatim(u"\x1B\r\n"); }), "\x1B\r\n");
}

TEST(Writer, FitsALineIntoItsColumns) {
  const auto times = [](std::size_t count, char16_t unit) { return std::u16string(count, unit); };
  std::u16string disks;
  while (disks.size() < 160) disks += u"\U0001F5B4";
  const std::tuple<std::u16string, std::u16string, std::u16string, std::string> cases[] = {
      {times(30, u'h'), u"middle", times(44, u't'), std::string(30, 'h') + "middle" + std::string(44, 't') + "\n"},
      {times(30, u'h'), u"middle", times(45, u't'), std::string(30, 'h') + "midd…" + std::string(45, 't') + "\n"},
      // No blank is left in front of the ellipsis.
      {times(61, u'h'), u"Mass Storage Device", u" tail", std::string(61, 'h') + "Mass Storage… tail\n"},
      // The tail stays as long as there is room for the ellipsis.
      {times(75, u'h'), u"middle", u"tail", std::string(75, 'h') + "…tail\n"},
      {times(76, u'h'), u"middle", u"tail", std::string(76, 'h') + "mid…\n"},
      {times(100, u'h'), u"", u"", std::string(79, 'h') + "…\n"},
      // Columns are code points, and an escaped character has four.
      {u"", disks, u"", ""},
      {u"", times(20, u'\x1B'), u"", ""},
  };
  for (const auto& [head, middle, tail, line] : cases) {
    const std::string written =
        Written([&, h = head, m = middle, t = tail](Writer& out) { out.SetColumns(80), out.FittedLine(h, m, t); });
    EXPECT_TRUE(line.empty() ? written.find("…") == written.npos : written == line) << written;
  }
  // Halves of pairs are columns of their own.
  const std::pair<std::u16string, std::size_t> counted[] = {{u"\xD800\xDC00\xDBFF\xDFFF", 2},
                                                            {u"\xD83Dx", 2},
                                                            {u"\xDC00\xDC00", 2},
                                                            {u"\xD800\xE000", 2},
                                                            {u"\xD800\xDBFF", 2},
                                                            {u"x\xD83D", 2},
                                                            {u"\xE000\xDC00", 2},
                                                            {u"\xD7FF\xDC00", 2}};
  for (const auto& [text, columns] : counted) {
    const auto fitted = [&, t = text](std::size_t into) {
      return Written([&](Writer& out) { out.SetColumns(into), out.FittedLine(t, u"", u""); });
    };
    EXPECT_EQ(fitted(columns).find("…"), std::string::npos) << testing::PrintToString(text);
    EXPECT_NE(fitted(columns - 1).find("…"), std::string::npos) << testing::PrintToString(text);
  }
  // In parts, and never within a pair.
  for (const std::size_t before : {65534u, 65535u, 65536u}) {
    EXPECT_EQ(Written([&](Writer& out) { out.Verbatim(times(before, u'x') + u"\U0001F5B4y"); }),
              std::string(before, 'x') + "\U0001F5B4y");
  }
  EXPECT_EQ(Tidied(u"  USB   SanDisk 3.2Gen1  "), u"USB SanDisk 3.2Gen1");
  EXPECT_EQ(Tidied(u"    "), u"");
}

}  // namespace
}  // namespace zkusb
