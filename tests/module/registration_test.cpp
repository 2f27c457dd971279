#include "module/registration.h"

#include <gmock/gmock.h>

#include <sstream>

#include "module/module.h"
#include "module/scripts.h"
#include "module/type_library.h"
#include "platform/system.h"
#include "platform/wrappers/failing_registry.h"
#include "simulation/process/module_environment.h"
#include "simulation/process/type_libraries.h"
#include "tests/support/cases.h"
#include "tests/support/failing_memory.h"
#include "tests/support/golden.h"
#include "tests/support/registry_lines.h"

namespace KelvoUHW {
namespace {

using platform::TypeLibrary;
using platform::simulated::SimulatedModuleEnvironment;
using platform::simulated::SimulatedRegistry;
using platform::wrappers::FailingRegistry;
using testing_support::ExpectAllClosed;
using testing_support::Lines;
using testing_support::LinesOf;
using testing_support::Put;

const std::u16string kModule = u"C:\\It's 100%APPID% {x}\\ZKUsbMonitor.DLL";
// What the module gives every script.
std::vector<Replacement> Common() {
  std::vector<Replacement> common;
  CZKUsbMonitorModule().AddCommonRGSReplacements(common);
  return common;
}
const HRESULT kTooLong = static_cast<HRESULT>(0x8007007A);

// A system with the module in a file that carries its type library, behind a registry that can fail.
struct Pc {
  explicit Pc(const std::u16string& module = kModule, const std::u16string& libraryFile = kModule,
              const TypeLibrary& library = ModuleTypeLibrary())
      : environment(module) {
    libraries.Add(libraryFile, library);
  }
  HRESULT Register(const ServerDescription& server = ModuleDescription()) {
    return Checked(RegisterServer(server, Common(), {failing, libraries, environment}));
  }
  HRESULT Unregister(const ServerDescription& server = ModuleDescription()) {
    return Checked(UnregisterServer(server, Common(), {failing, libraries, environment}));
  }
  // Whatever happened, nothing stays open and the thread has its locale again.
  HRESULT Checked(HRESULT result) {
    ExpectAllClosed(registry);
    EXPECT_EQ(libraries.LoadedCount() + libraries.MisuseCount(), 0u);
    EXPECT_EQ(environment.ThreadLocale(), SimulatedModuleEnvironment::kStartLocale);
    return result;
  }

