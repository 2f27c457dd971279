#include "monitor/message_window.h"

#include <optional>

#include "monitor/usb_event_receiver.h"
#include "tests/support/failing_memory.h"
#include "tests/support/monitor_process.h"

namespace KelvoUHW {
namespace {

using platform::kWM_DEVICECHANGE;
using platform::simulated::CallOrder;
using platform::simulated::ClassFacts;
using platform::simulated::WindowFacts;

constexpr std::uint32_t kWM_QUIT = 0x0012;
constexpr std::uint32_t kWM_USER = 0x0400;

// The window thread's work on a thread of the test, with what it returned.
struct LoopRun {
  explicit LoopRun(MonitorProcess& process) {
    process.Launch([this, &process] {
      WinApp app(process.desktop.GetModuleHandleW(nullptr), 1, u"", 2);
      result = app.RunMessageLoop();
      windowsLeft = process.desktop.Counts().windows;
    });
    process.desktop.RunFor(0);
  }
  std::optional<platform::WParam> result;
  std::size_t windowsLeft = 99;  // when the loop has returned and its thread has not
};

TEST(MessageWindow, IsHiddenTopLevelAndHasNoSize) {
  MonitorProcess process;
  EXPECT_EQ(StaticWndProc(0, 0x81, 0, 0), 1) << "a window that no object is making";
  const LoopRun run(process);
  const std::vector<ClassFacts> classes = process.desktop.Classes();
  ASSERT_EQ(classes.size(), 1u);
  EXPECT_EQ(classes[0].name, u"MsgReceiver");
  const platform::WNDCLASSW& fields = classes[0].fields;
  EXPECT_EQ(fields.style, 3u);
  EXPECT_TRUE(fields.lpfnWndProc == StaticWndProc);
  EXPECT_TRUE(fields.cbClsExtra == 0 && fields.cbWndExtra == 0 && fields.hIcon == 0);
  // The handles as the simulation makes them: of the program, of the arrow, of the white brush.
  EXPECT_EQ(fields.hInstance, 0x00400000);
  EXPECT_EQ(fields.hCursor, 0x10000 + 32512);
  EXPECT_EQ(fields.hbrBackground, 0x20000);

  const std::vector<WindowFacts> windows = process.desktop.Windows();
  ASSERT_EQ(windows.size(), 1u);
  EXPECT_TRUE(windows[0].className == u"MsgReceiver" && windows[0].title.empty());
  const platform::CREATESTRUCTW& creation = windows[0].creation;
  EXPECT_EQ(creation.hInstance, 0x00400000);
  EXPECT_TRUE(creation.style == 0 && creation.dwExStyle == 0 && creation.x == 0 && creation.y == 0);
  EXPECT_TRUE(creation.cx == 0 && creation.cy == 0 && creation.hwndParent == 0 && creation.hMenu == 0);
  EXPECT_EQ(creation.lpCreateParams, nullptr);
  ASSERT_NE(g_pMsgWindow, nullptr);
  EXPECT_EQ(g_pMsgWindow.load()->m_hWnd, windows[0].handle);
  EXPECT_EQ(process.desktop.WindowUserData(windows[0].handle), reinterpret_cast<std::intptr_t>(g_pMsgWindow.load()));
}

TEST(MessageWindow, PumpsUntilTheQuitMessage) {
  MonitorProcess process;
  // The loop goes on when a fetch fails, and dispatches the message before it only once.
  process.desktop.Order({.call = DesktopCall::GetMessageW, .nth = 2, .error = 5});
  const LoopRun run(process);
  const platform::WindowHandle window = process.desktop.Windows().at(0).handle;
  std::vector<platform::WParam> seen;
  process.desktop.SetDefaultProcedure([&](const platform::MSG& message) -> platform::LResult {
    if (message.message == kWM_USER) seen.push_back(message.wParam);
    return 9;
  });
  EXPECT_TRUE(process.desktop.PostToWindow(window, kWM_USER, 1, 0));
  process.desktop.RunFor(0);
  EXPECT_EQ(process.desktop.SendToWindow(window, kWM_USER, 2, 0), 9);
  EXPECT_EQ(process.desktop.Calls(DesktopCall::GetMessageW), 3u);
  EXPECT_EQ(run.result, std::nullopt);
  process.desktop.PostToWindow(window, kWM_QUIT, 77, 0);
  process.desktop.Settle();
  process.desktop.SetDefaultProcedure({});
  EXPECT_EQ(run.result, 77u);
  EXPECT_EQ(seen, (std::vector<platform::WParam>{1, 2}));
  EXPECT_EQ(run.windowsLeft, 0u);
}

TEST(MessageWindow, AnswersZeroForDeviceMessagesAndForExceptions) {
  MonitorProcess process;
  RecordingTarget target(process.desktop);
  CZKUMUsbEventReceiver receiver;
  ASSERT_TRUE(receiver.Start(&target));
  const WindowFacts facts = process.desktop.Windows().at(0);
  EXPECT_EQ(facts.creation.hInstance, 0x00400000) << "the receiver's own, too";
  const platform::WindowHandle window = facts.handle;
  const DeviceBroadcast watched = NamedBroadcast(0, 5, kWatchedPath);
  process.desktop.SetDefaultProcedure([&](const platform::MSG& message) -> platform::LResult {
    if (message.message == kWM_USER && message.wParam == 0) throw WinAppException(u"text");
    if (message.message == kWM_USER && message.wParam == 1) throw 3;
    return 9;
  });
  for (const platform::WParam kind : {0u, 1u, 2u}) {
    EXPECT_EQ(process.desktop.SendToWindow(window, kWM_USER, kind, 0), kind == 2 ? 9 : 0) << kind;
  }
  process.desktop.SetDefaultProcedure({});
  EXPECT_TRUE(process.desktop.Boxes().empty()) << "the texts are dropped";
  for (const std::uint32_t event : {0u, 7u, 0x8000u, 0x8001u, 0x8002u, 0x8003u, 0x8004u, 0x8005u, 0xFFFFu}) {
    EXPECT_EQ(process.desktop.SendToWindow(window, kWM_DEVICECHANGE, event, RecordOf(watched)), 0) << event;
  }
  // No memory for the name: the broadcast is lost, and nothing escapes.
  process.desktop.Settle();
  EXPECT_EQ(target.Calls().size(), 2u);
  std::uint64_t failures = 0;
  for (std::uint64_t allocation = 1;; ++allocation) {
    const FailingAllocation failing(allocation);
    EXPECT_EQ(StaticWndProc(window, kWM_DEVICECHANGE, platform::kDBT_DEVICEARRIVAL, RecordOf(watched)), 0);
    if (!failing.Failed() || allocation > 100) break;
    ++failures;
  }
  EXPECT_GE(failures, 3u);
  process.desktop.Settle();
  EXPECT_GT(target.Calls().size(), 2u);
}

// A failure to make the window ends the program with the system's code, told in a box.
TEST(MessageWindow, EndsTheProcessWithoutAWindow) {
  const std::tuple<const char*, std::vector<CallOrder>, std::optional<std::u16string>> kCases[] = {
      {"window", {{DesktopCall::CreateWindowExW, 1, 1400}}, u"Invalid window handle.\r\n"},
      {"class", {{DesktopCall::RegisterClassW, 1, 5}}, u"Access is denied.\r\n"},
      {"unknown code", {{DesktopCall::CreateWindowExW, 1, 0xDEAD}}, std::nullopt},
      {"no text", {{DesktopCall::RegisterClassW, 1, 5}, {DesktopCall::FormatMessageW, 1, 8}}, std::nullopt},
  };
  for (const auto& [what, orders, text] : kCases) {
    SCOPED_TRACE(what);
    MonitorProcess process;
    for (const CallOrder& order : orders) process.desktop.Order(order);
    const LoopRun run(process);
    const auto exit = process.desktop.Exit();
    ASSERT_TRUE(exit);
    EXPECT_EQ(exit->code, orders[0].error);
    const auto boxes = process.desktop.Boxes();
    ASSERT_EQ(boxes.size(), 1u);
    EXPECT_EQ(boxes[0].text, text);
    EXPECT_EQ(boxes[0].caption, std::nullopt);
    EXPECT_TRUE(boxes[0].owner == 0 && boxes[0].type == 0);
    EXPECT_EQ(run.result, std::nullopt) << "the thread went on";
  }
}

TEST(MessageWindow, ClassNameStandsOnceInAProcess) {
  MonitorProcess process;
  RecordingTarget target(process.desktop);
  CZKUMUsbEventReceiver first;
  CZKUMUsbEventReceiver second;
  EXPECT_TRUE(first.Start(&target));
  // The window object of the first start is there, so the second start waits for nothing.
  const std::uint64_t started = process.desktop.Now();
  EXPECT_TRUE(second.Start(&target));
  EXPECT_EQ(process.desktop.Now(), started);
  process.desktop.Settle();
  ASSERT_TRUE(process.desktop.Exit());
  EXPECT_EQ(process.desktop.Exit()->code, 1410u);
  EXPECT_EQ(process.desktop.Boxes().at(0).text, u"Class already exists.\r\n");
}

}  // namespace
}  // namespace KelvoUHW
