#include "platform/process_lock.h"

#include <windows.h>

namespace platform {

namespace {

static_assert(sizeof(SRWLOCK) == sizeof(void*) && alignof(SRWLOCK) == alignof(void*));

SRWLOCK* AsSystemLock(void*& lock) noexcept { return reinterpret_cast<SRWLOCK*>(&lock); }

}  // namespace

void ProcessLock::lock() noexcept { AcquireSRWLockExclusive(AsSystemLock(m_lock)); }
void ProcessLock::unlock() noexcept { ReleaseSRWLockExclusive(AsSystemLock(m_lock)); }

}  // namespace platform