  SimulatedRegistry registry;
  FailingRegistry failing{registry};
  platform::simulated::SimulatedTypeLibraries libraries{failing};
  SimulatedModuleEnvironment environment;
};

// All that registering writes into an empty registry: a listing with four places left open.
Lines RegisteredLines(const std::string& module, const std::string& libraryFile, const std::string& helpDirectory) {
  const std::pair<std::string, std::string> places[] = {
      {"<MODULE>", module},
      {"<PLATFORM>", ModuleTypeLibrary().attributes.syskind == platform::kSYS_WIN64 ? "win64" : "win32"},
      {"<LIBRARY>", libraryFile},
      {"<HELP>", helpDirectory}};
  std::istringstream file(testing_support::Golden("registered-keys"));
  Lines lines;
  for (std::string line; std::getline(file, line); lines.push_back(line)) {
    for (const auto& [mark, text] : places) {
      if (const std::size_t at = line.find(mark); at != line.npos) line.replace(at, mark.size(), text);
    }
  }
  EXPECT_EQ(lines.size(), 160u);
  return lines;
}

const std::string kModuleText = platform::ToUtf8(kModule);
const std::string kModuleDirectory = "C:\\It's 100%APPID% {x}";
const Lines kCleared = {"AppID", "CLSID", "Interface", "TypeLib"};

TEST(Registration, WritesEveryKeyAndTakesItBack) {
  Pc pc;
  const Lines expected = RegisteredLines(kModuleText, kModuleText, kModuleDirectory);
  for (int round = 0; round < 2; ++round) {
    EXPECT_EQ(pc.Register(), S_OK);
    EXPECT_EQ(LinesOf(pc.registry), expected);
  }
  EXPECT_EQ(pc.Unregister(), S_OK);
  EXPECT_EQ(LinesOf(pc.registry), kCleared);
  // Of a type library that is not registered the system knows nothing.
  EXPECT_EQ(pc.Unregister(), platform::kTYPE_E_REGISTRYACCESS);
  EXPECT_EQ(LinesOf(pc.registry), kCleared);
}

TEST(Registration, WorksOverKeysOfOthers) {
  const std::pair<std::u16string, const char16_t*> kForeign[] = {
      {u"AppID\\Other.DLL", u"AppID"},
      {u"CLSID\\{00000000-0000-0000-0000-000000000001}\\InprocServer32", u""},
      {u"TypeLib\\{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}\\2.0\\0\\win32", u""},
      {u"KelvoUsbMonitor.UsbTree\\Shell", u"Verb"},
      // Those above stay as they are, beside what is registered and when that has gone.
      {u"AppID\\{A0C53575-7F3D-4FF2-B5A7-BFA873492510}", u"Service"},
      {u"KelvoUsbMonitor.UsbTree", u""},
      {u"clsid\\{34349d2d-14c6-414b-9771-a7bd2a7c7180}\\Old\\Deep", u""},
      {u"CLSID\\{1D7E7A5B-648D-4236-8604-8F5F3C82433A}\\Programmable\\Old", u""},
      {u"CLSID\\{1D7E7A5B-648D-4236-8604-8F5F3C82433A}\\InprocServer32", u"Old"},
  };
  Pc pc;
  SimulatedRegistry alone;
  for (std::size_t i = 0; i < std::size(kForeign); ++i) {
    Put(pc.registry, kForeign[i].first, kForeign[i].second, u"foreign");
    if (i < 4) Put(alone, kForeign[i].first, kForeign[i].second, u"foreign");
  }
  Lines stays = LinesOf(alone, false);
  // A value in a key of ours goes with it; until then it stays, except below a key made anew.
  Lines expected = RegisteredLines(kModuleText, kModuleText, kModuleDirectory);
  std::erase_if(expected, [](const std::string& line) { return line.find(" = ") == line.npos; });
  expected.insert(expected.end(), stays.begin(), stays.end());
  expected.push_back("AppID\\{A0C53575-7F3D-4FF2-B5A7-BFA873492510}  Service = \"foreign\"");
  for (int round = 0; round < 2; ++round) {
    EXPECT_EQ(pc.Register(), S_OK);
    EXPECT_THAT(LinesOf(pc.registry, false), testing::UnorderedElementsAreArray(expected));
  }
  EXPECT_EQ(pc.Unregister(), S_OK);
  // Kept for the key below it, with its default value.
  stays.push_back("KelvoUsbMonitor.UsbTree  (default) = \"ZKUMUsbTree Class\"");
  EXPECT_THAT(LinesOf(pc.registry, false), testing::UnorderedElementsAreArray(stays));
}

TEST(Registration, EndsAtEachFailureOfTheRegistry) {
  for (const bool removing : {false, true}) {
    const auto run = [&](Pc& pc) { return removing ? pc.Unregister() : pc.Register(); };
    std::size_t scriptFailures = 0, libraryFailures = 0;
    const std::uint64_t step = testing_support::Cases<std::uint64_t>(1, 5);
    for (std::uint64_t call = 1;; call += step) {
      SCOPED_TRACE(call);
      Pc once, stopped;
      if (removing) {
        EXPECT_EQ(once.Register() + stopped.Register(), S_OK);
      }
      once.failing.SetPlan({.call = call, .error = 1450});
      const HRESULT result = run(once);
      if (result == S_OK) break;
      EXPECT_TRUE(result == HRESULT_FROM_WIN32(1450) || result == platform::kTYPE_E_REGISTRYACCESS);
      (result == HRESULT_FROM_WIN32(1450) ? scriptFailures : libraryFailures) += 1;
      EXPECT_EQ(once.failing.Calls(), call);
      // What was written stays, which is what a registry dead from there on holds.
      stopped.failing.SetPlan({.call = call, .onwards = true, .error = 1450});
      EXPECT_EQ(run(stopped), result);
      EXPECT_EQ(LinesOf(once.registry), LinesOf(stopped.registry));
      once.failing.SetPlan({});
      if (!removing) {
        EXPECT_EQ(run(once), S_OK);
        EXPECT_EQ(LinesOf(once.registry), RegisteredLines(kModuleText, kModuleText, kModuleDirectory));
      }
      ASSERT_FALSE(HasFailure());
    }
    EXPECT_GT(scriptFailures, 40u / step);
    EXPECT_GT(libraryFailures, 40u / step);
  }
}

TEST(Registration, FindsTheTypeLibrary) {
  const std::u16string deep = u"C:\\dir\\" + std::u16string(248, u'm');  // 255 characters
  const struct {
    const char* what;
    std::u16string module, libraryFile, helpFile;
    HRESULT result;
    std::string helpDirectory;
  } kCases[] = {
      {"in the module", u"/opt/zk/libM.so", u"/OPT/zk/libm.so", u"", S_OK, "/opt/zk"},
      {"in a file beside it", u"C:\\a.b\\M.DLL", u"C:\\a.b\\M.tlb", u"", S_OK, "C:\\a.b"},
      {"the module has no extension", u"C:\\a.b.\\M", u"C:\\a.b.\\M.tlb", u"", S_OK, "C:\\a.b."},
      {"the module has nothing else", u"C:\\d\\.DLL", u"C:\\d\\.tlb", u"", S_OK, "C:\\d"},
      {"neither has one", u"C:\\M.DLL", u"C:\\N.tlb", u"", TYPE_E_CANTLOADLIBRARY, ""},
      {"with a help file", u"C:\\M.DLL", u"C:\\M.DLL", u"D:\\Help\\M.chm", S_OK, "D:\\Help\\"},
      {"a help file without name", u"C:\\M.DLL", u"C:\\M.DLL", u"D:\\Help\\", S_OK, "D:\\Help\\"},
      {"a help file without directory", u"C:\\d\\M.DLL", u"C:\\d\\M.DLL", u"M.chm", S_OK, "C:\\d"},
      {"259 characters", deep + u".DLL", deep + u".DLL", u"", S_OK, "C:\\dir"},
      {"260 characters", deep + u"m.DLL", deep + u"m.DLL", u"", kTooLong, ""},
      {"600 characters", deep + std::u16string(345, u'm'), u"C:\\M.DLL", u"", kTooLong, ""},
      {"260 characters beside it", deep + u"m", deep + u"m.tlb", u"", kTooLong, ""},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    TypeLibrary library = ModuleTypeLibrary();
    library.helpFile = test.helpFile;
    Pc pc(test.module, test.libraryFile, library);
    EXPECT_EQ(pc.Register(), test.result);
    const std::string module = platform::ToUtf8(test.module);
    const std::string file = test.what == std::string("in the module") ? module : platform::ToUtf8(test.libraryFile);
    Lines expected = RegisteredLines(module, file, test.helpDirectory);
    // The scripts before it have done their part, with a path of any length; the module's own comes last when removing.
    if (FAILED(test.result)) {
      std::erase_if(expected,
                    [](const std::string& line) { return line.starts_with("Int") || line.starts_with("Typ"); });
    }
    EXPECT_EQ(LinesOf(pc.registry), expected);
    EXPECT_EQ(pc.Unregister(), test.result);
    if (FAILED(test.result)) expected.resize(6);
    EXPECT_EQ(LinesOf(pc.registry), FAILED(test.result) ? expected : kCleared);
  }
}

// A system that always succeeds, allocates nothing and says what is asked of it in which order.
struct Recorder final : platform::Registry, platform::TypeLibraries, platform::ModuleEnvironment {
  using Status = platform::Status;
  using Key = platform::RegistryKeyHandle;
  using Library = platform::TypeLibraryHandle;
  Status CreateKey(Key, const char16_t*, std::uint32_t, Key& key, std::uint32_t&) noexcept override {
    return OpenKey(0, nullptr, 0, key);
  }
  Status OpenKey(Key, const char16_t*, std::uint32_t, Key& key) noexcept override {
    EXPECT_EQ(locale, 0x800u);
    key = ++open;
    return Status::Success();
  }
  Status SetValue(Key, const char16_t*, std::uint32_t, const void*, std::uint32_t) noexcept override { return {}; }
  Status QueryValue(Key, const char16_t*, std::uint32_t*, void*, std::uint32_t&) noexcept override { return {}; }
  Status EnumKey(Key, std::uint32_t, char16_t*, std::uint32_t&) noexcept override {
    return Status::Failure(platform::kERROR_NO_MORE_ITEMS);
  }
  Status DeleteKey(Key, const char16_t*) noexcept override { return {}; }
  Status DeleteValue(Key, const char16_t*) noexcept override { return {}; }
  Status CloseKey(Key) noexcept override {
    --open;
    return {};
  }
  HRESULT LoadTypeLib(const char16_t*, Library& library) noexcept override {
    EXPECT_EQ(locale, 0x800u);
    library = 1;
    ++loaded;
    return S_OK;
  }
  HRESULT GetLibAttr(Library, platform::TypeLibraryAttributes& attributes) noexcept override {
    attributes = kAttributes;
    return attributesResult;
  }
  HRESULT GetHelpFile(Library, char16_t* name, std::uint32_t chars, std::uint32_t& length) noexcept override {
    EXPECT_EQ(name == nullptr, chars == 0);
    length = 6;
    if (chars > length) std::char_traits<char16_t>::copy(name, u"D:\\h.x", 7);
    return helpResult;
  }
  HRESULT RegisterTypeLib(Library, const char16_t*, const char16_t* directory) noexcept override {
    EXPECT_EQ(std::char_traits<char16_t>::compare(directory, u"D:\\", 4), 0);
    return registerResult;
  }
  HRESULT UnRegisterTypeLib(const platform::Guid& guid, std::uint16_t major, std::uint16_t minor, std::uint32_t lcid,
                            std::int32_t syskind) noexcept override {
    EXPECT_EQ((platform::TypeLibraryAttributes{guid, lcid, syskind, major, minor, kAttributes.wLibFlags}), kAttributes);
    return registerResult;
  }
  void ReleaseTypeLib(Library) noexcept override { --loaded; }
  Status ModuleFileName(char16_t* path, std::uint32_t chars, std::uint32_t& length) noexcept override {
    std::char_traits<char16_t>::copy(path, u"C:\\m.dll", 9);
    length = pathWithoutEnd ? chars : 8;
    return fileName;
  }
  std::uint32_t ThreadLocale() noexcept override { return locale; }
  Status SetThreadLocale(std::uint32_t to) noexcept override {
    locale = to;
    return Status::Failure(1);  // nobody's concern
  }

