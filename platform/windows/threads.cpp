#include <windows.h>

#include <process.h>

#include <atomic>

#include "platform/windows/native_types.h"
#include "platform/windows/windows_desktop.h"

namespace platform::windows {

bool WindowsThreads::StartThread(ThreadRoutine routine, std::uint32_t stackBytes,
                                 void* argument) noexcept {
  return _beginthread(routine, stackBytes, argument) != static_cast<std::uintptr_t>(-1);
}

void WindowsThreads::Sleep(std::uint32_t milliseconds) { ::Sleep(milliseconds); }

std::uint32_t WindowsThreads::CurrentThreadId() noexcept {
  // The system gives the id of a thread that ended to one that starts later; these are given once.
  static constinit std::atomic<std::uint32_t> s_last = 0;
  thread_local const std::uint32_t t_id = ++s_last;
  return t_id;
}

void WindowsThreads::ExitProcess(std::uint32_t code) { ::ExitProcess(code); }

Status WindowsThreads::PinModule(const void* address) noexcept {
  HMODULE module = nullptr;
  return FromBool(
      GetModuleHandleExW(GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS | GET_MODULE_HANDLE_EX_FLAG_PIN,
                         static_cast<const WCHAR*>(address), &module));
}

}  // namespace platform::windows
