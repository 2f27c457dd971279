#include "monitor/message_window.h"

#include <exception>

#include "monitor/process_state.h"
#include "monitor/usb_event_receiver.h"
#include "platform/device_broadcast.h"
#include "platform/system.h"

namespace KelvoUHW {

namespace {

constexpr char16_t kClassName[] = u"MsgReceiver";

platform::Desktop& Desktop() noexcept { return *platform::CurrentSystem().desktop; }

// A broadcast that is with the active receiver: the receiver outlives it.
class BroadcastInside {
 public:
  BroadcastInside() noexcept { ++g_nBroadcasts; }
  ~BroadcastInside() { --g_nBroadcasts; }
  BroadcastInside(const BroadcastInside&) = delete;
  BroadcastInside& operator=(const BroadcastInside&) = delete;
};

platform::LResult OnMessage(platform::WindowHandle window, std::uint32_t message,
                            platform::WParam wParam, platform::LParam lParam) {
  if (message != platform::kWM_DEVICECHANGE) {
    return Desktop().DefWindowProcW(window, message, wParam, lParam);
  }
  if (wParam == platform::kDBT_DEVICEARRIVAL || wParam == platform::kDBT_DEVICEREMOVECOMPLETE) {
    const BroadcastInside inside;
    if (CZKUMUsbEventReceiver* receiver = g_pActiveReceiver) {
      receiver->OnDeviceChange(wParam, lParam);
    }
  }
  return 0;
}

}  // namespace

WinApp::WinApp(platform::InstanceHandle instance, platform::InstanceHandle, const char16_t*,
               std::int32_t) noexcept
    : m_hInstance(instance) {
  g_pWinApp = this;
}

platform::WParam WinApp::RunMessageLoop() {
  CZKUMWinMsgReceiver receiver;
  if (!receiver.Create()) return 0;
  platform::MSG message;
  // A failed fetch (-1) is no end: the loop goes on until the quit message.
  while (Desktop().GetMessageW(message, 0, 0, 0) != 0) {
    Desktop().TranslateMessage(message);
    Desktop().DispatchMessageW(message);
    // What a failed fetch leaves here must not be dispatched once more.
    message = {};
  }
  return message.wParam;
}

WinBaseO::WinBaseO() noexcept { g_pMsgWindow = this; }

WinBaseO::~WinBaseO() {
  try {
    if (Desktop().IsWindow(m_hWnd) == 1) Desktop().DestroyWindow(m_hWnd);
  } catch (...) {
    // The thread ends; its windows go with it.
  }
}

bool WinBaseO::RegisterWindowClass() {
  platform::WNDCLASSW windowClass;
  windowClass.style = platform::kCS_HREDRAW | platform::kCS_VREDRAW;
  windowClass.lpfnWndProc = StaticWndProc;
  windowClass.hInstance = g_pWinApp.load()->m_hInstance;
  windowClass.hCursor = Desktop().LoadCursorW(0, platform::kIDC_ARROW);
  windowClass.hbrBackground = Desktop().GetStockObject(platform::kWHITE_BRUSH);
  windowClass.lpszClassName = kClassName;
  if (const platform::Status status = Desktop().RegisterClassW(windowClass); !status) {
    FatalError(status.error);
  }
  return true;
}

bool WinBaseO::Create() {
  if (!RegisterWindowClass()) return false;
  platform::CREATESTRUCTW creation;
  creation.hInstance = g_pWinApp.load()->m_hInstance;
  creation.lpszName = u"";
  creation.lpszClass = kClassName;
  platform::WindowHandle window = 0;
  const platform::Status status = Desktop().CreateWindowExW(creation, window);
  m_hWnd = window;
  if (window == 0) FatalError(status.error);
  return true;
}

void WinBaseO::FatalError(std::uint32_t code) {
  char16_t* text = nullptr;
  Desktop().FormatMessageW(
      platform::kFORMAT_MESSAGE_ALLOCATE_BUFFER | platform::kFORMAT_MESSAGE_FROM_SYSTEM, code,
      platform::kLANG_USER_DEFAULT, text);
  Desktop().MessageBoxW(0, text, nullptr, platform::kMB_OK);
  if (text != nullptr) Desktop().LocalFree(text);
  platform::CurrentSystem().threads->ExitProcess(code);
  std::terminate();  // never reached: compilers do not know it of a virtual operation
}

platform::LResult WinBaseO::WndProc(platform::WindowHandle window, std::uint32_t message,
                                    platform::WParam wParam, platform::LParam lParam) {
  // An exception neither reaches the system's dispatch nor shows anything: the texts are made and
  // dropped. This is deliberate.
  try {
    try {
      return OnMessage(window, message, wParam, lParam);
    } catch (const WinAppException& exception) {
      std::u16string text = exception.Message();
      text += u"\nAborting";
    } catch (...) {
      const std::u16string text = u"Exception\tcaught - Abort?\n(Program may be unstable if NO)";
    }
  } catch (...) {
    // No memory for the text.
  }
  return 0;
}

platform::LResult ZKUSB_WINDOW_CALL StaticWndProc(platform::WindowHandle window,
                                                  std::uint32_t message, platform::WParam wParam,
                                                  platform::LParam lParam) {
  auto* object = reinterpret_cast<WinBaseO*>(Desktop().WindowUserData(window));
  if (object == nullptr) {
    // The window's first message, which comes while it is being made: from here on the window
    // belongs to the object that is making it.
    object = g_pMsgWindow;
    if (object == nullptr) return Desktop().DefWindowProcW(window, message, wParam, lParam);
    Desktop().SetWindowUserData(window, reinterpret_cast<std::intptr_t>(object));
    object->m_hWnd = window;
  }
  return object->WndProc(window, message, wParam, lParam);
}

}  // namespace KelvoUHW
