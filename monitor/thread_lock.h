// A recursive lock that belongs to a thread.
#pragma once

#include <atomic>
#include <cstdint>

namespace KelvoUHW {

// Usable from static storage before anything is constructed. Waits by asking again every 50 ms, so
// the order in which waiting threads get it is not the order in which they came.
class CThreadLock {
 public:
  constexpr CThreadLock() noexcept = default;
  CThreadLock(const CThreadLock&) = delete;
  CThreadLock& operator=(const CThreadLock&) = delete;

  // Each Lock of a thread needs an Unlock of the same thread. Throws only what ends the thread when
  // the process ends during the wait: the lock is not held then.
  void Lock();
  // By a thread that does not own the lock: nothing.
  void Unlock() noexcept;

  // Free, whoever owned it: for a process that starts anew in this one.
  void Forget() noexcept;

 private:
  std::int32_t m_nCount = 0;                // the owner's alone; no matter when free
  std::atomic<std::uint32_t> m_nOwner = 0;  // a thread's id; 0 when free
};

// Holds the lock while it lives. Made and destroyed by one thread.
class ThreadLockGuard {
 public:
  explicit ThreadLockGuard(CThreadLock& lock) : m_lock(lock) { m_lock.Lock(); }
  ~ThreadLockGuard() { m_lock.Unlock(); }
  ThreadLockGuard(const ThreadLockGuard&) = delete;
  ThreadLockGuard& operator=(const ThreadLockGuard&) = delete;

 private:
  CThreadLock& m_lock;
};

}  // namespace KelvoUHW
