// Runs a program that shows a window with a list, waits until the list has more rows than it began with, and closes the
// window at once, while the events behind that row are still being told: close_window PROGRAM. Fails unless the program
// then ends by itself with 0.
#include <windows.h>
// Behind windows.h, on which it builds.
#include <commctrl.h>

#include <cstdio>

namespace {

constexpr DWORD kStepMilliseconds = 5;
constexpr int kMostSteps = 6000;

HWND ListOf(DWORD process) {
  HWND window = nullptr;
  while ((window = FindWindowExW(nullptr, window, L"DeviceWindow", nullptr)) != nullptr) {
    DWORD owner = 0;
    GetWindowThreadProcessId(window, &owner);
    if (owner == process && IsWindowVisible(window)) return FindWindowExW(window, nullptr, L"SysListView32", nullptr);
  }
  return nullptr;
}

}  // namespace

int main(int, char** argv) {
  STARTUPINFOA start{};
  start.cb = sizeof start;
  PROCESS_INFORMATION process{};
  if (!CreateProcessA(nullptr, argv[1], nullptr, nullptr, FALSE, 0, nullptr, nullptr, &start, &process)) return 2;
  LRESULT first = 0, rows = 0;
  for (int step = 0; step < kMostSteps && (first == 0 || rows == first); ++step) {
    Sleep(kStepMilliseconds);
    if (const HWND list = ListOf(process.dwProcessId)) {
      rows = SendMessageW(list, LVM_GETITEMCOUNT, 0, 0);
      if (first == 0) first = rows;
    }
  }
  const HWND list = ListOf(process.dwProcessId);
  DWORD code = STILL_ACTIVE;
  if (list != nullptr && PostMessageW(GetParent(list), WM_CLOSE, 0, 0) &&
      WaitForSingleObject(process.hProcess, 20000) == WAIT_OBJECT_0) {
    GetExitCodeProcess(process.hProcess, &code);
  } else {
    TerminateProcess(process.hProcess, 3);
  }
  std::printf("rows: %d, then %d; ended with %lu\n", static_cast<int>(first), static_cast<int>(rows), code);
  return code == 0 && rows == first + 1 ? 0 : 1;
}
