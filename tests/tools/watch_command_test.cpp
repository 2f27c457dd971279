#include <algorithm>
#include <regex>

#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::ElementsAre;

std::filesystem::path ScriptsFolder() { return MachinesFolder() / "scripts"; }

// The machine that a script runs over, as its notes say.
std::string MachineOf(const Json& script) {
  std::smatch match;
  const std::string notes = script.at("notes").dump();
  return std::regex_search(notes, match, std::regex("Runs over ([-a-z0-9]+)\\.json")) ? MachineFile(match[1]) : "";
}

std::vector<Json> JsonLines(const std::string& text) {
  std::vector<Json> values;
  for (const std::string& line : Lines(text)) {
    values.push_back(Json::parse(line, nullptr, false));
    EXPECT_FALSE(values.back().is_discarded()) << line;
  }
  return values;
}

// The text of it stands in the transcript.
TEST(WatchCommand, TellsWhatAStickDoesAsJson) {
#ifdef _WIN32
  GTEST_SKIP() << "scripts play in real time, which is never the same";
#endif
  const std::string script = (ScriptsFolder() / "stick-comes-and-goes.json").string();
  std::vector<std::string> told;
  for (const Json& line : JsonLines(Output({"watch", "--json", "--script", script}))) {
    const Json event = line.value("event", Json());
    if (event != "KDeviceAttached" && event != "KDeviceRemoved") continue;
    told.push_back(line.at("at").dump() + " " + event.get<std::string>() + " " + IdOf(line) + " " +
                   line.at("portPath").get<std::string>() + " " + line.at("driveLetters").dump());
  }
  EXPECT_THAT(
      told, ElementsAre(R"(1000 KDeviceAttached 0951:1666 1-2 ["F:"])", R"(6000 KDeviceRemoved 0951:1666 1-2 ["F:"])"));
}

// For every script at hand: text and JSON tell the same events in the order in which clients hear of them.
TEST(WatchCommand, TellsEveryScriptInOrder) {
  const std::vector<std::string> order{"attached", "connected", "removed", "modified"};
  const std::regex eventLine("  \\+[0-9]+\\.[0-9]{3}s  ([a-z]+) +(-|[0-9.-]+)  ([0-9A-F]{4}:[0-9A-F]{4}).*");
  int scripts = 0;
  for (const auto& entry : std::filesystem::directory_iterator(ScriptsFolder())) {
    SCOPED_TRACE(entry.path().string());
#ifdef _WIN32  // in real time, so one of them has to do
    if (entry.path().stem() != "card-in-slot") continue;
    scripts += 3;
#endif
    ++scripts;
    const Json script = LoadJson(entry.path());
    Args args{"watch", "--machine", MachineOf(script), "--script", entry.path().string()};
    std::vector<std::string> told, toldAsJson;
    std::size_t steps = 0;
    for (const std::string& line : Lines(Output(args))) {
      std::smatch match;
      if (std::regex_match(line, match, eventLine))
        told.push_back(match[1].str() + " " + match[2].str() + " " + match[3].str());
      steps += line.starts_with("+") ? 1 : 0;
    }
    EXPECT_EQ(steps, script.at("steps").size());
    EXPECT_GE(told.size(), 3u);

    args.push_back("--json");
    std::vector<std::string> stepNames;
    auto latest = order.begin();
    for (const Json& line : JsonLines(Output(args))) {
      if (line.at("line") == "step") {
        stepNames.push_back(line.at("step"));
        latest = order.begin();
      }
      if (line.at("line") != "event") continue;
      std::string event = line.at("event").get<std::string>().substr(std::string("KDevice").size());
      event[0] = static_cast<char>(event[0] - 'A' + 'a');
      latest = std::find(latest, order.end(), event);  // found only where it does not go back
      ASSERT_NE(latest, order.end()) << line;
      const std::string path = line.at("portPath");
      toldAsJson.push_back(event + " " + (path.empty() ? "-" : path) + " " + IdOf(line));
    }
    EXPECT_EQ(toldAsJson, told);
    EXPECT_EQ(stepNames.size(), steps);
  }
  EXPECT_GE(scripts, 4);
}

// Kept in a file, for the builds that cannot run on virtual time to compare with.
TEST(WatchCommand, TellsTheEventsThatAreKept) {
#ifdef _WIN32
  GTEST_SKIP() << "scripts play in real time; the tests of the DLL that ships compare with the file";
#endif
  const Json kept = Json::parse(testing_support::Contents("tests/golden/script-events.json"));
  EXPECT_EQ(kept.size(), 4u);
  for (const auto& [script, expected] : kept.items()) {
    const std::string file = (ScriptsFolder() / (script + ".json")).string();
    Json told = Json::array();
    for (const Json& line :
         JsonLines(Output({"watch", "--json", "--machine", MachineFile(expected.at("machine")), "--script", file}))) {
      if (line.contains("event") && !line.at("event").is_null()) {
        told.push_back({line.at("event"), line.at("InstanceId"), line.value("mountPoints", Json())});
      }
    }
    EXPECT_EQ(told.dump(1), expected.at("events").dump(1)) << script;
  }
}

// A reader without cards has letters and no volume.
TEST(WatchCommand, TellsTheLettersOfEmptyCardSlots) {
  const Args args{"watch", "--for", "0", "--machine", MachineFile("hp-cardreader")};
  EXPECT_THAT(Output(args), testing::HasSubstr(
                                "8-5  0BDA:0151  USB Mass Storage Device  serial 20060413092100000  F:, G:, H:, I:\n"));
  Args asJson = args;
  asJson.push_back("--json");
  Json letters;
  for (const Json& line : JsonLines(Output(asJson))) {
    if (line.at("line") == "event" && IdOf(line) == "0BDA:0151") letters = line.at("driveLetters");
  }
  EXPECT_EQ(letters, Json::array({"F:", "G:", "H:", "I:"}));
}

TEST(WatchCommand, WatchesAPcWithoutController) {
#ifdef _WIN32
  GTEST_SKIP() << "scripts play in real time, and this one takes a minute";
#endif
  const TemporaryFile machine("{}");
  const TemporaryFile waits(
      R"({"steps": [{"at": 61005, "wait": true}, {"at": 61005, "name": "\u001b", "wait": true}]})");
  EXPECT_EQ(Output({"watch", "--machine", machine.Path(), "--script", waits.Path()}),
            "0 devices at the start\n+61.005s\n  no event\n+61.005s  \\x1B\n  no event\n");
}

}  // namespace
}  // namespace zkusb
