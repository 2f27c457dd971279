#include "simulation/process/type_libraries.h"

#include <algorithm>
#include <utility>

#include "platform/registry_key.h"
#include "platform/text.h"

namespace platform::simulated {
namespace {

constexpr TypeLibraryHandle kFirstLibrary = 0x30000000;

// The system's marshallers of interfaces that a type library describes.
constexpr char16_t kLibraryMarshaller[] = u"{00020424-0000-0000-C000-000000000046}";
constexpr char16_t kDispatchMarshaller[] = u"{00020420-0000-0000-C000-000000000046}";

// "1.0": both numbers hexadecimal, as the system writes and reads them.
std::u16string VersionText(std::uint16_t majorVersion, std::uint16_t minorVersion) {
  return HexLower(majorVersion).append(u".").append(HexLower(minorVersion));
}

std::u16string LibraryPath(const Guid& guid) {
  return std::u16string(u"TypeLib\\").append(GuidText(guid));
}

const char16_t* PlatformName(std::int32_t syskind) {
  return syskind == kSYS_WIN64 ? u"win64" : u"win32";
}

// The part before the last separator.
std::u16string DirectoryOf(std::u16string_view path) {
  const std::size_t end = path.find_last_of(u"\\/");
  return std::u16string(path.substr(0, end == path.npos ? 0 : end));
}

// Writes keys one after the other until one fails.
class Writer {
 public:
  explicit Writer(Registry& registry) : m_key(registry) {}

  void Key(const std::u16string& path, const std::u16string& text) {
    if (m_status) m_status = m_key.Create(kHKEY_CLASSES_ROOT, path.c_str());
    Value(u"", text);
  }
  void Value(const std::u16string& name, const std::u16string& text) {
    if (m_status) m_status = m_key.SetText(name, text);
  }
  HRESULT Result() const { return m_status ? S_OK : kTYPE_E_REGISTRYACCESS; }

