#include "module/registration.h"

#include <gmock/gmock.h>

#include <fstream>
#include <iterator>

#include "module/module.h"
#include "module/scripts.h"
#include "module/type_library.h"
#include "platform/simulated/module_environment.h"
#include "platform/simulated/type_libraries.h"
#include "platform/wrappers/failing_registry.h"
#include "tests/support/failing_memory.h"
#include "tests/support/registry_lines.h"

namespace KelvoUHW {
namespace {

using platform::simulated::SimulatedModuleEnvironment;
using platform::simulated::SimulatedRegistry;
using platform::simulated::SimulatedTypeLibraries;
using platform::simulated::TypeLibrary;
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
  SimulatedTypeLibraries libraries{failing};
  SimulatedModuleEnvironment environment;
};

// Where `module` is the path of the module.
Lines ClassLines(const std::string& clsid, const std::string& name, const std::string& description,
                 const std::string& module) {
  const std::string progId = "KelvoUsbMonitor." + name, key = "CLSID\\" + clsid;
  return {key,
          key + "  (default) = \"" + description + "\"",
          key + "\\InprocServer32",
          key + "\\InprocServer32  (default) = \"" + module + "\"",
          key + "\\InprocServer32  ThreadingModel = \"Free\"",
          key + "\\ProgID",
          key + "\\ProgID  (default) = \"" + progId + ".1\"",
          key + "\\Programmable",
          key + "\\TypeLib",
          key + "\\TypeLib  (default) = \"{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}\"",
          key + "\\VersionIndependentProgID",
          key + "\\VersionIndependentProgID  (default) = \"" + progId + "\""};
}

Lines ProgIdLines(const std::string& clsid, const std::string& name, const std::string& description) {
  const std::string progId = "KelvoUsbMonitor." + name;
  return {progId,
          progId + "  (default) = \"" + description + "\"",
          progId + "\\CLSID",
          progId + "\\CLSID  (default) = \"" + clsid + "\"",
          progId + "\\CurVer",
          progId + "\\CurVer  (default) = \"" + progId + ".1\"",
          progId + ".1",
          progId + ".1  (default) = \"" + description + "\"",
          progId + ".1\\CLSID",
          progId + ".1\\CLSID  (default) = \"" + clsid + "\""};
}

Lines InterfaceLines() {
  const std::pair<const char*, const char*> kInterfaces[] = {
      {"{236C9B37-B991-48C2-B14A-340A28638282}", "IZKUMUsbTree"},
      {"{565B8FB4-EE30-4EE3-9B5B-E285678F1F9D}", "IZKUMEventNotifier"},
      {"{5B584C94-8FB4-4647-AFE6-879085600DBF}", "IZKUMUsbDevice"},
      {"{8080AF8D-857A-45C4-8296-AB1301ADFA28}", "IZKUMUsbTreeNode"},
      {"{8C4D3DF5-889F-434C-BA1C-22F23FD7CB1B}", "IZKDeviceEventCallBack"},
      {"{904023D8-3EB6-4079-B062-45C68095682E}", "IZKUMUsbTreeNodeEnumerator"},
      {"{92A25D95-3963-45EF-895F-EA42B4DD37AA}", "IZKUMHubDevice"},
      {"{931F33F5-525B-4613-A5A7-D0E28115DD9A}", "IZKUMDeviceEvent"},
      {"{A49B9696-751E-4402-A733-3AD46F48A5A0}", "IZKUMHubPort"},
      {"{B67689B6-7C60-465C-A541-9878368A6AE5}", "IZKUMInterfaceDevice"},
      {"{D107033F-3A53-4406-AF19-13543470DDB2}", "IZKUMInterfaceDescr"},
      {"{DFDABA17-D518-42A6-81DE-C90C8EC32BCF}", "IZKUMHostController"},
      {"{E5E8F6BE-7753-4041-880B-16D31F61397E}", "IZKUMPortDevice"},
      {"{F089A5D3-01B2-4B44-817B-200F94489BBD}", "IZKUMInfoDevice"},
  };
  Lines lines = {"Interface"};
  for (const auto& [iid, name] : kInterfaces) {
    const std::string key = std::string("Interface\\") + iid;
    // Calls to the sinks' interface go through IDispatch, to all others through the vtable.
    const std::string marshaller = name == std::string("IZKDeviceEventCallBack") ? "0" : "4";
    for (const std::string& line :
         {std::string(), "  (default) = \"" + std::string(name) + "\"", std::string("\\ProxyStubClsid32"),
          "\\ProxyStubClsid32  (default) = \"{0002042" + marshaller + "-0000-0000-C000-000000000046}\"",
          std::string("\\TypeLib"), std::string("\\TypeLib  (default) = \"{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}\""),
          std::string("\\TypeLib  Version = \"1.0\"")}) {
      lines.push_back(key + line);
    }
  }
  return lines;
}

Lines LibraryLines(const std::string& file, const std::string& helpDirectory) {
  const std::string key = "TypeLib\\{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}";
  return {"TypeLib",
          key,
          key + "\\1.0",
          key + "\\1.0  (default) = \"ZKUsbMonitor 1.0 Type Library\"",
          key + "\\1.0\\0",
          key + "\\1.0\\0\\win32",
          key + "\\1.0\\0\\win32  (default) = \"" + file + "\"",
          key + "\\1.0\\FLAGS",
          key + "\\1.0\\FLAGS  (default) = \"0\"",
          key + "\\1.0\\HELPDIR",
          key + "\\1.0\\HELPDIR  (default) = \"" + helpDirectory + "\""};
}

// All that registering writes into an empty registry.
Lines RegisteredLines(const std::string& module, const std::string& libraryFile, const std::string& helpDirectory) {
  const char* const kTree = "{34349D2D-14C6-414B-9771-A7BD2A7C7180}";
  const char* const kNotifier = "{1D7E7A5B-648D-4236-8604-8F5F3C82433A}";
  Lines all = {"AppID",
               "AppID\\ZKUsbMonitor.DLL",
               "AppID\\ZKUsbMonitor.DLL  AppID = \"{A0C53575-7F3D-4FF2-B5A7-BFA873492510}\"",
               "AppID\\{A0C53575-7F3D-4FF2-B5A7-BFA873492510}",
               "AppID\\{A0C53575-7F3D-4FF2-B5A7-BFA873492510}  (default) = \"ZKUsbMonitor\"",
               "CLSID"};
  for (const Lines& part :
       {ClassLines(kNotifier, "EventNotifier", "ZKUMEventNotifier Class", module),
        ClassLines(kTree, "UsbTree", "ZKUMUsbTree Class", module), InterfaceLines(),
        ProgIdLines(kNotifier, "EventNotifier", "ZKUMEventNotifier Class"),
        ProgIdLines(kTree, "UsbTree", "ZKUMUsbTree Class"), LibraryLines(libraryFile, helpDirectory)}) {
    all.insert(all.end(), part.begin(), part.end());
  }
  return all;
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
  const struct {
    std::u16string path;
    const char16_t* value;
    bool stays;  // as it is, beside what is registered and when that has gone
  } kForeign[] = {
      {u"AppID\\Other.DLL", u"AppID", true},
      {u"CLSID\\{00000000-0000-0000-0000-000000000001}\\InprocServer32", u"", true},
      {u"TypeLib\\{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}\\2.0\\0\\win32", u"", true},
      {u"KelvoUsbMonitor.UsbTree\\Shell", u"Verb", true},
      {u"AppID\\{A0C53575-7F3D-4FF2-B5A7-BFA873492510}", u"Service", false},
      {u"KelvoUsbMonitor.UsbTree", u"", false},
      {u"clsid\\{34349d2d-14c6-414b-9771-a7bd2a7c7180}\\Old\\Deep", u"", false},
      {u"CLSID\\{1D7E7A5B-648D-4236-8604-8F5F3C82433A}\\Programmable\\Old", u"", false},
      {u"CLSID\\{1D7E7A5B-648D-4236-8604-8F5F3C82433A}\\InprocServer32", u"Old", false},
  };
  Pc pc;
  Lines stays;
  for (const auto& foreign : kForeign) {
    SimulatedRegistry alone;
    Put(alone, foreign.path, foreign.value, u"foreign");
    Put(pc.registry, foreign.path, foreign.value, u"foreign");
    if (foreign.stays) stays.push_back(LinesOf(alone, false).at(0));
  }
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
    Pc whole;
    if (removing) {
      ASSERT_EQ(whole.Register(), S_OK);
    }
    whole.failing.SetPlan({});
    ASSERT_EQ(run(whole), S_OK);
    const std::uint64_t calls = whole.failing.Calls();
    EXPECT_GT(calls, 90u);
    std::size_t scriptFailures = 0, libraryFailures = 0;
    for (std::uint64_t call = 1; call <= calls; ++call) {
      SCOPED_TRACE(call);
      Pc once, stopped;
      if (removing) {
        EXPECT_EQ(once.Register() + stopped.Register(), S_OK);
      }
      once.failing.SetPlan({.call = call, .error = 1450});
      const HRESULT result = run(once);
      (result == HRESULT_FROM_WIN32(1450) ? scriptFailures : libraryFailures) += 1;
      if (result != HRESULT_FROM_WIN32(1450)) {
        EXPECT_EQ(result, platform::kTYPE_E_REGISTRYACCESS);
      }
      EXPECT_EQ(once.failing.Calls(), call);
      // What was written stays, which is what a registry dead from there on holds.
      stopped.failing.SetPlan({.call = call, .onwards = true, .error = 1450});
      EXPECT_EQ(run(stopped), result);
      EXPECT_EQ(LinesOf(once.registry), LinesOf(stopped.registry));
      once.failing.SetPlan({});
      if (!removing) {
        EXPECT_EQ(run(once), S_OK);
      }
      if (!removing) {
        EXPECT_EQ(LinesOf(once.registry), LinesOf(whole.registry));
      }
      ASSERT_FALSE(HasFailure());
    }
    EXPECT_GT(scriptFailures, 40u);
    EXPECT_GT(libraryFailures, 40u);
  }
}

