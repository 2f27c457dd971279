#include "module/registration.h"

#include <string>
#include <utility>
#include <vector>

#include "com/com_error.h"
#include "module/registrar.h"
#include "platform/text.h"

namespace KelvoUHW {
namespace {

using platform::FromUtf8;
using platform::GuidText;

// Paths of this many characters and more cannot be handed to the type library loader.
constexpr std::size_t kMaxPath = 260;
// The system's paths end far before.
constexpr std::size_t kLongestModulePath = 0x10000;

class SystemLocale {
 public:
  explicit SystemLocale(platform::ModuleEnvironment& environment) noexcept
      : m_environment(environment), m_before(environment.ThreadLocale()) {
    m_environment.SetThreadLocale(LOCALE_SYSTEM_DEFAULT);
  }
  SystemLocale(const SystemLocale&) = delete;
  SystemLocale& operator=(const SystemLocale&) = delete;
  ~SystemLocale() { m_environment.SetThreadLocale(m_before); }

 private:
  platform::ModuleEnvironment& m_environment;
  const std::uint32_t m_before;
};

class LoadedTypeLibrary {
 public:
  explicit LoadedTypeLibrary(platform::TypeLibraries& libraries) noexcept
      : m_libraries(libraries) {}
  LoadedTypeLibrary(const LoadedTypeLibrary&) = delete;
  LoadedTypeLibrary& operator=(const LoadedTypeLibrary&) = delete;
  ~LoadedTypeLibrary() {
    if (m_handle != platform::kNoTypeLibrary) m_libraries.ReleaseTypeLib(m_handle);
  }

  // Once.
  HRESULT Load(const std::u16string& path) noexcept {
    return m_libraries.LoadTypeLib(path.c_str(), m_handle);
  }
  platform::TypeLibraryHandle Handle() const noexcept { return m_handle; }

