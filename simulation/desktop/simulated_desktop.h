// A process in memory: its threads, its clock, its windows, and the device messages it receives.
// It implements platform/desktop.h, on virtual time (waiting takes no real time, and every
// repetition gives the same result) or on the real clock.
//
// One SimulatedDesktop is one process from its start to its end. Everything in it may be used from
// every thread; one lock guards it, which is never held while a window procedure or a thread's
// routine runs.
//
// Threads that are started through the seam are counted, and so is, on virtual time, the thread
// that makes the desktop, and each client thread while it keeps a ClientThread. Virtual time moves,
// and another thread goes on, only when all of them wait (see scheduler.h): a counted thread lets
// the others go on with RunFor, Settle or Broadcast, and keeps a WaitOutside while it waits for
// anything that is not in here, such as the end of a client thread.
//
// The end. EndProcess, and the destructor, wake every thread that waits, wait until those that were
// started here have returned, and let nobody wait again. A process that ends runs nothing of a
// thread's code any more; here a thread has to leave its own stack, so what waits in Sleep or
// GetMessageW, or would, throws ThreadEnd, and the thread's last catch, or the thread's start here,
// takes it. Its destructors run, which they would not on Windows. A thread that was started and has
// not had its turn never runs.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/desktop.h"
#include "simulation/desktop/desktop_calls.h"
#include "simulation/desktop/scheduler.h"
#include "simulation/pc/broadcasts.h"

namespace platform::simulated {

// Thrown to end a thread; no failure, so it is no std::exception.
struct ThreadEnd {};

// The program's own file in memory.
inline constexpr InstanceHandle kProgramInstance = 0x00400000;

// What is there now.
struct DesktopCounts {
  std::size_t threads = 0;  // started through the seam and not returned
  std::size_t classes = 0;
  std::size_t windows = 0;
  std::size_t registrations = 0;
  std::size_t localBuffers = 0;

  friend bool operator==(const DesktopCounts&, const DesktopCounts&) = default;
};

// A window as it was made, and who owns it.
struct WindowFacts {
  WindowHandle handle = 0;
  std::u16string className;
  std::u16string title;
  CREATESTRUCTW creation;  // its texts are null
  std::uint32_t ownerThread = 0;
};

struct ClassFacts {
  std::u16string name;
  WNDCLASSW fields;  // its texts are null
};

struct SleepFacts {
  std::uint32_t thread = 0;
  std::uint32_t milliseconds = 0;
  std::uint64_t at = 0;  // when it fell asleep
};

struct RegistrationFacts {
  WindowHandle window = 0;
  std::uint32_t flags = 0;
  DEV_BROADCAST_DEVICEINTERFACE_W filter;
};

struct ExitFacts {
  std::uint32_t code = 0;
  std::uint32_t thread = 0;
};

struct BoxFacts {
  WindowHandle owner = 0;
  std::optional<std::u16string> text;  // nothing for a null pointer
  std::optional<std::u16string> caption;
  std::uint32_t type = 0;
};

class SimulatedDesktop final : public Threads, public Desktop {
 public:
  explicit SimulatedDesktop(ClockMode mode = ClockMode::Virtual);
  ~SimulatedDesktop();

  // By a thread that was not started here. What it did once it need not do again.
  void EndProcess();

  ClockMode Mode() const noexcept;
  // Milliseconds since the process's start.
  std::uint64_t Now() const;
  // The calling thread waits that long, behind all others that wake at that moment: when it goes
  // on, what they set off has run as far as it goes without waiting. Not for threads started here.
  void RunFor(std::uint32_t milliseconds);
  // Until no thread waits for a moment and none runs: all that was set off has come to its end.
  void Settle();

  void Order(const CallOrder& order);
  // See Scheduler::SetChoice.
  void SetChoice(Scheduler::Choose choose);
  // What DefWindowProcW does from here on; it may throw. None: what the system does.
  void SetDefaultProcedure(std::function<LResult(const MSG&)> procedure);
  std::uint64_t Calls(DesktopCall call) const;

