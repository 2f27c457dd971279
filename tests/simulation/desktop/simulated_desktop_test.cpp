#include "simulation/desktop/simulated_desktop.h"

#include <gmock/gmock.h>

#include <cstring>
#include <set>
#include <thread>

#include "platform/setup_api.h"
#include "tests/support/launch.h"

namespace platform::simulated {
namespace {

using namespace testing;  // NOLINT: nothing but matchers
using testing_support::MakeWindow, testing_support::PumpMessages, testing_support::RegisterWindowClass;

constexpr std::uint32_t kWM_USER = 0x0400;

// Each message with the thread it was handled on.
struct Handled {
  WindowHandle window;
  std::uint32_t message;
  WParam wParam;
  std::uint32_t thread;
};

class SimulatedDesktopTest : public testing::Test {
 protected:
  SimulatedDesktopTest() { s_test = this; }
  static LResult ZKUSB_WINDOW_CALL Procedure(WindowHandle window, std::uint32_t message, WParam wParam, LParam lParam) {
    s_test->handled.push_back({window, message, wParam, s_test->desktop.CurrentThreadId()});
    if (s_test->answer) return s_test->answer({window, message, wParam, lParam});
    return s_test->desktop.DefWindowProcW(window, message, wParam, lParam);
  }
  void Launch(std::function<void()> body) { testing_support::Launch(desktop, std::move(body)); }
  Status Register(const char16_t* name = u"Class") { return RegisterWindowClass(desktop, Procedure, name); }
  Status Create(WindowHandle& window, WindowHandle parent = 0) { return MakeWindow(desktop, window, parent); }
  std::vector<std::uint32_t> Messages() const {
    std::vector<std::uint32_t> messages;
    for (const Handled& each : handled) messages.push_back(each.message);
    return messages;
  }
  std::vector<Handled> handled;
  std::function<LResult(const MSG&)> answer;
  SimulatedDesktop desktop;
  static inline SimulatedDesktopTest* s_test = nullptr;
};

TEST_F(SimulatedDesktopTest, ThreadsTakeTurnsAndTimeMovesWhenAllWait) {
  std::vector<std::string> log;
  const auto note = [&](const std::string& what) { log.push_back(what + "@" + std::to_string(desktop.Now())); };
  const auto sleeper = [&](const std::string& name, std::vector<std::uint32_t> naps) {
    Launch([&, name, naps] {
      note(name);
      for (const std::uint32_t nap : naps) {
        desktop.Sleep(nap);
        note(name);
      }
    });
  };
  sleeper("a", {30, 0, 20});
  sleeper("b", {20, 10});
  EXPECT_THAT(log, IsEmpty()) << "a thread ran while this one did";
  desktop.RunFor(30);
  note("main");
  sleeper("c", {});
  desktop.Settle();
  EXPECT_THAT(log, ElementsAre("a@0", "b@0", "b@20", "a@30", "b@30", "a@30", "main@30", "c@30", "a@50"));
  EXPECT_EQ(desktop.Counts().threads, 0u);
  // Ids are never used again.
  std::set<std::uint32_t> ids = {0, desktop.CurrentThreadId()};
  for (int i = 0; i < 3; ++i) {
    Launch([&] { EXPECT_TRUE(ids.insert(desktop.CurrentThreadId()).second); });
    desktop.Settle();
  }
  EXPECT_EQ(ids.size(), 5u);
  // A client thread holds the time while it counts, and lets go of it while it waits elsewhere.
  std::uint64_t client = 0, uncounted = 0;
  Launch([&] {
    desktop.Sleep(1000);
    uncounted = desktop.Now();
  });
  std::thread thread([&] {
    const ClientThread counts(desktop);
    desktop.Sleep(400);
    client = desktop.Now();
  });
  {
    const WaitOutside waits(desktop);
    thread.join();
  }
  desktop.Settle();
  EXPECT_TRUE(client == 450 || client == 1450) << client;  // whether it came before the time had passed
  EXPECT_EQ(uncounted, 1050u);
}

TEST_F(SimulatedDesktopTest, WindowsLiveInTheirThread) {
  WindowHandle window = 9;
  EXPECT_EQ(Create(window).error, 1407u);
  EXPECT_EQ(window, 0);
  EXPECT_TRUE(Register());
  EXPECT_EQ(Register().error, 1410u);
  EXPECT_TRUE(Register(u"class"));
  EXPECT_EQ(Register(nullptr).error, 87u);
  std::uint32_t owner = 0;
  Launch([&] {
    owner = desktop.CurrentThreadId();
    ASSERT_TRUE(Create(window));
    // The system's messages of a window's making come before it is made.
    EXPECT_THAT(Messages(), ElementsAre(0x24u, 0x81u, 0x83u, 0x01u));
    PumpMessages(desktop);
    EXPECT_TRUE(desktop.DestroyWindow(window));
  });
  desktop.RunFor(0);
  EXPECT_EQ(desktop.IsWindow(window), 1);
  EXPECT_EQ(desktop.DestroyWindow(window).error, 5u);
  EXPECT_EQ(desktop.SetWindowUserData(window, 12), 0);
  EXPECT_EQ(desktop.SetWindowUserData(window, 13), 12);
  EXPECT_EQ(desktop.WindowUserData(window), 13);
  handled.clear();
  answer = [](const MSG& message) { return static_cast<LResult>(message.wParam) * 2; };
  EXPECT_EQ(desktop.SendToWindow(window, kWM_USER, 21, 0), 42);
  EXPECT_THAT(handled, ElementsAre(FieldsAre(_, _, _, owner)));
  EXPECT_TRUE(desktop.PostToWindow(window, 0x12, 0, 0));
  desktop.Settle();
  EXPECT_THAT(Messages(), ElementsAre(kWM_USER, 0x02u, 0x82u));
  EXPECT_EQ(desktop.IsWindow(window), 0);
  EXPECT_EQ(desktop.WindowUserData(window), 0);
  EXPECT_EQ(desktop.DestroyWindow(window).error, 1400u);
  EXPECT_FALSE(desktop.PostToWindow(window, kWM_USER, 0, 0));
  EXPECT_THAT(desktop.Misuses(),
              ElementsAre(u"destruction of another thread's window", u"destruction of a window that is not there"));
  // A procedure can refuse its window, and what it throws is remembered.
  answer = [](const MSG&) -> LResult { throw 1; };
  EXPECT_FALSE(Create(window));
  EXPECT_EQ(desktop.Counts().windows, 0u);
  EXPECT_EQ(desktop.Misuses().back(), u"an exception left a window procedure");
  MSG message;
  EXPECT_EQ(desktop.GetMessageW(message, 1, 0, 0), -1);
}

TEST_F(SimulatedDesktopTest, GivesUpOnAThreadThatDoesNotPump) {
  EXPECT_TRUE(Register());
  WindowHandle window = 0;
  Launch([&] {
    ASSERT_TRUE(Create(window));
    desktop.Sleep(40'000);
  });
  desktop.RunFor(0);
  EXPECT_EQ(desktop.SendToWindow(window, kWM_USER, 0, 0), std::nullopt);
  EXPECT_EQ(desktop.Now(), 30'000u);
  // The thread ends while this one waits: an answer without a handler.
  EXPECT_EQ(desktop.SendToWindow(window, kWM_USER, 0, 0), 0);
  EXPECT_EQ(desktop.Now(), 40'000u);
  EXPECT_EQ(desktop.Counts().windows, 0u);
}

TEST_F(SimulatedDesktopTest, DeliversDeviceMessagesAsTheSystemDoes) {
  const Guid disks = GUID_DEVINTERFACE_DISK;
  EXPECT_TRUE(Register());
  WindowHandle all = 0, some = 0, child = 0;
  std::vector<NotificationHandle> registrations(3);
  DEV_BROADCAST_DEVICEINTERFACE_W filter;
  filter.dbcc_size = sizeof filter;
  Launch([&] {
    ASSERT_TRUE(Create(all) && Create(some) && Create(child, all));
    ASSERT_TRUE(desktop.RegisterDeviceNotificationW(all, &filter, 4, registrations[0]));
    filter.dbcc_classguid = disks;
    ASSERT_TRUE(desktop.RegisterDeviceNotificationW(some, &filter, 0, registrations[1]));
    ASSERT_TRUE(desktop.RegisterDeviceNotificationW(child, &filter, 0, registrations[2]));
    PumpMessages(desktop);
  });
  desktop.RunFor(0);
  const std::pair<DeviceBroadcast, std::vector<WindowHandle>> kCases[] = {
      {VolumeBroadcast(kDBT_DEVICEARRIVAL, u'e', 0), {all, some}},
      {{kDBT_DEVNODES_CHANGED, {}}, {all, some}},
      {InterfaceBroadcast(kDBT_DEVICEARRIVAL, disks, u"x"), {all, some, child}},
      {InterfaceBroadcast(kDBT_DEVICEARRIVAL, GUID_DEVINTERFACE_VOLUME, u"x"), {all}}};
  std::vector<std::byte> seen;
  answer = [&](const MSG& message) {
    if (message.lParam == 0) return 0;
    const auto* bytes = reinterpret_cast<const std::byte*>(message.lParam);
    std::uint32_t size = 0;
    std::memcpy(&size, bytes, sizeof size);
    seen.assign(bytes, bytes + size);
    return 0;
  };
  for (const auto& [broadcast, recipients] : kCases) {
    handled.clear();
    EXPECT_EQ(desktop.Broadcast(broadcast), recipients.size());
    std::vector<WindowHandle> windows;
    for (const Handled& each : handled) windows.push_back(each.window);
    EXPECT_EQ(windows, recipients);
    EXPECT_THAT(handled, Each(FieldsAre(_, kWM_DEVICECHANGE, broadcast.event, _)));
    if (!broadcast.record.empty()) {
      EXPECT_EQ(seen, broadcast.record);
    }
  }
  answer = nullptr;
  DEV_BROADCAST_DEVICEINTERFACE_W shorter = filter, volumes = filter;
  shorter.dbcc_size = 28;
  volumes.dbcc_devicetype = kDBT_DEVTYP_VOLUME;
  const std::tuple<WindowHandle, DEV_BROADCAST_DEVICEINTERFACE_W*, std::uint32_t, std::uint32_t> kRefused[] = {
      {0, &filter, 4, 87},    {all, nullptr, 4, 87},  {all, &filter, 1, 87},
      {all, &shorter, 4, 87}, {all, &volumes, 4, 87}, {all + 100, &filter, 4, 1400}};
  for (const auto& [window, filter, flags, error] : kRefused) {
    NotificationHandle refused = 5;
    EXPECT_EQ(desktop.RegisterDeviceNotificationW(window, filter, flags, refused).error, error);
    EXPECT_EQ(refused, 0);
  }
  EXPECT_TRUE(desktop.UnregisterDeviceNotification(registrations[1]));
  EXPECT_EQ(desktop.UnregisterDeviceNotification(registrations[1]).error, 6u);
  EXPECT_THAT(desktop.Misuses(), ElementsAre(u"end of a device notification that is not registered"));
  EXPECT_EQ(desktop.Counts(), (DesktopCounts{1, 1, 3, 2, 0}));
}

TEST_F(SimulatedDesktopTest, HandlesAndTextsAreOfWhatIsAskedFor) {
  SimulatedDesktop process;
  const std::pair<GraphicsHandle, GraphicsHandle> handles[] = {{process.LoadCursorW(0, kIDC_ARROW), 0x17F00},
                                                               {process.LoadCursorW(0, kIDC_ARROW + 1), 0x17F01},
                                                               {process.LoadCursorW(0, kIDC_ARROW - 1), 0},
                                                               {process.LoadCursorW(1, kIDC_ARROW), 0},
                                                               {process.GetStockObject(0), 0x20000},
                                                               {process.GetStockObject(5), 0x20005},
                                                               {process.GetStockObject(-1), 0},
                                                               {process.GetModuleHandleW(nullptr), 0x00400000},
                                                               {process.GetModuleHandleW(u"other"), 0}};
  for (const auto& [handle, expected] : handles) EXPECT_EQ(handle, expected);
  constexpr std::uint32_t kFlags = kFORMAT_MESSAGE_ALLOCATE_BUFFER | kFORMAT_MESSAGE_FROM_SYSTEM;
  const std::tuple<std::uint32_t, std::uint32_t, std::uint32_t, std::u16string> texts[] = {
      {kFlags, 5, kLANG_USER_DEFAULT, u"Access is denied.\r\n"},
      {kFORMAT_MESSAGE_FROM_SYSTEM, 5, kLANG_USER_DEFAULT, u""},
      {kFlags, 5, 0x409, u""},
      {kFlags, 0xDEAD, kLANG_USER_DEFAULT, u""}};
  for (const auto& [flags, code, language, expected] : texts) {
    char16_t* text = nullptr;
    EXPECT_EQ(process.FormatMessageW(flags, code, language, text), expected.size());
    EXPECT_EQ(text == nullptr ? std::u16string() : text, expected);
    process.LocalFree(text);
  }
  EXPECT_THAT(process.Misuses(), IsEmpty());
}

// Whatever a thread waits for, the end of the process ends the wait and then the thread.
TEST_F(SimulatedDesktopTest, EndsItsThreadsWhereverTheyWait) {
  for (const ClockMode mode : {ClockMode::Virtual, ClockMode::Real}) {
    SimulatedDesktop process(mode);
    std::atomic<int> left = 0, wentOn = 0;
    const std::function<void()> waits[] = {[&] { process.Sleep(0xFFFFFFFF); }, [&] { PumpMessages(process); },
                                           [&] { process.ExitProcess(7); }};
    for (const auto& wait : waits) {
      testing_support::Launch(process, [&] {
        struct Leaves {
          std::atomic<int>& left;
          ~Leaves() { ++left; }
        } const leaves{left};
        wait();
        ++wentOn;
      });
    }
    process.Settle();
    EXPECT_EQ(process.Counts().threads, 3u);
    EXPECT_EQ(left, 0);
    ASSERT_TRUE(process.Exit());
    EXPECT_EQ(process.Exit()->code, 7u);
    process.EndProcess();
    EXPECT_EQ(process.Counts().threads, 0u);
    EXPECT_TRUE(left == 3 && wentOn == 0);
    EXPECT_THROW(process.Sleep(1), ThreadEnd);
    EXPECT_FALSE(process.StartThread([](void*) {}, 0, nullptr));
    EXPECT_THAT(process.Misuses(), IsEmpty());
  }
}

}  // namespace
}  // namespace platform::simulated
