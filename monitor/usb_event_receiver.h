// From device broadcasts to calls of the event notifier.
#pragma once

#include <atomic>
#include <cstdint>

#include "com/private_interfaces.h"
#include "platform/desktop.h"
#include "platform/device_broadcast.h"

namespace KelvoUHW {

// The notifier's part that listens to the system. Start makes the window thread; each broadcast
// that matters makes an event thread, which calls the notifier once, under g_notifyLock and in the
// multithreaded apartment. Which devices came or went is not read from the broadcast: the notifier
// finds out.
class CZKUMUsbEventReceiver {
 public:
  CZKUMUsbEventReceiver() noexcept = default;
  CZKUMUsbEventReceiver(const CZKUMUsbEventReceiver&) = delete;
  CZKUMUsbEventReceiver& operator=(const CZKUMUsbEventReceiver&) = delete;
  // Takes back what Start did, except for the window and its thread, which stay as long as the
  // process. Waits for g_notifyLock, so not by a thread that another holder of it waits for.
  virtual ~CZKUMUsbEventReceiver();

  // Once in the life of a process. Takes a reference of its own to `target`, which may be null.
  // False when no device-interface messages are going to come: without a window thread, or when the
  // window is not there yet at the moment the thread's object is.
  bool Start(IZKUMPrivateNotifier* target);

  // A device event with its record, on the window thread. The record is not trusted: one that is
  // null or too short for what is read from it starts nothing. FALSE when an event thread was to be
  // started and could not be; that broadcast is lost.
  BOOL OnDeviceChange(platform::WParam event, platform::LParam broadcast);
  // Whether the record names one of the devices whose interfaces, too, start a run. Reads no more
  // of it than it says it has.
  static bool IsWatchedDevice(const platform::DEV_BROADCAST_HDR* header);

  // The threads. `delay` is a number of milliseconds.
  static void NotifyThreadProc(void* delay);
  static void WindowThreadProc(void* unused);

  // How many builds the notifier has under way; no decision reads it.
  std::atomic<std::int32_t> m_nBusy = 0;
  platform::NotificationHandle m_hDevNotify = 0;
};

}  // namespace KelvoUHW
