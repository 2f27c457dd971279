#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::HasSubstr;
using testing::StartsWith;

TEST(CommandLine, RefusesWrongUsageAndBadFilesInOneLine) {
  const TemporaryFile noJson("{ \"devices\": [ }");
  const TemporaryFile unknownMember(R"({"devices": [{"id": "A\\B\\1", "colour": "red"}]})");
  const TemporaryFile noSteps("{}");
  const TemporaryFile badStep(R"({"steps": [{"at": 5, "unplug": "USB\\NO\\1"}]})");
  std::vector<std::tuple<Args, std::string, std::string>> cases = {
      {{}, "", "a command is needed"},
      {{"tree", "a\nb\x1b[2J"}, "", "a\\x0Ab\\x1B[2J"},
      {{"tree", "--machine", "/no/such/file"}, "/no/such/file: ", "cannot be read"},
      {{"tree", "--machine", noJson.Path()}, noJson.Path() + ": ", "line 1, column 16"},
      {{"watch", "--machine", unknownMember.Path(), "--script", noSteps.Path()},
       unknownMember.Path() + ": ",
       "devices[0]: unknown member \"colour\""},
      {{"tree", "--script", "/no/such/file"}, "/no/such/file: ", "cannot be read"},
      {{"dump", "--script", noSteps.Path()}, noSteps.Path() + ": ", "steps: is missing"},
      {{"--script", badStep.Path(), "watch"}, badStep.Path() + ": ", "steps[0]: "},
  };
  // The arguments with a bar behind each, a tab, the reason.
  std::ifstream usage(ZKUSB_SOURCE_DIR "/tests/tools/refused-usage.tsv");
  for (std::string line, reason; std::getline(usage, line, '\t') && std::getline(usage, reason);) {
    cases.emplace_back(Lines(line, '|'), "", reason);
  }
  EXPECT_EQ(cases.size(), 31u);
  for (const auto& [args, file, reason] : ProgramCases(cases)) {
    SCOPED_TRACE(testing::PrintToString(args));
    const ProgramResult result = RunClient(args);
    EXPECT_EQ(result.code, kRefused);
    EXPECT_EQ(result.out, "");
    EXPECT_THAT(result.err, testing::AllOf(StartsWith("zkusb: " + file), HasSubstr(reason),
                                           HasSubstr(file.empty() ? "zkusb --help" : "")));
    EXPECT_EQ(result.err.find('\n') + 1, result.err.size());
  }
}

