// The lock for data of the whole process: ready before any constructor of a static object runs, and
// still good after the last destructor has. Pointers may be released by either.
//
// The locks may be taken and given back by every thread, never throw, and are not recursive.
#pragma once

#include <mutex>
#include <shared_mutex>

namespace platform {

#ifdef _WIN32

// std::mutex is neither of the two here: it is made and destroyed at run time.
class ProcessLock {
 public:
  constexpr ProcessLock() noexcept = default;
  ProcessLock(const ProcessLock&) = delete;
  ProcessLock& operator=(const ProcessLock&) = delete;

  void lock() noexcept;
  void unlock() noexcept;

 private:
  void* m_lock = nullptr;  // an SRWLOCK
};

// The same for readers that share it and a writer that has it alone.
class ProcessSharedLock {
 public:
  constexpr ProcessSharedLock() noexcept = default;
  ProcessSharedLock(const ProcessSharedLock&) = delete;
  ProcessSharedLock& operator=(const ProcessSharedLock&) = delete;

  void lock() noexcept;
  void unlock() noexcept;
  void lock_shared() noexcept;
  void unlock_shared() noexcept;

 private:
  void* m_lock = nullptr;  // an SRWLOCK
};

#else

using ProcessLock = std::mutex;
using ProcessSharedLock = std::shared_mutex;

#endif

}  // namespace platform
