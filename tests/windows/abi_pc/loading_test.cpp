// The DLL that ships, loaded and unloaded as often as a program that runs for years does it.
#include <windows.h>

#include <gtest/gtest.h>
#include <tlhelp32.h>

#include <atomic>
#include <climits>
#include <cstdio>
#include <vector>

#include "tests/windows/abi_pc/pictures.h"

namespace abi_pc {
namespace {

struct Counts {
  int freeIndexes = 0;
  int handles = 0;
  int threads = 0;
  auto operator<=>(const Counts&) const = default;
};

Counts CountNow() {
  Counts counts;
  std::vector<DWORD> indexes;
  for (DWORD index; (index = TlsAlloc()) != TLS_OUT_OF_INDEXES;) indexes.push_back(index);
  for (const DWORD index : indexes) TlsFree(index);
  counts.freeIndexes = static_cast<int>(indexes.size());
  const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPTHREAD, 0);
  THREADENTRY32 thread{};
  thread.dwSize = sizeof thread;
  for (BOOL more = Thread32First(snapshot, &thread); more; more = Thread32Next(snapshot, &thread)) {
    counts.threads += thread.th32OwnerProcessID == GetCurrentProcessId() ? 1 : 0;
  }
  CloseHandle(snapshot);
  // One by one, up to well beyond the next one: not every system tells their number.
  const HANDLE next = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  CloseHandle(next);
  for (std::uintptr_t value = 4; value < reinterpret_cast<std::uintptr_t>(next) + 0x1000; value += 4) {
    DWORD flags = 0;
    counts.handles += GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags) ? 1 : 0;
  }
  return counts;
}

void PrintTo(const Counts& counts, std::ostream* out) {
  *out << counts.freeIndexes << " free indexes, " << counts.handles << " handles, " << counts.threads << " threads";
}

// How many allocations of the module go well before one fails.
std::atomic<int> g_allocationsLeft = INT_MAX;
void* __cdecl FailingMalloc(std::size_t bytes) { return --g_allocationsLeft == 0 ? nullptr : std::malloc(bytes); }

DWORD WINAPI ReadOnce(void* module) { return !static_cast<LoadedModule*>(module)->Picture().empty(); }

// One load: a tree, queries, from another thread too, and every other time an exception inside.
void LoadOnce(int cycle) {
  const LoadedModule module;
  ASSERT_TRUE(module.tree) << cycle;
  ASSERT_TRUE(Replace(module.Handle(), "malloc", reinterpret_cast<void*>(&FailingMalloc)));
  if (cycle % 2 == 0) {
    g_allocationsLeft = 1 + cycle % 400;
    module.build->BuildTree();
    g_allocationsLeft = INT_MAX;
  }
  module.Build();
  if (cycle % 3 == 0) {
    // One of the system's: those of the run-time keep handles for the next.
    const HANDLE thread = CreateThread(nullptr, 0, ReadOnce, const_cast<LoadedModule*>(&module), 0, nullptr);
    DWORD shown = 0;
    WaitForSingleObject(thread, INFINITE);
    GetExitCodeThread(thread, &shown);
    CloseHandle(thread);
    EXPECT_TRUE(shown || cycle % 2 == 0);
  }
  ComPtr<IZKUMUsbTreeNodeEnumerator> volumes;
  EXPECT_EQ(module.tree->get_PortDevicesWithVolume(volumes.Put()), S_OK);
}

// What the module has of the registry.
std::atomic<int> g_keys = 0;
LSTATUS WINAPI OpenKey(HKEY key, LPCWSTR name, DWORD options, REGSAM access, PHKEY opened) {
  const LSTATUS status = RegOpenKeyExW(key, name, options, access, opened);
  g_keys += status == ERROR_SUCCESS ? 1 : 0;
  return status;
}
LSTATUS WINAPI CreateKey(HKEY key, LPCWSTR name, DWORD reserved, LPWSTR type, DWORD options, REGSAM access,
                         const LPSECURITY_ATTRIBUTES security, PHKEY opened, LPDWORD disposition) {
  const LSTATUS status = RegCreateKeyExW(key, name, reserved, type, options, access, security, opened, disposition);
  g_keys += status == ERROR_SUCCESS ? 1 : 0;
  return status;
}
LSTATUS WINAPI CloseKey(HKEY key) { return --g_keys, RegCloseKey(key); }

void RegisterOnce() {
  const LoadedModule module;
  using Registration = HRESULT(STDAPICALLTYPE*)();
  EXPECT_TRUE(Replace(module.Handle(), "RegOpenKeyExW", reinterpret_cast<void*>(&OpenKey)) &&
              Replace(module.Handle(), "RegCreateKeyExW", reinterpret_cast<void*>(&CreateKey)) &&
              Replace(module.Handle(), "RegCloseKey", reinterpret_cast<void*>(&CloseKey)));
  EXPECT_EQ(module.Export<Registration>("DllRegisterServer")(), S_OK);
  EXPECT_EQ(module.Export<Registration>("DllUnregisterServer")(), S_OK);
}

TEST(AbiPc, IsLoadedAndUnloadedAnyNumberOfTimes) {
  const int cycles = static_cast<int>(FromEnvironment("ZKUSB_CYCLES", Cases(5000u, 300u)));
  const sim::Machine machine = sim::LoadMachine(MachinePath("vmware-win7"));
  Counts early;
  for (int cycle = 0; cycle < cycles && !HasFailure(); ++cycle) {
    Begin(machine);
    LoadOnce(cycle);
    ExpectNothingWrong("load " + std::to_string(cycle), {.sets = 2 * kSetsOfABuild});
    ASSERT_EQ(GetModuleHandleW(L"ZKUsbMonitor.dll"), nullptr) << cycle;
    if (cycle == 9) early = CountNow();
  }
  const Counts late = CountNow();
  EXPECT_EQ(late, early);
  // The simulated module keeps its PC, but nothing of the system.
  for (int cycle = 0; cycle < 20; ++cycle) EXPECT_FALSE(SimulatedPictureOf(MachinePath("vmware-win7")).empty());
  EXPECT_EQ(CountNow(), early);
  // The system's own registration of a type library keeps keys on Wine: handles are told from ours by counting ours.
  for (int cycle = 0; cycle < 50 && !HasFailure(); ++cycle) RegisterOnce();
  EXPECT_EQ(CountNow().freeIndexes, early.freeIndexes);
  EXPECT_EQ(g_keys, 0);
  std::printf("after 10 loads: %s\nafter %d loads: %s\n", testing::PrintToString(early).c_str(), cycles,
              testing::PrintToString(late).c_str());
}

}  // namespace
}  // namespace abi_pc
