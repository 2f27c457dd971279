#include "tests/support/program.h"

#include <windows.h>

#include "platform/text.h"

namespace {

// A test says which program hangs before it is ended itself.
constexpr DWORD kLongestRunMilliseconds = 180'000;

// A file that is gone when it is closed, for output of any length: a pipe would have to be read while the other fills.
class OutputFile {
 public:
  OutputFile() {
    wchar_t folder[MAX_PATH + 1], name[MAX_PATH + 1];
    SECURITY_ATTRIBUTES inherited{sizeof inherited, nullptr, TRUE};
    if (GetTempPathW(MAX_PATH, folder) == 0 || GetTempFileNameW(folder, L"zku", 0, name) == 0) return;
    m_file = CreateFileW(name, GENERIC_READ | GENERIC_WRITE, FILE_SHARE_READ | FILE_SHARE_WRITE, &inherited,
                         CREATE_ALWAYS, FILE_FLAG_DELETE_ON_CLOSE, nullptr);
  }
  ~OutputFile() {
    if (Opened()) CloseHandle(m_file);
  }
  OutputFile(const OutputFile&) = delete;
  OutputFile& operator=(const OutputFile&) = delete;

  bool Opened() const { return m_file != INVALID_HANDLE_VALUE; }
  HANDLE Handle() const { return m_file; }
  std::string Contents() const {
    std::string text;
    SetFilePointer(m_file, 0, nullptr, FILE_BEGIN);
    char block[1 << 14];
    for (DWORD bytes = 0; ReadFile(m_file, block, sizeof block, &bytes, nullptr) && bytes != 0;) {
      text.append(block, bytes);
    }
    return text;
  }

 private:
  HANDLE m_file = INVALID_HANDLE_VALUE;
};

// As the system's own splitting of a command line takes it apart again: a backslash is one unless a quotation mark
// follows.
std::u16string Quoted(const std::string& argument) {
  std::u16string text = u"\"";
  std::size_t backslashes = 0;
  for (const char16_t unit : platform::FromUtf8(argument)) {
    if (unit == u'"') text.append(backslashes + 1, u'\\');
    backslashes = unit == u'\\' ? backslashes + 1 : 0;
    text += unit;
  }
  return text.append(backslashes, u'\\').append(u"\"");
}

}  // namespace

ProgramResult RunProgram(const std::string& program, const std::vector<std::string>& args, const std::string& outFile) {
  ProgramResult result;
  const OutputFile out, err;
  if (!outFile.empty() || !out.Opened() || !err.Opened()) return result;
  std::u16string line = Quoted(program);
  for (const std::string& arg : args) line.append(u" ").append(Quoted(arg));
  STARTUPINFOW start{};
  start.cb = sizeof start;
  start.dwFlags = STARTF_USESTDHANDLES;
  start.hStdInput = GetStdHandle(STD_INPUT_HANDLE);
  start.hStdOutput = out.Handle();
  start.hStdError = err.Handle();
  PROCESS_INFORMATION process{};
  if (!CreateProcessW(nullptr, reinterpret_cast<wchar_t*>(line.data()), nullptr, nullptr, TRUE, 0, nullptr, nullptr,
                      &start, &process)) {
    return result;
  }
  DWORD code = 0;
  const bool ended = WaitForSingleObject(process.hProcess, kLongestRunMilliseconds) == WAIT_OBJECT_0;
  if (!ended) TerminateProcess(process.hProcess, 0);
  if (ended && GetExitCodeProcess(process.hProcess, &code)) result.code = static_cast<int>(code);
  CloseHandle(process.hThread);
  CloseHandle(process.hProcess);
  result.out = out.Contents();
  result.err = err.Contents();
  if (!ended) result.err += "\nwas ended: it took over three minutes";
  return result;
}
