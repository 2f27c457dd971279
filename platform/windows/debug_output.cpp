#include "platform/windows/native_types.h"
#include "platform/windows/windows_host.h"

namespace platform::windows {

void WindowsHost::WriteDebugText(const char16_t* text) noexcept {
  OutputDebugStringW(Native(text));
}

}  // namespace platform::windows