TEST(CommandLine, SaysWhatWasNotFound) {
  const TemporaryFile storageOnly(ChangedMachine([](Json& machine) { machine.erase("hostControllers"); }));
  const TemporaryFile controllersOnly(ChangedMachine([](Json& machine) { machine.erase("hubs"); }));
  // A controller and its root hub, with nothing plugged in.
  const TemporaryFile nothingPlugged(R"({
    "devices": [{"id": "ACPI\\A"},
                {"id": "PCI\\VEN_8086&DEV_1C26&SUBSYS_0&REV_05\\1", "parent": "ACPI\\A", "driver": "K", "description": "EHCI"},
                {"id": "USB\\ROOT_HUB20\\1", "parent": "PCI\\VEN_8086&DEV_1C26&SUBSYS_0&REV_05\\1", "service": "usbhub"}],
    "hostControllers": [{"names": ["\\\\.\\HCD0"], "driverKey": "K", "rootHub": "HUB"}],
    "hubs": [{"name": "HUB", "ports": [{}, {}]}]})");
  const TemporaryFile noStick(
      R"({"steps": [{"wait": true}, {"unplug": "USB\\VID_0781&PID_5580\\AA010603160707470215"}]})");
  const std::string noController = "zkusb: no USB host controller found\n";
  const std::tuple<Args, std::string, std::string> cases[] = {
      {{"dump", "--machine", storageOnly.Path()}, noController, ""},
      {{"tree", "--machine", storageOnly.Path()}, noController, ""},
      {{"volumes", "--machine", storageOnly.Path()}, noController, ""},
      {{"find", "--vendor", "781", "--machine", controllersOnly.Path()}, "zkusb: no USB hub found\n", ""},
      {{"tree", "--machine", nothingPlugged.Path()}, "zkusb: no USB device found\n", ""},
      {{"find", "--vendor", "0781", "--product", "5581"}, "zkusb: no device 0781:5581\n", ""},
      {{"find", "--vendor", "1"}, "zkusb: no device of vendor 0001\n", ""},
      {{"find", "san", "--product", "1"}, "zkusb: no device \"san\" of product 0001\n", ""},
      {{"Z:\\"}, "zkusb: no device \"Z:\\\"\n", ""},
#ifndef _WIN32  // where scripts play in real time, for watch alone
      {{"volumes", "--script", noStick.Path()}, "zkusb: no device carries a volume or a drive letter\n", ""},
#endif
      // JSON has the shape it always has, and nothing in it.
      {{"find", "x", "--json", "--machine", storageOnly.Path()}, noController, R"("devices": [])"},
      {{"find", "--json", "--vendor", "1"}, "zkusb: no device of vendor 0001\n", R"("devices": [])"},
      {{"volumes", "--json", "--machine", nothingPlugged.Path()}, "zkusb: no USB device found\n", R"("devices": [])"},
      {{"volumes", "--json", "--machine", storageOnly.Path()}, noController, R"("devices": [])"},
      {{"tree", "--json", "--machine", storageOnly.Path()}, noController, R"("Childs": [])"},
      {{"dump", "--json", "--machine", storageOnly.Path()}, noController, R"("ToString": "")"},
  };
  for (const auto& [args, message, out] : ProgramCases(cases)) {
    SCOPED_TRACE(testing::PrintToString(args));
    const ProgramResult result = RunOverSimulatedPc(args);
    EXPECT_EQ(result.code, kNothingFound);
    EXPECT_TRUE(out.empty() ? result.out.empty() : result.out.find(out) != result.out.npos) << result.out;
    EXPECT_EQ(result.err, message);
  }
}

TEST(CommandLine, TakesOptionsOnBothSidesOfTheCommandAndHelps) {
  const std::string file = MachineFile("vmware-win7");
  const std::string expected = Output({"--machine", file, "--json", "tree"});
  EXPECT_EQ(Output({"tree", "--json", "--machine", file}), expected);
  EXPECT_EQ(Output({"--json", "tree", "--machine=" + file}), expected);
  EXPECT_NE(Output({"tree", "--machine", file}), expected);

  EXPECT_THAT(Output({"--version"}), testing::MatchesRegex("zkusb .+\\..+\n"));
  const std::string help = Output({"--help"});
  for (const std::string line :
       {"tree", "dump", "find", "volumes", "watch", "record", "check", "register", "unregister", "--json"}) {
    EXPECT_THAT(help, HasSubstr("  " + line));
  }
  EXPECT_THAT(Output({"find", "--help"}), HasSubstr("--product HEX"));

  // File names are UTF-8.
  const std::string copyName = UniquePath(u8"\u00E9\u4E2D.json");
  const std::filesystem::path copy(std::u8string(copyName.begin(), copyName.end()));
  std::filesystem::copy_file(file, copy, std::filesystem::copy_options::overwrite_existing);
  EXPECT_EQ(Output({"tree", "--json", "--machine", copyName}), expected);
  std::filesystem::remove(copy);
}

TEST(CommandLine, NoticesThatTheOutputIsLost) {
#ifdef _WIN32
  GTEST_SKIP() << "there is no file that is always full";
#endif
  const ProgramResult result = RunProgram(ZKUSB_PROGRAM, {"tree"}, "/dev/full");
  EXPECT_EQ(result.code, kRefused);
  EXPECT_EQ(result.err, "zkusb: the output cannot be written\n");
}

}  // namespace
}  // namespace zkusb