 private:
  RegistryKey m_key;
  Status m_status;
};

// Deletes a key without subkeys; one that is gone or still has some is as good.
bool DeleteIfEmpty(Registry& registry, const std::u16string& path) {
  RegistryKey key(registry);
  Status status = key.Open(kHKEY_CLASSES_ROOT, path.c_str());
  if (!status) return status.error == kERROR_FILE_NOT_FOUND;
  std::u16string subkey;
  status = key.FirstSubkey(subkey);
  if (status) return true;
  if (status.error != kERROR_NO_MORE_ITEMS) return false;
  key.Close();
  return registry.DeleteKey(kHKEY_CLASSES_ROOT, path.c_str()).ok;
}

}  // namespace

SimulatedTypeLibraries::SimulatedTypeLibraries(Registry& registry)
    : m_registry(registry), m_nextHandle(kFirstLibrary) {}

void SimulatedTypeLibraries::Add(std::u16string_view path, TypeLibrary library) {
  const std::lock_guard lock(m_mutex);
  m_files[ToUpper(path)] = std::move(library);
}

const TypeLibrary* SimulatedTypeLibraries::Find(TypeLibraryHandle library) const {
  const auto found = m_loaded.find(library);
  return found == m_loaded.end() ? nullptr : &found->second;
}

HRESULT SimulatedTypeLibraries::LoadTypeLib(const char16_t* path,
                                            TypeLibraryHandle& library) noexcept {
  library = kNoTypeLibrary;
  const std::lock_guard lock(m_mutex);
  const auto found = path == nullptr ? m_files.end() : m_files.find(ToUpper(path));
  if (found == m_files.end()) return TYPE_E_CANTLOADLIBRARY;
  library = m_nextHandle++;
  m_loaded.emplace(library, found->second);
  return S_OK;
}

HRESULT SimulatedTypeLibraries::GetLibAttr(TypeLibraryHandle library,
                                           TypeLibraryAttributes& attributes) noexcept {
  const std::lock_guard lock(m_mutex);
  const TypeLibrary* found = Find(library);
  if (found == nullptr) return E_INVALIDARG;
  attributes = found->attributes;
  return S_OK;
}

HRESULT SimulatedTypeLibraries::GetHelpFile(TypeLibraryHandle library, char16_t* name,
                                            std::uint32_t nameChars,
                                            std::uint32_t& length) noexcept {
  const std::lock_guard lock(m_mutex);
  const TypeLibrary* found = Find(library);
  if (found == nullptr) return E_INVALIDARG;
  length = static_cast<std::uint32_t>(found->helpFile.size());
  if (length < nameChars) std::copy_n(found->helpFile.c_str(), length + 1, name);
  return S_OK;
}

HRESULT SimulatedTypeLibraries::RegisterTypeLib(TypeLibraryHandle library, const char16_t* path,
                                                const char16_t* helpDirectory) noexcept {
  const std::lock_guard lock(m_mutex);
  const TypeLibrary* found = Find(library);
  if (found == nullptr || path == nullptr) return E_INVALIDARG;
  const TypeLibraryAttributes& attributes = found->attributes;
  const std::u16string id = GuidText(attributes.guid);
  const std::u16string version = VersionText(attributes.wMajorVerNum, attributes.wMinorVerNum);
  const std::u16string key = LibraryPath(attributes.guid).append(u"\\").append(version);
  const std::u16string locale = key + u"\\" + HexLower(attributes.lcid);

  Writer writer(m_registry);
  writer.Key(key, found->helpString);
  writer.Key(locale + u"\\" + PlatformName(attributes.syskind), path);
  writer.Key(key + u"\\FLAGS", Decimal(attributes.wLibFlags));
  writer.Key(key + u"\\HELPDIR",
             helpDirectory == nullptr ? DirectoryOf(path) : std::u16string(helpDirectory));
  for (const LibraryInterface& entry : found->interfaces) {
    std::u16string interfaceKey = u"Interface\\";
    interfaceKey += GuidText(entry.iid);
    writer.Key(interfaceKey, entry.name);
    writer.Key(interfaceKey + u"\\ProxyStubClsid32",
               entry.dispatch ? kDispatchMarshaller : kLibraryMarshaller);
    writer.Key(interfaceKey + u"\\TypeLib", id);
    writer.Value(u"Version", version);
  }
  return writer.Result();
}

HRESULT SimulatedTypeLibraries::UnRegisterTypeLib(const Guid& guid, std::uint16_t majorVersion,
                                                  std::uint16_t minorVersion, std::uint32_t lcid,
                                                  std::int32_t syskind) noexcept {
  const std::lock_guard lock(m_mutex);
  const std::u16string library = LibraryPath(guid);
  const std::u16string version = library + u"\\" + VersionText(majorVersion, minorVersion);
  const std::u16string locale = version + u"\\" + HexLower(lcid);
  const std::u16string platform = locale + u"\\" + PlatformName(syskind);

  // Which interfaces it has only the file knows that was registered.
  RegistryKey key(m_registry);
  std::u16string path;
  if (!key.Open(kHKEY_CLASSES_ROOT, platform.c_str()) || !key.Text(u"", path)) {
    return kTYPE_E_REGISTRYACCESS;
  }
  key.Close();
  bool ok = true;
  if (const auto file = m_files.find(ToUpper(path)); file != m_files.end()) {
    for (const LibraryInterface& entry : file->second.interfaces) {
      std::u16string interfaceKey = u"Interface\\";
      interfaceKey += GuidText(entry.iid);
      for (const char16_t* subkey : {u"\\ProxyStubClsid32", u"\\TypeLib", u""}) {
        ok = ok && DeleteIfEmpty(m_registry, interfaceKey + subkey);
      }
    }
  }
  ok = ok && m_registry.DeleteKey(kHKEY_CLASSES_ROOT, platform.c_str()) &&
       DeleteIfEmpty(m_registry, locale);
  // Flags and help directory go with the last platform of the locale.
  if (ok) {
    const Status left = key.Open(kHKEY_CLASSES_ROOT, locale.c_str());
    ok = left ? true
              : left.error == kERROR_FILE_NOT_FOUND &&
                    DeleteIfEmpty(m_registry, version + u"\\FLAGS") &&
                    DeleteIfEmpty(m_registry, version + u"\\HELPDIR") &&
                    DeleteIfEmpty(m_registry, version) && DeleteIfEmpty(m_registry, library);
  }
  return ok ? S_OK : kTYPE_E_REGISTRYACCESS;
}

void SimulatedTypeLibraries::ReleaseTypeLib(TypeLibraryHandle library) noexcept {
  const std::lock_guard lock(m_mutex);
  if (m_loaded.erase(library) == 0) ++m_misuses;
}

std::size_t SimulatedTypeLibraries::LoadedCount() const {
  const std::lock_guard lock(m_mutex);
  return m_loaded.size();
}

std::size_t SimulatedTypeLibraries::MisuseCount() const {
  const std::lock_guard lock(m_mutex);
  return m_misuses;
}

}  // namespace platform::simulated
