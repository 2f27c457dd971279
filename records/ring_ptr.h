// RingPtr: the owning reference to a record, a shared pointer without a counter.
//
// All RingPtrs to one record form a circular, doubly linked ring; the one that finds itself alone
// when it lets go deletes the record. Copies, moves and releases take constant time.
#pragma once

#include <cstddef>
#include <type_traits>
#include <utility>

namespace KelvoUHW {

// The links of one ring member. Links of all rings change under one process-wide lock: clients
// release node objects on threads of their own while an event thread builds, and nobody can
// serialise the two. The lock is never held while a record is destroyed.
class RingLink {
 protected:
  class Lock {
   public:
    Lock() noexcept;
    ~Lock();
    Lock(const Lock&) = delete;
    Lock& operator=(const Lock&) = delete;
  };

  RingLink() noexcept = default;
  RingLink(const RingLink&) = delete;
  RingLink& operator=(const RingLink&) = delete;
  ~RingLink() = default;

  // The caller holds the lock. A link that is alone is its own neighbour.
  static void LinkAfter(const RingLink& member, const RingLink& added) noexcept;
  static bool Unlink(const RingLink& member) noexcept;  // true when it was alone
  static void TakePlace(const RingLink& taken, const RingLink& by) noexcept;
  static void SwapPlaces(const RingLink& a, const RingLink& b) noexcept;  // of two rings
  static std::size_t CountMembers(const RingLink& member) noexcept;

 private:
  // Copying a pointer links the copy behind its source, which is const to the one who copies.
  mutable const RingLink* m_pPrevious = this;
  mutable const RingLink* m_pNext = this;
};

// One RingPtr object belongs to one thread at a time, except that several threads may copy from it
// while one assigns to it. Pointers of different types (derived and base) to one record share a
// ring. A record may state how it is deleted with a static member `Destroy(T*) noexcept`.
template <class T>
class RingPtr : private RingLink {
 public:
  RingPtr() noexcept = default;
  RingPtr(std::nullptr_t) noexcept {}
  // Takes over a new record that no RingPtr owns yet.
  explicit RingPtr(T* record) noexcept : m_pRecord(record) {}

  RingPtr(const RingPtr& other) noexcept { Join(other); }
  template <class U>
  requires std::is_convertible_v<U*, T*> RingPtr(const RingPtr<U>& other)
  noexcept { Join(other); }
  RingPtr(RingPtr&& other) noexcept { Take(other); }
  template <class U>
  requires std::is_convertible_v<U*, T*> RingPtr(RingPtr<U>&& other)
  noexcept { Take(other); }
  ~RingPtr() { Reset(); }

  RingPtr& operator=(const RingPtr& other) noexcept {
    if (this != &other) RingPtr(other).Swap(*this);
    return *this;
  }
  RingPtr& operator=(RingPtr&& other) noexcept {
    RingPtr(std::move(other)).Swap(*this);
    return *this;
  }

  void Swap(RingPtr& other) noexcept {
    const Lock lock;
    if (m_pRecord == other.m_pRecord) return;  // one ring: nothing would differ
    SwapPlaces(*this, other);
    std::swap(m_pRecord, other.m_pRecord);
  }

  // Lets go; deletes the record when this was the last pointer to it.
  void Reset() noexcept {
    if (T* last = Leave()) {
      if constexpr (requires { T::Destroy(last); }) {
        T::Destroy(last);
      } else {
        delete last;
      }
    }
  }

  // Lets go and never deletes the record.
  void Abandon() noexcept { Leave(); }

  T* Get() const noexcept { return m_pRecord; }
  T* operator->() const noexcept { return m_pRecord; }
  T& operator*() const noexcept { return *m_pRecord; }
  explicit operator bool() const noexcept { return m_pRecord != nullptr; }

  // The number of pointers to the record, 0 for an empty one. Walks the ring.
  std::size_t RingSize() const noexcept {
    const Lock lock;
    return m_pRecord ? CountMembers(*this) : 0;
  }

  // The same record under a derived type, in the same ring. The caller knows the type.
  template <class U>
  RingPtr<U> StaticCast() const noexcept {
    RingPtr<U> result;
    const Lock lock;
    result.m_pRecord = static_cast<U*>(m_pRecord);
    if (m_pRecord) LinkAfter(*this, result);
    return result;
  }

  template <class U>
  friend bool operator==(const RingPtr& a, const RingPtr<U>& b) noexcept {
    return a.Get() == b.Get();
  }
  friend bool operator==(const RingPtr& a, std::nullptr_t) noexcept { return !a.m_pRecord; }

 private:
  template <class U>
  friend class RingPtr;

  // The source's address is read under the lock: another thread may be assigning to the source.
  template <class U>
  void Join(const RingPtr<U>& other) noexcept {
    const Lock lock;
    m_pRecord = other.m_pRecord;
    if (m_pRecord) LinkAfter(other, *this);
  }
  template <class U>
  void Take(RingPtr<U>& other) noexcept {
    const Lock lock;
    m_pRecord = std::exchange(other.m_pRecord, nullptr);
    TakePlace(other, *this);
  }
  T* Leave() noexcept {
    const Lock lock;
    T* record = std::exchange(m_pRecord, nullptr);
    return Unlink(*this) ? record : nullptr;
  }

  T* m_pRecord = nullptr;
};

template <class T, class... Args>
RingPtr<T> MakeRecord(Args&&... args) {
  return RingPtr<T>(new T(std::forward<Args>(args)...));
}

}  // namespace KelvoUHW
