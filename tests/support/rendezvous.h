// Threads that wait for each other. Those of the standard library (std::latch, std::barrier, std::atomic::wait) now and
// then never wake up in programs under Wine; these are a condition variable.
#pragma once

#include <condition_variable>
#include <cstddef>
#include <mutex>

namespace testing_support {

// Lets as many threads as it was made for go on together, any number of times.
class Rendezvous {
 public:
  explicit Rendezvous(std::size_t threads) : m_threads(threads) {}

  void ArriveAndWait() {
    std::unique_lock lock(m_mutex);
    const std::size_t round = m_round;
    if (++m_arrived == m_threads) {
      m_arrived = 0;
      ++m_round;
      m_next.notify_all();
    } else {
      m_next.wait(lock, [&] { return m_round != round; });
    }
  }

 private:
  const std::size_t m_threads;
  std::mutex m_mutex;
  std::condition_variable m_next;
  std::size_t m_arrived = 0;
  std::size_t m_round = 0;
};

// A number that threads wait for to change.
class Announcement {
 public:
  int Get() const {
    const std::lock_guard lock(m_mutex);
    return m_number;
  }
  void Tell(int number) {
    const std::lock_guard lock(m_mutex);
    m_number = number;
    m_told.notify_all();
  }
  // The number that is told after `seen`; at once when it is another one already.
  int WaitForAnother(int seen) const {
    std::unique_lock lock(m_mutex);
    m_told.wait(lock, [&] { return m_number != seen; });
    return m_number;
  }

 private:
  mutable std::mutex m_mutex;
  mutable std::condition_variable m_told;
  int m_number = 0;
};

}  // namespace testing_support
