#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::HasSubstr;

const std::vector<std::string> kCommands{"tree",   "dump",  "find",  "volumes",  "page",
                                         "record", "check", "watch", "register", "unregister"};

TEST(Help, NamesEveryCommandWithExamplesThatAreOnes) {
  const std::string help = Output({"--help"}), manual = Output({"--man-page"});
  for (const std::string& command : kCommands) {
    SCOPED_TRACE(command);
    EXPECT_THAT(help, HasSubstr("  " + command + " "));
    EXPECT_THAT(manual, HasSubstr(".SS " + command + "\n"));
    const std::string own = Output({command, "--help"});
    EXPECT_THAT(own, HasSubstr("Usage: zkusb " + command));
    std::size_t examples = 0;
    const std::vector<std::string> lines = Lines(own.substr(own.find("Examples:")));
    for (const std::string& line : lines) {
      if (!line.starts_with("  zkusb " + command)) continue;
      ++examples;
      std::istringstream words(line.substr(0, line.find("  ", 2)).substr(8));
      Args args;
      for (std::string word; words >> word && word != ">";) args.push_back(word);
      args.push_back("--help");  // so that nothing is done; what is wrong is refused all the same
      EXPECT_EQ(RunClient(args).code, kDone) << line;
    }
    EXPECT_GE(examples, 1u);
  }
  EXPECT_THAT(manual, testing::AllOf(HasSubstr("\\-\\-vendor \\fIHEX\\fP"), HasSubstr(".SH EXIT STATUS")));
}

// What a shell would offer.
std::vector<std::string> Completions(const std::string& line) {
#ifdef _WIN32
  return {line};
#else
  const TemporaryFile script(Output({"--bash-completion"}) + "COMP_WORDS=(" + line +
                             ")\nCOMP_CWORD=$((${#COMP_WORDS[@]} - 1))\n_zkusb\nprintf '%s\\n' \"${COMPREPLY[@]}\"\n");
  const ProgramResult result = RunProgram("/bin/bash", {script.Path()});
  EXPECT_EQ(result.err, "");
  return Lines(result.out);
#endif
}

TEST(Help, CompletesInBash) {
#ifdef _WIN32
  GTEST_SKIP() << "there is no bash";
#endif
  const std::pair<std::string, std::vector<std::string>> cases[] = {
      {"zkusb fi", {"find"}},
      {"zkusb un", {"unregister"}},
      {"zkusb find --v", {"--version", "--vendor"}},
      {"zkusb --json watch --f", {"--for"}},
      {"zkusb tree --for", {""}},
      {"zkusb find --vendor ''", {""}},
      {"zkusb record --w", {"--width", "--with-serials", "--watch"}},
      {"zkusb check " ZKUSB_SOURCE_DIR "/machines/v", {ZKUSB_SOURCE_DIR "/machines/vmware-win7.json"}},
      {"zkusb --machine " ZKUSB_SOURCE_DIR "/machines/v", {ZKUSB_SOURCE_DIR "/machines/vmware-win7.json"}},
  };
  for (const auto& [line, words] : cases) EXPECT_EQ(Completions(line), words) << line;
}

TEST(Help, ManualPageIsOneForTheFormatter) {
#ifdef _WIN32
  GTEST_SKIP() << "there is no groff";
#else
  if (!std::filesystem::exists("/usr/bin/groff")) GTEST_SKIP() << "there is no groff";
  const TemporaryFile page(Output({"--man-page"}));
  const ProgramResult result = RunProgram("/usr/bin/groff", {"-man", "-ww", "-Tutf8", page.Path()});
  EXPECT_EQ(result.code, 0);
  EXPECT_EQ(result.err, "");
  EXPECT_GE(Lines(result.out).size(), 100u);
#endif
}

}  // namespace
}  // namespace zkusb
