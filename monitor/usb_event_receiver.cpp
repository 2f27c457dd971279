#include "monitor/usb_event_receiver.h"

#include <cstddef>
#include <cstdio>
#include <cstring>
#include <string>

#include "com/module_lock.h"
#include "monitor/message_window.h"
#include "monitor/process_state.h"
#include "platform/com.h"
#include "platform/system.h"
#include "records/identifiers.h"
#include "records/node.h"

namespace KelvoUHW {

namespace {

constexpr std::uint32_t kWindowPollMilliseconds = 10;
// So long for the window once its object is there. Where none comes the process is about to end.
constexpr std::uint32_t kLongestWindowWaitMilliseconds = 5000;
// A watched device's removal is looked at late, its arrival and every volume at once: this is
// deliberate.
constexpr std::uint32_t kRemovalDelayMilliseconds = 3000;

// The prefix of a device-interface path; whatever stands there is skipped unseen.
constexpr std::size_t kPathPrefixLength = 4;

platform::Threads& Threads() noexcept { return *platform::CurrentSystem().threads; }

template <class Value>
Value ReadAt(const void* bytes, std::size_t offset) noexcept {
  Value value;
  std::memcpy(&value, static_cast<const std::byte*>(bytes) + offset, sizeof value);
  return value;
}

// The name within the record's own size, up to its first zero.
std::u16string BroadcastName(const platform::DEV_BROADCAST_HDR* header) {
  const std::size_t size = ReadAt<std::uint32_t>(header, 0);
  std::u16string name;
  for (std::size_t offset = platform::kInterfaceBroadcastNameOffset;
       offset + sizeof(char16_t) <= size; offset += sizeof(char16_t)) {
    const auto unit = ReadAt<char16_t>(header, offset);
    if (unit == u'\0') break;
    name += unit;
  }
  return name;
}

// An event thread's claim on what it runs in: the module's code until its very last act. Made
// before the thread starts and handed to it.
void BeginEventThread() noexcept {
  ++g_nEventThreads;
  LockModule();
}
void EndEventThread() noexcept {
  --g_nEventThreads;
  UnlockModule();
}
struct EventThreadEnd {
  ~EventThreadEnd() { EndEventThread(); }
};

// The multithreaded apartment, as long as it lives, unless entering it failed.
class Apartment {
 public:
  Apartment() noexcept : m_entered(SUCCEEDED(CoInitializeEx(nullptr, COINIT_MULTITHREADED))) {}
  ~Apartment() {
    if (m_entered) CoUninitialize();
  }
  Apartment(const Apartment&) = delete;
  Apartment& operator=(const Apartment&) = delete;
  explicit operator bool() const noexcept { return m_entered; }

