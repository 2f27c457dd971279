#include "platform/windows/console.h"

#include <windows.h>

#include <fcntl.h>
#include <io.h>
#include <shellapi.h>

#include <cstdio>
#include <memory>

#include "platform/text.h"

namespace platform::windows {

namespace {

struct FreeLocal {
  void operator()(void* memory) const noexcept { LocalFree(memory); }
};

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
  SetConsoleOutputCP(CP_UTF8);
  _setmode(_fileno(stdout), _O_BINARY);
  _setmode(_fileno(stderr), _O_BINARY);
}

}  // namespace platform::windows
