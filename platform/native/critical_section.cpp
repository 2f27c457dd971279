#include "platform/critical_section.h"

#include "platform/com_controls.h"

namespace platform {

namespace {

struct Fault {
  std::uint64_t callsBefore = 0;  // 0: none ordered
  HRESULT result = S_OK;
};
thread_local Fault t_fault;

}  // namespace

HRESULT CriticalSection::Initialize() noexcept {
  if (t_fault.callsBefore != 0 && --t_fault.callsBefore == 0) return t_fault.result;
  return S_OK;
}

namespace controls {
void FailCriticalSection(std::uint64_t call, HRESULT result) noexcept { t_fault = {call, result}; }
}  // namespace controls

}  // namespace platform
