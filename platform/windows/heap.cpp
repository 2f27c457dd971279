#include "platform/heap.h"

#include <array>
#include <new>

#include "platform/process_lock.h"

namespace heap {

namespace {

constexpr std::size_t kStep = 16;
constexpr std::size_t kClasses = 65;  // up to 1024 bytes; class 0 is for what is larger
constexpr std::size_t kChunkBytes = 1 << 20;

// In front of each block; as large as any alignment asks for.
struct alignas(kStep) Head {
  std::size_t sizeClass;
  Head* next;
};

constinit platform::ProcessLock g_lock;
constinit std::array<Head*, kClasses> g_free{};
constinit char* g_chunk = nullptr;
constinit std::size_t g_left = 0;

Head* FromChunk(std::size_t bytes) noexcept {
  if (g_left < bytes) {
    g_chunk = static_cast<char*>(std::malloc(kChunkBytes));
    g_left = g_chunk == nullptr ? 0 : kChunkBytes;
    if (g_chunk == nullptr) return nullptr;
  }
  g_left -= bytes;
  return ::new (g_chunk + g_left) Head;
}

}  // namespace

void* Take(std::size_t bytes) noexcept {
  const std::size_t sizeClass = bytes == 0 ? 1 : (bytes + kStep - 1) / kStep;
  Head* head = nullptr;
  if (sizeClass >= kClasses) {
    head = bytes > SIZE_MAX - sizeof(Head) ? nullptr
                                           : static_cast<Head*>(std::malloc(sizeof(Head) + bytes));
    if (head != nullptr) head->sizeClass = 0;
  } else {
    g_lock.lock();
    head = g_free[sizeClass];
    if (head != nullptr) {
      g_free[sizeClass] = head->next;
    } else {
      head = FromChunk(sizeof(Head) + sizeClass * kStep);
    }
    g_lock.unlock();
    if (head != nullptr) head->sizeClass = sizeClass;
  }
  return head == nullptr ? nullptr : head + 1;
}

void Give(void* memory) noexcept {
  if (memory == nullptr) return;
  Head* const head = static_cast<Head*>(memory) - 1;
  const std::size_t sizeClass = head->sizeClass;
  if (sizeClass == 0) {
    std::free(head);
    return;
  }
  g_lock.lock();
  head->next = g_free[sizeClass];
  g_free[sizeClass] = head;
  g_lock.unlock();
}

}  // namespace heap
