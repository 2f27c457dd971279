#include "monitor/process_state.h"

#include "platform/desktop.h"
#include "platform/system.h"

namespace KelvoUHW {

constinit CThreadLock g_notifyLock;
constinit std::atomic<IZKUMPrivateNotifier*> g_pNotifyTarget = nullptr;
constinit std::atomic<CZKUMUsbEventReceiver*> g_pActiveReceiver = nullptr;
constinit std::atomic<WinBaseO*> g_pMsgWindow = nullptr;
constinit std::atomic<WinApp*> g_pWinApp = nullptr;
constinit std::atomic<std::uint32_t> g_nBroadcasts = 0;
constinit std::atomic<std::uint32_t> g_nEventThreads = 0;

namespace {

constexpr std::uint32_t kTeardownPollMilliseconds = 10;

void WaitForNone(const std::atomic<std::uint32_t>& count) noexcept {
  try {
    while (count != 0) platform::CurrentSystem().threads->Sleep(kTeardownPollMilliseconds);
  } catch (...) {
    // The process has ended, and with it those that were waited for.
  }
}

}  // namespace

void ReleaseNotifyTarget() noexcept {
  if (IZKUMPrivateNotifier* target = g_pNotifyTarget.exchange(nullptr)) target->Release();
}

void WaitForBroadcasts() noexcept { WaitForNone(g_nBroadcasts); }

void StopReceiving() noexcept {
  g_pActiveReceiver = nullptr;
  WaitForBroadcasts();
  WaitForNone(g_nEventThreads);
}

void ForgetMonitorState() noexcept {
  g_notifyLock.Forget();
  g_pNotifyTarget = nullptr;
  g_pActiveReceiver = nullptr;
  g_pMsgWindow = nullptr;
  g_pWinApp = nullptr;
  g_nBroadcasts = 0;
  g_nEventThreads = 0;
}

}  // namespace KelvoUHW
