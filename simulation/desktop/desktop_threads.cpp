#include <atomic>
#include <new>
#include <utility>

#include "simulation/desktop/desktop_state.h"
#ifndef _WIN32
#include "platform/process_end.h"
#endif

namespace platform::simulated {
namespace {

constexpr std::uint32_t kForever = 0xFFFFFFFF;

// As the system's: multiples of four; but no id comes back.
std::uint32_t NewThreadId() noexcept {
  static std::atomic<std::uint32_t> last = 0x1000;
  return last += 4;
}

}  // namespace

Status SimulatedDesktop::State::Begin(Scheduler::Lock& lock, DesktopCall call) {
  const CallOrder order = orders.Next(call);
  if (order.delayMilliseconds != 0) {
    Scheduler::Waiter waiter;
    scheduler.Block(lock, waiter, scheduler.Now() + order.delayMilliseconds);
  }
  return order.error ? Status::Failure(*order.error) : Status::Success();
}

bool SimulatedDesktop::StartThread(ThreadRoutine routine, std::uint32_t, void* argument) noexcept {
  const auto run = [this, routine, argument] {
    try {
      routine(argument);
    } catch (const ThreadEnd&) {
    } catch (...) {
      const auto guard = m_state->Guard();
      m_state->misuses.emplace_back(u"an exception left a thread");
    }
    const auto guard = m_state->Guard();
    m_state->DropThread(CurrentThreadId());
  };
  const auto lock = m_state->Guard();
  if (m_state->orders.Next(DesktopCall::StartThread).error) return false;
  try {
    return m_state->scheduler.Start(run);
  } catch (const std::bad_alloc&) {
    return false;
  }
}

void SimulatedDesktop::Sleep(std::uint32_t milliseconds) {
  auto lock = m_state->Guard();
  m_state->Begin(lock, DesktopCall::Sleep);
  const std::uint64_t now = m_state->scheduler.Now();
  if (m_state->scheduler.Mode() == ClockMode::Virtual) {
    m_state->sleeps.push_back({CurrentThreadId(), milliseconds, now});
  }
  Scheduler::Waiter waiter;
  std::optional<std::uint64_t> until = now + milliseconds;
  if (milliseconds == kForever) until.reset();
  if (!m_state->scheduler.Block(lock, waiter, until)) throw ThreadEnd();
}

std::uint32_t SimulatedDesktop::CurrentThreadId() noexcept {
  thread_local const std::uint32_t id = NewThreadId();
  return id;
}

// A thread started here stays where it is until the process is ended, as it would on Windows: no
// destructor of its runs while others still use what it owns.
void SimulatedDesktop::ExitProcess(std::uint32_t code) {
  auto lock = m_state->Guard();
  const std::uint32_t thread = CurrentThreadId();
  if (!m_state->exit) m_state->exit = ExitFacts{code, thread};
  m_state->DropThread(thread);
  Scheduler::Waiter waiter;
  if (m_state->scheduler.IsStarted()) m_state->scheduler.Block(lock, waiter, std::nullopt);
  throw ThreadEnd();
}

Status SimulatedDesktop::PinModule(const void* address) noexcept {
  {
    auto lock = m_state->Guard();
    const Status ordered = m_state->Begin(lock, DesktopCall::PinModule);
    if (!ordered) return ordered;
    m_state->pins.push_back(address);
  }
#ifndef _WIN32
  // In earnest: the code of a loaded module runs on the threads of this process. Without the lock,
  // which a module may want that is being unloaded.
  native::KeepMapped(address);
#endif
  return Status::Success();
}

void SimulatedDesktop::RunFor(std::uint32_t milliseconds) {
  auto lock = m_state->Guard();
  Scheduler::Waiter waiter;
  m_state->scheduler.Block(lock, waiter, m_state->scheduler.Now() + milliseconds,
                           Scheduler::Turn::Late);
}

void SimulatedDesktop::Settle() {
  auto lock = m_state->Guard();
  m_state->scheduler.Settle(lock);
}

void SimulatedDesktop::EndProcess() {
  {
    const auto lock = m_state->Guard();
    m_state->scheduler.End();
  }
  m_state->scheduler.Join();
}

ClientThread::ClientThread(SimulatedDesktop& desktop) : m_desktop(desktop) {
  const auto lock = m_desktop.m_state->Guard();
  m_desktop.m_state->scheduler.Count();
}

ClientThread::~ClientThread() {
  const auto lock = m_desktop.m_state->Guard();
  m_desktop.m_state->scheduler.Uncount();
}

WaitOutside::WaitOutside(SimulatedDesktop& desktop) : m_desktop(desktop) {
  const auto lock = m_desktop.m_state->Guard();
  m_desktop.m_state->scheduler.Uncount();
}

WaitOutside::~WaitOutside() {
  const auto lock = m_desktop.m_state->Guard();
  m_desktop.m_state->scheduler.Count();
}

}  // namespace platform::simulated
