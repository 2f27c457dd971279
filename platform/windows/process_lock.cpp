#include "platform/process_lock.h"

#include <windows.h>

namespace platform {

namespace {

static_assert(sizeof(SRWLOCK) == sizeof(void*) && alignof(SRWLOCK) == alignof(void*));

SRWLOCK* AsSystemLock(void*& lock) noexcept { return reinterpret_cast<SRWLOCK*>(&lock); }

}  // namespace

void ProcessLock::lock() noexcept { AcquireSRWLockExclusive(AsSystemLock(m_lock)); }
void ProcessLock::unlock() noexcept { ReleaseSRWLockExclusive(AsSystemLock(m_lock)); }

void ProcessSharedLock::lock() noexcept { AcquireSRWLockExclusive(AsSystemLock(m_lock)); }
void ProcessSharedLock::unlock() noexcept { ReleaseSRWLockExclusive(AsSystemLock(m_lock)); }
void ProcessSharedLock::lock_shared() noexcept { AcquireSRWLockShared(AsSystemLock(m_lock)); }
void ProcessSharedLock::unlock_shared() noexcept { ReleaseSRWLockShared(AsSystemLock(m_lock)); }

}  // namespace platform
