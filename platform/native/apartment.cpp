#include <optional>
#include <utility>

#include "platform/com_controls.h"
#include "platform/native/com_functions.h"

namespace {

struct Apartment {
  std::uint32_t depth = 0;
  DWORD model = COINIT_MULTITHREADED;
};
thread_local Apartment t_apartment;
thread_local std::optional<HRESULT> t_failure;

}  // namespace

HRESULT CoInitializeEx(void*, DWORD concurrencyModel) noexcept {
  if (t_failure) return *std::exchange(t_failure, std::nullopt);
  const DWORD model = concurrencyModel & COINIT_APARTMENTTHREADED;
  if (t_apartment.depth == 0) {
    t_apartment = {1, model};
    return S_OK;
  }
  if (t_apartment.model != model) return RPC_E_CHANGED_MODE;
  ++t_apartment.depth;
  return S_FALSE;
}

void CoUninitialize() noexcept {
  if (t_apartment.depth > 0) --t_apartment.depth;
}

namespace platform::controls {

void FailNextCoInitialize(HRESULT result) noexcept { t_failure = result; }
std::uint32_t ApartmentDepth() noexcept { return t_apartment.depth; }

}  // namespace platform::controls
