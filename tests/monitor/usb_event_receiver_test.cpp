#include "monitor/usb_event_receiver.h"

#include <gmock/gmock.h>

#include "monitor/message_window.h"
#include "tests/support/monitor_process.h"

namespace KelvoUHW {
namespace {

using platform::kDBT_DEVICEARRIVAL;
using platform::kDBT_DEVICEREMOVECOMPLETE;
using platform::kWM_DEVICECHANGE;
using platform::simulated::VolumeBroadcast;
using testing::Each;
using testing::ElementsAre;
using testing::IsEmpty;

constexpr std::uint32_t kArrival = kDBT_DEVICEARRIVAL;
constexpr std::uint32_t kRemoval = kDBT_DEVICEREMOVECOMPLETE;
constexpr std::uint32_t kOem = 0, kVolume = 2, kPort = 3, kInterface = 5, kHandle = 6;

std::u16string Path(const std::u16string& id, const std::u16string& prefix = u"\\\\?\\") {
  return prefix + u"USB#" + id + u"#0a1b#{a5dcbf10-6530-11d2-901f-00c04fb951ed}";
}

// A process whose receiver has started with a target.
struct Monitor : MonitorProcess {
  // What the broadcast set off: the delays of the calls, each at its moment.
  std::vector<std::uint64_t> Send(std::uint32_t event, const DeviceBroadcast& broadcast) {
    const std::uint64_t start = desktop.Now();
    const auto& calls = target.Calls();
    const std::size_t before = calls.size();
    const platform::WindowHandle window = desktop.Windows().at(0).handle;
    EXPECT_EQ(desktop.SendToWindow(window, kWM_DEVICECHANGE, event, RecordOf(broadcast)), 0);
    desktop.Settle();
    std::vector<std::uint64_t> delays;
    for (std::size_t i = before; i < calls.size(); ++i) {
      EXPECT_EQ(calls[i], (RecordingTarget::Call{start + calls[i].delay, calls[i].delay, TRUE, true}));
      delays.push_back(calls[i].delay);
    }
    return delays;
  }

