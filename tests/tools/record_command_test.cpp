#include "tools/zkusb/record_command.h"

#include <csignal>
#include <thread>

#include "platform/console.h"
#include "platform/system.h"
#include "simulation/machine/machine_file.h"
#include "simulation/machine/machine_writer.h"
#include "simulation/pc/simulated_pc.h"
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
  EXPECT_THAT(told, HasSubstr("  +1000 ms  USB Mass Storage Device comes\n  +6000 ms  USB Mass Storage Device goes\n"));
  EXPECT_THAT(Output({"check", file.Path(), "--script", recorded}), HasSubstr("nothing to find fault with"));
#ifndef _WIN32  // in real time, where events wander from step to step
  const auto events = Events(Output({"watch", "--script", script}));
  EXPECT_GE(events.size(), 4u);
  EXPECT_EQ(Events(Output({"watch", "--machine", file.Path(), "--script", recorded})), events);
  // Both together make a page with the events; one of a recording names nobody where the recording does not.
  Output({"record", file.Path(), "--watch", "--script", script});
  const TemporaryFile page("");
  Output({"page", page.Path(), "--machine", file.Path(), "--script", recorded});
  const std::string html = FileText(page.Path());
  EXPECT_THAT(html, testing::AllOf(HasSubstr("KDeviceModified"), Not(HasSubstr("AA010603160707470215")),
                                   Not(HasSubstr("60A44C413FD1B2A1C9A60135"))));
#endif
  std::filesystem::remove(recorded);
}

// Pulls out and plugs in what a script says, each time as soon as the recording has the step before, then presses
// Ctrl-C.
void PlayInRealTime(platform::simulated::SimulatedPc& pc, const platform::simulated::Script& script,
                    const std::string& recorded) {
  const auto steps = [&] {
    const Json json = Json::parse(FileText(recorded), nullptr, false);
    return json.is_discarded() ? 0 : json.at("steps").size();
  };
  const auto waitFor = [](const auto& holds) {
    for (int waited = 0; waited < 30'000 && !holds(); waited += 20) {
      std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    EXPECT_TRUE(holds());
  };
  waitFor([&] { return std::filesystem::exists(recorded); });
  for (const platform::simulated::Step& step : script) {
    const std::string before = WriteMachine(pc.Snapshot());
    const std::size_t stepsBefore = steps();
    EXPECT_EQ(pc.Apply(step), u"");
    if (WriteMachine(pc.Snapshot()) != before) waitFor([&] { return steps() > stepsBefore; });
  }
#ifdef _WIN32
  platform::Interrupt();  // these tests have no console to press it in
#else
  std::raise(SIGINT);
#endif
}

// Over a PC that stands in for the one the program runs on, in this process: only such a one is watched in real time.
TEST(RecordCommand, WatchesInRealTimeUntilCtrlC) {
  const std::string scriptFile = (MachinesFolder() / "scripts" / "stick-comes-and-goes.json").string();
  const auto machine = platform::simulated::LoadMachine(MachineFile("dell-precision"));
  const auto script = platform::simulated::LoadScript(scriptFile, machine);
  platform::simulated::SimulatedPc pc(machine);
  Options options;
  options.command = Command::kRecord;
  options.json = options.withSerials = options.recordWatch = true;
  options.file = UniquePath(u8".json");
  std::string recorded = options.file;
  recorded.replace(recorded.size() - 5, 5, ".script.json");
  const platform::System system = platform::CurrentSystem();
  platform::SetCurrentSystem({.host = &pc});
  std::thread player([&] { PlayInRealTime(pc, script, recorded); });
  std::ostringstream text;
  Writer out(text);
  Record(options, out);
  player.join();
  platform::SetCurrentSystem(system);

  EXPECT_TRUE(pc.Misuses().empty());
  EXPECT_EQ(pc.Open(), platform::simulated::OpenCounts());
  CheckJson(text.str(), true);
  const std::vector<std::string> lines = Lines(text.str());
  std::string told;
  for (const std::string& line : lines) told += Json::parse(line).at("line").get<std::string>() + " ";
  EXPECT_EQ(told, "file script step step end ");
  EXPECT_EQ(Json::parse(lines.at(0)).at("devices"), machine.devices.size());
  EXPECT_EQ(Json::parse(lines.at(0)).at("replaced").at("serialNumbers"), 0);
  EXPECT_EQ(Json::parse(lines.back()).at("incomplete"), 0);
#ifndef _WIN32  // in real time, where events wander from step to step
  const auto events = Events(Output({"watch", "--script", scriptFile}));
  EXPECT_GE(events.size(), 4u);
  EXPECT_EQ(Events(Output({"watch", "--machine", options.file, "--script", recorded})), events);
#endif
  std::filesystem::remove(options.file);
  std::filesystem::remove(recorded);
}

TEST(RecordCommand, RefusesWhatCannotBeDone) {
  const std::tuple<Args, std::string> cases[] = {
      {{"record"}, "is required"},
      {{"record", "a", "--for", "1"}, "--for requires --watch"},
      {{"record", "a", "--anonymous", "--with-serials"}, "--anonymous excludes --with-serials"},
      {{"record", "/no/such/folder/file", "--machine", MachineFile("vmware-win7")}, "cannot be written"},
      {{"check"}, "is required"},
      {{"check", "/no/such/file"}, "cannot be read"},
  };
  for (const auto& [args, reason] : ProgramCases(cases)) {
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
  const ProgramResult json = RunClient({"check", machine.Path(), "--json"});
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
