// A recursive lock that can fail to come about, as the system's can.
#pragma once

#include "platform/com.h"
#ifndef _WIN32
#include <mutex>
#endif

namespace platform {

// Initialize first and once; without its success nothing else may be called. Meets the standard's
// requirements for a lock (std::lock_guard).
class CriticalSection {
 public:
  CriticalSection() noexcept = default;
  CriticalSection(const CriticalSection&) = delete;
  CriticalSection& operator=(const CriticalSection&) = delete;

#ifdef _WIN32
  ~CriticalSection() {
    if (m_initialized) DeleteCriticalSection(&m_section);
  }
  HRESULT Initialize() noexcept {
    if (!InitializeCriticalSectionAndSpinCount(&m_section, 0)) {
      return HRESULT_FROM_WIN32(GetLastError());
    }
    m_initialized = true;
    return S_OK;
  }
  void lock() noexcept { EnterCriticalSection(&m_section); }
  void unlock() noexcept { LeaveCriticalSection(&m_section); }

 private:
  CRITICAL_SECTION m_section{};
  bool m_initialized = false;
#else
  HRESULT Initialize() noexcept;
  void lock() noexcept { m_mutex.lock(); }
  void unlock() noexcept { m_mutex.unlock(); }

 private:
  std::recursive_mutex m_mutex;
#endif
};

}  // namespace platform