 private:
  const bool m_entered;
};

}  // namespace

CZKUMUsbEventReceiver::~CZKUMUsbEventReceiver() {
  try {
    const ThreadLockGuard lock(g_notifyLock);
    ReleaseNotifyTarget();
    g_pActiveReceiver = nullptr;
    if (m_hDevNotify != 0) {
      platform::CurrentSystem().desktop->UnregisterDeviceNotification(m_hDevNotify);
    }
  } catch (...) {
    // The process ended while another thread held the lock.
  }
  ReleaseNotifyTarget();
  g_pActiveReceiver = nullptr;
  WaitForBroadcasts();
}

bool CZKUMUsbEventReceiver::Start(IZKUMPrivateNotifier* target) {
  g_pActiveReceiver = this;
  if (target != g_pNotifyTarget) {
    if (target != nullptr) target->AddRef();
    if (IZKUMPrivateNotifier* previous = g_pNotifyTarget.exchange(target)) previous->Release();
  }
  if (!Threads().StartThread(WindowThreadProc, 0, nullptr)) {
    std::printf("Failed to create a thread\n");
    return false;
  }
  while (g_pMsgWindow == nullptr) Threads().Sleep(kWindowPollMilliseconds);

  // The object is there before its window is, and the system refuses a null handle: the process
  // would never hear of a device interface.
  std::uint32_t waited = 0;
  while (g_pMsgWindow.load()->m_hWnd == 0 && waited < kLongestWindowWaitMilliseconds) {
    Threads().Sleep(kWindowPollMilliseconds);
    waited += kWindowPollMilliseconds;
  }
  const platform::WindowHandle window = g_pMsgWindow.load()->m_hWnd;
  platform::DEV_BROADCAST_DEVICEINTERFACE_W filter;
  filter.dbcc_size = sizeof filter;
  platform::CurrentSystem().desktop->RegisterDeviceNotificationW(
      window, &filter,
      platform::kDEVICE_NOTIFY_WINDOW_HANDLE | platform::kDEVICE_NOTIFY_ALL_INTERFACE_CLASSES,
      m_hDevNotify);
  return m_hDevNotify != 0;
}

BOOL CZKUMUsbEventReceiver::OnDeviceChange(platform::WParam event, platform::LParam broadcast) {
  if (event != platform::kDBT_DEVICEARRIVAL && event != platform::kDBT_DEVICEREMOVECOMPLETE) {
    return TRUE;
  }
  const auto* header = reinterpret_cast<const platform::DEV_BROADCAST_HDR*>(broadcast);
  if (header == nullptr || ReadAt<std::uint32_t>(header, 0) < sizeof *header) return TRUE;

  std::uint32_t delay = 0;
  const auto type =
      ReadAt<std::uint32_t>(header, offsetof(platform::DEV_BROADCAST_HDR, dbch_devicetype));
  if (type != platform::kDBT_DEVTYP_VOLUME) {
    if (!IsWatchedDevice(header)) return TRUE;
    if (event == platform::kDBT_DEVICEREMOVECOMPLETE) delay = kRemovalDelayMilliseconds;
  }

  BeginEventThread();
  void* argument = reinterpret_cast<void*>(static_cast<std::uintptr_t>(delay));
  if (Threads().StartThread(NotifyThreadProc, 0, argument)) return TRUE;
  EndEventThread();
  m_nBusy = 0;
  return FALSE;
}

bool CZKUMUsbEventReceiver::IsWatchedDevice(const platform::DEV_BROADCAST_HDR* header) {
  if (header == nullptr) return false;
  // Read as an interface's record whatever the type says.
  const std::u16string name = BroadcastName(header);
  if (name.size() <= kPathPrefixLength) return false;
  CZKUMUsbTreeNodeImpl scratch;
  scratch.SetInstanceId(InterfacePathToInstanceId(name.c_str() + kPathPrefixLength));
  return scratch.m_nVendorId == 0x05AC && scratch.m_nProductId >= 0x1290 &&
         scratch.m_nProductId <= 0x1292;
}

void CZKUMUsbEventReceiver::NotifyThreadProc(void* argument) {
  const EventThreadEnd end;
  try {
    const auto delay = static_cast<std::uint32_t>(reinterpret_cast<std::uintptr_t>(argument));
    if (delay != 0) Threads().Sleep(delay);
    const ThreadLockGuard lock(g_notifyLock);
    const Apartment apartment;
    if (!apartment) return;
    if (IZKUMPrivateNotifier* target = g_pNotifyTarget) target->NotifyDeviceChange(delay, TRUE);
  } catch (...) {
    // Nobody is left to tell; the next broadcast starts a run of its own.
  }
}

void CZKUMUsbEventReceiver::WindowThreadProc(void*) {
  // The window procedure is this module's code and stays the class's until the process ends. Where
  // the module cannot be pinned, a lock that nobody gives back keeps it.
  if (!Threads().PinModule(&g_notifyLock)) LockModule();
  try {
    WinApp app(platform::CurrentSystem().desktop->GetModuleHandleW(nullptr), 0, nullptr, 0);
    app.RunMessageLoop();
  } catch (...) {
    // The thread ends, and with it its window.
  }
}

}  // namespace KelvoUHW
