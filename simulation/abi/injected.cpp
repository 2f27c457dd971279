// The PC inside a program that knows nothing of it: loaded before the program's first instruction,
// it loads the module that ships and stands in its import table. The environment says which PC it
// is, and where to write what was wrong:
//
// - ABI_PC_MODULE: the module.
// - ABI_PC_MACHINE: the machine file.
// - ABI_PC_SCRIPT: a script, played in real time with the system's own messages; empty: nothing
//   changes.
// - ABI_PC_PROGRAM: not empty: it stands in the program's own import table, too, for what the
// program
//   asks without the module. The script begins at once, since there is no window to wait for.
// - ABI_PC_REPORT: the report: one line for each breach, then one with what is open and one with
// the
//   starts.
#include <windows.h>

#include <dbt.h>

#include <fstream>

#include "platform/text.h"
#include "simulation/abi/abi_pc.h"
#include "simulation/machine/machine_file.h"
#include "simulation/pc/play_step.h"

namespace {

namespace sim = platform::simulated;

// What the player found wrong.
std::string* g_trouble = new std::string;

std::string Variable(const char* name) {
  char value[1024];
  const DWORD length = GetEnvironmentVariableA(name, value, sizeof value);
  return std::string(value, length < sizeof value ? length : 0);
}

HWND Receiver() {
  for (HWND window = nullptr;
       (window = FindWindowExW(nullptr, window, L"MsgReceiver", nullptr)) != nullptr;) {
    DWORD process = 0;
    GetWindowThreadProcessId(window, &process);
    if (process == GetCurrentProcessId()) return window;
  }
  return nullptr;
}

// Interfaces are told of only where somebody has asked for it.
void Send(const sim::DeviceBroadcast& broadcast) {
  const auto* const record = reinterpret_cast<const DEV_BROADCAST_HDR*>(broadcast.record.data());
  if (!broadcast.record.empty() && record->dbch_devicetype == DBT_DEVTYP_DEVICEINTERFACE &&
      abi_pc::OpenNow().notifications == 0) {
    return;
  }
  const HWND receiver = Receiver();
  if (receiver == nullptr) return;
  SendMessageTimeoutW(receiver, WM_DEVICECHANGE, broadcast.event,
                      broadcast.record.empty() ? 0 : reinterpret_cast<LPARAM>(record), SMTO_BLOCK,
                      5000, nullptr);
}

DWORD WINAPI Play(void*) {
  try {
    const sim::Machine machine = sim::LoadMachine(Variable("ABI_PC_MACHINE"));
    sim::SimulatedPc pc(machine);
    while (Variable("ABI_PC_PROGRAM").empty() && Receiver() == nullptr) Sleep(10);
    const ULONGLONG start = GetTickCount64();
    for (const sim::Step& step : sim::LoadScript(Variable("ABI_PC_SCRIPT"), machine)) {
      const ULONGLONG now = GetTickCount64() - start;
      if (step.atMilliseconds > now) Sleep(static_cast<DWORD>(step.atMilliseconds - now));
      const auto send = [&](const sim::DeviceBroadcast& broadcast) {
        abi_pc::Change(pc.Snapshot());
        Send(broadcast);
      };
      *g_trouble += platform::ToUtf8(
          sim::PlayStep(pc, step, send, [] { Sleep(sim::kRealLeadMilliseconds); }));
      abi_pc::Change(pc.Snapshot());
    }
  } catch (const std::exception& error) {
    *g_trouble += error.what();
  }
  return 0;
}

bool Enter() {
  try {
    abi_pc::Begin(sim::LoadMachine(Variable("ABI_PC_MACHINE")));
    const HMODULE module = LoadLibraryA(Variable("ABI_PC_MODULE").c_str());
    if (module == nullptr) return false;
    abi_pc::Attach(module);
    if (!Variable("ABI_PC_PROGRAM").empty()) abi_pc::Attach(GetModuleHandleW(nullptr));
    if (!Variable("ABI_PC_SCRIPT").empty())
      CloseHandle(CreateThread(nullptr, 0, Play, nullptr, 0, nullptr));
    return true;
  } catch (const std::exception& error) {
    OutputDebugStringA(error.what());
    return false;
  }
}

void Report() {
  std::ofstream report(Variable("ABI_PC_REPORT"));
  for (const std::string& breach : abi_pc::Breaches()) report << "breach: " << breach << "\n";
  if (!g_trouble->empty()) report << "breach: the player: " << *g_trouble << "\n";
  report << "open: " << abi_pc::TextOf(abi_pc::OpenNow()) << "\n";
  report << "calls: " << abi_pc::Calls()["DeviceIoControl"] << "\n";
}

}  // namespace

extern "C" BOOL WINAPI DllMain(HINSTANCE, DWORD reason, LPVOID) {
  if (reason == DLL_PROCESS_ATTACH) return Enter();
  if (reason == DLL_PROCESS_DETACH) Report();
  return TRUE;
}
