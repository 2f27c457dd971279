#include "records/ring_ptr.h"

#include <utility>

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

bool RecordRings::Leave(const RingLink& member) noexcept {
  // Whoever is left alone is the link that the ring begins with.
  const RingLink* left = member.m_pPrevious;
  RingLink::Unlink(member);
  if (left->m_pNext != left) return false;
  for (Ring* ring = &m_shared; ring->next; ring = ring->next) {
    if (ring->next != left) continue;
    delete std::exchange(ring->next, ring->next->next);
    break;
  }
  return true;
}

bool RecordRings::LeaveForDeletion(const RingLink& member) noexcept {
  return Leave(member) && !std::exchange(m_bDying, true);
}

bool RecordRings::BeginRing(Ring* ring, const RingLink& member) noexcept {
  if (m_bDying) return false;
  ring->next = std::exchange(m_shared.next, ring);
  RingLink::LinkAfter(*ring, member);
  return true;
}

bool RecordRings::AreOneRing(const RingLink& a, const RingLink& b) const noexcept {
  if (m_shared.next == nullptr) return true;
  const RingLink* link = &a;
  do {
    if (link == &b) return true;
    link = link->m_pNext;
  } while (link != &a);
  return false;
}

void RecordRings::LetAllGo() noexcept {
  const RingLink::Lock lock;
  for (Ring* ring = &m_shared; ring;) {
    while (ring->m_pNext != ring) {
      const RingLink& member = *ring->m_pNext;
      RingLink::Unlink(member);
      member.Hold(nullptr);
    }
    Ring* const next = ring->next;
    if (ring != &m_shared) delete ring;
    ring = next;
  }
  m_shared.next = nullptr;
}

bool RecordRings::IsHeld() const noexcept {
  const RingLink::Lock lock;
  if (m_shared.m_pNext != &m_shared) return true;
  return m_shared.next != nullptr;  // a ring goes with its last member
}

}  // namespace KelvoUHW