 private:
  platform::TypeLibraries& m_libraries;
  platform::TypeLibraryHandle m_handle = platform::kNoTypeLibrary;
};

HRESULT ReadModulePath(platform::ModuleEnvironment& environment, std::u16string& path) {
  for (std::size_t chars = kMaxPath; chars <= kLongestModulePath; chars *= 2) {
    std::u16string buffer(chars, u'\0');
    std::uint32_t length = 0;
    const platform::Status status =
        environment.ModuleFileName(buffer.data(), static_cast<std::uint32_t>(chars), length);
    if (!status) return ToHresult(status);
    if (length >= chars) continue;
    buffer.resize(length);
    path = std::move(buffer);
    return S_OK;
  }
  return HRESULT_FROM_WIN32(platform::kERROR_INSUFFICIENT_BUFFER);
}

// What is registered, and what every script of it is given.
struct Server {
  const ServerDescription& description;
  const std::vector<Replacement>& replacements;
};

// The path in quotes of a script's own: its quotes are doubled there and stand once in the
// registry.
Replacement ModuleReplacement(std::u16string_view modulePath) {
  std::u16string quoted;
  for (const char16_t unit : modulePath) quoted.append(unit == u'\'' ? 2 : 1, unit);
  return {u"MODULE", std::move(quoted)};
}

using RunScript = decltype(RegisterScript);

HRESULT RunModuleScript(RunScript& run, const Server& server, platform::Registry& registry) {
  return run(registry, FromUtf8(server.description.script), server.replacements);
}

// The scripts of all classes, up to the first that fails.
HRESULT RunClassScripts(RunScript& run, const Server& server, platform::Registry& registry) {
  for (const RegisteredClass& entry : server.description.classes) {
    std::vector<Replacement> replacements = server.replacements;
    replacements.push_back({u"PROGID", std::u16string(entry.progId)});
    replacements.push_back({u"VERSION", std::u16string(entry.version)});
    replacements.push_back({u"DESCRIPTION", std::u16string(entry.description)});
    replacements.push_back({u"CLSID", GuidText(entry.clsid)});
    replacements.push_back({u"LIBID", GuidText(server.description.libId)});
    replacements.push_back({u"THREADING", std::u16string(entry.threading)});
    const HRESULT result = run(registry, FromUtf8(entry.script), replacements);
    if (FAILED(result)) return result;
  }
  return S_OK;
}

// Loads the module's library; `path` is set to the file it was found in.
HRESULT LoadModuleLibrary(LoadedTypeLibrary& library, const std::u16string& modulePath,
                          std::u16string& path) {
  const HRESULT tooLong = HRESULT_FROM_WIN32(platform::kERROR_INSUFFICIENT_BUFFER);
  if (modulePath.size() >= kMaxPath) return tooLong;
  path = modulePath;
  const HRESULT inModule = library.Load(path);
  if (SUCCEEDED(inModule)) return inModule;

  const std::size_t name = path.find_last_of(u"\\/") + 1;
  const std::size_t dot = path.rfind(u'.');
  if (dot != path.npos && dot >= name) path.resize(dot);
  path += u".tlb";
  return path.size() >= kMaxPath ? tooLong : library.Load(path);
}

// The directory, with the separator at its end, of the help file that the library names; empty when
// it names none.
HRESULT ReadHelpDirectory(platform::TypeLibraries& libraries, const LoadedTypeLibrary& library,
                          std::u16string& directory) {
  std::uint32_t length = 0;
  HRESULT result = libraries.GetHelpFile(library.Handle(), nullptr, 0, length);
  if (FAILED(result)) return result;
  std::u16string file(std::size_t{length} + 1, u'\0');
  result = libraries.GetHelpFile(library.Handle(), file.data(), length + 1, length);
  if (FAILED(result)) return result;
  file.resize(length);
  directory = file.substr(0, file.find_last_of(u"\\/:") + 1);
  return result;
}

HRESULT RegisterLibrary(const RegistrationSystem& system, const std::u16string& modulePath) {
  LoadedTypeLibrary library(system.typeLibraries);
  std::u16string path;
  HRESULT result = LoadModuleLibrary(library, modulePath, path);
  if (FAILED(result)) return result;
  std::u16string helpDirectory;
  result = ReadHelpDirectory(system.typeLibraries, library, helpDirectory);
  if (FAILED(result)) return result;
  return system.typeLibraries.RegisterTypeLib(
      library.Handle(), path.c_str(), helpDirectory.empty() ? nullptr : helpDirectory.c_str());
}

HRESULT UnregisterLibrary(const RegistrationSystem& system, const std::u16string& modulePath) {
  LoadedTypeLibrary library(system.typeLibraries);
  std::u16string path;
  HRESULT result = LoadModuleLibrary(library, modulePath, path);
  if (FAILED(result)) return result;
  platform::TypeLibraryAttributes attributes;
  result = system.typeLibraries.GetLibAttr(library.Handle(), attributes);
  if (FAILED(result)) return result;
  return system.typeLibraries.UnRegisterTypeLib(attributes.guid, attributes.wMajorVerNum,
                                                attributes.wMinorVerNum, attributes.lcid,
                                                attributes.syskind);
}

// Runs `work` with what the scripts are given and the module's path, under the system's locale.
template <class Work>
HRESULT UnderSystemLocale(const ServerDescription& description,
                          const std::vector<Replacement>& common, const RegistrationSystem& system,
                          Work work) noexcept {
  const SystemLocale locale(system.environment);
  return Guarded([&] {
    std::u16string modulePath;
    HRESULT result = ReadModulePath(system.environment, modulePath);
    if (FAILED(result)) return result;
    std::vector<Replacement> replacements = common;
    replacements.push_back(ModuleReplacement(modulePath));
    result = work(Server{description, replacements}, modulePath);
    return FAILED(result) ? result : S_OK;
  });
}

}  // namespace

HRESULT RegisterServer(const ServerDescription& server, const std::vector<Replacement>& common,
                       const RegistrationSystem& system) noexcept {
  const auto work = [&](const Server& registered, const std::u16string& modulePath) {
    HRESULT result = RunModuleScript(RegisterScript, registered, system.registry);
    if (SUCCEEDED(result)) result = RunClassScripts(RegisterScript, registered, system.registry);
    return FAILED(result) ? result : RegisterLibrary(system, modulePath);
  };
  return UnderSystemLocale(server, common, system, work);
}

HRESULT UnregisterServer(const ServerDescription& server, const std::vector<Replacement>& common,
                         const RegistrationSystem& system) noexcept {
  const auto work = [&](const Server& registered, const std::u16string& modulePath) {
    HRESULT result = RunClassScripts(UnregisterScript, registered, system.registry);
    if (SUCCEEDED(result)) result = UnregisterLibrary(system, modulePath);
    return FAILED(result) ? result : RunModuleScript(UnregisterScript, registered, system.registry);
  };
  return UnderSystemLocale(server, common, system, work);
}

}  // namespace KelvoUHW
