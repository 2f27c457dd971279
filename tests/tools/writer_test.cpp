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
  const struct {
    std::u16string text;
    std::string line;
  } cases[] = {
      {u"\\\\?\\Volume{1}\\", "\\\\?\\Volume{1}\\\n"},
      {u"\x1B[2J\r\n\t", "\\x1B[2J\\x0D\\x0A\\x09\n"},
      {std::u16string(u"a\0b", 3), "a\\x00b\n"},
      {u"\x7F\x80\x9F\xA0", "\\x7F\\x80\\x9F\u00A0\n"},
      {u"\u202Egnp.exe\u2069\u2028\u200F", "\\u202Egnp.exe\\u2069\\u2028\\u200F\n"},
      {u"Gerät \U0001F5B4", "Gerät \U0001F5B4\n"},
      {std::u16string(1, char16_t{0xD83D}) + u"!", "\uFFFD!\n"},
  };
  for (const auto& [text, line] : cases) {
    EXPECT_EQ(Written([shown = text](Writer& out) { out.Line(shown); }), line);
  }
  const nlohmann::ordered_json json = {{"a", "\x1B\x7F\xC2\x9B\xE2\x80\xAE\n"}};
  const std::string written = Written([&](Writer& out) { out.Json(json, false); });
  EXPECT_EQ(written, "{\"a\":\"\\u001b\\u007f\\u009b\\u202e\\n\"}\n");
  EXPECT_EQ(nlohmann::ordered_json::parse(written), json);
  EXPECT_EQ(Written([](Writer& out) { out.Verbatim(u"\x1B\r\n"); }), "\x1B\r\n");
}

TEST(Writer, FitsALineIntoItsColumns) {
  const auto repeated = [](std::u16string_view text, std::size_t times) {
    std::u16string all;
    for (std::size_t i = 0; i < times; ++i) all += text;
    return all;
  };
  const std::u16string disk = u"\U0001F5B4";
  const struct {
    std::u16string head, middle, tail;
    std::string line;
  } cases[] = {
      {u"head ", u"middle", u" tail", "head middle tail\n"},
      {repeated(u"h", 30), repeated(u"m", 40), repeated(u"t", 10),
       std::string(30, 'h') + std::string(40, 'm') + std::string(10, 't') + "\n"},
      {repeated(u"h", 30), repeated(u"m", 41), repeated(u"t", 10),
       std::string(30, 'h') + std::string(39, 'm') + "…" + std::string(10, 't') + "\n"},
      {repeated(u"h", 60), u"Mass Storage Device", u" tail",
       std::string(60, 'h') + "Mass Storage D… tail\n"},
      // No blank is left in front of the ellipsis.
      {repeated(u"h", 61), u"Mass Storage Device", u" tail",
       std::string(61, 'h') + "Mass Storage… tail\n"},
      // The tail stays as long as there is room for the ellipsis.
      {repeated(u"h", 73), u"middle", u"tail", std::string(73, 'h') + "mi…tail\n"},
      {repeated(u"h", 75), u"middle", u"tail", std::string(75, 'h') + "…tail\n"},
      {repeated(u"h", 76), u"middle", u"tail", std::string(76, 'h') + "mid…\n"},
      {repeated(u"h", 100), u"", u"", std::string(79, 'h') + "…\n"},
      // Columns are code points, and an escaped character has four.
      {u"", repeated(disk, 80), u"", std::string()},
      {u"", repeated(u"\x1B", 20), u"", std::string()},
  };
  for (const auto& [head, middle, tail, line] : cases) {
    const std::string written =
        Written([&, h = head, m = middle, t = tail](Writer& out) { out.FittedLine(h, m, t); });
    if (!line.empty()) {
      EXPECT_EQ(written, line);
    } else {
      EXPECT_EQ(written.find("…"), std::string::npos) << written;
    }
  }
}

TEST(Writer, TidiesPadding) {
  EXPECT_EQ(Tidied(u"  USB   SanDisk 3.2Gen1  "), u"USB SanDisk 3.2Gen1");
  EXPECT_EQ(Tidied(u"    "), u"");
}

}  // namespace
}  // namespace zkusb
