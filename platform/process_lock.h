// The lock for data of the whole process: ready before any constructor of a static object runs, and
// still good after the last destructor has. Pointers may be released by either.
//
// lock and unlock may be called from every thread and never throw; it is not recursive.
#pragma once

#include <mutex>

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

#else

using ProcessLock = std::mutex;

#endif

}  // namespace platform
