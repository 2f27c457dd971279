// Threads and windows of the running process, behind the seam.
#pragma once

#include "platform/desktop.h"

namespace platform::windows {

class WindowsThreads final : public Threads {
 public:
  bool StartThread(ThreadRoutine routine, std::uint32_t stackBytes,
                   void* argument) noexcept override;
  void Sleep(std::uint32_t milliseconds) override;
  std::uint32_t CurrentThreadId() noexcept override;
  [[noreturn]] void ExitProcess(std::uint32_t code) override;
  Status PinModule(const void* address) noexcept override;
};

// Each operation is the system's call of the same meaning and nothing more. An object holds no
// state, and serves any number of threads.
class WindowsDesktop final : public Desktop {
 public:
  InstanceHandle GetModuleHandleW(const char16_t* name) noexcept override;
  GraphicsHandle LoadCursorW(InstanceHandle instance, std::uint16_t number) noexcept override;
  GraphicsHandle GetStockObject(std::int32_t object) noexcept override;

  Status RegisterClassW(const WNDCLASSW& windowClass) noexcept override;
  Status CreateWindowExW(const CREATESTRUCTW& creation, WindowHandle& window) override;
  Status DestroyWindow(WindowHandle window) override;
  std::int32_t IsWindow(WindowHandle window) noexcept override;
  std::intptr_t WindowUserData(WindowHandle window) noexcept override;
  std::intptr_t SetWindowUserData(WindowHandle window, std::intptr_t value) noexcept override;

  std::int32_t GetMessageW(MSG& message, WindowHandle window, std::uint32_t first,
                           std::uint32_t last) override;
  std::int32_t TranslateMessage(const MSG& message) noexcept override;
  LResult DispatchMessageW(const MSG& message) override;
  LResult DefWindowProcW(WindowHandle window, std::uint32_t message, WParam wParam,
                         LParam lParam) override;

  Status RegisterDeviceNotificationW(WindowHandle recipient, const void* filter,
                                     std::uint32_t flags,
                                     NotificationHandle& notification) noexcept override;
  Status UnregisterDeviceNotification(NotificationHandle notification) noexcept override;

  std::uint32_t FormatMessageW(std::uint32_t flags, std::uint32_t code, std::uint32_t language,
                               char16_t*& text) noexcept override;
  void LocalFree(char16_t* text) noexcept override;
  std::int32_t MessageBoxW(WindowHandle owner, const char16_t* text, const char16_t* caption,
                           std::uint32_t type) noexcept override;
};

}  // namespace platform::windows
