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

#include "platform/text.h"

namespace platform::windows {

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

}  // namespace

std::vector<std::string> Arguments() {
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

void PassOutputThrough() noexcept {
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

}  // namespace platform::windows
