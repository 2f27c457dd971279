// What there is once in a process: the notification lock, and who receives what.
//
// All of it stands in static storage, is zero when the module is loaded, and outlives every thread.
// Pointers are atomic because the window thread, event threads and client threads read and write
// them without a lock in common.
#pragma once

#include <atomic>
#include <cstdint>

#include "com/private_interfaces.h"
#include "monitor/thread_lock.h"

namespace KelvoUHW {

class CZKUMUsbEventReceiver;
class WinApp;
class WinBaseO;

// Serialises event threads with each other, with the notifier's use of the tree and with the
// receiver's teardown. Taken before any other lock.
extern CThreadLock g_notifyLock;

// What event threads call; owns one reference. Event threads call it under g_notifyLock.
extern std::atomic<IZKUMPrivateNotifier*> g_pNotifyTarget;
// Where the window procedure hands broadcasts to; not owned.
extern std::atomic<CZKUMUsbEventReceiver*> g_pActiveReceiver;
// The window object constructed last; not owned, and never cleared: the window thread, on whose
// stack it stands, runs until the process ends.
extern std::atomic<WinBaseO*> g_pMsgWindow;
// The application object of the window thread; not owned.
extern std::atomic<WinApp*> g_pWinApp;

// Broadcasts that are with the active receiver just now, and event threads that have not ended.
extern std::atomic<std::uint32_t> g_nBroadcasts;
extern std::atomic<std::uint32_t> g_nEventThreads;

// Gives the target's reference back, if there is one. The pointer is null before the release, which
// may destroy the notifier and come back here. Not while an event thread may be in a call of the
// target: hold g_notifyLock, or see StopReceiving.
void ReleaseNotifyTarget() noexcept;

// From here on no broadcast is taken, and when this returns no event thread is left; a removal that
// waits for its three seconds is waited for. Not by an event thread, nor with g_notifyLock held.
// The next CZKUMUsbEventReceiver::Start receives again.
void StopReceiving() noexcept;

// Waits for the broadcasts that were with a receiver when g_pActiveReceiver was set to null. Not by
// the window thread.
void WaitForBroadcasts() noexcept;

// As in a process that has just loaded the module. For programs that let one simulated process
// follow the other, when no thread of the earlier one is left. Releases nothing.
void ForgetMonitorState() noexcept;

}  // namespace KelvoUHW
