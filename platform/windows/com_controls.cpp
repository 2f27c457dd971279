// Takes the place of entries in the import table of the program that links it: a slot that is
// defined here is not taken from the system's import library. Calls of the system's DLLs among
// themselves do not come here.
#include "platform/com_controls.h"

#include <atomic>
#include <optional>
#include <utility>

// The symbol that calls of an imported function go through; on 32 bits its name ends with the bytes
// of its parameters.
#ifdef _WIN64
#define IMPORT_SLOT(name, bytes) "__imp_" #name
#else
#define IMPORT_SLOT(name, bytes) "__imp__" #name "@" #bytes
#endif

namespace {

// The system's own function, looked up at the first call, which may come before anything of this
// file is constructed.
template <class Function>
class Real {
 public:
  constexpr Real(const wchar_t* dll, const char* name) noexcept : m_dll(dll), m_name(name) {}

  template <class... Args>
  auto operator()(Args... args) noexcept {
    Function* function = m_function;
    if (function == nullptr) {
      function = reinterpret_cast<Function*>(
          reinterpret_cast<void*>(GetProcAddress(LoadLibraryW(m_dll), m_name)));
      m_function = function;
    }
    return function(args...);
  }

 private:
  const wchar_t* const m_dll;
  const char* const m_name;
  std::atomic<Function*> m_function = nullptr;
};

constinit Real<decltype(SysAllocString)> g_sysAllocString(L"oleaut32.dll", "SysAllocString");
constinit Real<decltype(SysAllocStringLen)> g_sysAllocStringLen(L"oleaut32.dll",
                                                                "SysAllocStringLen");
constinit Real<decltype(SysFreeString)> g_sysFreeString(L"oleaut32.dll", "SysFreeString");
constinit Real<decltype(VariantClear)> g_variantClear(L"oleaut32.dll", "VariantClear");
constinit Real<decltype(VariantCopy)> g_variantCopy(L"oleaut32.dll", "VariantCopy");
constinit Real<decltype(CoInitializeEx)> g_coInitializeEx(L"ole32.dll", "CoInitializeEx");
constinit Real<decltype(CoUninitialize)> g_coUninitialize(L"ole32.dll", "CoUninitialize");
constinit Real<decltype(InitializeCriticalSectionAndSpinCount)> g_initializeCriticalSection(
    L"kernel32.dll", "InitializeCriticalSectionAndSpinCount");

constinit std::atomic<std::int64_t> g_alive = 0;
constinit std::atomic<std::int64_t> g_allocated = 0;

// What is ordered for a thread, and what it has done.
struct Orders {
  std::uint64_t failingText = 0;  // 0: none
  std::uint64_t textsSeen = 0;
  std::uint64_t locksBefore = 0;  // 0: none fails
  HRESULT lockResult = S_OK;
  std::optional<HRESULT> entering;
  std::uint32_t depth = 0;
};
constinit thread_local Orders t_orders;

bool TextFails() noexcept {
  return t_orders.failingText != 0 && ++t_orders.textsSeen == t_orders.failingText;
}
void CountText(bool allocated) noexcept {
  if (!allocated) return;
  ++g_alive;
  ++g_allocated;
}
bool HoldsText(const VARIANT& variant) noexcept {
  return variant.vt == VT_BSTR && variant.bstrVal != nullptr;
}

BSTR WINAPI AllocString(const OLECHAR* text) noexcept {
  if (TextFails()) return nullptr;
  const BSTR made = g_sysAllocString(text);
  CountText(made != nullptr);
  return made;
}

BSTR WINAPI AllocStringLen(const OLECHAR* text, UINT characters) noexcept {
  if (TextFails()) return nullptr;
  const BSTR made = g_sysAllocStringLen(text, characters);
  CountText(made != nullptr);
  return made;
}

void WINAPI FreeString(BSTR text) noexcept {
  if (text != nullptr) --g_alive;
  g_sysFreeString(text);
}

HRESULT WINAPI Clear(VARIANTARG* variant) noexcept {
  const bool text = HoldsText(*variant);
  const HRESULT result = g_variantClear(variant);
  if (text && SUCCEEDED(result)) --g_alive;
  return result;
}

HRESULT WINAPI Copy(VARIANTARG* target, VARIANTARG* source) noexcept {
  if (target == source) return S_OK;
  if (const HRESULT cleared = Clear(target); FAILED(cleared)) return cleared;
  if (HoldsText(*source) && TextFails()) return E_OUTOFMEMORY;
  const HRESULT result = g_variantCopy(target, source);
  CountText(SUCCEEDED(result) && HoldsText(*target));
  return result;
}

HRESULT WINAPI EnterApartment(void* reserved, DWORD model) noexcept {
  if (t_orders.entering) return *std::exchange(t_orders.entering, std::nullopt);
  const HRESULT result = g_coInitializeEx(reserved, model);
  if (SUCCEEDED(result)) ++t_orders.depth;
  return result;
}

void WINAPI LeaveApartment() noexcept {
  if (t_orders.depth > 0) --t_orders.depth;
  g_coUninitialize();
}

BOOL WINAPI InitializeSection(CRITICAL_SECTION* section, DWORD spins) noexcept {
  if (t_orders.locksBefore != 0 && --t_orders.locksBefore == 0) {
    SetLastError(static_cast<DWORD>(t_orders.lockResult) & 0xFFFF);
    return FALSE;
  }
  return g_initializeCriticalSection(section, spins);
}

}  // namespace

extern "C" {
const void* g_slotAllocString asm(IMPORT_SLOT(SysAllocString,
                                              4)) = reinterpret_cast<const void*>(&AllocString);
const void* g_slotAllocStringLen asm(IMPORT_SLOT(SysAllocStringLen, 8)) =
    reinterpret_cast<const void*>(&AllocStringLen);
const void* g_slotFreeString asm(IMPORT_SLOT(SysFreeString,
                                             4)) = reinterpret_cast<const void*>(&FreeString);
const void* g_slotClear asm(IMPORT_SLOT(VariantClear, 4)) = reinterpret_cast<const void*>(&Clear);
const void* g_slotCopy asm(IMPORT_SLOT(VariantCopy, 8)) = reinterpret_cast<const void*>(&Copy);
const void* g_slotEnter asm(IMPORT_SLOT(CoInitializeEx,
                                        8)) = reinterpret_cast<const void*>(&EnterApartment);
const void* g_slotLeave asm(IMPORT_SLOT(CoUninitialize,
                                        0)) = reinterpret_cast<const void*>(&LeaveApartment);
const void* g_slotSection asm(IMPORT_SLOT(InitializeCriticalSectionAndSpinCount,
                                          8)) = reinterpret_cast<const void*>(&InitializeSection);
}

namespace platform::controls {

BstrCounts CountBstrs() noexcept { return {g_alive, g_allocated}; }

FailingBstr::FailingBstr(std::uint64_t allocation) noexcept {
  t_orders.failingText = allocation;
  t_orders.textsSeen = 0;
}
FailingBstr::~FailingBstr() { t_orders.failingText = 0; }
bool FailingBstr::Failed() const noexcept { return t_orders.textsSeen >= t_orders.failingText; }

void FailNextCoInitialize(HRESULT result) noexcept { t_orders.entering = result; }
std::uint32_t ApartmentDepth() noexcept { return t_orders.depth; }

void FailCriticalSection(std::uint64_t call, HRESULT result) noexcept {
  t_orders.locksBefore = call;
  t_orders.lockResult = result;
}

}  // namespace platform::controls
