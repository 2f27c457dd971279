#include <gmock/gmock.h>

#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::HasSubstr;
using testing::Not;

std::string FileText(const std::filesystem::path& path) {
  std::ifstream stream(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(stream), {}};
}

// The lines of a watch that tell events, in their order, without the moments.
[[maybe_unused]] std::vector<std::string> Events(const std::string& transcript) {
  std::vector<std::string> events;
  for (const std::string& line : Lines(transcript)) {
    const std::size_t word = line.find("s  ");
    if (line.starts_with("  +") && word != std::string::npos) events.push_back(line.substr(word + 3));
  }
  return events;
}

TEST(RecordCommand, WritesTheSamePcWithAndWithoutWhatLeadsToAPerson) {
  const TemporaryFile whole(""), anonymous("");
  for (const char* name : {"dell-precision", "hp-cardreader"}) {
    const std::string machine = MachineFile(name),
                      serial = name[0] == 'd' ? "AA010603160707470215" : "20060413092100000";
    EXPECT_THAT(Output({"record", whole.Path(), "--with-serials", "--machine", machine}),
                HasSubstr("Nothing was replaced"));
    EXPECT_EQ(Output({"dump", "--machine", whole.Path()}), Output({"dump", "--machine", machine}));
    EXPECT_EQ(Output({"tree", "--json", "--machine", whole.Path()}), Output({"tree", "--json", "--machine", machine}));
    EXPECT_THAT(FileText(whole.Path()), HasSubstr(serial));

    EXPECT_THAT(Output({"record", anonymous.Path(), "--machine", machine}), HasSubstr("serial number"));
    const std::string dump = Output({"dump", "--machine", anonymous.Path()});
    EXPECT_EQ(dump.size(), Output({"dump", "--machine", machine}).size());
    EXPECT_THAT(FileText(anonymous.Path()), Not(HasSubstr(serial)));
    EXPECT_THAT(FileText(anonymous.Path()), HasSubstr("Replaced, equal ones by equal ones: "));
    const std::string again = FileText(anonymous.Path());
    Output({"record", anonymous.Path(), "--anonymous", "--machine", machine});
    EXPECT_EQ(FileText(anonymous.Path()), again);
    // What was recorded gives nobody anything to find fault with.
    EXPECT_THAT(Output({"check", anonymous.Path()}), HasSubstr("nothing to find fault with"));
  }
}

TEST(RecordCommand, WritesWhatChangesAsAScript) {
  const TemporaryFile file("");
  const std::string script = (MachinesFolder() / "scripts" / "stick-comes-and-goes.json").string();
  const std::string recorded = file.Path() + ".script.json";
  const std::string told = Output({"record", file.Path(), "--watch", "--with-serials", "--script", script});
  EXPECT_THAT(told, HasSubstr(recorded + ": what changes\n"));
  EXPECT_THAT(told, HasSubstr("  +1000 ms  "));
  EXPECT_THAT(Output({"check", file.Path(), "--script", recorded}), HasSubstr("nothing to find fault with"));
#ifndef _WIN32  // in real time, where events wander from step to step
  const auto events = Events(Output({"watch", "--script", script}));
  EXPECT_GE(events.size(), 4u);
  EXPECT_EQ(Events(Output({"watch", "--machine", file.Path(), "--script", recorded})), events);
#endif
  std::filesystem::remove(recorded);
}

TEST(RecordCommand, RefusesWhatCannotBeDone) {
  const std::tuple<Args, std::string> cases[] = {
      {{"record"}, "is required"},
      {{"record", "a", "--anonymous", "--with-serials"}, "--anonymous excludes --with-serials"},
      {{"record", "/no/such/folder/file", "--machine", MachineFile("vmware-win7")}, "cannot be written"},
      {{"check"}, "is required"},
      {{"check", "/no/such/file"}, "cannot be read"},
  };
  for (const auto& [args, reason] : cases) {
    SCOPED_TRACE(testing::PrintToString(args));
    const ProgramResult result = RunClient(args);
    EXPECT_EQ(result.code, kRefused);
    EXPECT_THAT(result.err, HasSubstr(reason));
  }
}

