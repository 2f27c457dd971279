#include <algorithm>
#include <utility>

#include "platform/setup_api.h"
#include "simulation/desktop/desktop_state.h"

namespace platform::simulated {
namespace {

constexpr std::uint32_t kWM_CREATE = 0x0001;
constexpr std::uint32_t kWM_DESTROY = 0x0002;
constexpr std::uint32_t kWM_QUIT = 0x0012;
constexpr std::uint32_t kWM_GETMINMAXINFO = 0x0024;
constexpr std::uint32_t kWM_NCCREATE = 0x0081;
constexpr std::uint32_t kWM_NCDESTROY = 0x0082;
constexpr std::uint32_t kWM_NCCALCSIZE = 0x0083;

// How long a sender waits for a thread that does not pump.
constexpr std::uint32_t kSendTimeout = 30'000;

}  // namespace

Window* SimulatedDesktop::State::Find(WindowHandle window) {
  const auto found = windows.find(window);
  return found == windows.end() ? nullptr : &found->second;
}

LResult SimulatedDesktop::State::Run(Scheduler::Lock& lock, const MSG& message) {
  const Window* window = Find(message.hwnd);
  if (window == nullptr) return 0;
  const WindowProcedure procedure = window->procedure;
  lock.unlock();
  LResult result = 0;
  bool escaped = false;
  try {
    result = procedure(message.hwnd, message.message, message.wParam, message.lParam);
  } catch (const ThreadEnd&) {
    throw;
  } catch (...) {
    escaped = true;
  }
  lock.lock();
  if (escaped) misuses.emplace_back(u"an exception left a window procedure");
  return result;
}

std::optional<LResult> SimulatedDesktop::State::Send(Scheduler::Lock& lock, const MSG& message) {
  const Window* window = Find(message.hwnd);
  if (window == nullptr || scheduler.Ended()) return std::nullopt;
  const std::uint32_t owner = window->facts.ownerThread;
  MessageQueue& queue = queues[owner];
  SentMessage sent{message, 0, false, false, {}};
  queue.sent.push_back(&sent);
  if (queue.pumping != nullptr) scheduler.Wake(*queue.pumping);
  const std::uint64_t until = scheduler.Now() + kSendTimeout;
  while (!sent.answered && (sent.taken || scheduler.Now() < until) && !scheduler.Ended()) {
    // Once its procedure runs, the sender has to wait: the record is the sender's.
    scheduler.Block(lock, sent.sender, sent.taken ? std::nullopt : std::optional(until));
  }
  // The end of a process stops senders, too, but a procedure that runs still has the record.
  while (sent.taken && !sent.answered) {
    lock.unlock();
    std::this_thread::yield();
    lock.lock();
  }
  // The thread may be gone by now, and its queue with it.
  const auto left = queues.find(owner);
  if (left != queues.end()) std::erase(left->second.sent, &sent);
  return sent.answered ? std::optional(sent.result) : std::nullopt;
}

void SimulatedDesktop::State::Answer(SentMessage& sent, LResult result) {
  sent.result = result;
  sent.answered = true;
  scheduler.Wake(sent.sender);
}

void SimulatedDesktop::State::DropThread(std::uint32_t thread) {
  std::erase_if(windows,
                [&](const auto& entry) { return entry.second.facts.ownerThread == thread; });
  const auto queue = queues.find(thread);
  if (queue == queues.end()) return;
  for (SentMessage* sent : queue->second.sent) Answer(*sent, 0);
  queues.erase(queue);
}

Status SimulatedDesktop::RegisterClassW(const WNDCLASSW& windowClass) noexcept {
  auto lock = m_state->Guard();
  if (const Status ordered = m_state->Begin(lock, DesktopCall::RegisterClassW); !ordered) {
    return ordered;
  }
  if (windowClass.lpszClassName == nullptr || windowClass.lpfnWndProc == nullptr) {
    return Status::Failure(kERROR_INVALID_PARAMETER);
  }
  ClassFacts facts{windowClass.lpszClassName, windowClass};
  for (const ClassFacts& other : m_state->classes) {
    if (other.name == facts.name) return Status::Failure(kERROR_CLASS_ALREADY_EXISTS);
  }
  facts.fields.lpszClassName = nullptr;
  facts.fields.lpszMenuName = nullptr;
  m_state->classes.push_back(std::move(facts));
  return Status::Success();
}

Status SimulatedDesktop::CreateWindowExW(const CREATESTRUCTW& creation, WindowHandle& window) {
  window = 0;
  auto lock = m_state->Guard();
  if (const Status ordered = m_state->Begin(lock, DesktopCall::CreateWindowExW); !ordered) {
    return ordered;
  }
  const std::u16string name = creation.lpszClass != nullptr ? creation.lpszClass : u"";
  const auto windowClass =
      std::find_if(m_state->classes.begin(), m_state->classes.end(),
                   [&](const ClassFacts& facts) { return facts.name == name; });
  if (windowClass == m_state->classes.end()) {
    return Status::Failure(kERROR_CANNOT_FIND_WND_CLASS);
  }
  const WindowHandle handle = m_state->lastWindow += 2;
  Window made;
  made.facts = {handle, name, creation.lpszName != nullptr ? creation.lpszName : u"", creation,
                CurrentThreadId()};
  made.facts.creation.lpszName = nullptr;
  made.facts.creation.lpszClass = nullptr;
  made.procedure = windowClass->fields.lpfnWndProc;
  m_state->windows.emplace(handle, std::move(made));

  // A window hears of its size before it hears of being made.
  m_state->Run(lock, {handle, kWM_GETMINMAXINFO});
  bool accepted = m_state->Run(lock, {handle, kWM_NCCREATE}) != 0;
  if (accepted) {
    m_state->Run(lock, {handle, kWM_NCCALCSIZE});
    accepted = m_state->Run(lock, {handle, kWM_CREATE}) != -1;
  }
  if (!accepted) {
    m_state->windows.erase(handle);
    return Status::Failure(0);  // refused by its own procedure: no code of the system
  }
  window = handle;
  return Status::Success();
}

Status SimulatedDesktop::DestroyWindow(WindowHandle window) {
  auto lock = m_state->Guard();
  const Window* found = m_state->Find(window);
  if (found == nullptr) {
    m_state->misuses.emplace_back(u"destruction of a window that is not there");
    return Status::Failure(kERROR_INVALID_WINDOW_HANDLE);
  }
  if (found->facts.ownerThread != CurrentThreadId()) {
    m_state->misuses.emplace_back(u"destruction of another thread's window");
    return Status::Failure(kERROR_ACCESS_DENIED);
  }
  m_state->Run(lock, {window, kWM_DESTROY});
  m_state->Run(lock, {window, kWM_NCDESTROY});
  m_state->windows.erase(window);
  return Status::Success();
}

std::int32_t SimulatedDesktop::IsWindow(WindowHandle window) noexcept {
  const auto lock = m_state->Guard();
  return m_state->Find(window) != nullptr ? 1 : 0;
}

std::intptr_t SimulatedDesktop::WindowUserData(WindowHandle window) noexcept {
  const auto lock = m_state->Guard();
  const Window* found = m_state->Find(window);
  return found != nullptr ? found->userData : 0;
}

std::intptr_t SimulatedDesktop::SetWindowUserData(WindowHandle window,
                                                  std::intptr_t value) noexcept {
  const auto lock = m_state->Guard();
  Window* found = m_state->Find(window);
  return found != nullptr ? std::exchange(found->userData, value) : 0;
}

std::int32_t SimulatedDesktop::GetMessageW(MSG& message, WindowHandle window, std::uint32_t first,
                                           std::uint32_t last) {
  auto lock = m_state->Guard();
  if (!m_state->Begin(lock, DesktopCall::GetMessageW)) return -1;
  if (window != 0 || first != 0 || last != 0) return -1;
  MessageQueue& queue = m_state->queues[CurrentThreadId()];
  for (;;) {
    if (m_state->scheduler.Ended()) throw ThreadEnd();
    if (!queue.sent.empty()) {
      SentMessage& sent = *queue.sent.front();
      queue.sent.pop_front();
      sent.taken = true;
      LResult result = 0;
      try {
        result = m_state->Run(lock, sent.message);
      } catch (const ThreadEnd&) {
        lock.lock();
        m_state->Answer(sent, 0);
        throw;
      }
      m_state->Answer(sent, result);
      continue;
    }
    if (!queue.posted.empty()) {
      message = queue.posted.front();
      queue.posted.pop_front();
      return message.message == kWM_QUIT ? 0 : 1;
    }
    Scheduler::Waiter waiter;
    queue.pumping = &waiter;
    m_state->scheduler.Block(lock, waiter, std::nullopt);
    queue.pumping = nullptr;
  }
}

std::int32_t SimulatedDesktop::TranslateMessage(const MSG&) noexcept { return 0; }

LResult SimulatedDesktop::DispatchMessageW(const MSG& message) {
  auto lock = m_state->Guard();
  return m_state->Run(lock, message);
}

LResult SimulatedDesktop::DefWindowProcW(WindowHandle window, std::uint32_t message, WParam wParam,
                                         LParam lParam) {
  std::function<LResult(const MSG&)> procedure;
  {
    const auto lock = m_state->Guard();
    procedure = m_state->defaultProcedure;
  }
  if (procedure) return procedure({window, message, wParam, lParam});
  return message == kWM_NCCREATE ? 1 : 0;
}

std::optional<LResult> SimulatedDesktop::SendToWindow(WindowHandle window, std::uint32_t message,
                                                      WParam wParam, LParam lParam) {
  auto lock = m_state->Guard();
  return m_state->Send(lock, {window, message, wParam, lParam});
}

bool SimulatedDesktop::PostToWindow(WindowHandle window, std::uint32_t message, WParam wParam,
                                    LParam lParam) {
  const auto lock = m_state->Guard();
  const Window* found = m_state->Find(window);
  if (found == nullptr) return false;
  MessageQueue& queue = m_state->queues[found->facts.ownerThread];
  queue.posted.push_back({window, message, wParam, lParam});
  if (queue.pumping != nullptr) m_state->scheduler.Wake(*queue.pumping);
  return true;
}

}  // namespace platform::simulated
