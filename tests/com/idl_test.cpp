// The IDL and the header that clients include, side by side: what is in both is read as text and compared line by line.
#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <regex>

namespace {

using Lines = std::vector<std::string>;

std::string Replaced(const std::string& text, const char* pattern, const char* by) {
  return std::regex_replace(text, std::regex(pattern), by);
}

// Without comments, on one line.
std::string Load(const std::string& file) {
  std::ifstream stream(ZKUSB_SOURCE_DIR "/" + file);
  std::string text;
  for (std::string line; std::getline(stream, line);) text += line.substr(0, line.find("//")) + ' ';
  return Replaced(text, "\\s+", " ");
}

// "A2AC77FD36C64C2A..." of a GUID in either spelling.
std::string Digits(const std::string& guid) { return Replaced(Replaced(guid, "0x", ""), "[^0-9A-F]", ""); }

// "ULONG nVendorId, BSTR* pVal" in either spelling, without blanks.
std::string Parameters(std::string text) {
  text = Replaced(Replaced(text, "\\[[^\\]]*\\]", ""), "\\benum ", "");
  text = Replaced(Replaced(text, "unsigned long", "ULONG"), "unsigned char", "BYTE");
  return Replaced(Replaced(text, "\\blong\\b", "LONG"), " ", "");
}

// Calls visit for each match, from the first on.
template <class Visit>
void ForEachMatch(const std::string& text, const char* pattern, Visit visit) {
  const std::regex expression(pattern);
  for (std::sregex_iterator match(text.begin(), text.end(), expression), end; match != end; ++match) visit(*match);
}

TEST(Idl, SaysWhatTheHeaderSays) {
  Lines header, idl;
  const char* const inHeader =
      R"(struct (\w+) : IUnknown \{ static constexpr IID kIid\{([^;]*);|virtual HRESULT STDMETHODCALLTYPE (\w+)\(([^)]*)\) = 0;)";
  ForEachMatch(Load("com/zkusb_monitor.h"), inHeader, [&](const std::smatch& m) {
    header.push_back(m[1].matched ? m.str(1) + " " + Digits(m.str(2)) : m.str(3) + " " + Parameters(m.str(4)));
  });
  const char* const inIdl =
      R"(uuid\(([^)]*)\)[^\]]*\] interface (\w+) : IUnknown|\[([^\]]*)\] HRESULT (\w+)\(([^;]*)\);)";
  ForEachMatch(Load("com/zkusb_monitor.idl"), inIdl, [&](const std::smatch& m) {
    const bool property = m.str(3).find("propget") != std::string::npos;
    idl.push_back(m[1].matched ? m.str(2) + " " + Digits(m.str(1))
                               : (property ? "get_" : "") + m.str(4) + " " + Parameters(m.str(5)));
  });
  EXPECT_EQ(idl, header);
  EXPECT_EQ(header.size(), 13u + 50u);  // interfaces and methods

  // Classes, the library and the event interface, whatever their order.
  const auto idsOf = [](const char* file, const char* pattern, std::size_t name, std::size_t guid) {
    Lines lines;
    ForEachMatch(Load(file), pattern,
                 [&](const std::smatch& m) { lines.push_back(m.str(name) + " " + Digits(m.str(guid))); });
    std::sort(lines.begin(), lines.end());
    return lines;
  };
  const Lines ids = idsOf("com/zkusb_monitor.h", "(?:LIBID|CLSID|DIID)_(\\w+)\\{([^;]*);", 1, 2);
  EXPECT_EQ(ids.size(), 4u);
  EXPECT_EQ(
      idsOf("com/zkusb_monitor.idl", "uuid\\(([^)]*)\\)[^\\]]*\\] (?:library|coclass|dispinterface) (\\w+)", 2, 1),
      ids);

  const auto values = [](const char* file) {
    Lines lines;
    ForEachMatch(Load(file), "enum (\\w+)|\\b(K\\w+ = \\d+)", [&](const std::smatch& m) {
      const std::string line = m[1].matched ? "enum " + m.str(1) : m.str(2);
      // Where it is only named, it is the one just defined or a parameter's.
      if (!m[1].matched || std::find(lines.begin(), lines.end(), line) == lines.end()) lines.push_back(line);
    });
    return lines;
  };
  EXPECT_EQ(values("com/zkusb_monitor.idl"), values("records/device_types.h"));
  EXPECT_EQ(values("records/device_types.h").size(), 2u + 12u);
}

}  // namespace
