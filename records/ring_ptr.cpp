#include "records/ring_ptr.h"

#include "platform/process_lock.h"

namespace KelvoUHW {

namespace {

// Pointers may be released by static destructors.
constinit platform::ProcessLock g_ringMutex;

}  // namespace

RingLink::Lock::Lock() noexcept { g_ringMutex.lock(); }
RingLink::Lock::~Lock() { g_ringMutex.unlock(); }

void RingLink::LinkAfter(const RingLink& member, const RingLink& added) noexcept {
  added.m_pPrevious = &member;
  added.m_pNext = member.m_pNext;
  member.m_pNext->m_pPrevious = &added;
  member.m_pNext = &added;
}

bool RingLink::Unlink(const RingLink& member) noexcept {
  if (member.m_pNext == &member) return true;
  member.m_pPrevious->m_pNext = member.m_pNext;
  member.m_pNext->m_pPrevious = member.m_pPrevious;
  member.m_pPrevious = member.m_pNext = &member;
  return false;
}

void RingLink::TakePlace(const RingLink& taken, const RingLink& by) noexcept {
  if (taken.m_pNext == &taken) {
    by.m_pPrevious = by.m_pNext = &by;
    return;
  }
  by.m_pPrevious = taken.m_pPrevious;
  by.m_pNext = taken.m_pNext;
  by.m_pPrevious->m_pNext = &by;
  by.m_pNext->m_pPrevious = &by;
  taken.m_pPrevious = taken.m_pNext = &taken;
}

void RingLink::SwapPlaces(const RingLink& a, const RingLink& b) noexcept {
  const RingLink between;
  TakePlace(a, between);
  TakePlace(b, a);
  TakePlace(between, b);
}

std::size_t RingLink::CountMembers(const RingLink& member) noexcept {
  std::size_t count = 1;
  for (const RingLink* link = member.m_pNext; link != &member; link = link->m_pNext) ++count;
  return count;
}

}  // namespace KelvoUHW
