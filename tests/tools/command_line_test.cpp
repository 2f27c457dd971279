#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::HasSubstr;
using testing::StartsWith;
using Args = std::vector<std::string>;

// Refuses with one line that begins with the program's name and `start`.
void ExpectRefused(const Args& args, const std::string& start, const std::string& part, const std::string& end = "") {
  SCOPED_TRACE(testing::PrintToString(args));
  const Result result = RunClient(args);
  EXPECT_EQ(result.code, kRefused);
  EXPECT_EQ(result.out, "");
  EXPECT_THAT(result.err, testing::AllOf(StartsWith("zkusb: " + start), HasSubstr(part), HasSubstr(end)));
  EXPECT_EQ(result.err.find('\n') + 1, result.err.size());
}

TEST(CommandLine, RefusesWrongUsageInOneLine) {
  const struct {
    Args args;
    std::string reason;
  } cases[] = {
      {{}, "a command is needed"},
      {{"list"}, "not expected: list"},
      {{"tree", "dump"}, "dump"},
      {{"tree", "--bogus"}, "--bogus"},
      {{"tree", "a\nb\x1b[2J"}, "a\\x0Ab\\x1B[2J"},
      {{"tree", "--machine"}, "--machine"},
      {{"tree", "--machine", "a", "--machine", "b"}, "--machine"},
      {{"--json=no", "tree"}, "json"},
      {{"tree", "--vendor", "1"}, "--vendor"},
      {{"find"}, "--vendor is required"},
      {{"find", "--vendor", ""}, "hexadecimal"},
      {{"find", "--vendor", "0x"}, "\"0x\" is not a number of one to four hexadecimal digits"},
      {{"find", "--vendor", "0x00781"}, "hexadecimal"},
      {{"find", "--vendor", "78g"}, "hexadecimal"},
      {{"find", "--vendor", "-1"}, "hexadecimal"},
      {{"find", "--vendor", "0x0x1"}, "hexadecimal"},
      {{"find", "--vendor", "781", "--product", "zz"}, "--product: \"zz\""},
      {{"find", "--vendor", "781", "--product", ""}, "--product: \"\""},
      {{"watch"}, "watch needs --script FILE"},
  };
  for (const auto& [args, reason] : cases) ExpectRefused(args, "", reason, "zkusb --help");
}

TEST(CommandLine, RefusesBadFilesWithTheirPlace) {
  const TemporaryFile noJson("{ \"devices\": [ }");
  const TemporaryFile unknownMember(R"({"devices": [{"id": "A\\B\\1", "colour": "red"}]})");
  const TemporaryFile noSteps("{}");
  const TemporaryFile badStep(R"({"steps": [{"at": 5, "unplug": "USB\\NO\\1"}]})");
  const struct {
    Args args;
    std::string file, reason;
  } cases[] = {
      {{"tree", "--machine", "/no/such/file"}, "/no/such/file", "cannot be read"},
      {{"tree", "--machine", noJson.Path()}, noJson.Path(), "line 1, column 16"},
      {{"watch", "--machine", unknownMember.Path(), "--script", noSteps.Path()},
       unknownMember.Path(),
       "devices[0]: unknown member \"colour\""},
      {{"tree", "--script", "/no/such/file"}, "/no/such/file", "cannot be read"},
      {{"dump", "--script", noSteps.Path()}, noSteps.Path(), "steps: is missing"},
      {{"--script", badStep.Path(), "watch"}, badStep.Path(), "steps[0]: "},
  };
  for (const auto& [args, file, reason] : cases) ExpectRefused(args, file + ": ", reason);
}

TEST(CommandLine, SaysWhatWasNotFound) {
  const TemporaryFile nothing("{}");
  const TemporaryFile storageOnly(ChangedMachine([](Json& machine) { machine.erase("hostControllers"); }));
  const TemporaryFile controllersOnly(ChangedMachine([](Json& machine) { machine.erase("hubs"); }));
  const TemporaryFile noStick(R"({"steps": [
      {"unplug": "USB\\VID_0781&PID_5580\\AA010603160707470215"}]})");
  const std::string noController = "zkusb: no USB host controller found\n";
  const struct {
    Args args;
    std::string message;
  } cases[] = {
      {{"dump", "--machine", nothing.Path()}, noController},
      {{"tree", "--machine", storageOnly.Path()}, noController},
      {{"volumes", "--machine", storageOnly.Path(), "--json"}, noController},
      {{"find", "--vendor", "781", "--machine", controllersOnly.Path()}, noController},
      {{"find", "--vendor", "1"}, "zkusb: no device of vendor 0001\n"},
      {{"find", "--vendor", "0781", "--product", "5581"}, "zkusb: no device 0781:5581\n"},
      {{"volumes", "--script", noStick.Path()}, "zkusb: no device carries a volume or a drive letter\n"},
  };
  for (const auto& [args, message] : cases) {
    SCOPED_TRACE(testing::PrintToString(args));
    const Result result = RunClient(args);
    EXPECT_EQ(result.code, kNothingFound);
    EXPECT_EQ(result.out, "");
    EXPECT_EQ(result.err, message);
  }
  const Result json = RunClient({"find", "--vendor", "1", "--json"});
  EXPECT_EQ(json.code, kNothingFound);
  EXPECT_EQ(json.out, "[]\n");
}

TEST(CommandLine, TakesOptionsOnBothSidesOfTheCommandAndHelps) {
  const std::string file = MachineFile("vmware-win7");
  const std::string expected = Output({"--machine", file, "--json", "tree"});
  EXPECT_EQ(Output({"tree", "--json", "--machine", file}), expected);
  EXPECT_EQ(Output({"--json", "tree", "--machine=" + file}), expected);
  EXPECT_NE(Output({"tree", "--machine", file}), expected);

  // Help and version are no failures.
  EXPECT_THAT(Output({"--version"}), testing::MatchesRegex("zkusb .+\\..+\n"));
  for (const std::string line : {"tree", "dump", "find", "volumes", "watch", "register", "unregister", "--json"}) {
    EXPECT_THAT(Output({"--help"}), HasSubstr("  " + line));
  }
  EXPECT_THAT(Output({"find", "--help"}), HasSubstr("--product HEX"));
}

TEST(CommandLine, TakesFileNamesInUtf8) {
  const std::filesystem::path copy =
      std::filesystem::path(testing::TempDir()) / std::filesystem::path(u8"zkusb-\u00E9\u4E2D.json");
  const std::string original = MachineFile("vmware-win7");
  std::filesystem::copy_file(original, copy, std::filesystem::copy_options::overwrite_existing);
  const std::u8string name = copy.u8string();
  EXPECT_EQ(Output({"tree", "--machine", std::string(name.begin(), name.end())}),
            Output({"tree", "--machine", original}));
  std::filesystem::remove(copy);
}

TEST(CommandLine, NoticesThatTheOutputIsLost) {
  const Result result = RunProgram(ZKUSB_PROGRAM, {"tree"}, "/dev/full");
  EXPECT_EQ(result.code, kRefused);
  EXPECT_EQ(result.err, "zkusb: the output cannot be written\n");
}

}  // namespace
}  // namespace zkusb
