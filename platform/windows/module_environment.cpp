#include "platform/process_end.h"
#include "platform/windows/native_types.h"
#include "platform/windows/windows_module.h"

namespace platform {

namespace {
// Written once, before anything of the module runs. Null: the component is part of the program.
constinit HINSTANCE g_instance = nullptr;
}  // namespace

void SetModuleInstance(HINSTANCE instance) noexcept { g_instance = instance; }

namespace windows {

Status WindowsModuleEnvironment::ModuleFileName(char16_t* path, std::uint32_t pathChars,
                                                std::uint32_t& length) noexcept {
  length = GetModuleFileNameW(g_instance, Native(path), pathChars);
  return FromBool(length != 0);
}

std::uint32_t WindowsModuleEnvironment::ThreadLocale() noexcept { return GetThreadLocale(); }

Status WindowsModuleEnvironment::SetThreadLocale(std::uint32_t locale) noexcept {
  return FromBool(::SetThreadLocale(locale));
}

}  // namespace windows

}  // namespace platform
