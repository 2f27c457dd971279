// Room for one object whose life neither a static constructor nor a static destructor touches.
#pragma once

#include <cstddef>
#include <new>
#include <utility>

namespace KelvoUHW {

// For objects of the whole module, which are made when it is loaded and destroyed when it is
// unloaded, in a stated order, and left alone when the process ends. Not thread-safe.
template <class T>
class ManualLifetime {
 public:
  constexpr ManualLifetime() noexcept = default;
  ManualLifetime(const ManualLifetime&) = delete;
  ManualLifetime& operator=(const ManualLifetime&) = delete;

  // The earlier object, if there is one, is destroyed first.
  template <class... Args>
  T& Make(Args&&... args) noexcept(noexcept(T(std::forward<Args>(args)...))) {
    Destroy();
    return *(m_object = ::new (static_cast<void*>(m_room)) T(std::forward<Args>(args)...));
  }
  void Destroy() noexcept {
    if (T* object = std::exchange(m_object, nullptr)) object->~T();
  }

  explicit operator bool() const noexcept { return m_object != nullptr; }
  T& operator*() const noexcept { return *m_object; }
  T* operator->() const noexcept { return m_object; }

 private:
  alignas(T) std::byte m_room[sizeof(T)]{};
  T* m_object = nullptr;
};

}  // namespace KelvoUHW
