// The threads of a simulated process and its clock.
//
// The process has one lock, and a thread waits in one way: it blocks here until it is woken or its
// time has come. So the scheduler knows when every thread waits. Only then does virtual time move,
// to the next moment somebody sleeps for, and it wakes one sleeper at a time, in the order of
// moments and of falling asleep: waits are exact and runs repeat.
#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <list>
#include <mutex>
#include <optional>
#include <thread>
#include <unordered_map>

namespace platform::simulated {

enum class ClockMode : std::uint8_t {
  Virtual,  // moves only when every thread waits
  Real,     // milliseconds are those of the machine: for stress runs and measurements
};

// Counted threads hold virtual time while they run: those started here, and client threads that ask
// for it. Another thread counts while it is blocked in here, so that it can wait for a moment.
// Every operation wants the lock held by its caller unless said otherwise.
class Scheduler {
 public:
  using Lock = std::unique_lock<std::mutex>;
  using Milliseconds = std::uint64_t;

  // Blocked on by one thread. Must outlive the Block.
  struct Waiter {
    std::condition_variable wake;
    bool woken = false;
  };
  enum class Woken : std::uint8_t { ByOther, ByTime, ByEnd };
  // Sleepers of one moment wake in the order of falling asleep; the late ones behind all others,
  // when what those set off has run as far as it goes.
  enum class Turn : std::uint8_t { InOrder, Late };

  explicit Scheduler(ClockMode mode) : m_mode(mode) {}
  Scheduler(const Scheduler&) = delete;
  Scheduler& operator=(const Scheduler&) = delete;

  std::mutex& Mutex() { return m_mutex; }
  Milliseconds Now() const;

  // Without a moment only Wake and the end wake it. Once the process has ended nothing blocks.
  Woken Block(Lock& lock, Waiter& waiter, std::optional<Milliseconds> until,
              Turn turn = Turn::InOrder);
  void Wake(Waiter& waiter);
  // Until every counted thread waits and none of them for a moment; late callers wait for those
  // before them. False when the process ended.
  bool Settle(Lock& lock);

  // Starts a counted thread; it counts from here on, so that no time passes before it runs. False
  // when there is none to be had or the process has ended.
  bool Start(std::function<void()> body);
  std::size_t Running() const { return m_started; }

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
  struct Sleeper {
    Waiter* waiter;
    std::optional<Milliseconds> until;
    Turn turn;
  };

  void AdvanceWhenAllWait();
  void Reap();

  const ClockMode m_mode;
  const std::chrono::steady_clock::time_point m_start = std::chrono::steady_clock::now();
  std::mutex m_mutex;
  Milliseconds m_virtualNow = 0;
  std::size_t m_running = 0;  // counted threads that do not wait, and woken ones
  std::size_t m_started = 0;
  bool m_ended = false;
  enum class Kind : std::uint8_t { Started, Client };
  std::unordered_map<std::thread::id, Kind> m_counted;
  std::list<Sleeper> m_sleepers;  // in the order of falling asleep
  std::list<Waiter*> m_settling;
  std::list<std::thread> m_threads;
  std::list<std::thread::id> m_finished;
};

}  // namespace platform::simulated
