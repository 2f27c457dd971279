// The threads of a simulated process and its clock.
//
// The process has one lock, and a thread waits in one way: it blocks here until it is woken or its
// moment has come. So the scheduler knows when every thread waits.
//
// On virtual time the threads take turns: whoever is started or woken goes on when all others wait,
// one at a time, in the order of their moments and then of falling asleep. When nobody can go on,
// time moves to the next moment somebody sleeps for. So waits are exact and runs repeat. On the
// real clock threads run side by side.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <list>
#include <memory>
#include <mutex>
#include <optional>
#include <thread>
#include <unordered_map>
#include <utility>
#include <vector>

namespace platform::simulated {

enum class ClockMode : std::uint8_t {
  Virtual,
  Real,  // milliseconds are those of the machine: for stress runs and measurements
};

// Counted threads hold virtual time while they run: those started here, and client threads that ask
// for it. Another thread counts while it is blocked in here, so that it can wait for a moment.
// Every operation wants the lock held by its caller unless said otherwise.
class Scheduler {
 public:
  using Lock = std::unique_lock<std::mutex>;
  using Milliseconds = std::uint64_t;

  // Sleepers of one moment wake in the order of falling asleep; the late ones behind all others,
  // when what those set off has run as far as it goes.
  enum class Turn : std::uint8_t { InOrder, Late };

  // What one thread blocks on. Outlives each Block.
  class Waiter {
   public:
    Waiter() = default;
    Waiter(const Waiter&) = delete;
    Waiter& operator=(const Waiter&) = delete;

   private:
    friend class Scheduler;
    std::condition_variable m_wake;
    bool m_blocked = false;
    bool m_goes = false;  // its turn has come: it counts as running
    std::optional<Milliseconds> m_until;
    Turn m_turn = Turn::InOrder;
  };

  explicit Scheduler(ClockMode mode) : m_mode(mode) {}
  Scheduler(const Scheduler&) = delete;
  Scheduler& operator=(const Scheduler&) = delete;

  std::mutex& Mutex() { return m_mutex; }
  ClockMode Mode() const noexcept { return m_mode; }
  // On virtual time: which of so many threads that could go on just now does. Called with the lock
  // held, so it must not use the process. None: the one that fell asleep first.
  using Choose = std::function<std::size_t(std::size_t threads)>;
  void SetChoice(Choose choose) { m_choose = std::move(choose); }
  Milliseconds Now() const;

  // Without a moment only Wake and the end wake it. False when the process has ended: then nothing
  // blocks.
  bool Block(Lock& lock, Waiter& waiter, std::optional<Milliseconds> until,
             Turn turn = Turn::InOrder);
  // Nothing for a waiter that is not blocked.
  void Wake(Waiter& waiter);
  // Until every counted thread waits and none of them for a moment.
  void Settle(Lock& lock);

  // Starts a counted thread. False when there is none to be had or the process has ended. A thread
  // whose turn has not come when the process ends never runs its body.
  bool Start(std::function<void()> body);
  std::size_t Started() const { return m_started; }
  // Whether the calling thread was started here.
  bool IsStarted() const;

  // The calling thread, not started here, counts from here on, or no longer.
  void Count();
  void Uncount();

  // Wakes every thread; what blocks later returns at once.
  void End();
  bool Ended() const { return m_ended; }
  // Waits for the threads started here. Without the lock, by none of them.
  void Join();

 private:
  enum class Kind : std::uint8_t { Started, Client };

  void FallAsleep(Waiter& waiter, std::optional<Milliseconds> until, Turn turn);
  void Await(Lock& lock, Waiter& waiter);
  void Go(Waiter& waiter);
  void AdvanceWhenAllWait();
  Waiter& ChosenLike(Waiter& first);
  void Run(const std::function<void()>& body, Waiter& turn);
  void Reap();

  const ClockMode m_mode;
  const std::chrono::steady_clock::time_point m_start = std::chrono::steady_clock::now();
  std::mutex m_mutex;
  Milliseconds m_virtualNow = 0;
  std::size_t m_running = 0;  // counted threads that do not wait
  std::size_t m_started = 0;
  Choose m_choose;
  bool m_ended = false;
  std::unordered_map<std::thread::id, Kind> m_counted;
  std::list<Waiter*> m_sleepers;  // in the order of falling asleep
  std::list<Waiter*> m_settling;
  std::list<std::thread> m_threads;
  std::list<std::thread::id> m_finished;
};

}  // namespace platform::simulated