  // Sent to that window: runs in its owner thread while it pumps; its result, or nothing when there
  // is no such window or the thread did not pump for 30 seconds.
  std::optional<LResult> SendToWindow(WindowHandle window, std::uint32_t message, WParam wParam,
                                      LParam lParam);
  // Posted: false without such a window.
  bool PostToWindow(WindowHandle window, std::uint32_t message, WParam wParam, LParam lParam);
  // As the system does it: device-interface records are sent to the windows that are registered for
  // their class, once for each registration, all others to every top-level window. The record is
  // valid during the message only. Returns the messages that were answered.
  std::size_t Broadcast(const DeviceBroadcast& broadcast);

  DesktopCounts Counts() const;
  std::vector<WindowFacts> Windows() const;
  std::vector<ClassFacts> Classes() const;
  std::vector<RegistrationFacts> Registrations() const;
  // On virtual time only: a stress run would fill the memory.
  std::vector<SleepFacts> Sleeps() const;
  std::vector<const void*> Pins() const;
  std::vector<BoxFacts> Boxes() const;
  // The first ExitProcess. Its thread ran no further, the others go on until EndProcess.
  std::optional<ExitFacts> Exit() const;
  // Second closings, exceptions that left a window procedure or a thread, one text each.
  std::vector<std::u16string> Misuses() const;

  // Threads
  bool StartThread(ThreadRoutine routine, std::uint32_t stackBytes,
                   void* argument) noexcept override;
  void Sleep(std::uint32_t milliseconds) override;
  std::uint32_t CurrentThreadId() noexcept override;
  [[noreturn]] void ExitProcess(std::uint32_t code) override;
  Status PinModule(const void* address) noexcept override;

  // Desktop
  InstanceHandle GetModuleHandleW(const char16_t* name) noexcept override;
  GraphicsHandle LoadCursorW(InstanceHandle instance, std::uint16_t number) noexcept override;
  GraphicsHandle GetStockObject(std::int32_t object) noexcept override;
  Status RegisterClassW(const WNDCLASSW& windowClass) noexcept override;
  Status CreateWindowExW(const CREATESTRUCTW& creation, WindowHandle& window) override;
  Status DestroyWindow(WindowHandle window) override;
  std::int32_t IsWindow(WindowHandle window) noexcept override;
  std::intptr_t WindowUserData(WindowHandle window) noexcept override;
  std::intptr_t SetWindowUserData(WindowHandle window, std::intptr_t value) noexcept override;
  // Without filters only: others fail.
  std::int32_t GetMessageW(MSG& message, WindowHandle window, std::uint32_t first,
                           std::uint32_t last) override;
  std::int32_t TranslateMessage(const MSG& message) noexcept override;
  LResult DispatchMessageW(const MSG& message) override;
  LResult DefWindowProcW(WindowHandle window, std::uint32_t message, WParam wParam,
                         LParam lParam) override;
  Status RegisterDeviceNotificationW(WindowHandle recipient, const void* filter,
                                     std::uint32_t flags,
                                     NotificationHandle& notification) noexcept override;
  Status UnregisterDeviceNotification(NotificationHandle notification) noexcept override;
  std::uint32_t FormatMessageW(std::uint32_t flags, std::uint32_t code, std::uint32_t language,
                               char16_t*& text) noexcept override;
  void LocalFree(char16_t* text) noexcept override;
  std::int32_t MessageBoxW(WindowHandle owner, const char16_t* text, const char16_t* caption,
                           std::uint32_t type) noexcept override;

 private:
  friend class ClientThread;
  friend class WaitOutside;
  struct State;
  std::unique_ptr<State> m_state;
};

// While it lives, the calling thread counts.
class ClientThread {
 public:
  explicit ClientThread(SimulatedDesktop& desktop);
  ~ClientThread();
  ClientThread(const ClientThread&) = delete;
  ClientThread& operator=(const ClientThread&) = delete;

 private:
  SimulatedDesktop& m_desktop;
};

// While it lives, the calling thread, a counted one, does not count.
class WaitOutside {
 public:
  explicit WaitOutside(SimulatedDesktop& desktop);
  ~WaitOutside();
  WaitOutside(const WaitOutside&) = delete;
  WaitOutside& operator=(const WaitOutside&) = delete;

 private:
  SimulatedDesktop& m_desktop;
};

}  // namespace platform::simulated
