#include "platform/simulated/scheduler.h"

#include <algorithm>
#include <system_error>
#include <utility>

namespace platform::simulated {

Scheduler::Milliseconds Scheduler::Now() const {
  if (m_mode == ClockMode::Virtual) return m_virtualNow;
  return static_cast<Milliseconds>(std::chrono::duration_cast<std::chrono::milliseconds>(
                                       std::chrono::steady_clock::now() - m_start)
                                       .count());
}

Scheduler::Woken Scheduler::Block(Lock& lock, Waiter& waiter, std::optional<Milliseconds> until,
                                  Turn turn) {
  if (m_ended) return Woken::ByEnd;
  const bool counted = m_counted.contains(std::this_thread::get_id());
  waiter.woken = false;
  const auto place = m_sleepers.insert(m_sleepers.end(), {&waiter, until, turn});
  if (counted) --m_running;
  AdvanceWhenAllWait();

  const auto woken = [&] { return waiter.woken || m_ended; };
  Woken result = Woken::ByOther;
  if (m_mode == ClockMode::Real && until) {
    if (!waiter.wake.wait_until(lock, m_start + std::chrono::milliseconds(*until), woken)) {
      result = Woken::ByTime;
    }
  } else {
    waiter.wake.wait(lock, woken);
    // Nobody but the clock takes the moment away.
    if (waiter.woken && until && !place->until) result = Woken::ByTime;
  }
  m_sleepers.erase(place);
  // Whoever wakes a thread counts it as running, or time could move before it does.
  if (!waiter.woken) {
    ++m_running;
    if (m_ended) result = Woken::ByEnd;
  }
  if (!counted) {
    --m_running;
    AdvanceWhenAllWait();
  }
  return result;
}

void Scheduler::Wake(Waiter& waiter) {
  if (waiter.woken || m_ended) return;
  waiter.woken = true;
  ++m_running;
  waiter.wake.notify_one();
}

void Scheduler::AdvanceWhenAllWait() {
  if (m_running != 0 || m_ended) return;
  Sleeper* next = nullptr;
  for (Sleeper& sleeper : m_sleepers) {
    if (!sleeper.until || sleeper.waiter->woken) continue;
    if (next == nullptr ||
        std::pair(*sleeper.until, sleeper.turn) < std::pair(*next->until, next->turn)) {
      next = &sleeper;
    }
  }
  if (next == nullptr) {
    if (!m_settling.empty()) Wake(*m_settling.front());
    return;
  }
  if (m_mode == ClockMode::Real) return;
  m_virtualNow = std::max(m_virtualNow, *next->until);
  next->until.reset();
  Wake(*next->waiter);
}

bool Scheduler::Settle(Lock& lock) {
  Waiter waiter;
  m_settling.push_back(&waiter);
  const Woken woken = Block(lock, waiter, std::nullopt);
  m_settling.remove(&waiter);
  AdvanceWhenAllWait();
  return woken != Woken::ByEnd;
}

bool Scheduler::Start(std::function<void()> body) {
  if (m_ended) return false;
  Reap();
  try {
    m_threads.emplace_back([this, body = std::move(body)] {
      {
        const Lock lock(m_mutex);
        m_counted.emplace(std::this_thread::get_id(), Kind::Started);
      }
      body();
      const Lock lock(m_mutex);
      m_counted.erase(std::this_thread::get_id());
      m_finished.push_back(std::this_thread::get_id());
      --m_running;
      --m_started;
      AdvanceWhenAllWait();
    });
  } catch (const std::system_error&) {
    return false;
  }
  ++m_running;
  ++m_started;
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
  for (const Sleeper& sleeper : m_sleepers) sleeper.waiter->wake.notify_all();
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
