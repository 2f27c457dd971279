#include "tests/tools/client.h"

namespace zkusb {
namespace {

// What stands between two texts.
std::string Between(const std::string& text, const std::string& before, const std::string& after) {
  const std::size_t from = text.find(before) + before.size();
  EXPECT_NE(text.find(before), text.npos);
  return text.substr(from, text.find(after, from) - from);
}

struct WrittenPage {
  ProgramResult result;
  std::string html;
  Json data;
};

WrittenPage WritePage(const Args& args) {
  const TemporaryFile file("");
  Args all{"page", file.Path()};
  all.insert(all.end(), args.begin(), args.end());
  WrittenPage page{RunClient(all), {}, {}};
  std::ifstream stream(file.Path(), std::ios::binary);
  page.html.assign(std::istreambuf_iterator<char>(stream), {});
  page.data =
      Json::parse(Between(page.html, "<script id=\"data\" type=\"application/json\">", "</script>"), nullptr, false);
  EXPECT_EQ(SchemaFault(page.data), "");
  return page;
}

TEST(PageCommand, HoldsWhatTheTreeHolds) {
  const std::string file = MachineFile("asus-b560");
  const WrittenPage page = WritePage({"--machine", file});
  EXPECT_EQ(page.result.code, kDone) << page.result.err;
  EXPECT_EQ(page.data.at("RootNode"), JsonOutput({"tree", "--machine", file}).at("RootNode"));
  EXPECT_EQ(page.data.at("timeline"), Json::array());
  // One file, and nothing from elsewhere.
  for (const std::string outside : {"http://", "https://", "src=", "@import", "url("}) {
    const std::string text =
        page.html.substr(0, page.html.find("<script id")) + page.html.substr(page.html.rfind("<script>"));
    const std::size_t at = text.find(outside);
    EXPECT_TRUE(at == text.npos || text.compare(at, 18, "http://www.w3.org/") == 0) << text.substr(at, 60);
  }
}

TEST(PageCommand, HoldsNoMarkupOfADevice) {
  const std::string name = "</script><script>alert(1)</script><!-- & ]]>";
  const TemporaryFile machine(ChangedMachine([&](Json& changed) {
    for (Json& device : changed["devices"]) {
      if (device["id"].get<std::string>().starts_with("USB\\VID_0781")) device["description"] = name;
    }
  }));
  const WrittenPage page = WritePage({"--machine", machine.Path()});
  EXPECT_NE(page.data.dump().find("alert(1)"), std::string::npos);
  EXPECT_EQ(page.html.find(name.substr(0, 17)), page.html.npos);
  const std::string data = Between(page.html, "application/json\">", "</script>");
  EXPECT_EQ(data.find_first_of("<>&"), data.npos);
}

TEST(PageCommand, TellsWhatAScriptDoes) {
#ifdef _WIN32
  GTEST_SKIP() << "scripts play in real time, which is never the same";
#endif
  const WrittenPage page = WritePage({"--script", (MachinesFolder() / "scripts/stick-comes-and-goes.json").string()});
  std::string told;
  for (const Json& step : page.data.at("timeline")) {
    told += step.at("at").dump() + " " + step.at("connected").dump() + ":";
    for (const Json& event : step.at("events")) {
      told += " " + event.at("event").get<std::string>() + " " + event.at("portPath").get<std::string>();
    }
    told += "\n";
  }
  EXPECT_EQ(told,
            "0 3:\n0 0:\n1000 4: KDeviceAttached 1-2 KDeviceModified 1-3\n"
            "6000 3: KDeviceRemoved 1-2 KDeviceModified 1-3\n");
}

TEST(PageCommand, SaysWhatItCannotDo) {
  const TemporaryFile none("{}");
  const WrittenPage empty = WritePage({"--json", "--machine", none.Path()});
  EXPECT_EQ(empty.result.code, kNothingFound);
  EXPECT_EQ(empty.result.err, "zkusb: no USB device found; the page is empty\n");
  EXPECT_EQ(empty.data.at("RootNode").at("Childs"), Json::array());
  const std::string folder = testing::TempDir() + "no-such-folder/page.html";
  const ProgramResult refused = RunOverSimulatedPc({"page", folder});
  EXPECT_EQ(refused.code, kRefused);
  EXPECT_EQ(refused.err, "zkusb: " + folder + ": cannot be written\n");
}

}  // namespace
}  // namespace zkusb
