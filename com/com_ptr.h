// ComPtr: an owned reference to a COM object.
#pragma once

#include <cstddef>
#include <utility>

#include "platform/com.h"

namespace KelvoUHW {

// One ComPtr belongs to one thread at a time.
template <class Interface>
class ComPtr {
 public:
  ComPtr() noexcept = default;
  ComPtr(std::nullptr_t) noexcept {}
  explicit ComPtr(Interface* pointer) noexcept : m_p(pointer) {
    if (m_p) m_p->AddRef();
  }
  ComPtr(const ComPtr& other) noexcept : ComPtr(other.m_p) {}
  ComPtr(ComPtr&& other) noexcept : m_p(std::exchange(other.m_p, nullptr)) {}
  ~ComPtr() { Reset(); }
  ComPtr& operator=(ComPtr other) noexcept {
    std::swap(m_p, other.m_p);
    return *this;
  }

  // Takes over a reference that the caller owns.
  static ComPtr Attach(Interface* owned) noexcept {
    ComPtr result;
    result.m_p = owned;
    return result;
  }
  // Hands the reference to the caller.
  Interface* Detach() noexcept { return std::exchange(m_p, nullptr); }
  void Reset() noexcept {
    if (Interface* released = std::exchange(m_p, nullptr)) released->Release();
  }
  // For out parameters: lets go of what is held first.
  Interface** Put() noexcept {
    Reset();
    return &m_p;
  }
  void** PutVoid() noexcept { return reinterpret_cast<void**>(Put()); }

  // The object under another interface; empty when it has none.
  template <class Other>
  ComPtr<Other> As() const noexcept {
    ComPtr<Other> result;
    if (m_p) m_p->QueryInterface(platform::IidOf<Other>(), result.PutVoid());
    return result;
  }

  Interface* Get() const noexcept { return m_p; }
  Interface* operator->() const noexcept { return m_p; }
  explicit operator bool() const noexcept { return m_p != nullptr; }

 private:
  Interface* m_p = nullptr;
};

}  // namespace KelvoUHW