TEST(Registration, FindsTheTypeLibrary) {
  const std::u16string deep = u"C:\\" + std::u16string(240, u'd') + u"\\";  // 244 characters
  const struct {
    const char* what;
    std::u16string module, libraryFile, helpFile;
    HRESULT result;
    std::string helpDirectory;
  } kCases[] = {
      {"in the module", u"/opt/zk/libM.so", u"/OPT/zk/libm.so", u"", S_OK, "/opt/zk"},
      {"in a file beside it", u"C:\\a.b\\M.DLL", u"C:\\a.b\\M.tlb", u"", S_OK, "C:\\a.b"},
      {"the module has no extension", u"C:\\a.b\\M", u"C:\\a.b\\M.tlb", u"", S_OK, "C:\\a.b"},
      {"neither has one", u"C:\\M.DLL", u"C:\\N.tlb", u"", TYPE_E_CANTLOADLIBRARY, ""},
      {"with a help file", u"C:\\M.DLL", u"C:\\M.DLL", u"D:\\Help\\M.chm", S_OK, "D:\\Help\\"},
      {"a help file without directory", u"C:\\d\\M.DLL", u"C:\\d\\M.DLL", u"M.chm", S_OK, "C:\\d"},
      {"259 characters", deep + std::u16string(11, u'm') + u".DLL", deep + std::u16string(11, u'm') + u".DLL", u"",
       S_OK, platform::ToUtf8(deep.substr(0, 243))},
      {"260 characters", deep + std::u16string(12, u'm') + u".DLL", deep + std::u16string(12, u'm') + u".DLL", u"",
       kTooLong, ""},
      {"600 characters", deep + std::u16string(356, u'm'), u"C:\\M.DLL", u"", kTooLong, ""},
      {"260 characters beside it", deep + std::u16string(12, u'm'), deep + std::u16string(12, u'm') + u".tlb", u"",
       kTooLong, ""},
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
    // The scripts before it have done their part, with a path of any length.
    const auto library0 = [](const std::string& line) {
      return line.compare(0, 9, "Interface") == 0 || line.compare(0, 7, "TypeLib") == 0;
    };
    if (FAILED(test.result)) std::erase_if(expected, library0);
    EXPECT_EQ(LinesOf(pc.registry), expected);
    // The module's own script comes last and therefore not after a failure.
    EXPECT_EQ(pc.Unregister(), test.result);
    EXPECT_EQ(LinesOf(pc.registry),
              FAILED(test.result) ? Lines({expected[0], expected[1], expected[2], expected[3], expected[4], "CLSID"})
                                  : kCleared);
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
    return loadResult;
  }
  HRESULT GetLibAttr(Library, platform::TypeLibraryAttributes& attributes) noexcept override {
    attributes = kAttributes;
    return attributesResult;
  }
  HRESULT GetHelpFile(Library, char16_t* name, std::uint32_t chars, std::uint32_t& length) noexcept override {
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
  Status ModuleFileName(char16_t* path, std::uint32_t, std::uint32_t& length) noexcept override {
    std::char_traits<char16_t>::copy(path, u"C:\\m.dll", 9);
    length = 8;
    return fileName;
  }
  std::uint32_t ThreadLocale() noexcept override { return locale; }
  Status SetThreadLocale(std::uint32_t to) noexcept override {
    locale = to;
    return Status::Failure(1);  // nobody's concern
  }

  static constexpr platform::TypeLibraryAttributes kAttributes{{1, 2, 3, {4}}, 0x407, 3, 5, 6, 7};
  std::uint32_t locale = 0x411;
  Key open = 0;
  int loaded = 0;
  HRESULT loadResult = S_OK, attributesResult = S_OK, helpResult = S_OK, registerResult = S_OK;
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
    EXPECT_EQ(system.locale, 0x411u);
    EXPECT_EQ(system.open, 0);
    EXPECT_EQ(system.loaded, 0);
  }
}

