// What the compiler's run-time library asks of its thread library, in a module that is loaded and
// unloaded any number of times. The thread library takes an index of the system for thread-local
// data and handles in each load, when it is first asked who calls, and never gives them back: after
// a thousand loads the process has none left. Two functions ask it.
//
// - __emutls_get_address: the compiler reaches each thread-local variable through it; the record it
//   passes is that of the run-time library (libgcc, emutls.c). The one here stands before the
//   library's in the module, and what it takes an unload gives back.
// - pthread_once: for unwinding in 32 bits, which registers the module's tables when it is loaded,
//   and for variables inside functions. The linker puts the one here in its place (--wrap).
#include "platform/process_end.h"

#include <windows.h>

#include <malloc.h>
#include <array>
#include <atomic>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <mutex>

#include "platform/process_lock.h"

extern "C" {

// As the compiler lays it out. `number` counts from one; 0 says that no thread has asked yet.
struct EmulatedVariable {
  std::size_t bytes;
  std::size_t alignment;
  std::size_t number;
  const void* initial;  // null: zeros
};

void* __emutls_get_address(EmulatedVariable* variable);

// `state` is 0 before the first call, and begins so.
int __wrap_pthread_once(long* state, void (*routine)());
}

namespace __gnu_cxx {
// The run-time's reserve of memory for exceptions, which it takes when it is loaded.
void __freeres();
}  // namespace __gnu_cxx

namespace platform {

namespace windows {

namespace {

// More than a module has of them; the linker joins those of the run-time, too.
constexpr std::size_t kMostVariables = 64;

// What a thread has of the variables, in a list of all threads.
struct ThreadData {
  ThreadData* next;
  std::array<void*, kMostVariables> variables;
};

constinit ProcessLock g_lock;  // guards what stands below, and who gives a variable its number
constinit std::atomic<DWORD> g_index = TLS_OUT_OF_INDEXES;
constinit std::size_t g_variables = 0;
constinit ThreadData* g_threads = nullptr;

// What asks for a variable may be about to ask for the error of a call that came before.
class KeptError {
 public:
  KeptError() noexcept : m_error(GetLastError()) {}
  ~KeptError() { SetLastError(m_error); }
  KeptError(const KeptError&) = delete;
  KeptError& operator=(const KeptError&) = delete;

 private:
  const DWORD m_error;
};

void* Made(const EmulatedVariable& variable) noexcept {
  void* const place = _aligned_malloc(variable.bytes, variable.alignment);
  if (place == nullptr) std::abort();  // as the library does: nobody could be told
  if (variable.initial != nullptr) {
    std::memcpy(place, variable.initial, variable.bytes);
  } else {
    std::memset(place, 0, variable.bytes);
  }
  return place;
}

// Zero-based.
std::size_t NumberOf(EmulatedVariable& variable) noexcept {
  const std::atomic_ref number(variable.number);
  if (number == 0) {
    const std::lock_guard lock(g_lock);
    if (number == 0) number = ++g_variables;
    if (number > kMostVariables) std::abort();
  }
  return number - 1;
}

ThreadData& DataOfThread() noexcept {
  if (g_index != TLS_OUT_OF_INDEXES) {
    if (void* const data = TlsGetValue(g_index)) return *static_cast<ThreadData*>(data);
  }
  const std::lock_guard lock(g_lock);
  if (g_index == TLS_OUT_OF_INDEXES) g_index = TlsAlloc();
  auto* const data = static_cast<ThreadData*>(std::calloc(1, sizeof(ThreadData)));
  if (g_index == TLS_OUT_OF_INDEXES || data == nullptr || !TlsSetValue(g_index, data)) std::abort();
  data->next = g_threads;
  g_threads = data;
  return *data;
}

void Free(ThreadData* data) noexcept {
  for (void* const variable : data->variables) _aligned_free(variable);
  std::free(data);
}

}  // namespace

}  // namespace windows

void ForgetThread() noexcept {
  using namespace windows;
  const std::lock_guard lock(g_lock);
  if (g_index == TLS_OUT_OF_INDEXES) return;
  auto* const data = static_cast<ThreadData*>(TlsGetValue(g_index));
  for (ThreadData** link = &g_threads; *link != nullptr; link = &(*link)->next) {
    if (*link != data) continue;
    *link = data->next;
    TlsSetValue(g_index, nullptr);
    Free(data);
    return;
  }
}

void ForgetAllThreads() noexcept {
  using namespace windows;
  __gnu_cxx::__freeres();
  const std::lock_guard lock(g_lock);
  while (ThreadData* const data = g_threads) {
    g_threads = data->next;
    Free(data);
  }
  if (g_index != TLS_OUT_OF_INDEXES) TlsFree(g_index);
  g_index = TLS_OUT_OF_INDEXES;
}

}  // namespace platform

void* __emutls_get_address(EmulatedVariable* variable) {
  using namespace platform::windows;
  const KeptError error;
  void*& place = DataOfThread().variables[NumberOf(*variable)];
  if (place == nullptr) place = Made(*variable);
  return place;
}

int __wrap_pthread_once(long* state, void (*routine)()) {
  constexpr long kNever = 0, kRuns = 1, kDone = 2;
  const std::atomic_ref now(*state);
  for (long seen = kNever; !now.compare_exchange_strong(seen, kRuns); seen = kNever) {
    if (seen == kDone) return 0;
    Sleep(0);  // the routines of the run-time library are a few stores
  }
  routine();
  now = kDone;
  return 0;
}
