#include "monitor/thread_lock.h"

#include "platform/desktop.h"
#include "platform/system.h"

namespace KelvoUHW {

namespace {
constexpr std::uint32_t kPollMilliseconds = 50;
}  // namespace

void CThreadLock::Lock() {
  platform::Threads& threads = *platform::CurrentSystem().threads;
  const std::uint32_t self = threads.CurrentThreadId();
  if (m_nOwner == self) {
    ++m_nCount;
    return;
  }
  for (std::uint32_t free = 0; !m_nOwner.compare_exchange_strong(free, self); free = 0) {
    threads.Sleep(kPollMilliseconds);
  }
  m_nCount = 1;
}

void CThreadLock::Unlock() noexcept {
  if (m_nOwner != platform::CurrentSystem().threads->CurrentThreadId()) return;
  if (--m_nCount == 0) m_nOwner = 0;
}

void CThreadLock::Forget() noexcept { m_nOwner = 0; }

}  // namespace KelvoUHW
