#include "records/record_lock.h"

#include <mutex>

#include "platform/process_lock.h"

namespace KelvoUHW {

namespace {

// The gate is passed by everybody and kept by a writer until it is in: the shared lock alone lets
// readers overtake a waiting writer for ever.
constinit platform::ProcessLock g_gate;
platform::ProcessSharedLock g_records;
thread_local bool t_holds = false;

bool TakeForReading() noexcept {
  if (t_holds) return false;
  { const std::lock_guard pass(g_gate); }
  g_records.lock_shared();
  return t_holds = true;
}

bool TakeForWriting() noexcept {
  if (t_holds) return false;
  const std::lock_guard keep(g_gate);
  g_records.lock();
  return t_holds = true;
}

}  // namespace

RecordReadLock::RecordReadLock() noexcept : m_taken(TakeForReading()) {}
RecordReadLock::~RecordReadLock() {
  if (!m_taken) return;
  t_holds = false;
  g_records.unlock_shared();
}

RecordWriteLock::RecordWriteLock() noexcept : m_taken(TakeForWriting()) {}
RecordWriteLock::~RecordWriteLock() {
  if (!m_taken) return;
  t_holds = false;
  g_records.unlock();
}

}  // namespace KelvoUHW
