#include <dlfcn.h>

#include <algorithm>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

#include "platform/native/com_functions.h"
#include "platform/registry.h"
#include "platform/registry_key.h"
#include "platform/system.h"
#include "platform/text.h"

namespace {

using GetClassObjectFunction = HRESULT (*)(REFCLSID, REFIID, void**);
using CanUnloadNowFunction = HRESULT (*)();

// A loaded server, until the last owner lets go. A call into it owns it for as long as it lasts.
class Library {
 public:
  explicit Library(const std::u16string& path)
      : m_handle(dlopen(platform::ToUtf8(path).c_str(), RTLD_NOW | RTLD_LOCAL)) {
    if (m_handle == nullptr) return;
    m_getClassObject =
        reinterpret_cast<GetClassObjectFunction>(dlsym(m_handle, "DllGetClassObject"));
    m_canUnloadNow = reinterpret_cast<CanUnloadNowFunction>(dlsym(m_handle, "DllCanUnloadNow"));
  }
  ~Library() {
    if (m_handle != nullptr) dlclose(m_handle);
  }
  Library(const Library&) = delete;
  Library& operator=(const Library&) = delete;

  HRESULT Usable() const noexcept {
    if (m_handle == nullptr) return CO_E_DLLNOTFOUND;
    return m_getClassObject == nullptr ? CO_E_ERRORINDLL : S_OK;
  }
  HRESULT GetClassObject(REFCLSID clsid, REFIID iid, void** out) const {
    return m_getClassObject(clsid, iid, out);
  }
  bool CanUnload() const { return m_canUnloadNow != nullptr && m_canUnloadNow() == S_OK; }

 private:
  void* const m_handle;
  GetClassObjectFunction m_getClassObject = nullptr;
  CanUnloadNowFunction m_canUnloadNow = nullptr;
};
using LibraryPtr = std::shared_ptr<const Library>;

struct RegisteredClassObject {
  CLSID clsid;
  IUnknown* object;
  DWORD cookie;
};

struct Classes {
  std::mutex mutex;
  std::map<std::u16string, LibraryPtr> libraries;  // by path
  std::vector<RegisteredClassObject> registered;
  DWORD lastCookie = 0;
};

// Never destroyed: threads go on asking for classes while the process ends.
Classes& Known() {
  static Classes& known = *std::make_unique<Classes>().release();
  return known;
}

IUnknown* FindRegistered(REFCLSID clsid) {
  const std::lock_guard lock(Known().mutex);
  for (const RegisteredClassObject& entry : Known().registered) {
    if (entry.clsid != clsid) continue;
    entry.object->AddRef();
    return entry.object;
  }
  return nullptr;
}

// Loaded once and kept until CoFreeUnusedLibraries. Loading runs code of the library, which may ask
// for classes itself, so the lock is not held meanwhile.
HRESULT LoadServer(const std::u16string& path, LibraryPtr& library) {
  {
    const std::lock_guard lock(Known().mutex);
    if (const auto known = Known().libraries.find(path); known != Known().libraries.end()) {
      library = known->second;
      return S_OK;
    }
  }
  library = std::make_shared<const Library>(path);
  if (const HRESULT usable = library->Usable(); FAILED(usable)) return usable;
  const std::lock_guard lock(Known().mutex);
  Known().libraries.emplace(path, library);
  return S_OK;
}

// The default value of a key below HKEY_CLASSES_ROOT; empty without one.
std::u16string ReadDefault(const std::u16string& path) {
  platform::Registry* registry = platform::CurrentSystem().registry;
  if (registry == nullptr) return {};
  platform::RegistryKey key(*registry);
  std::u16string value;
  if (!key.Open(platform::kHKEY_CLASSES_ROOT, path.c_str())) return {};
  return key.Text(u"", value) ? value : std::u16string();
}

template <class Body>
HRESULT Guarded(Body body) noexcept {
  try {
    return body();
  } catch (...) {
    return E_OUTOFMEMORY;
  }
}

}  // namespace

HRESULT CoGetClassObject(REFCLSID clsid, DWORD, void*, REFIID iid, void** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  return Guarded([&] {
    if (IUnknown* registered = FindRegistered(clsid)) {
      const HRESULT result = registered->QueryInterface(iid, out);
      registered->Release();
      return result;
    }
    std::u16string key = u"CLSID\\";
    key.append(platform::GuidText(clsid)).append(u"\\InprocServer32");
    const std::u16string path = ReadDefault(key);
    if (path.empty()) return REGDB_E_CLASSNOTREG;
    LibraryPtr library;
    const HRESULT loaded = LoadServer(path, library);
    return FAILED(loaded) ? loaded : library->GetClassObject(clsid, iid, out);
  });
}

HRESULT CoCreateInstance(REFCLSID clsid, IUnknown* outer, DWORD context, REFIID iid,
                         void** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  IClassFactory* factory = nullptr;
  HRESULT result = CoGetClassObject(clsid, context, nullptr, IClassFactory::kIid,
                                    reinterpret_cast<void**>(&factory));
  if (FAILED(result)) return result;
  result = factory->CreateInstance(outer, iid, out);
  factory->Release();
  return result;
}

HRESULT CoRegisterClassObject(REFCLSID clsid, IUnknown* classObject, DWORD, DWORD,
                              DWORD* cookie) noexcept {
  if (classObject == nullptr || cookie == nullptr) return E_INVALIDARG;
  return Guarded([&] {
    const std::lock_guard lock(Known().mutex);
    Known().registered.push_back({clsid, classObject, Known().lastCookie + 1});
    *cookie = ++Known().lastCookie;
    classObject->AddRef();
    return S_OK;
  });
}

HRESULT CoRevokeClassObject(DWORD cookie) noexcept {
  IUnknown* revoked = nullptr;
  {
    std::vector<RegisteredClassObject>& registered = Known().registered;
    const std::lock_guard lock(Known().mutex);
    const auto entry =
        std::find_if(registered.begin(), registered.end(),
                     [&](const RegisteredClassObject& each) { return each.cookie == cookie; });
    if (entry == registered.end()) return E_INVALIDARG;
    revoked = entry->object;
    registered.erase(entry);
  }
  revoked->Release();
  return S_OK;
}

void CoFreeUnusedLibraries() noexcept {
  // Unloaded when the lock is free again: that, too, runs code of theirs.
  std::map<std::u16string, LibraryPtr> unused;
  const std::lock_guard lock(Known().mutex);
  for (auto next = Known().libraries.begin(); next != Known().libraries.end();) {
    const auto library = next++;
    const bool inCall = library->second.use_count() != 1;
    if (!inCall && library->second->CanUnload()) unused.insert(Known().libraries.extract(library));
  }
}

HRESULT CLSIDFromProgID(const char16_t* progId, CLSID* clsid) noexcept {
  if (progId == nullptr || clsid == nullptr) return E_INVALIDARG;
  *clsid = GUID{};
  return Guarded([&] {
    std::u16string key = progId;
    key.append(u"\\CLSID");
    const std::optional<platform::Guid> found = platform::ParseGuid(ReadDefault(key));
    if (!found) return CO_E_CLASSSTRING;
    *clsid = *found;
    return S_OK;
  });
}
