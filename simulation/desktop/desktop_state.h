// What a simulated process consists of; only its own sources include this.
#pragma once

#include <deque>
#include <functional>
#include <map>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "simulation/desktop/simulated_desktop.h"

namespace platform::simulated {

inline constexpr std::uint32_t kERROR_ACCESS_DENIED = 5;
inline constexpr std::uint32_t kERROR_INVALID_WINDOW_HANDLE = 1400;
inline constexpr std::uint32_t kERROR_CANNOT_FIND_WND_CLASS = 1407;
inline constexpr std::uint32_t kERROR_CLASS_ALREADY_EXISTS = 1410;

// A message that another thread has sent and waits for.
struct SentMessage {
  MSG message;
  LResult result = 0;
  bool answered = false;
  bool taken = false;  // its procedure runs, so the sender's record is in use
  Scheduler::Waiter sender;
};

struct Window {
  WindowFacts facts;
  WindowProcedure procedure = nullptr;
  std::intptr_t userData = 0;
};

// What a thread that pumps has waiting.
struct MessageQueue {
  std::deque<SentMessage*> sent;
  std::deque<MSG> posted;
  Scheduler::Waiter* pumping = nullptr;
};

struct SimulatedDesktop::State {
  explicit State(ClockMode mode) : scheduler(mode) {}

  mutable Scheduler scheduler;  // its lock guards everything below

  CallOrders orders;
  std::vector<ClassFacts> classes;
  std::map<WindowHandle, Window> windows;                  // in the order of their making
  std::unordered_map<std::uint32_t, MessageQueue> queues;  // by thread
  std::map<NotificationHandle, RegistrationFacts> registrations;
  std::unordered_set<char16_t*> localBuffers;
  WindowHandle lastWindow = 0x10000;
  NotificationHandle lastRegistration = 0x2000;
  std::function<LResult(const MSG&)> defaultProcedure;
  std::vector<SleepFacts> sleeps;
  std::vector<const void*> pins;
  std::vector<BoxFacts> boxes;
  std::optional<ExitFacts> exit;
  std::vector<std::u16string> misuses;

  Scheduler::Lock Guard() const { return Scheduler::Lock(scheduler.Mutex()); }

  // Counts the call, lets the time pass that is ordered for it, and tells whether it fails.
  Status Begin(Scheduler::Lock& lock, DesktopCall call);
  Window* Find(WindowHandle window);
  // Runs the window's procedure on the calling thread, with the lock released.
  LResult Run(Scheduler::Lock& lock, const MSG& message);
  // Delivered in the owner thread; nothing when it is not answered.
  std::optional<LResult> Send(Scheduler::Lock& lock, const MSG& message);
  void Answer(SentMessage& sent, LResult result);
  // The windows of a thread that is no more go with it; who waits for them is answered.
  void DropThread(std::uint32_t thread);
};

}  // namespace platform::simulated
