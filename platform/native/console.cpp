#include "platform/console.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <chrono>
#include <climits>
#include <csignal>

namespace platform {

namespace {

// A signal handler may write to a pipe and set a flag, and little else.
int g_wakePipe[2] = {-1, -1};
std::atomic<bool> g_interrupted = false;
static_assert(std::atomic<bool>::is_always_lock_free);

constexpr short kGone = POLLERR | POLLHUP | POLLNVAL;

extern "C" void OnSignal(int) {
  const int saved = errno;
  Interrupt();
  errno = saved;
}

}  // namespace

void PrepareConsole() noexcept { std::signal(SIGPIPE, SIG_IGN); }

std::size_t OutputColumns() noexcept {
  winsize size{};
  if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) != 0) return 0;
  return size.ws_col == 0 ? 80 : size.ws_col;  // a terminal that does not know
}

bool OutputIsClosedPipe() noexcept {
  pollfd output{STDOUT_FILENO, 0, 0};
  return poll(&output, 1, 0) == 1 && (output.revents & kGone) != 0;
}

void CatchInterrupts() noexcept {
  if (pipe2(g_wakePipe, O_CLOEXEC | O_NONBLOCK) != 0) return;
  struct sigaction action {};
  action.sa_handler = OnSignal;
  sigemptyset(&action.sa_mask);
  action.sa_flags = SA_RESTART;
  for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
    // What whoever started the program has it ignore, such as nohup, it goes on ignoring.
    struct sigaction old {};
    if (sigaction(number, nullptr, &old) == 0 && old.sa_handler != SIG_IGN) {
      sigaction(number, &action, nullptr);
    }
  }
}

void Interrupt() noexcept {
  g_interrupted = true;
  const char mark = 0;
  // A full pipe wakes as well as one more byte would.
  if (write(g_wakePipe[1], &mark, 1) != 1) return;
}

bool Interrupted() noexcept { return g_interrupted; }

void WaitForInterrupt(std::optional<std::uint32_t> milliseconds) noexcept {
  using Clock = std::chrono::steady_clock;
  const Clock::time_point start = Clock::now();
  while (!Interrupted()) {
    int timeout = -1;
    if (milliseconds) {
      const auto passed =
          std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - start).count();
      if (passed >= *milliseconds) return;
      const auto left = static_cast<std::int64_t>(*milliseconds) - passed;
      timeout = left > INT_MAX ? INT_MAX : static_cast<int>(left);
    }
    pollfd files[] = {{g_wakePipe[0], POLLIN, 0}, {STDOUT_FILENO, 0, 0}};
    if (poll(files, 2, timeout) > 0 && (files[1].revents & kGone) != 0) return;
  }
}

}  // namespace platform
