#include "platform/server_module.h"

#include <dlfcn.h>

#include <filesystem>
#include <memory>

#include "platform/text.h"

namespace platform {

namespace {

struct CloseLibrary {
  void operator()(void* library) const noexcept { dlclose(library); }
};

HRESULT Call(const std::u16string& path, const char* function) {
  const std::unique_ptr<void, CloseLibrary> library(
      dlopen(ToUtf8(path).c_str(), RTLD_NOW | RTLD_LOCAL));
  if (!library) return CO_E_DLLNOTFOUND;
  const auto entry = reinterpret_cast<HRESULT (*)()>(dlsym(library.get(), function));
  return entry ? entry() : CO_E_ERRORINDLL;
}

}  // namespace

std::u16string ServerModulePath() {
  return FromUtf8(
      (std::filesystem::read_symlink("/proc/self/exe").parent_path() / "libZKUsbMonitor.so")
          .string());
}

HRESULT RegisterServerModule(const std::u16string& path) { return Call(path, "DllRegisterServer"); }

HRESULT UnregisterServerModule(const std::u16string& path) {
  return Call(path, "DllUnregisterServer");
}

}  // namespace platform