  RecordingTarget target{desktop};
  CZKUMUsbEventReceiver receiver;
  const bool started = receiver.Start(&target);
};

TEST(UsbEventReceiver, StartsAnEventThreadForWhatMatters) {
  const std::u16string watched = kWatchedPath;
  const auto bytesUpTo = [](const std::u16string& text) { return 28 + 2 * text.size(); };
  const std::u16string upToCut = watched.substr(0, watched.rfind(u'#') + 1);
  const std::tuple<const char*, std::uint32_t, DeviceBroadcast, std::vector<std::uint64_t>> kCases[] = {
      {"volume came", kArrival, VolumeBroadcast(0, u'E', 0), {0}},
      {"volume went", kRemoval, VolumeBroadcast(0, u'E', 0), {0}},
      {"volume, its name not read", kArrival, NamedBroadcast(0, kVolume, u"x"), {0}},
      {"volume, header only", kRemoval, NamedBroadcast(0, kVolume, u"", 12), {0}},
      {"volume, header cut", kArrival, NamedBroadcast(0, kVolume, u"", 11), {}},
      {"watched came", kArrival, NamedBroadcast(0, kInterface, watched), {0}},
      {"watched went", kRemoval, NamedBroadcast(0, kInterface, watched), {3000}},
      {"product 1290", kArrival, NamedBroadcast(0, kInterface, Path(u"VID_05AC&PID_1290")), {0}},
      {"small letters", kRemoval, NamedBroadcast(0, kInterface, Path(u"vid_05ac&pid_1292")), {3000}},
      {"product 128F", kArrival, NamedBroadcast(0, kInterface, Path(u"VID_05AC&PID_128F")), {}},
      {"product 1293 came", kArrival, NamedBroadcast(0, kInterface, Path(u"VID_05AC&PID_1293")), {}},
      {"product 1293 went", kRemoval, NamedBroadcast(0, kInterface, Path(u"VID_05AC&PID_1293")), {}},
      {"vendor 05AD", kArrival, NamedBroadcast(0, kInterface, Path(u"VID_05AD&PID_1291")), {}},
      {"no ids", kArrival, NamedBroadcast(0, kInterface, Path(u"ROOT_HUB20")), {}},
      {"no name", kArrival, NamedBroadcast(0, kInterface, u""), {}},
      {"port went", kRemoval, NamedBroadcast(0, kPort, watched), {3000}},
      {"handle, not watched", kRemoval, NamedBroadcast(0, kHandle, u"COM1 and more"), {}},
      {"other types are read alike", kArrival, NamedBroadcast(0, kOem, watched), {0}},
      {"any prefix of four", kArrival, NamedBroadcast(0, kInterface, Path(u"VID_05AC&PID_1291", u"####")), {0}},
      {"prefix skipped unseen", kArrival, NamedBroadcast(0, kInterface, u"VID_05AC&PID_1291#1#{x}"), {}},
      {"name of four", kArrival, NamedBroadcast(0, kInterface, u"\\\\?\\"), {}},
      {"name of five", kArrival, NamedBroadcast(0, kInterface, u"\\\\?\\#"), {}},
      {"name without its zero", kArrival, NamedBroadcast(0, kInterface, upToCut, bytesUpTo(upToCut)), {0}},
      {"half a character more", kArrival, NamedBroadcast(0, kInterface, watched, bytesUpTo(upToCut) + 1), {0}},
      {"header only", kRemoval, NamedBroadcast(0, kInterface, watched, 12), {}},
      {"size only", kRemoval, NamedBroadcast(0, kInterface, watched, 4), {}},
      {"null came", kArrival, {}, {}},
      {"null went", kRemoval, {}, {}},
      {"nodes changed", 0x0007, {}, {}},
      {"query", 0x8001, VolumeBroadcast(0, u'E', 0), {}},
      {"query failed", 0x8002, NamedBroadcast(0, kInterface, watched), {}},
      {"pending", 0x8003, NamedBroadcast(0, kInterface, watched), {}},
      {"custom", 0x8006, VolumeBroadcast(0, u'E', 0), {}},
      {"beyond 16 bits", 0x18000, VolumeBroadcast(0, u'E', 0), {}},
  };
  Monitor monitor;
  std::uint64_t threads = monitor.desktop.Calls(DesktopCall::StartThread);
  for (const auto& [what, event, broadcast, delays] : kCases) {
    EXPECT_EQ(monitor.Send(event, broadcast), delays) << what;
    threads += delays.size();
    EXPECT_EQ(monitor.desktop.Calls(DesktopCall::StartThread), threads) << what;
    // The answer to the window procedure says only whether a thread could be had.
    EXPECT_EQ(monitor.receiver.OnDeviceChange(event, RecordOf(broadcast)), TRUE) << what;
    monitor.desktop.Settle();
    threads += delays.size();
  }
  EXPECT_FALSE(CZKUMUsbEventReceiver::IsWatchedDevice(nullptr));
}

TEST(UsbEventReceiver, RegistersForEveryInterfaceOnceTheWindowIsThere) {
  Monitor monitor;
  SimulatedDesktop& desktop = monitor.desktop;
  EXPECT_TRUE(monitor.started);
  EXPECT_EQ(desktop.Now(), 10u);
  EXPECT_EQ(monitor.target.References(), 2);
  EXPECT_EQ(g_pNotifyTarget, &monitor.target);
  const auto registrations = desktop.Registrations();
  ASSERT_EQ(registrations.size(), 1u);
  EXPECT_EQ(registrations[0].window, g_pMsgWindow.load()->m_hWnd);
  EXPECT_EQ(registrations[0].flags, 4u);
  const platform::DEV_BROADCAST_DEVICEINTERFACE_W& filter = registrations[0].filter;
  EXPECT_TRUE(filter.dbcc_size == 32 && filter.dbcc_devicetype == 5 && filter.dbcc_reserved == 0);
  EXPECT_TRUE(filter.dbcc_classguid == platform::kNullGuid && filter.dbcc_name[0] == 0);

  // The same target again takes no reference, another one replaces it.
  RecordingTarget other(desktop);
  CZKUMUsbEventReceiver again;
  desktop.Order({.call = DesktopCall::StartThread, .nth = 2, .error = 8});
  desktop.Order({.call = DesktopCall::StartThread, .nth = 3, .error = 8});
  testing::internal::CaptureStdout();
  EXPECT_FALSE(again.Start(&monitor.target));
  EXPECT_EQ(monitor.target.References(), 2);
  EXPECT_FALSE(again.Start(&other));
  EXPECT_EQ(testing::internal::GetCapturedStdout(), "Failed to create a thread\nFailed to create a thread\n");
  EXPECT_TRUE(monitor.target.References() == 1 && other.References() == 2);
  // Without a thread nothing is registered.
  EXPECT_EQ(again.m_hDevNotify, 0);
  EXPECT_EQ(desktop.Calls(DesktopCall::RegisterDeviceNotificationW), 1u);
}

TEST(UsbEventReceiver, WaitsForItsWindowButNotForEver) {
  // The object is published, its window not yet made. One that comes too late hears of volumes alone.
  const std::tuple<std::uint32_t, bool, std::uint64_t> kCases[] = {
      {100, true, 100}, {4995, true, 5000}, {5005, true, 5010}, {5100, false, 5010}, {9000, false, 5010}};
  for (const auto& [delay, started, until] : kCases) {
    SCOPED_TRACE(delay);
    MonitorProcess process;
    process.desktop.Order({.call = DesktopCall::CreateWindowExW, .delayMilliseconds = delay});
    RecordingTarget target(process.desktop);
    CZKUMUsbEventReceiver receiver;
    EXPECT_EQ(receiver.Start(&target), started);
    EXPECT_EQ(process.desktop.Now(), until);
    process.desktop.RunFor(static_cast<std::uint32_t>(10'000 - until));
    EXPECT_EQ(process.desktop.Registrations().size(), started ? 1u : 0u);
    EXPECT_EQ(process.desktop.Broadcast(NamedBroadcast(kArrival, kInterface, kWatchedPath)), started ? 1u : 0u);
    EXPECT_EQ(process.desktop.Broadcast(VolumeBroadcast(kArrival, u'E', 0)), 1u);
    process.desktop.Settle();
    EXPECT_THAT(target.Calls(), Each(RecordingTarget::Call{10'000, 0, TRUE, true}));
    EXPECT_EQ(target.Calls().size(), started ? 2u : 1u);
  }
  // The handle is there from the window's first message on, while the window is still being made.
  {
    MonitorProcess process;
    process.desktop.SetDefaultProcedure([&](const platform::MSG& message) -> platform::LResult {
      if (message.message == 0x81) process.desktop.Sleep(100);
      return 1;
    });
    CZKUMUsbEventReceiver receiver;
    EXPECT_TRUE(receiver.Start(nullptr));
    EXPECT_EQ(process.desktop.Now(), 10u);
    process.desktop.RunFor(200);
  }
  // The object is late, too: looked for every ten milliseconds. A module that cannot be pinned is locked for good.
  const std::int32_t locks = ModuleLockCount();
  {
    MonitorProcess process;
    process.desktop.Order({.call = DesktopCall::PinModule, .error = 8, .delayMilliseconds = 25});
    process.desktop.Order({.call = DesktopCall::RegisterDeviceNotificationW, .error = 8});
    CZKUMUsbEventReceiver receiver;
    EXPECT_FALSE(receiver.Start(nullptr));
    EXPECT_EQ(process.desktop.Now(), 30u);
    EXPECT_EQ(ModuleLockCount(), locks + 1);
  }
  UnlockModule();
}

TEST(UsbEventReceiver, LosesABroadcastWithoutAThreadOrAnApartment) {
  Monitor monitor;
  SimulatedDesktop& desktop = monitor.desktop;
  const std::int32_t locks = ModuleLockCount();
  const DeviceBroadcast volume = VolumeBroadcast(kArrival, u'E', 0);

  desktop.Order({.call = DesktopCall::StartThread, .nth = 2, .error = 8});
  monitor.receiver.m_nBusy = 5;
  EXPECT_EQ(monitor.receiver.OnDeviceChange(kArrival, RecordOf(volume)), FALSE);
  EXPECT_EQ(monitor.receiver.m_nBusy, 0);
  EXPECT_EQ(ModuleLockCount(), locks);
  EXPECT_EQ(g_nEventThreads, 0u);
  desktop.Settle();
  EXPECT_EQ(desktop.Calls(DesktopCall::StartThread), 2u) << "tried again";

  // A thread in an apartment of the other kind cannot enter ours, and stays in its own.
  HRESULT own = E_FAIL;
  ++g_nEventThreads;
  LockModule();
  monitor.Launch([&] {
    EXPECT_EQ(CoInitializeEx(nullptr, COINIT_APARTMENTTHREADED), S_OK);
    CZKUMUsbEventReceiver::NotifyThreadProc(nullptr);
    own = CoInitializeEx(nullptr, COINIT_APARTMENTTHREADED);
    CoUninitialize();
    CoUninitialize();
  });
  desktop.Settle();
  EXPECT_THAT(monitor.target.Calls(), IsEmpty());
  EXPECT_EQ(own, S_FALSE);

  // Neither keeps the lock or the next broadcast; an exception of the target does not, either.
  monitor.target.onCall = [] { throw std::bad_alloc(); };
  EXPECT_THAT(monitor.Send(kArrival, volume), ElementsAre(0u));
  EXPECT_THAT(monitor.Send(kArrival, volume), ElementsAre(0u));
  EXPECT_EQ(ModuleLockCount(), locks);
}

TEST(UsbEventReceiver, RunsEventThreadsOneAtATimeAndNotInTheirOrder) {
  Monitor monitor;
  SimulatedDesktop& desktop = monitor.desktop;
  monitor.target.onCall = [&] {
    const ThreadLockGuard again(g_notifyLock);  // the notifier takes it once more
    EXPECT_GE(ModuleLockCount(), 1);
    desktop.Sleep(70);
  };
  const std::uint64_t start = desktop.Now();
  desktop.Broadcast(NamedBroadcast(kRemoval, kInterface, kWatchedPath));
  desktop.Broadcast(VolumeBroadcast(kArrival, u'E', 0));
  desktop.Broadcast(VolumeBroadcast(kRemoval, u'E', 0));
  EXPECT_EQ(desktop.Now(), start) << "the window thread waited for a run";
  desktop.Settle();
  // The second volume asks at 0, 50 and 100.
  using Call = RecordingTarget::Call;
  EXPECT_THAT(monitor.target.Calls(), ElementsAre(Call{start, 0, TRUE, true}, Call{start + 100, 0, TRUE, true},
                                                  Call{start + 3000, 3000, TRUE, true}));
}

TEST(UsbEventReceiver, TeardownTakesBackAllButTheWindow) {
  MonitorProcess process;
  SimulatedDesktop& desktop = process.desktop;
  RecordingTarget target(desktop);
  const DeviceBroadcast volume = VolumeBroadcast(kArrival, u'E', 0);
  {
    CZKUMUsbEventReceiver receiver;
    EXPECT_TRUE(receiver.Start(&target));
    // A removal is on its way and comes too late.
    desktop.Broadcast(NamedBroadcast(kRemoval, kInterface, kWatchedPath));
    g_notifyLock.Lock();
    process.Launch([&] {
      desktop.Sleep(10);
      EXPECT_EQ(target.References(), 2) << "teardown did not wait for the lock";
    });
    desktop.RunFor(20);
    g_notifyLock.Unlock();
    // A broadcast is with the receiver: it outlives it.
    ++g_nBroadcasts;
    process.Launch([&] {
      desktop.Sleep(25);
      --g_nBroadcasts;
    });
  }
  EXPECT_EQ(desktop.Now(), 10u + 20u + 30u);
  EXPECT_EQ(target.References(), 1);
  EXPECT_TRUE(g_pNotifyTarget == nullptr && g_pActiveReceiver == nullptr && g_pMsgWindow != nullptr);
  EXPECT_EQ(desktop.Counts().registrations, 0u);
  const std::uint64_t threads = desktop.Calls(DesktopCall::StartThread);
  EXPECT_EQ(desktop.Broadcast(volume), 1u);
  EXPECT_EQ(desktop.Broadcast(NamedBroadcast(kArrival, kInterface, kWatchedPath)), 0u);
  desktop.Settle();
  EXPECT_EQ(desktop.Calls(DesktopCall::StartThread), threads);
  EXPECT_THAT(target.Calls(), IsEmpty());
}

}  // namespace
}  // namespace KelvoUHW
