#include "tests/support/failing_memory.h"

#include <unwind.h>

#include <chrono>
#include <map>
#include <memory>
#include <new>
#include <set>
#include <thread>
#include <utility>
#include <vector>

#include "platform/heap.h"

// Allocations until the one that fails; 0: none fails.
static thread_local std::uint64_t t_countdown = 0;
static thread_local bool t_paused = false;
static thread_local bool t_slow = false;

// While set: the places of the allocations, hashed.
static thread_local std::vector<std::uint64_t>* t_places = nullptr;

static _Unwind_Reason_Code AddFrame(_Unwind_Context* context, void* hash) {
  auto& sum = *static_cast<std::uint64_t*>(hash);
  sum = (sum ^ static_cast<std::uint64_t>(_Unwind_GetIP(context))) * 0x100000001B3U;
  return _URC_NO_REASON;
}

static void RecordPlace() {
  t_paused = true;
  std::uint64_t place = 14695981039346656037U;
  _Unwind_Backtrace(AddFrame, &place);
  t_places->push_back(place);
  t_paused = false;
}

void* operator new(std::size_t bytes) {
  if (t_slow) std::this_thread::sleep_for(std::chrono::milliseconds(1));
  if (t_places != nullptr && !t_paused) RecordPlace();
  if (t_countdown != 0 && !t_paused && --t_countdown == 0) throw std::bad_alloc();
  if (void* memory = heap::Take(bytes)) return memory;
  throw std::bad_alloc();
}
void* operator new(std::size_t bytes, const std::nothrow_t&) noexcept {
  try {
    return operator new(bytes);
  } catch (const std::bad_alloc&) {
    return nullptr;
  }
}
void operator delete(void* memory) noexcept { heap::Give(memory); }
void operator delete(void* memory, std::size_t) noexcept { heap::Give(memory); }

namespace KelvoUHW {

void BeginRecordingAllocations() { t_places = new std::vector<std::uint64_t>; }

std::vector<std::uint64_t> EndRecordingAllocations() {
  const std::unique_ptr<std::vector<std::uint64_t>> places(std::exchange(t_places, nullptr));
  std::map<std::uint64_t, std::pair<std::uint64_t, std::uint64_t>> firstAndLast;
  for (std::size_t i = 0; i < places->size(); ++i) {
    firstAndLast.try_emplace((*places)[i], i + 1, i + 1).first->second.second = i + 1;
  }
  std::set<std::uint64_t> distinct;
  for (const auto& [place, both] : firstAndLast) distinct.insert({both.first, both.second});
  return {distinct.begin(), distinct.end()};
}

SlowAllocations::SlowAllocations() noexcept { t_slow = true; }
SlowAllocations::~SlowAllocations() { t_slow = false; }

FailingAllocation::FailingAllocation(std::uint64_t allocation) noexcept { t_countdown = allocation; }
FailingAllocation::~FailingAllocation() { t_countdown = 0; }
bool FailingAllocation::Failed() const noexcept { return t_countdown == 0; }

platform::Status WellFedHost::BeforeCall(const platform::wrappers::HostCall&) noexcept {
  t_paused = true;
  return {};
}
void WellFedHost::AfterCall(const platform::wrappers::HostCall&, const platform::Status&,
                            const std::intptr_t*) noexcept {
  t_paused = false;
}

}  // namespace KelvoUHW
