#include "simulation/machine/machine_file.h"

#include <gmock/gmock.h>

#include <fstream>
#include <iterator>

#include "simulation/machine/machine_writer.h"
#include "tests/support/cases.h"

namespace platform::simulated {
namespace {

using namespace testing;  // NOLINT: nothing but matchers

std::string MachineError(const std::string& json) {
  try {
    ParseMachine(json, "pc.json");
  } catch (const MachineFileError& error) {
    return error.what();
  }
  return "no error";
}

std::string Repeated(const char* text, std::size_t times) {
  std::string all;
  while (times-- > 0) all += text;
  return all;
}

TEST(MachineFile, RefusesEachMistakeWithItsPlace) {
  const std::string port = "hubs[0].ports[1].", ports = R"({"hubs": [{"name": "H", "ports": [{}, {)";
  const std::pair<std::string, std::string> kCases[] = {
      {"{\n  \"name\": \"\xC3\xA4\xC3\xB6\" x",
       "line 2, column 16: syntax error while parsing object - invalid literal; expected '}'"},
      {"{\"name\": \"\xC3\x28\"}",
       "line 1, column 12: syntax error while parsing value - invalid string: ill-formed UTF-8 byte"},
      // What was read last may look like a part of the reason, and is no part of it.
      {"{\"name\": \"a; expected secret\x01\"}",
       "line 1, column 29: syntax error while parsing value - invalid string: control character U+0001 (SOH) must be "
       "escaped to \\u0001"},
      {"{\"name\": \"'; expected secret\" \"'; expected secret\"}",
       "line 1, column 50: syntax error while parsing object - unexpected string literal; expected '}'"},
      {std::string("{}\0{}", 5), "line 1, column 3: unexpected zero byte"},
      {Repeated("[", 100000), Repeated("[0]", 15) + ": is nested too deeply (at most 16 levels)"},
      {R"({"devices": [{"id": ")" + std::string(200, 'A') + R"("}]})", "devices[0].id: is longer than 199 characters"},
      {ports + R"("pipes": [{})" + Repeated(", {}", 30) + "]}]}]}", port + "pipes: has more than 30 entries"},
      {ports + "}" + Repeated(", {}", 254) + "]}]}", "hubs[0].ports: has more than 255 entries"}};
  for (const auto& [json, error] : kCases) EXPECT_EQ(MachineError(json), "pc.json: " + error) << json.substr(0, 300);
  if (testing_support::EveryCase()) {
    EXPECT_EQ(MachineError(R"({"notes": [)" + Repeated("\"\",", 2'000'000) + "]}"),
              "pc.json: notes: the file has more than 2000000 values");
  }
  // The others in a file: the text, a tab, the error.
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/machine/machine-file-errors.tsv");
  int cases = 0;
  for (std::string json, error; std::getline(file, json, '\t') && std::getline(file, error); ++cases) {
    EXPECT_EQ(MachineError(json), "pc.json: " + error) << json;
  }
  EXPECT_EQ(cases, 78);
}

TEST(MachineFile, CollectsEachFaultOnce) {
  std::vector<std::string> faults;
  ParseMachine(R"({"devices": [{"id": "HTREE\\ROOT\\0"}, {"id": "htree\\root\\0"}, {"id": "A"}, {"id": "a"}]})", "f",
               faults);
  EXPECT_THAT(faults, ElementsAre("f: devices[0].id: is the root device, which is always there",
                                  "f: devices[1].id: is the root device, which is always there",
                                  StartsWith("f: devices[3].id: ")));
}

// What is said is written again, and what is said by default is not. That each member is the one it is called,
// recordings of a PC show.
TEST(MachineFile, WritesWhatItReads) {
  const std::string folder = ZKUSB_SOURCE_DIR "/tests/simulation/machine/";
  std::ifstream file(folder + "every-member-written.json", std::ios::binary);
  const std::string expected((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
  EXPECT_EQ(WriteMachine(LoadMachine(folder + "every-member.json")), expected);
}

TEST(MachineFile, NamesTheFileThatCannotBeRead) {
  for (const std::string path : {"/no/such.json", ZKUSB_SOURCE_DIR}) {
    try {
      LoadMachine(path);
      ADD_FAILURE() << path;
    } catch (const MachineFileError& error) {
      EXPECT_THAT(error.what(), StartsWith(path + ": cannot be read: "));
    }
  }
}

}  // namespace
}  // namespace platform::simulated
