#include <dlfcn.h>

#include <algorithm>
#include <array>
#include <map>
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

struct Library {
  void* handle = nullptr;
  GetClassObjectFunction getClassObject = nullptr;
  CanUnloadNowFunction canUnloadNow = nullptr;
};

struct RegisteredClassObject {
  CLSID clsid;
  IUnknown* object;
  DWORD cookie;
};

std::mutex g_mutex;
std::map<std::u16string, Library> g_libraries;  // by path
std::vector<RegisteredClassObject> g_registered;
DWORD g_lastCookie = 0;

IUnknown* FindRegistered(REFCLSID clsid) {
  const std::lock_guard lock(g_mutex);
  for (const RegisteredClassObject& entry : g_registered) {
    if (entry.clsid != clsid) continue;
    entry.object->AddRef();
    return entry.object;
  }
  return nullptr;
}

// Loaded once and kept until CoFreeUnusedLibraries.
HRESULT LoadServer(const std::u16string& path, Library& library) {
  const std::lock_guard lock(g_mutex);
  if (const auto known = g_libraries.find(path); known != g_libraries.end()) {
    library = known->second;
    return S_OK;
  }
  library.handle = dlopen(platform::ToUtf8(path).c_str(), RTLD_NOW | RTLD_LOCAL);
  if (library.handle == nullptr) return CO_E_DLLNOTFOUND;
  library.getClassObject =
      reinterpret_cast<GetClassObjectFunction>(dlsym(library.handle, "DllGetClassObject"));
  library.canUnloadNow =
      reinterpret_cast<CanUnloadNowFunction>(dlsym(library.handle, "DllCanUnloadNow"));
  if (library.getClassObject == nullptr) {
    dlclose(library.handle);
    return CO_E_ERRORINDLL;
  }
  g_libraries.emplace(path, library);
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
    Library library;
    const HRESULT loaded = LoadServer(path, library);
    return FAILED(loaded) ? loaded : library.getClassObject(clsid, iid, out);
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
    const std::lock_guard lock(g_mutex);
    g_registered.push_back({clsid, classObject, g_lastCookie + 1});
    *cookie = ++g_lastCookie;
    classObject->AddRef();
    return S_OK;
  });
}

HRESULT CoRevokeClassObject(DWORD cookie) noexcept {
  IUnknown* revoked = nullptr;
  {
    const std::lock_guard lock(g_mutex);
    const auto entry =
        std::find_if(g_registered.begin(), g_registered.end(),
                     [&](const RegisteredClassObject& each) { return each.cookie == cookie; });
    if (entry == g_registered.end()) return E_INVALIDARG;
    revoked = entry->object;
    g_registered.erase(entry);
  }
  revoked->Release();
  return S_OK;
}

void CoFreeUnusedLibraries() noexcept {
  const std::lock_guard lock(g_mutex);
  for (auto library = g_libraries.begin(); library != g_libraries.end();) {
    const CanUnloadNowFunction canUnloadNow = library->second.canUnloadNow;
    if (canUnloadNow == nullptr || canUnloadNow() != S_OK) {
      ++library;
      continue;
    }
    dlclose(library->second.handle);
    library = g_libraries.erase(library);
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