  bool AsBefore() const { return locale == 0x411 && open == 0 && loaded == 0; }

  static constexpr platform::TypeLibraryAttributes kAttributes{{1, 2, 3, {4}}, 0x407, 3, 5, 6, 7};
  std::uint32_t locale = 0x411;
  Key open = 0;
  int loaded = 0;
  bool pathWithoutEnd = false;
  HRESULT attributesResult = S_OK, helpResult = S_OK, registerResult = S_OK;
  Status fileName;
};

TEST(Registration, GivesTheCodeOfWhateverFails) {
  const ServerDescription& good = ModuleDescription();
  const RegisteredClass odd{{}, "HKCR { '%UNKNOWN%' }", u"", u"", u"", u""};
  const auto with = [](auto member, auto value) {
    Recorder recorder;
    recorder.*member = value;
    return recorder;
  };
  const struct {
    const char* what;
    Recorder system;
    ServerDescription server;
    HRESULT onRegister, onUnregister;
  } kCases[] = {
      {"nothing", {}, good, S_OK, S_OK},
      {"other successes", with(&Recorder::registerResult, S_FALSE), good, S_OK, S_OK},
      {"the path", with(&Recorder::fileName, platform::Status::Failure(2)), good, HRESULT_FROM_WIN32(2),
       HRESULT_FROM_WIN32(2)},
      {"a path that never fits", with(&Recorder::pathWithoutEnd, true), good, kTooLong, kTooLong},
      {"the path, for no reason", with(&Recorder::fileName, platform::Status::Failure(0)), good, E_FAIL, E_FAIL},
      {"the module's script", {}, {{}, "HKCR {", {}}, DISP_E_EXCEPTION, DISP_E_EXCEPTION},
      {"a class's script", {}, {{}, "", {&odd, 1}}, DISP_E_EXCEPTION, DISP_E_EXCEPTION},
      {"the attributes", with(&Recorder::attributesResult, E_ABORT), good, S_OK, E_ABORT},
      {"the help file", with(&Recorder::helpResult, E_ABORT), good, E_ABORT, S_OK},
      {"the type library", with(&Recorder::registerResult, E_ABORT), good, E_ABORT, E_ABORT},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    Recorder system = test.system;
    EXPECT_EQ(RegisterServer(test.server, Common(), {system, system, system}), test.onRegister);
    EXPECT_EQ(UnregisterServer(test.server, Common(), {system, system, system}), test.onUnregister);
    EXPECT_TRUE(system.AsBefore());
  }
}

TEST(Registration, NeedsAllPartsOfTheSystem) {
  Recorder recorder;
  CZKUsbMonitorModule module;
  for (const int missing : {0, 1, 2, 3}) {
    platform::System system{.registry = &recorder, .typeLibraries = &recorder, .environment = &recorder};
    if (missing == 1) system.registry = nullptr;
    if (missing == 2) system.typeLibraries = nullptr;
    if (missing == 3) system.environment = nullptr;
    platform::SetCurrentSystem(system);
    EXPECT_EQ(module.RegisterServer(), missing == 0 ? S_OK : E_UNEXPECTED) << missing;
    EXPECT_EQ(module.UnregisterServer(), missing == 0 ? S_OK : E_UNEXPECTED) << missing;
    EXPECT_TRUE(recorder.AsBefore());
  }
  module.Unload();
  platform::SetCurrentSystem({});
}

TEST(Registration, RunsOutOfMemoryAnywhere) {
  const ServerDescription& server = ModuleDescription();
  const std::vector<Replacement> common = Common();
  for (const auto run : {&RegisterServer, &UnregisterServer}) {
    std::uint64_t allocation = 0;
    for (bool failed = true; failed;) {
      Recorder system;
      const auto work = [&] { return run(server, common, {system, system, system}); };
      const HRESULT result = WithoutAllocation(++allocation, failed, work);
      EXPECT_EQ(result, failed ? E_OUTOFMEMORY : S_OK) << allocation;
      EXPECT_TRUE(system.AsBefore()) << allocation;
      ASSERT_FALSE(HasFailure());
    }
    EXPECT_GT(allocation, 100u);
  }
}

TEST(Registration, ScriptsAreTheFilesTheyWereMadeFrom) {
  const std::pair<int, const char*> kCases[] = {{101, "module"}, {102, "event_notifier"}, {103, "usb_tree"}};
  for (const auto& [number, name] : kCases) {
    const std::string text = testing_support::Contents(std::string("module/scripts/") + name + ".rgs");
    EXPECT_EQ(RegistryScript(static_cast<ScriptResource>(number)), text) << name;
    EXPECT_FALSE(text.empty()) << name;
  }
  EXPECT_EQ(RegistryScript(ScriptResource::EventNotifier), RegistryScript(ScriptResource::UsbTree));
}

}  // namespace
}  // namespace KelvoUHW
