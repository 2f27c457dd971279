// Threads and windows: what the component asks of the operating system beyond devices.
//
// As in host.h every operation mirrors one platform call, may be called from every thread, keeps no
// pointer it is given and writes its out values only as said. An operation without `noexcept` may
// run a window procedure or end the calling thread; elsewhere than on Windows a thread ends by an
// exception, see Sleep. Macros of the system's headers end in no letter here: what is a function
// there keeps its published name.
#pragma once

#include <cstdint>

#include "platform/host.h"

// Window procedures have the system's calling convention.
#if defined(_WIN32) && !defined(_WIN64)
#define ZKUSB_WINDOW_CALL __stdcall
#else
#define ZKUSB_WINDOW_CALL
#endif

namespace platform {

// Handles; 0 is none.
using WindowHandle = std::intptr_t;
using InstanceHandle = std::intptr_t;
using GraphicsHandle = std::intptr_t;  // icons, cursors and brushes
using MenuHandle = std::intptr_t;
using NotificationHandle = std::intptr_t;

using WParam = std::uintptr_t;
using LParam = std::intptr_t;
using LResult = std::intptr_t;
using WindowProcedure = LResult(ZKUSB_WINDOW_CALL*)(WindowHandle, std::uint32_t message, WParam,
                                                    LParam);
using ThreadRoutine = void (*)(void* argument);

inline constexpr std::uint32_t kCS_VREDRAW = 1;
inline constexpr std::uint32_t kCS_HREDRAW = 2;
inline constexpr std::uint16_t kIDC_ARROW = 32512;
inline constexpr std::int32_t kWHITE_BRUSH = 0;
inline constexpr std::uint32_t kFORMAT_MESSAGE_ALLOCATE_BUFFER = 0x0100;
inline constexpr std::uint32_t kFORMAT_MESSAGE_FROM_SYSTEM = 0x1000;
inline constexpr std::uint32_t kLANG_USER_DEFAULT = 0x0400;
inline constexpr std::uint32_t kMB_OK = 0;

struct WNDCLASSW {
  std::uint32_t style = 0;
  WindowProcedure lpfnWndProc = nullptr;
  std::int32_t cbClsExtra = 0;
  std::int32_t cbWndExtra = 0;
  InstanceHandle hInstance = 0;
  GraphicsHandle hIcon = 0;
  GraphicsHandle hCursor = 0;
  GraphicsHandle hbrBackground = 0;
  const char16_t* lpszMenuName = nullptr;
  const char16_t* lpszClassName = nullptr;
};

// The arguments of one CreateWindowExW.
struct CREATESTRUCTW {
  void* lpCreateParams = nullptr;
  InstanceHandle hInstance = 0;
  MenuHandle hMenu = 0;
  WindowHandle hwndParent = 0;
  std::int32_t cy = 0;
  std::int32_t cx = 0;
  std::int32_t y = 0;
  std::int32_t x = 0;
  std::uint32_t style = 0;
  const char16_t* lpszName = nullptr;
  const char16_t* lpszClass = nullptr;
  std::uint32_t dwExStyle = 0;
};

struct MSG {
  WindowHandle hwnd = 0;
  std::uint32_t message = 0;
  WParam wParam = 0;
  LParam lParam = 0;
  std::uint32_t time = 0;
  std::int32_t ptX = 0;
  std::int32_t ptY = 0;
};

class Threads {
 public:
  // _beginthread: a detached thread runs `routine` once. False is its -1, and the routine never
  // runs. Stack size 0 is the program's own. No exception may leave the routine.
  virtual bool StartThread(ThreadRoutine routine, std::uint32_t stackBytes,
                           void* argument) noexcept = 0;
  // Blocks. Where a process ends inside a process (see simulated/simulated_desktop.h) it throws
  // what ends the calling thread: let it pass or catch it last, and end the thread.
  virtual void Sleep(std::uint32_t milliseconds) = 0;
  // Never 0, and never again the id of another thread of this run.
  virtual std::uint32_t CurrentThreadId() noexcept = 0;
  // Does not return: the process ends with that exit code.
  [[noreturn]] virtual void ExitProcess(std::uint32_t code) = 0;
  // GetModuleHandleExW with FROM_ADDRESS and PIN: the module that holds `address` stays mapped
  // until the process ends.
  virtual Status PinModule(const void* address) noexcept = 0;

 protected:
  ~Threads() = default;
};

class Desktop {
 public:
  // Null: the program's own file. 0 on failure.
  virtual InstanceHandle GetModuleHandleW(const char16_t* name) noexcept = 0;
  // The system's own cursors are those of instance 0, asked for by number. Shared: nobody frees it.
  virtual GraphicsHandle LoadCursorW(InstanceHandle instance, std::uint16_t number) noexcept = 0;
  virtual GraphicsHandle GetStockObject(std::int32_t object) noexcept = 0;

  // A class lives until the process ends, and its name stands once in a process.
  virtual Status RegisterClassW(const WNDCLASSW& windowClass) noexcept = 0;
  // The calling thread owns the window and pumps its messages; the first of them arrive before this
  // returns. Failure leaves 0 in `window`.
  virtual Status CreateWindowExW(const CREATESTRUCTW& creation, WindowHandle& window) = 0;
  // By the owner thread only. A window that is gone is refused.
  virtual Status DestroyWindow(WindowHandle window) = 0;
  // Not 0 for a window; 1 is what is documented.
  virtual std::int32_t IsWindow(WindowHandle window) noexcept = 0;
  // GetWindowLongPtrW and SetWindowLongPtrW of GWL_USERDATA. 0 for a window that is gone; the
  // second returns the earlier value.
  virtual std::intptr_t WindowUserData(WindowHandle window) noexcept = 0;
  virtual std::intptr_t SetWindowUserData(WindowHandle window, std::intptr_t value) noexcept = 0;

  // Blocks, and runs window procedures for messages that other threads send meanwhile. 0: the quit
  // message; -1: failure, `message` stays as it was. Ends the thread as Sleep does.
  virtual std::int32_t GetMessageW(MSG& message, WindowHandle window, std::uint32_t first,
                                   std::uint32_t last) = 0;
  virtual std::int32_t TranslateMessage(const MSG& message) noexcept = 0;
  virtual LResult DispatchMessageW(const MSG& message) = 0;
  virtual LResult DefWindowProcW(WindowHandle window, std::uint32_t message, WParam wParam,
                                 LParam lParam) = 0;

  // `filter` is the record of the kind of device asked for. The caller owns the registration;
  // failure leaves 0. It outlives its window.
  virtual Status RegisterDeviceNotificationW(WindowHandle recipient, const void* filter,
                                             std::uint32_t flags,
                                             NotificationHandle& notification) noexcept = 0;
  virtual Status UnregisterDeviceNotification(NotificationHandle notification) noexcept = 0;

  // A system's error code as text; with ALLOCATE_BUFFER, the only way used here, `text` is set to a
  // buffer that the caller frees with LocalFree. Returns its characters without the terminator, 0
  // on failure: then `text` stays.
  virtual std::uint32_t FormatMessageW(std::uint32_t flags, std::uint32_t code,
                                       std::uint32_t language, char16_t*& text) noexcept = 0;
  virtual void LocalFree(char16_t* text) noexcept = 0;
  // Blocks until a person answers. A null caption is the system's.
  virtual std::int32_t MessageBoxW(WindowHandle owner, const char16_t* text,
                                   const char16_t* caption, std::uint32_t type) noexcept = 0;

 protected:
  ~Desktop() = default;
};

}  // namespace platform
