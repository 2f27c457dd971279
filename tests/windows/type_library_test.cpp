// The type library that the module carries, as the system reads it.
#include <windows.h>

#include <gtest/gtest.h>

#include <fstream>
#include <iterator>
#include <sstream>

#include "platform/com.h"
#include "platform/text.h"
#include "tests/support/program.h"
#include "tests/windows/module_files.h"
#include "tools/type_library/type_library_dump.h"

namespace {

// Programs are compiled against every one of these names, numbers, flags and texts. The system shows the methods of an
// interface without their HRESULT where it presents them as members of a dispinterface.
TEST(TypeLibrary, SaysWhatWasPublished) {
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/windows/type_library.txt");
  std::stringstream published;
  published << file.rdbuf();
  ASSERT_GT(published.str().size(), 5000u);
  for (const std::u16string& module : {Module(), SimulatedModule()}) {
    std::istringstream dump(DumpTypeLibrary(module));
    std::istringstream expected(published.str());
    std::string line;
    for (std::string want; std::getline(expected, want);) {
      if (const auto width = want.find("SYS_WIN32"); width != want.npos && sizeof(void*) == 8) {
        want.replace(width, 9, "SYS_WIN64");
      }
      EXPECT_TRUE(std::getline(dump, line)) << "missing: " << want;
      EXPECT_EQ(line, want);
    }
    EXPECT_FALSE(std::getline(dump, line)) << "too much: " << line;
  }
}

TEST(TypeLibrary, IsPrintedByAProgram) {
  const std::string program = platform::ToUtf8(ModuleFile(u"zkusb_typelib.exe"));
  const std::string module = platform::ToUtf8(Module());
  const struct {
    std::vector<std::string> args;
    int code;
    std::string out, reason;
  } cases[] = {{{module}, 0, DumpTypeLibrary(Module()), ""},
               {{program}, 1, "", program + ": no type library"},
               {{module + "?"}, 1, "", "no type library"},
               {{}, 2, "", "usage"},
               {{module, module}, 2, "", "usage"}};
  for (const auto& [args, code, out, reason] : cases) {
    const ProgramResult result = RunProgram(program, args);
    EXPECT_EQ(result.code, code);
    EXPECT_EQ(result.out, out);
    EXPECT_EQ(result.err.empty(), reason.empty());
    EXPECT_NE(result.err.find(reason), std::string::npos) << result.err;
  }
}

// A resource of a file that is not run; empty where it has none.
std::string Resource(HMODULE file, int number, const wchar_t* type) {
  const HRSRC found = FindResourceW(file, MAKEINTRESOURCEW(number), type);
  if (found == nullptr) return {};
  return {static_cast<const char*>(LockResource(LoadResource(file, found))), SizeofResource(file, found)};
}

std::string FileText(const std::string& path) {
  std::ifstream file(ZKUSB_SOURCE_DIR "/" + path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

TEST(Resources, AreThoseThatWerePublished) {
  const std::u16string path = Module();
  const HMODULE file = LoadLibraryExW(platform::ToSystemText(path.c_str()), nullptr, LOAD_LIBRARY_AS_DATAFILE);
  ASSERT_NE(file, nullptr);
  EXPECT_EQ(Resource(file, 101, L"REGISTRY"), FileText("module/scripts/module.rgs"));
  EXPECT_EQ(Resource(file, 102, L"REGISTRY"), FileText("module/scripts/event_notifier.rgs"));
  EXPECT_EQ(Resource(file, 103, L"REGISTRY"), FileText("module/scripts/usb_tree.rgs"));
  EXPECT_GT(Resource(file, 101, L"REGISTRY").size(), 50u);
  EXPECT_EQ(Resource(file, 1, L"TYPELIB").substr(0, 4), "MSFT");
  // Texts of the version record are UTF-16; its numbers stand behind the signature.
  const std::string version = Resource(file, 1, reinterpret_cast<const wchar_t*>(RT_VERSION));
  const std::size_t numbers = version.find("\xBD\x04\xEF\xFE");
  ASSERT_NE(numbers, version.npos);
  EXPECT_EQ(version.substr(numbers + 8, 4), std::string("\0\0\1\0", 4));  // 1.0
  FreeLibrary(file);
}

}  // namespace
