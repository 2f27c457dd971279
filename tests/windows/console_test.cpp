// What the client leaves behind in a console.
#include <windows.h>

#include <gtest/gtest.h>

#include "platform/com.h"
#include "platform/text.h"
#include "tests/windows/module_files.h"

namespace {

constexpr UINT kCodePage = 437;

BOOL WINAPI Ignore(DWORD) { return TRUE; }

// A console of this process and those it starts; none where the system has no place for one.
class Console {
 public:
  Console() : m_made((FreeConsole(), AllocConsole())) {
    SetConsoleOutputCP(kCodePage);
    SetConsoleCtrlHandler(Ignore, TRUE);
  }
  ~Console() {
    SetConsoleCtrlHandler(Ignore, FALSE);
    FreeConsole();
  }
  Console(const Console&) = delete;
  Console& operator=(const Console&) = delete;
  explicit operator bool() const { return m_made && GetConsoleOutputCP() == kCodePage; }

 private:
  const BOOL m_made;
};

bool WaitForCodePage(UINT codePage) {
  for (int i = 0; i < 1000 && GetConsoleOutputCP() != codePage; ++i) Sleep(10);
  return GetConsoleOutputCP() == codePage;
}

// At the end of a run, whatever it did, and when a person ends it.
TEST(Console, HasItsCodePageAfterTheClient) {
  const Console console;
  if (!console) GTEST_SKIP() << "no console can be made here";
  const struct {
    const wchar_t* arguments;
    DWORD control;
    bool ends;
  } cases[] = {{L" --help", 0, true},
               {L" no such command", 0, true},
               {L" tree", 0, true},
               {L" watch --for 60", CTRL_BREAK_EVENT, false},
               {L" watch --for 60", CTRL_C_EVENT, false}};
  for (const auto& [arguments, control, ends] : cases) {
    std::wstring line = L"\"";
    line.append(platform::ToSystemText(ModuleFile(u"zkusb.exe").c_str())).append(L"\"").append(arguments);
    STARTUPINFOW start{};
    start.cb = sizeof start;
    PROCESS_INFORMATION process{};
    ASSERT_TRUE(CreateProcessW(nullptr, line.data(), nullptr, nullptr, FALSE, 0, nullptr, nullptr, &start, &process));
    if (!ends) {
      EXPECT_TRUE(WaitForCodePage(CP_UTF8)) << "never set";
      // All programs of the console hear of it, this one too.
      if (!GenerateConsoleCtrlEvent(control, 0)) {
        std::printf("skipped: Ctrl-%s cannot be sent here: error %lu\n", control == CTRL_C_EVENT ? "C" : "Break",
                    GetLastError());
        TerminateProcess(process.hProcess, 1);
        SetConsoleOutputCP(kCodePage);
      }
    }
    EXPECT_EQ(WaitForSingleObject(process.hProcess, 20'000), WAIT_OBJECT_0);
    TerminateProcess(process.hProcess, 1);
    EXPECT_EQ(GetConsoleOutputCP(), kCodePage) << platform::ToUtf8(reinterpret_cast<const char16_t*>(arguments));
    SetConsoleOutputCP(kCodePage);
    CloseHandle(process.hThread);
    CloseHandle(process.hProcess);
  }
}

}  // namespace
