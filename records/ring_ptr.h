// RingPtr: the owning reference to a record, a shared pointer without a counter.
//
// All RingPtrs to one record form a circular, doubly linked ring; the one that finds itself alone
// when it lets go deletes the record. Copies, moves and releases take constant time.
#pragma once

#include <atomic>
#include <concepts>
#include <cstddef>
#include <memory>
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

  // What the member points at. A record that is destroyed takes it from pointers that it knows, as
  // the last thing it does to them: a pointer that finds itself empty stands alone, and needs no
  // lock.
  void* Held() const noexcept { return m_pHeld.load(std::memory_order_acquire); }
  void Hold(void* record) const noexcept { m_pHeld.store(record, std::memory_order_release); }

 private:
  friend class RecordRings;

  // Copying a pointer links the copy behind its source, which is const to the one who copies.
  mutable const RingLink* m_pPrevious = this;
  mutable const RingLink* m_pNext = this;
  mutable std::atomic<void*> m_pHeld = nullptr;
};

// The base of records that several rings may hold: that of the pointers which share it, and rings
// made with RingPtr::InARingOfItsOwn. Whichever ring loses its last pointer first destroys the
// record. Each ring begins with a link of the record's, by which the others are found then.
class RecordRings {
 public:
  RecordRings(const RecordRings&) = delete;
  RecordRings& operator=(const RecordRings&) = delete;

  // Before the record is deleted: takes it from every pointer that still holds it. Nobody may use
  // such a pointer on another thread meanwhile, but for copying, moving and letting go.
  void LetAllGo() noexcept;
  // Whether any pointer holds the record.
  bool IsHeld() const noexcept;

 protected:
  RecordRings() noexcept = default;
  ~RecordRings() = default;

 private:
  template <class T>
  friend class RingPtr;

  struct Ring : RingLink {
    Ring* next = nullptr;
  };

  // The caller holds the lock.
  void Begin(const RingLink& member) const noexcept { RingLink::LinkAfter(m_shared, member); }
  bool Leave(const RingLink& member) noexcept;             // true when it was alone
  bool LeaveForDeletion(const RingLink& member) noexcept;  // true once, for who has to delete
  bool AreOneRing(const RingLink& a, const RingLink& b) const noexcept;
  // False where the record is about to be deleted; then `ring` stays the caller's.
  bool BeginRing(Ring* ring, const RingLink& member) noexcept;

  Ring m_shared;
  bool m_bDying = false;
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
  explicit RingPtr(T* record) noexcept {
    Hold(record);
    if constexpr (KnowsItsRings()) {
      const Lock lock;
      if (record) record->Begin(*this);
    }
  }

  // A pointer that shares the record with nobody: when its last copy lets go, the record is
  // destroyed though others hold it, and they hold nothing from then on. Empty for a record that is
  // about to be deleted; the caller sees to it that it is not deleted before. Throws
  // std::bad_alloc.
  static RingPtr InARingOfItsOwn(T* record) requires std::derived_from<T, RecordRings> {
    RingPtr result;
    auto ring = std::make_unique<RecordRings::Ring>();
    const Lock lock;
    if (record->BeginRing(ring.get(), result)) {
      static_cast<void>(ring.release());  // the record owns it
      result.Hold(record);
    }
    return result;
  }

  // One more of the pointers that share the record. The caller knows that one of them stays.
  static RingPtr SharedWithOthers(T* record) noexcept requires std::derived_from<T, RecordRings> {
    return RingPtr(record);
  }

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
    if (this == &other) return *this;
    if (*this) {
      RingPtr(other).Swap(*this);
    } else {
      Join(other);
    }
    return *this;
  }
  RingPtr& operator=(RingPtr&& other) noexcept {
    if (*this) {
      RingPtr(std::move(other)).Swap(*this);
    } else {
      Take(other);
    }
    return *this;
  }

  void Swap(RingPtr& other) noexcept {
    const Lock lock;
    void* const held = Held();
    if (held == other.Held() && AreOneRing(other)) return;  // nothing would differ
    SwapPlaces(*this, other);
    Hold(other.Held());
    other.Hold(held);
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
  void Abandon() noexcept {
    const Lock lock;
    if constexpr (KnowsItsRings()) {
      if (T* record = Taken()) record->RecordRings::Leave(*this);
    } else {
      Taken();
      Unlink(*this);
    }
  }

  T* Get() const noexcept { return static_cast<T*>(Held()); }
  T* operator->() const noexcept { return Get(); }
  T& operator*() const noexcept { return *Get(); }
  explicit operator bool() const noexcept { return Held() != nullptr; }

  // The number of pointers in the ring, 0 for an empty one. Walks it.
  std::size_t RingSize() const noexcept {
    const Lock lock;
    return Held() ? CountMembers(*this) - (KnowsItsRings() ? 1 : 0) : 0;
  }

  // The same record under a derived type, in the same ring. The caller knows the type.
  template <class U>
  RingPtr<U> StaticCast() const noexcept {
    RingPtr<U> result;
    const Lock lock;
    if (T* const record = Get()) {
      result.Hold(static_cast<U*>(record));
      LinkAfter(*this, result);
    }
    return result;
  }

  template <class U>
  friend bool operator==(const RingPtr& a, const RingPtr<U>& b) noexcept {
    return a.Get() == b.Get();
  }
  friend bool operator==(const RingPtr& a, std::nullptr_t) noexcept { return !a; }

 private:
  template <class U>
  friend class RingPtr;

  // Asked inside functions: a record may hold pointers to records of its own kind.
  static constexpr bool KnowsItsRings() noexcept { return std::is_base_of_v<RecordRings, T>; }

  bool AreOneRing(const RingPtr& other) const noexcept {
    if constexpr (KnowsItsRings()) {
      return Get() == nullptr || Get()->RecordRings::AreOneRing(*this, other);
    } else {
      return true;
    }
  }

  // The next two are for a pointer that is empty. The source's address is read under the lock:
  // another thread may be assigning to the source, or taking its record from it.
  template <class U>
  void Join(const RingPtr<U>& other) noexcept {
    if (!other) return;
    const Lock lock;
    if (T* const record = other.Get()) {
      Hold(record);
      LinkAfter(other, *this);
    }
  }
  template <class U>
  void Take(RingPtr<U>& other) noexcept {
    if (!other) return;
    const Lock lock;
    if (T* const record = other.Taken()) {
      Hold(record);
      TakePlace(other, *this);
    }
  }
  T* Taken() noexcept {
    T* const record = Get();
    Hold(nullptr);
    return record;
  }
  T* Leave() noexcept {
    if (!*this) return nullptr;
    const Lock lock;
    T* record = Taken();
    if constexpr (KnowsItsRings()) {
      return record && record->LeaveForDeletion(*this) ? record : nullptr;
    } else {
      return Unlink(*this) ? record : nullptr;
    }
  }
};

template <class T, class... Args>
RingPtr<T> MakeRecord(Args&&... args) {
  return RingPtr<T>(new T(std::forward<Args>(args)...));
}

}  // namespace KelvoUHW
