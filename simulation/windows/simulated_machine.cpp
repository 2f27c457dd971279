// The one function in which ZKUsbMonitorSimulated.dll differs from ZKUsbMonitor.dll: it returns a
// simulated PC instead of the one that the program runs on. COM, registry, windows and threads are
// the system's own in both.
//
// Two environment variables choose the PC. ZKUSB_MACHINE names a machine file (without it, the
// built-in machine is used) and ZKUSB_SCRIPT a script. A thread of its own plays the script in real
// time, beginning when the process has the window that receives device messages.
#include <windows.h>

#include <cstdio>
#include <exception>
#include <memory>
#include <new>
#include <string>

#include "platform/text.h"
#include "platform/windows/machine.h"
#include "platform/windows/native_types.h"
#include "platform/windows/server_classes.h"
#include "platform/windows/windows_desktop.h"
#include "simulation/machine/built_in_machine.h"
#include "simulation/machine/machine_file.h"
#include "simulation/pc/play_step.h"
#include "simulation/pc/simulated_pc.h"

namespace platform::windows {

namespace {

constexpr DWORD kWindowPollMilliseconds = 10;
constexpr UINT kAnswerMilliseconds = 5000;

struct PlayedPc {
  explicit PlayedPc(simulated::Machine machine) : pc(std::move(machine)) {}
  simulated::SimulatedPc pc;
  simulated::Script script;
};

void Complain(const std::string& reason) noexcept {
  std::fprintf(stderr, "ZKUsbMonitorSimulated: %s\n", reason.c_str());
  try {
    std::u16string line = u"ZKUsbMonitorSimulated: ";
    line.append(FromUtf8(reason)).append(u"\n");
    OutputDebugStringW(Native(line.c_str()));
  } catch (const std::bad_alloc&) {
  }
}

HWND ReceiverOfThisProcess() noexcept {
  HWND window = nullptr;
  while ((window = FindWindowExW(nullptr, window, L"MsgReceiver", nullptr)) != nullptr) {
    DWORD process = 0;
    GetWindowThreadProcessId(window, &process);
    if (process == GetCurrentProcessId()) break;
  }
  return window;
}

void Send(const simulated::DeviceBroadcast& broadcast) {
  const LPARAM record =
      broadcast.record.empty() ? 0 : reinterpret_cast<LPARAM>(broadcast.record.data());
  SendMessageTimeoutW(ReceiverOfThisProcess(), WM_DEVICECHANGE, broadcast.event, record, SMTO_BLOCK,
                      kAnswerMilliseconds, nullptr);
}

void PlayScript(void* argument) {
  PlayedPc& played = *static_cast<PlayedPc*>(argument);
  try {
    while (ReceiverOfThisProcess() == nullptr) ::Sleep(kWindowPollMilliseconds);
    const ULONGLONG start = GetTickCount64();
    for (const simulated::Step& step : played.script) {
      const ULONGLONG now = GetTickCount64() - start;
      if (step.atMilliseconds > now) ::Sleep(static_cast<DWORD>(step.atMilliseconds - now));
      const std::u16string refused = simulated::PlayStep(
          played.pc, step, Send, [] { ::Sleep(simulated::kRealLeadMilliseconds); });
      if (!refused.empty()) Complain(ToUtf8(refused));
    }
  } catch (const std::exception& error) {
    Complain(error.what());
  }
}

// Given to the process for good: its threads use it until the process ends.
PlayedPc* Load() noexcept {
  try {
    simulated::Machine machine;
    std::unique_ptr<PlayedPc> played;
    try {
      const std::string file = ToUtf8(EnvironmentText(u"ZKUSB_MACHINE"));
      machine = file.empty() ? simulated::ParseMachine(simulated::BuiltInMachine(),
                                                       simulated::kBuiltInMachineName)
                             : simulated::LoadMachine(file);
      played = std::make_unique<PlayedPc>(machine);
      const std::string script = ToUtf8(EnvironmentText(u"ZKUSB_SCRIPT"));
      if (!script.empty()) played->script = simulated::LoadScript(script, machine);
    } catch (const simulated::MachineFileError& error) {
      Complain(error.what());
      // What is wrong shows nothing, rather than something else.
      if (played == nullptr) played = std::make_unique<PlayedPc>(simulated::Machine{});
    }
    WindowsThreads threads;
    // The thread's code is this module's.
    if (!played->script.empty() && threads.PinModule(reinterpret_cast<const void*>(&PlayScript))) {
      threads.StartThread(PlayScript, 0, played.get());
    }
    return played.release();
  } catch (const std::exception& error) {
    Complain(error.what());
    std::terminate();
  }
}

}  // namespace

Host& Machine() noexcept {
  static PlayedPc* const s_played = Load();
  return s_played->pc;
}

}  // namespace platform::windows
