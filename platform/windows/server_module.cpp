#include "platform/server_module.h"

#include <windows.h>

#include <memory>
#include <stdexcept>
#include <type_traits>

#include "platform/windows/native_types.h"

namespace platform {

namespace {

using windows::Native;

constexpr std::size_t kLongestPath = 0x10000;

struct FreeModule {
  void operator()(HMODULE module) const noexcept { FreeLibrary(module); }
};
using Module = std::unique_ptr<std::remove_pointer_t<HMODULE>, FreeModule>;

HRESULT Call(const std::u16string& path, const char* function) {
  // What the module needs is looked for beside it, not beside the program.
  const Module module(LoadLibraryExW(Native(path.c_str()), nullptr, LOAD_WITH_ALTERED_SEARCH_PATH));
  if (module == nullptr) return CO_E_DLLNOTFOUND;
  const auto entry = reinterpret_cast<HRESULT(STDAPICALLTYPE*)()>(
      reinterpret_cast<void*>(GetProcAddress(module.get(), function)));
  return entry ? entry() : CO_E_ERRORINDLL;
}

}  // namespace

std::u16string ServerModulePath() {
  for (std::size_t chars = MAX_PATH; chars <= kLongestPath; chars *= 2) {
    std::u16string path(chars, u'\0');
    const DWORD length =
        GetModuleFileNameW(nullptr, Native(path.data()), static_cast<DWORD>(chars));
    if (length == 0) break;
    if (length >= chars) continue;
    path.resize(length);
    path.resize(path.find_last_of(u"\\/") + 1);
    return path.append(u"ZKUsbMonitor.dll");
  }
  throw std::runtime_error("the system does not tell where the program lies");
}

HRESULT RegisterServerModule(const std::u16string& path) { return Call(path, "DllRegisterServer"); }

HRESULT UnregisterServerModule(const std::u16string& path) {
  return Call(path, "DllUnregisterServer");
}

}  // namespace platform
