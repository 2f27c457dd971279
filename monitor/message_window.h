// A hidden window on a thread of its own that receives device broadcasts.
#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <utility>

#include "platform/desktop.h"

namespace KelvoUHW {

// The failure of window code that the window procedure tells about. Nothing in the component throws
// it.
class WinAppException {
 public:
  explicit WinAppException(std::u16string message) : m_strMessage(std::move(message)) {}
  const std::u16string& Message() const noexcept { return m_strMessage; }

 private:
  std::u16string m_strMessage;
};

// The window thread's application. Publishes itself in g_pWinApp.
class WinApp {
 public:
  // As a program's main function gets them; only the first is used.
  WinApp(platform::InstanceHandle instance, platform::InstanceHandle previous,
         const char16_t* commandLine, std::int32_t show) noexcept;
  WinApp(const WinApp&) = delete;
  WinApp& operator=(const WinApp&) = delete;

  // Makes the window and pumps its messages until the quit message, which nobody posts: in practice
  // until the process ends. The quit message's wParam, or 0 when there is no window.
  platform::WParam RunMessageLoop();

  const platform::InstanceHandle m_hInstance;
};

// A window and its procedure; made, used and destroyed by the window thread, except for m_hWnd,
// which other threads read. Publishes itself in g_pMsgWindow.
class WinBaseO {
 public:
  WinBaseO() noexcept;
  WinBaseO(const WinBaseO&) = delete;
  WinBaseO& operator=(const WinBaseO&) = delete;

  // The window's messages. No exception leaves it, whatever happens inside: it answers 0 then.
  virtual platform::LResult WndProc(platform::WindowHandle window, std::uint32_t message,
                                    platform::WParam wParam, platform::LParam lParam);

  // Registers the class and makes the window: hidden, without a size, and top-level, since only
  // those receive volume broadcasts. Ends the process when one of the two fails.
  bool Create();
  bool RegisterWindowClass();

  // Shows the system's text for the code and ends the process with it.
  [[noreturn]] static void FatalError(std::uint32_t code);

  // Null until the window's first message.
  std::atomic<platform::WindowHandle> m_hWnd = 0;

 protected:
  // Destroys the window. Not virtual: the window procedure is the only virtual operation.
  ~WinBaseO();
};

class CZKUMWinMsgReceiver final : public WinBaseO {};

// The class's window procedure.
platform::LResult ZKUSB_WINDOW_CALL StaticWndProc(platform::WindowHandle window,
                                                  std::uint32_t message, platform::WParam wParam,
                                                  platform::LParam lParam);

}  // namespace KelvoUHW
