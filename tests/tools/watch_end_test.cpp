// How watch ends when nobody has said for how long.
#include "tests/tools/client.h"

#ifndef _WIN32
#include <fcntl.h>
#include <poll.h>
#include <pty.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#endif

namespace zkusb {
namespace {

#ifdef _WIN32

TEST(WatchEnd, OnCtrlC) { GTEST_SKIP() << "programs of these tests have no console to press Ctrl-C in"; }

#else

constexpr int kMostMilliseconds = 60'000;

// A client that runs while its output is read.
class RunningClient {
 public:
  enum class Output { kPipe, kTerminal };

  explicit RunningClient(Args args, Output output = Output::kPipe) {
    int ends[2] = {-1, -1};
    winsize size{24, 60, 0, 0};
    EXPECT_EQ(output == Output::kPipe ? pipe2(ends, O_CLOEXEC) : openpty(&ends[0], &ends[1], nullptr, nullptr, &size),
              0);
    m_reader = ends[0];
    args.insert(args.begin(), "zkusb");
    std::vector<char*> argv;
    for (std::string& arg : args) argv.push_back(arg.data());
    argv.push_back(nullptr);
    m_child = fork();
    if (m_child == 0) {
      // The shell of a test in the background ignores them.
      for (const int number : {SIGINT, SIGTERM, SIGHUP}) std::signal(number, SIG_DFL);
      std::signal(SIGPIPE, SIG_DFL);
      dup2(ends[1], STDOUT_FILENO);
      close(ends[0]);
      close(ends[1]);
      execv(ZKUSB_PROGRAM, argv.data());
      _exit(127);
    }
    close(ends[1]);
  }
  ~RunningClient() {
    if (m_child > 0) kill(m_child, SIGKILL), waitpid(m_child, nullptr, 0);
    CloseOutput();
  }
  RunningClient(const RunningClient&) = delete;
  RunningClient& operator=(const RunningClient&) = delete;

  // All that comes until `end` stands in it, or the end.
  std::string ReadUntil(const std::string& end) {
    std::string text;
    char byte = 0;
    pollfd file{m_reader, POLLIN, 0};
    while ((end.empty() || text.find(end) == text.npos) && poll(&file, 1, kMostMilliseconds) == 1 &&
           read(m_reader, &byte, 1) == 1) {
      text += byte;
    }
    return text;
  }
  bool Runs() const { return waitpid(m_child, nullptr, WNOHANG) == 0; }
  void Signal(int number) const { kill(m_child, number); }
  void CloseOutput() {
    if (m_reader >= 0) close(std::exchange(m_reader, -1));
  }
  // -1 where a signal ended it, or it did not end.
  int Code() {
    int status = 0;
    for (int waited = 0; waitpid(m_child, &status, WNOHANG) == 0; waited += 10) {
      if (waited > kMostMilliseconds) return -1;
      usleep(10'000);
    }
    m_child = 0;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }

 private:
  int m_reader = -1;
  pid_t m_child = 0;
};

TEST(WatchEnd, OnCtrlCAndWhenAskedTo) {
  for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
    RunningClient client({"watch"});
    // Each line comes while the program runs.
    EXPECT_THAT(client.ReadUntil("at the start\n"), testing::HasSubstr("  1-3  0781:5580  SanDisk"));
    usleep(100'000);
    EXPECT_TRUE(client.Runs());
    client.Signal(number);
    EXPECT_EQ(client.ReadUntil(""), "");
    EXPECT_EQ(client.Code(), kDone);
  }
}

TEST(WatchEnd, WhenNobodyReadsAnyMore) {
  const std::string script = (MachinesFolder() / "scripts/stick-comes-and-goes.json").string();
  for (const Args& args : {Args{"watch"}, Args{"watch", "--json"}, Args{"watch", "--script", script}, Args{"tree"}}) {
    RunningClient atOnce(args), later(args);
    atOnce.CloseOutput();
    EXPECT_EQ(atOnce.Code(), kDone) << testing::PrintToString(args);
    later.ReadUntil("\n");
    later.CloseOutput();
    EXPECT_EQ(later.Code(), kDone) << testing::PrintToString(args);
  }
}

TEST(WatchEnd, LinesAreCutToATerminal) {
  for (const Args& args : {Args{"tree"}, Args{"find", "e"}, Args{"volumes"}, Args{"watch", "--for", "0"}}) {
    RunningClient client(args, RunningClient::Output::kTerminal);
    const std::vector<std::string> lines = Lines(client.ReadUntil(""));
    EXPECT_EQ(client.Code(), kDone);
    EXPECT_GE(lines.size(), 3u);
    std::ptrdiff_t widest = 0;
    for (const std::string& line : lines) {
      const auto isPoint = [](char byte) { return (byte & 0xC0) != 0x80 && byte != '\r'; };
      widest = std::max(widest, std::ranges::count_if(line, isPoint));
    }
    EXPECT_EQ(widest, 60) << testing::PrintToString(args);
  }
  RunningClient wide({"tree", "--width", "0"}, RunningClient::Output::kTerminal);
  EXPECT_EQ(wide.ReadUntil("").find("…"), std::string::npos);
}

#endif

}  // namespace
}  // namespace zkusb
