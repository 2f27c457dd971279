#include <gmock/gmock.h>

#include <algorithm>
#include <fstream>
#include <iterator>

#include "platform/text.h"
#include "simulation/machine/machine_file.h"
#include "simulation/machine/machine_writer.h"
#include "simulation/pc/simulated_pc.h"

namespace platform::simulated {
namespace {

using testing::StartsWith;

const char kScriptMachine[] = R"({
  "devices": [{"id": "USB\\HUB\\1"}, {"id": "USB\\A\\1", "driver": "k1"}],
  "hubs": [{"name": "USB#HUB#1", "ports": [{"driverKey": "k1"}, {}]}],
  "volumes": [{"name": "\\\\?\\Volume{1}\\"}]})";

std::string ScriptError(const std::string& steps) {
  try {
    ParseScript("{\"steps\": [" + steps + "]}", "s.json", ParseMachine(kScriptMachine, "pc.json"));
  } catch (const MachineFileError& error) {
    return error.what();
  }
  return "no error";
}

TEST(ScriptFile, ReadsEveryKindOfStep) {
  const Script script = ParseScript(R"({"name": "n", "notes": ["x"], "steps": [
    {"name": "in", "plug": {"devices": [{"id": "USB\\B\\1", "parent": "USB\\HUB\\1", "driver": "k2"}],
      "ports": [{"hub": "usb#hub#1", "index": 2, "driverKey": "k2", "speed": "high"}]}},
    {"at": 5, "mount": {"volume": "\\\\?\\Volume{1}\\", "path": "E:\\"}},
    {"at": 5, "dismount": {"volume": "\\\\?\\Volume{1}\\", "path": "E:\\"}},
    {"at": 7, "wait": true, "broadcast": "none"},
    {"at": "0x64", "unplug": "usb\\b\\1", "broadcast": "before"}]})",
                                    "s.json", ParseMachine(kScriptMachine, "pc.json"));
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/machine/every-step-written.json", std::ios::binary);
  const std::string expected((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
  EXPECT_EQ(WriteScript(script, {u"n", {u"x"}}), expected);
}

TEST(ScriptFile, RefusesEachMistakeWithItsPlace) {
  // The steps, a tab, the error.
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/machine/script-file-errors.tsv");
  int cases = 0;
  for (std::string steps, error; std::getline(file, steps, '\t') && std::getline(file, error); ++cases) {
    EXPECT_EQ(ScriptError(steps), "s.json: " + error) << steps;
  }
  EXPECT_EQ(cases, 10);
  // A device that a step took away can come back, and cannot go twice.
  EXPECT_EQ(ScriptError(R"({"unplug": "USB\\A\\1"}, {"plug": {"devices": [{"id": "USB\\A\\1"}]}})"), "no error");
  EXPECT_THAT(ScriptError(R"({"unplug": "USB\\A\\1"}, {"unplug": "USB\\A\\1"})"), StartsWith("s.json: steps[1]: "));
}

TEST(ScriptFile, ReadyMadeScriptsEndWhereTheyBegin) {
  const std::string folder = ZKUSB_SOURCE_DIR "/machines/";
  const std::string kCases[][2] = {{"dell-precision", "stick-comes-and-goes"},
                                   {"hp-cardreader", "card-in-slot"},
                                   {"asus-b560", "hub-with-four-devices"},
                                   {"dell-precision", "usb-hard-disk"}};
  for (const auto& [machine, name] : kCases) {
    SCOPED_TRACE(name);
    const Machine start = LoadMachine(folder + machine + ".json");
    SimulatedPc pc(start);
    std::size_t most = 0;
    for (const Step& step : LoadScript(folder + "scripts/" + name + ".json", start)) {
      EXPECT_EQ(ToUtf8(pc.Apply(step)), "");
      most = std::max(most, pc.Snapshot().devices.size());
    }
    EXPECT_GT(most, start.devices.size());
    EXPECT_EQ(pc.Snapshot().devices.size(), start.devices.size());
    EXPECT_EQ(pc.Snapshot().storage.size(), start.storage.size());
  }
  // The example of the documentation.
  const std::string path = ZKUSB_SOURCE_DIR "/docs/machine-file.md";
  std::ifstream file(path);
  const std::string text((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
  const std::size_t start = text.rfind("```json\n", text.find("\"steps\""));
  ASSERT_NE(start, std::string::npos);
  const std::string example = text.substr(start + 8, text.find("\n```", start) - start - 8);
  EXPECT_EQ(ParseScript(example, path, LoadMachine(folder + "dell-precision.json")).size(), 2u);
}

}  // namespace
}  // namespace platform::simulated
