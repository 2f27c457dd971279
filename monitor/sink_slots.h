// The sinks that are advised, each in a slot of its own.
#pragma once

#include <atomic>
#include <vector>

#include "com/com_ptr.h"
#include "platform/com.h"
#include "platform/critical_section.h"

namespace KelvoUHW {

// Every method may be called by every thread; the lock is held for short array operations only and
// never while a sink is called. A cookie is the slot's index plus one.
//
// The destructor frees the array and not the sinks that are still in it: at that time the process
// ends or the module is unloaded, and nobody knows whether their code is still there. This is
// deliberate.
class SinkSlots {
 public:
  struct Connection {
    ComPtr<IUnknown> sink;
    DWORD cookie = 0;
  };

  // The lock belongs to the object that holds the slots.
  explicit SinkSlots(platform::CriticalSection& lock) noexcept : m_lock(lock) {}

  // Takes over the reference on success: the lowest free slot. CONNECT_E_ADVISELIMIT, and the
  // reference stays with the caller, when no slot can be added.
  HRESULT Add(ComPtr<IUnknown>& sink, DWORD& cookie) noexcept;
  // Empties the slot and hands its reference to the caller, who lets go outside the lock; empty for
  // a cookie that names no sink.
  ComPtr<IUnknown> Take(DWORD cookie) noexcept;
  // Empty for a free slot. `index` is below a Size() that was told before.
  ComPtr<IUnknown> At(LONG index) const noexcept;
  // Free ones included; read without the lock.
  LONG Size() const noexcept { return m_nSlots; }
  std::vector<Connection> Occupied() const;

 private:
  static constexpr std::size_t kFirstSlots = 4;

  platform::CriticalSection& m_lock;
  std::vector<IUnknown*> m_slots;  // owning; null is free
  std::atomic<LONG> m_nSlots = 0;
};

}  // namespace KelvoUHW
