// Starts a program with a DLL in it: zkusb_launcher DLL [NAME=VALUE...] PROGRAM [ARGUMENT...]. Each
// word is quoted and holds no quotation mark. Ends with the program's code, or with 125 where it
// could not be started so.
#include <windows.h>

#include <cstdio>
#include <string>

namespace {

constexpr int kNotStarted = 125;

// Takes the first word off the command line.
std::wstring TakeWord(const wchar_t*& line) {
  const bool quoted = *line == L'"';
  const wchar_t* const begin = line + quoted;
  const wchar_t* end = begin;
  while (*end != 0 && *end != (quoted ? L'"' : L' ')) ++end;
  line = end + (quoted && *end != 0);
  while (*line == L' ') ++line;
  return {begin, end};
}

// Has the process load the DLL, on a thread that ends with it.
bool Load(HANDLE process, const std::wstring& dll) {
  const SIZE_T bytes = (dll.size() + 1) * sizeof(wchar_t);
  void* const text =
      VirtualAllocEx(process, nullptr, bytes, MEM_COMMIT | MEM_RESERVE, PAGE_READWRITE);
  if (text == nullptr || !WriteProcessMemory(process, text, dll.c_str(), bytes, nullptr))
    return false;
  // The system's own DLLs stand at one address in all programs of a width.
  const auto load = reinterpret_cast<LPTHREAD_START_ROUTINE>(
      reinterpret_cast<void*>(GetProcAddress(GetModuleHandleW(L"kernel32.dll"), "LoadLibraryW")));
  const HANDLE thread = CreateRemoteThread(process, nullptr, 0, load, text, 0, nullptr);
  if (thread == nullptr) return false;
  DWORD loaded = 0;
  WaitForSingleObject(thread, INFINITE);
  GetExitCodeThread(thread, &loaded);  // the lower half of where it lies
  CloseHandle(thread);
  return loaded != 0;
}

}  // namespace

int main() {
  const wchar_t* line = GetCommandLineW();
  TakeWord(line);
  const std::wstring dll = TakeWord(line);
  std::wstring program = line;
  for (std::wstring word; (word = TakeWord(line)).find(L'=') != word.npos; program = line) {
    const std::size_t end = word.find(L'=');
    SetEnvironmentVariableW(word.substr(0, end).c_str(), word.substr(end + 1).c_str());
  }
  STARTUPINFOW start{};
  start.cb = sizeof start;
  start.dwFlags = STARTF_USESTDHANDLES;
  start.hStdInput = GetStdHandle(STD_INPUT_HANDLE);
  start.hStdOutput = GetStdHandle(STD_OUTPUT_HANDLE);
  start.hStdError = GetStdHandle(STD_ERROR_HANDLE);
  PROCESS_INFORMATION process{};
  if (!CreateProcessW(nullptr, program.data(), nullptr, nullptr, TRUE, CREATE_SUSPENDED, nullptr,
                      nullptr, &start, &process)) {
    std::fprintf(stderr, "the program cannot be started: %lu\n", GetLastError());
    return kNotStarted;
  }
  if (!Load(process.hProcess, dll)) {
    std::fprintf(stderr, "the DLL cannot be loaded\n");
    TerminateProcess(process.hProcess, kNotStarted);
  }
  DWORD code = kNotStarted;
  ResumeThread(process.hThread);
  WaitForSingleObject(process.hProcess, INFINITE);
  GetExitCodeProcess(process.hProcess, &code);
  return static_cast<int>(code);
}
