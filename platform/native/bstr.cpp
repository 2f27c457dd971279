#include <atomic>
#include <cstdlib>
#include <cstring>
#include <limits>
#include <string_view>

#include "platform/com_controls.h"
#include "platform/native/com_functions.h"

namespace {

std::atomic<std::int64_t> g_alive = 0;
std::atomic<std::int64_t> g_allocated = 0;

// The failure that FailingBstr orders for this thread.
struct Fault {
  std::uint64_t at = 0;  // 0: none
  std::uint64_t seen = 0;
};
thread_local Fault t_fault;

// Room before the first character: the length stands in its last four bytes, the rest keeps the
// text aligned as an allocation is.
constexpr std::size_t kPrefixBytes = 16;

}  // namespace

BSTR SysAllocStringLen(const char16_t* text, UINT characters) noexcept {
  if (t_fault.at != 0 && ++t_fault.seen == t_fault.at) return nullptr;
  constexpr std::size_t kMost = (std::numeric_limits<UINT>::max() - 64) / sizeof(char16_t);
  if (characters > kMost) return nullptr;
  const std::uint32_t bytes = characters * static_cast<std::uint32_t>(sizeof(char16_t));
  auto* block = static_cast<char*>(std::malloc(kPrefixBytes + bytes + sizeof(char16_t)));
  if (block == nullptr) return nullptr;
  std::memcpy(block + kPrefixBytes - sizeof bytes, &bytes, sizeof bytes);
  auto* start = reinterpret_cast<char16_t*>(block + kPrefixBytes);
  if (text != nullptr) std::memcpy(start, text, bytes);
  start[characters] = u'\0';
  ++g_alive;
  ++g_allocated;
  return start;
}

BSTR SysAllocString(const char16_t* text) noexcept {
  if (text == nullptr) return nullptr;
  return SysAllocStringLen(text, static_cast<UINT>(std::u16string_view(text).size()));
}

void SysFreeString(BSTR text) noexcept {
  if (text == nullptr) return;
  --g_alive;
  std::free(reinterpret_cast<char*>(text) - kPrefixBytes);
}

UINT SysStringByteLen(BSTR text) noexcept {
  if (text == nullptr) return 0;
  std::uint32_t bytes = 0;
  std::memcpy(&bytes, reinterpret_cast<const char*>(text) - sizeof bytes, sizeof bytes);
  return bytes;
}

UINT SysStringLen(BSTR text) noexcept {
  return SysStringByteLen(text) / static_cast<UINT>(sizeof(char16_t));
}

namespace platform::controls {

BstrCounts CountBstrs() noexcept { return {g_alive, g_allocated}; }

FailingBstr::FailingBstr(std::uint64_t allocation) noexcept { t_fault = {allocation, 0}; }
FailingBstr::~FailingBstr() { t_fault = {}; }
bool FailingBstr::Failed() const noexcept { return t_fault.seen >= t_fault.at; }

}  // namespace platform::controls
