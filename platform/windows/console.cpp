#include "platform/windows/console.h"

#include <windows.h>

#include <fcntl.h>
#include <io.h>
#include <shellapi.h>

#include <atomic>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <memory>

#include "platform/console.h"
#include "platform/text.h"

namespace platform {

namespace {

struct FreeLocal {
  void operator()(void* memory) const noexcept { LocalFree(memory); }
};

// The console's code page before this program; 0: it was not changed, or is back.
constinit std::atomic<UINT> g_codePage = 0;

void PutCodePageBack() noexcept {
  if (const UINT codePage = g_codePage.exchange(0)) SetConsoleOutputCP(codePage);
}

BOOL WINAPI OnControl(DWORD) {
  PutCodePageBack();
  return FALSE;  // the system goes on to end the process
}

void OnAbort(int) { PutCodePageBack(); }

// Lives until the process ends: the system calls the handler on a thread of its own.
HANDLE g_wake = nullptr;
std::atomic<bool> g_interrupted = false;

// Called before the other, which is older. A console that closes ends the process when it returns.
BOOL WINAPI OnInterrupt(DWORD event) {
  Interrupt();
  if (event != CTRL_C_EVENT && event != CTRL_BREAK_EVENT) PutCodePageBack();
  return TRUE;
}

}  // namespace

std::vector<std::string> windows::Arguments() {
  int count = 0;
  const std::unique_ptr<LPWSTR[], FreeLocal> words(CommandLineToArgvW(GetCommandLineW(), &count));
  std::vector<std::string> arguments;
  if (words == nullptr) return arguments;
  for (int i = 1; i < count; ++i) {
    arguments.push_back(
        ToUtf8(reinterpret_cast<const char16_t*>(words[static_cast<std::size_t>(i)])));
  }
  return arguments;
}

void PrepareConsole() noexcept {
  const UINT before = GetConsoleOutputCP();
  if (before != 0 && SetConsoleOutputCP(CP_UTF8)) {
    g_codePage = before;
    std::atexit(PutCodePageBack);
    std::signal(SIGABRT, OnAbort);
    SetConsoleCtrlHandler(OnControl, TRUE);
  }
  _setmode(_fileno(stdout), _O_BINARY);
  _setmode(_fileno(stderr), _O_BINARY);
}

std::size_t OutputColumns() noexcept {
  CONSOLE_SCREEN_BUFFER_INFO info{};
  if (!GetConsoleScreenBufferInfo(GetStdHandle(STD_OUTPUT_HANDLE), &info)) return 0;
  // A line that fills the last column is followed by an empty one.
  const int columns = info.srWindow.Right - info.srWindow.Left;
  return columns > 0 ? static_cast<std::size_t>(columns) : 80;
}

bool OutputIsClosedPipe() noexcept {
  return GetFileType(GetStdHandle(STD_OUTPUT_HANDLE)) == FILE_TYPE_PIPE;
}

void CatchInterrupts() noexcept {
  g_wake = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  SetConsoleCtrlHandler(OnInterrupt, TRUE);
}

void Interrupt() noexcept {
  g_interrupted = true;
  if (g_wake) SetEvent(g_wake);
}

bool Interrupted() noexcept { return g_interrupted; }

void WaitForInterrupt(std::optional<std::uint32_t> milliseconds) noexcept {
  if (g_wake) {
    WaitForSingleObject(g_wake, milliseconds.value_or(INFINITE));
  } else {
    Sleep(milliseconds.value_or(INFINITE));
  }
}

}  // namespace platform
