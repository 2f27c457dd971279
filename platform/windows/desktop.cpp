#include <windows.h>

#include <dbt.h>

#include "platform/device_broadcast.h"
#include "platform/windows/native_types.h"
#include "platform/windows/windows_desktop.h"

namespace platform::windows {

namespace {

static_assert(kCS_VREDRAW == CS_VREDRAW && kCS_HREDRAW == CS_HREDRAW);
static_assert(kWHITE_BRUSH == WHITE_BRUSH && kMB_OK == MB_OK);
static_assert(kFORMAT_MESSAGE_ALLOCATE_BUFFER == FORMAT_MESSAGE_ALLOCATE_BUFFER &&
              kFORMAT_MESSAGE_FROM_SYSTEM == FORMAT_MESSAGE_FROM_SYSTEM);
static_assert(kLANG_USER_DEFAULT == MAKELANGID(LANG_NEUTRAL, SUBLANG_DEFAULT));
static_assert(kWM_DEVICECHANGE == WM_DEVICECHANGE && kDBT_DEVICEARRIVAL == DBT_DEVICEARRIVAL &&
              kDBT_DEVICEREMOVECOMPLETE == DBT_DEVICEREMOVECOMPLETE);
static_assert(kDEVICE_NOTIFY_WINDOW_HANDLE == DEVICE_NOTIFY_WINDOW_HANDLE &&
              kDEVICE_NOTIFY_ALL_INTERFACE_CLASSES == DEVICE_NOTIFY_ALL_INTERFACE_CLASSES);
static_assert(sizeof(DEV_BROADCAST_HDR) == sizeof(::DEV_BROADCAST_HDR));
static_assert(sizeof(DEV_BROADCAST_DEVICEINTERFACE_W) == sizeof(::DEV_BROADCAST_DEVICEINTERFACE_W));
static_assert(kInterfaceBroadcastNameOffset ==
              offsetof(::DEV_BROADCAST_DEVICEINTERFACE_W, dbcc_name));
static_assert(sizeof(DEV_BROADCAST_VOLUME) == sizeof(::DEV_BROADCAST_VOLUME));

template <class Handle>
Handle As(std::intptr_t handle) noexcept {
  return reinterpret_cast<Handle>(handle);
}

::MSG NativeMessage(const MSG& message) noexcept {
  return {As<HWND>(message.hwnd), message.message, message.wParam,
          message.lParam,         message.time,    {message.ptX, message.ptY}};
}

}  // namespace

InstanceHandle WindowsDesktop::GetModuleHandleW(const char16_t* name) noexcept {
  return FromNative(::GetModuleHandleW(Native(name)));
}

GraphicsHandle WindowsDesktop::LoadCursorW(InstanceHandle instance, std::uint16_t number) noexcept {
  return FromNative(::LoadCursorW(As<HINSTANCE>(instance), MAKEINTRESOURCEW(number)));
}

GraphicsHandle WindowsDesktop::GetStockObject(std::int32_t object) noexcept {
  return FromNative(::GetStockObject(object));
}

Status WindowsDesktop::RegisterClassW(const WNDCLASSW& windowClass) noexcept {
  ::WNDCLASSW native{};
  native.style = windowClass.style;
  // The same function type but for the handle, which is a pointer here.
  native.lpfnWndProc = reinterpret_cast<WNDPROC>(reinterpret_cast<void*>(windowClass.lpfnWndProc));
  native.cbClsExtra = windowClass.cbClsExtra;
  native.cbWndExtra = windowClass.cbWndExtra;
  native.hInstance = As<HINSTANCE>(windowClass.hInstance);
  native.hIcon = As<HICON>(windowClass.hIcon);
  native.hCursor = As<HCURSOR>(windowClass.hCursor);
  native.hbrBackground = As<HBRUSH>(windowClass.hbrBackground);
  native.lpszMenuName = Native(windowClass.lpszMenuName);
  native.lpszClassName = Native(windowClass.lpszClassName);
  return FromBool(::RegisterClassW(&native) != 0);
}

Status WindowsDesktop::CreateWindowExW(const CREATESTRUCTW& creation, WindowHandle& window) {
  window = FromNative(::CreateWindowExW(
      creation.dwExStyle, Native(creation.lpszClass), Native(creation.lpszName), creation.style,
      creation.x, creation.y, creation.cx, creation.cy, As<HWND>(creation.hwndParent),
      As<HMENU>(creation.hMenu), As<HINSTANCE>(creation.hInstance), creation.lpCreateParams));
  return FromBool(window != 0);
}

Status WindowsDesktop::DestroyWindow(WindowHandle window) {
  return FromBool(::DestroyWindow(As<HWND>(window)));
}

std::int32_t WindowsDesktop::IsWindow(WindowHandle window) noexcept {
  return ::IsWindow(As<HWND>(window));
}

std::intptr_t WindowsDesktop::WindowUserData(WindowHandle window) noexcept {
  return ::GetWindowLongPtrW(As<HWND>(window), GWLP_USERDATA);
}

std::intptr_t WindowsDesktop::SetWindowUserData(WindowHandle window, std::intptr_t value) noexcept {
  return ::SetWindowLongPtrW(As<HWND>(window), GWLP_USERDATA, static_cast<LONG_PTR>(value));
}

std::int32_t WindowsDesktop::GetMessageW(MSG& message, WindowHandle window, std::uint32_t first,
                                         std::uint32_t last) {
  ::MSG native{};
  const BOOL result = ::GetMessageW(&native, As<HWND>(window), first, last);
  if (result == -1) return -1;
  message = {FromNative(native.hwnd),
             native.message,
             native.wParam,
             native.lParam,
             native.time,
             native.pt.x,
             native.pt.y};
  return result;
}

std::int32_t WindowsDesktop::TranslateMessage(const MSG& message) noexcept {
  const ::MSG native = NativeMessage(message);
  return ::TranslateMessage(&native);
}

LResult WindowsDesktop::DispatchMessageW(const MSG& message) {
  const ::MSG native = NativeMessage(message);
  return ::DispatchMessageW(&native);
}

LResult WindowsDesktop::DefWindowProcW(WindowHandle window, std::uint32_t message, WParam wParam,
                                       LParam lParam) {
  return ::DefWindowProcW(As<HWND>(window), message, wParam, static_cast<LPARAM>(lParam));
}

Status WindowsDesktop::RegisterDeviceNotificationW(WindowHandle recipient, const void* filter,
                                                   std::uint32_t flags,
                                                   NotificationHandle& notification) noexcept {
  notification = FromNative(
      ::RegisterDeviceNotificationW(As<HANDLE>(recipient), const_cast<void*>(filter), flags));
  return FromBool(notification != 0);
}

Status WindowsDesktop::UnregisterDeviceNotification(NotificationHandle notification) noexcept {
  return FromBool(::UnregisterDeviceNotification(As<HDEVNOTIFY>(notification)));
}

std::uint32_t WindowsDesktop::FormatMessageW(std::uint32_t flags, std::uint32_t code,
                                             std::uint32_t language, char16_t*& text) noexcept {
  // With a buffer that the call allocates, the parameter for the buffer takes its address.
  WCHAR* buffer = nullptr;
  const DWORD length = ::FormatMessageW(flags, nullptr, code, language,
                                        reinterpret_cast<WCHAR*>(&buffer), 0, nullptr);
  if (length != 0) text = reinterpret_cast<char16_t*>(buffer);
  return length;
}

void WindowsDesktop::LocalFree(char16_t* text) noexcept { ::LocalFree(text); }

std::int32_t WindowsDesktop::MessageBoxW(WindowHandle owner, const char16_t* text,
                                         const char16_t* caption, std::uint32_t type) noexcept {
  return ::MessageBoxW(As<HWND>(owner), Native(text), Native(caption), type);
}

}  // namespace platform::windows