TEST(CheckCommand, SaysEverythingThatIsWrong) {
  const TemporaryFile machine(ChangedMachine([](Json& pc) {
    pc["devices"][1]["parent"] = "USB\\NO\\1";
    pc["devices"][2]["colour"] = "red";
    pc["hubs"][0]["ports"][0]["driverKey"] = "{nobody}\\0001";
    pc["volumes"][0]["serial"] = "12";
    pc["drives"].push_back({{"letter", "Q"}, {"type", "fixed"}});
  }));
  const TemporaryFile script(R"({"steps": [{"at": 5, "unplug": "USB\\NO\\1"}, {"at": 3, "wait": true},
                                          {"at": 1, "wait": true}, {}]})");
  const ProgramResult result = RunClient({"check", machine.Path(), "--script", script.Path()});
  EXPECT_EQ(result.code, kNothingFound);
  EXPECT_EQ(result.err, "");
  const std::string wrong = "wrong: " + machine.Path() + ": ", inScript = "wrong: " + script.Path() + ": ";
  const std::string suspicious = "suspicious: " + machine.Path() + ": ";
  EXPECT_THAT(
      Lines(result.out),
      testing::ElementsAre(testing::StartsWith(wrong + "devices[2]: unknown member \"colour\""),
                           testing::StartsWith(wrong + "volumes[0].serial: must be a number, or a text of 0x"),
                           testing::StartsWith(wrong + "devices[1].parent: no device with the id \"USB\\NO\\1\""),
                           testing::StartsWith(inScript + "steps[0]: device USB\\NO\\1 is missing"),
                           testing::StartsWith(inScript + "steps[2].at: 1 goes back (the step before is at 3)"),
                           testing::StartsWith(inScript + "steps[3]: needs one of"),
                           testing::StartsWith(suspicious + "hubs[0].ports[0].driverKey: no device has the driver key"),
                           testing::StartsWith(suspicious + "drives[")));
  const ProgramResult json = RunProgram(ZKUSB_PROGRAM, {"check", machine.Path(), "--json"});
  EXPECT_EQ(json.code, kNothingFound);
  EXPECT_EQ(Json::parse(json.out).at("findings").size(), 5u);
}

// The page's first example is all that a person needs who wants to see a device, and nothing can be left out.
TEST(CheckCommand, FindsNothingInTheSmallestUsefulFile) {
  const std::string page = FileText(std::filesystem::path(ZKUSB_SOURCE_DIR) / "docs" / "machine-file.md");
  const std::size_t begin = page.find("```json\n") + 8;
  const std::string example = page.substr(begin, page.find("```", begin) - begin);
  const TemporaryFile smallest(example);
  EXPECT_EQ(RunClient({"check", smallest.Path()}).code, kDone);
  EXPECT_THAT(Output({"tree", "--machine", smallest.Path()}),
              testing::AllOf(HasSubstr("USB Host Controller"), HasSubstr("046D:C077"), HasSubstr("USB Input Device")));
  for (const char* part : {"&SUBSYS_1C268086", "&REV_05", ", \"description\": \"USB Host Controller\""}) {
    std::string less = example;
    for (std::size_t at; (at = less.find(part)) != std::string::npos;) less.erase(at, std::string(part).size());
    const TemporaryFile file(less);
    EXPECT_EQ(RunClient({"check", file.Path()}).code, kNothingFound) << part;
    EXPECT_THAT(RunClient({"tree", "--machine", file.Path()}).out, Not(HasSubstr("046D:C077"))) << part;
  }
}

TEST(CheckCommand, FindsNothingInTheMachinesAtHand) {
  for (const char* name : {"asus-b560", "dell-precision", "hp-cardreader", "vmware-win7"}) {
    const ProgramResult result = RunClient({"check", MachineFile(name)});
    EXPECT_EQ(result.code, kDone) << result.out;
  }
}

}  // namespace
}  // namespace zkusb
