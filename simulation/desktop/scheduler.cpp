#include "simulation/desktop/scheduler.h"

#include <algorithm>
#include <exception>
#include <utility>

namespace platform::simulated {

Scheduler::Milliseconds Scheduler::Now() const {
  if (m_mode == ClockMode::Virtual) return m_virtualNow;
  const auto passed = std::chrono::steady_clock::now() - m_start;
  return static_cast<Milliseconds>(
      std::chrono::duration_cast<std::chrono::milliseconds>(passed).count());
}

void Scheduler::FallAsleep(Waiter& waiter, std::optional<Milliseconds> until, Turn turn) {
  waiter.m_blocked = true;
  waiter.m_goes = false;
  waiter.m_until = until;
  waiter.m_turn = turn;
  m_sleepers.push_back(&waiter);
}

void Scheduler::Await(Lock& lock, Waiter& waiter) {
  const auto over = [&] { return waiter.m_goes || m_ended; };
  if (m_mode == ClockMode::Real && waiter.m_until) {
    const auto until = m_start + std::chrono::milliseconds(*waiter.m_until);
    waiter.m_wake.wait_until(lock, until, over);
  } else {
    waiter.m_wake.wait(lock, over);
  }
  // Whoever wakes a thread counts it as running, or time could move before it does.
  if (!waiter.m_goes) ++m_running;
  waiter.m_blocked = false;
  m_sleepers.remove(&waiter);
}

bool Scheduler::Block(Lock& lock, Waiter& waiter, std::optional<Milliseconds> until, Turn turn) {
  if (m_ended) return false;
  const bool counted = m_counted.contains(std::this_thread::get_id());
  FallAsleep(waiter, until, turn);
  if (counted) --m_running;
  AdvanceWhenAllWait();
  Await(lock, waiter);
  if (!counted) {
    --m_running;
    AdvanceWhenAllWait();
  }
  return !m_ended;
}

void Scheduler::Go(Waiter& waiter) {
  waiter.m_goes = true;
  ++m_running;
  waiter.m_wake.notify_one();
}

void Scheduler::Wake(Waiter& waiter) {
  if (!waiter.m_blocked || waiter.m_goes || m_ended) return;
  if (m_mode == ClockMode::Real) {
    Go(waiter);
    return;
  }
  waiter.m_until = std::min(waiter.m_until.value_or(m_virtualNow), m_virtualNow);
  AdvanceWhenAllWait();
}

void Scheduler::AdvanceWhenAllWait() {
  if (m_running != 0 || m_ended) return;
  Waiter* next = nullptr;
  for (Waiter* sleeper : m_sleepers) {
    if (!sleeper->m_until || sleeper->m_goes) continue;
    if (next == nullptr ||
        std::pair(*sleeper->m_until, sleeper->m_turn) < std::pair(*next->m_until, next->m_turn)) {
      next = sleeper;
    }
  }
  if (next == nullptr) {
    const auto settling =
        std::find_if(m_settling.begin(), m_settling.end(),
                     [](const Waiter* waiter) { return waiter->m_blocked && !waiter->m_goes; });
    if (settling != m_settling.end()) Go(**settling);
  } else if (m_mode == ClockMode::Virtual) {
    m_virtualNow = std::max(m_virtualNow, *next->m_until);
    Go(m_choose ? ChosenLike(*next) : *next);
  }
}

// Of all that wake as `first` does.
Scheduler::Waiter& Scheduler::ChosenLike(Waiter& first) {
  std::vector<Waiter*> ready;
  for (Waiter* sleeper : m_sleepers) {
    if (!sleeper->m_goes && sleeper->m_until && *sleeper->m_until <= m_virtualNow &&
        sleeper->m_turn == first.m_turn) {
      ready.push_back(sleeper);
    }
  }
  return *ready[ready.size() == 1 ? 0 : m_choose(ready.size()) % ready.size()];
}

void Scheduler::Settle(Lock& lock) {
  Waiter waiter;
  m_settling.push_back(&waiter);
  Block(lock, waiter, std::nullopt);
  m_settling.remove(&waiter);
}

void Scheduler::Run(const std::function<void()>& body, Waiter& turn) {
  Lock lock(m_mutex);
  m_counted.emplace(std::this_thread::get_id(), Kind::Started);
  if (m_mode == ClockMode::Virtual) Await(lock, turn);
  if (!m_ended) {
    lock.unlock();
    body();
    lock.lock();
  }
  m_counted.erase(std::this_thread::get_id());
  m_finished.push_back(std::this_thread::get_id());
  --m_running;
  --m_started;
  AdvanceWhenAllWait();
}

bool Scheduler::Start(std::function<void()> body) {
  if (m_ended) return false;
  Reap();
  std::shared_ptr<Waiter> turn;
  try {
    turn = std::make_shared<Waiter>();
    // In line from here on, so that threads begin in the order in which they were started.
    if (m_mode == ClockMode::Virtual) FallAsleep(*turn, m_virtualNow, Turn::InOrder);
    m_threads.emplace_back([this, turn, body = std::move(body)] { Run(body, *turn); });
  } catch (const std::exception&) {  // neither memory nor a thread
    m_sleepers.remove(turn.get());
    return false;
  }
  ++m_started;
  if (m_mode == ClockMode::Real) ++m_running;
  AdvanceWhenAllWait();
  return true;
}

// A finished thread needs the lock no more: joining it here takes as long as it takes to return.
void Scheduler::Reap() {
  for (const std::thread::id id : m_finished) {
    const auto thread = std::find_if(m_threads.begin(), m_threads.end(),
                                     [&](const std::thread& each) { return each.get_id() == id; });
    thread->join();
    m_threads.erase(thread);
  }
  m_finished.clear();
}

bool Scheduler::IsStarted() const {
  const auto thread = m_counted.find(std::this_thread::get_id());
  return thread != m_counted.end() && thread->second == Kind::Started;
}

void Scheduler::Count() {
  if (m_counted.emplace(std::this_thread::get_id(), Kind::Client).second) ++m_running;
}

void Scheduler::Uncount() {
  if (m_counted.erase(std::this_thread::get_id()) == 0) return;
  --m_running;
  AdvanceWhenAllWait();
}

void Scheduler::End() {
  m_ended = true;
  for (Waiter* sleeper : m_sleepers) sleeper->m_wake.notify_all();
}

void Scheduler::Join() {
  std::list<std::thread> threads;
  {
    const Lock lock(m_mutex);
    threads.swap(m_threads);
    m_finished.clear();
  }
  for (std::thread& thread : threads) thread.join();
}

}  // namespace platform::simulated
