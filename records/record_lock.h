// The lock between a build that changes published records and everybody who reads them.
//
// Device records live on from tree to tree: a build joins them anew while clients may be reading
// them through node objects, and clients cannot serialise against the event threads. So readers
// share the lock for the length of one property read, a build holds it alone while it joins, and so
// does who deletes records. A reader must not let go of the last pointer to a record.
#pragma once

namespace KelvoUHW {

// Taken for reading or writing until destruction. A thread that has the lock already, in whichever
// way, has it: nothing is taken twice. A writer that waits keeps new readers out, so that readers
// that follow each other closely cannot starve a build. Nobody may wait for another thread while
// holding it.
class RecordReadLock {
 public:
  RecordReadLock() noexcept;
  ~RecordReadLock();
  RecordReadLock(const RecordReadLock&) = delete;
  RecordReadLock& operator=(const RecordReadLock&) = delete;

 private:
  const bool m_taken;
};

// A thread that only reads so far must not ask for it.
class RecordWriteLock {
 public:
  RecordWriteLock() noexcept;
  ~RecordWriteLock();
  RecordWriteLock(const RecordWriteLock&) = delete;
  RecordWriteLock& operator=(const RecordWriteLock&) = delete;

 private:
  const bool m_taken;
};

}  // namespace KelvoUHW