TEST(Registration, RunsOutOfMemoryAnywhere) {
  const ServerDescription& server = ModuleDescription();
  const std::vector<Replacement> common = Common();
  for (const auto run : {&RegisterServer, &UnregisterServer}) {
    std::uint64_t allocation = 0;
    for (bool failed = true; failed;) {
      Recorder system;
      HRESULT result = S_OK;
      {
        const FailingAllocation failing(++allocation);
        result = run(server, common, {system, system, system});
        failed = failing.Failed();
      }
      EXPECT_EQ(result, failed ? E_OUTOFMEMORY : S_OK) << allocation;
      EXPECT_TRUE(system.locale == 0x411 && system.open == 0 && system.loaded == 0) << allocation;
      ASSERT_FALSE(HasFailure());
    }
    EXPECT_GT(allocation, 100u);
  }
}

TEST(Registration, ScriptsAreTheFilesTheyWereMadeFrom) {
  const struct {
    ScriptResource resource;
    int number;
    const char* file;
  } kCases[] = {{ScriptResource::Module, 101, "module"},
                {ScriptResource::EventNotifier, 102, "event_notifier"},
                {ScriptResource::UsbTree, 103, "usb_tree"}};
  for (const auto& [resource, number, name] : kCases) {
    std::ifstream file(std::string(ZKUSB_SOURCE_DIR "/module/scripts/") + name + ".rgs", std::ios::binary);
    const std::string text((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
    EXPECT_EQ(RegistryScript(resource), text) << name;
    EXPECT_EQ(static_cast<int>(resource), number);
    EXPECT_FALSE(text.empty()) << name;
  }
  EXPECT_EQ(RegistryScript(ScriptResource::EventNotifier), RegistryScript(ScriptResource::UsbTree));
}

}  // namespace
}  // namespace KelvoUHW
