#include "platform/windows/server_classes.h"

#include <windows.h>

#include <stdexcept>

#include "platform/text.h"
#include "platform/windows/native_types.h"

namespace platform::windows {

namespace {

using GetClassObject = HRESULT(STDAPICALLTYPE*)(REFCLSID, REFIID, void**);

HRESULT RegisterClassObject(GetClassObject getClassObject, const CLSID& clsid, DWORD& cookie) {
  IUnknown* factory = nullptr;
  HRESULT result =
      getClassObject(clsid, IidOf<IClassFactory>(), reinterpret_cast<void**>(&factory));
  if (FAILED(result)) return result;
  result = CoRegisterClassObject(clsid, factory, CLSCTX_INPROC_SERVER, REGCLS_MULTIPLEUSE, &cookie);
  factory->Release();
  return result;
}

[[noreturn]] void Fail(const std::u16string& path, const char* what, std::uint32_t code) {
  std::string text = ToUtf8(path);
  text.append(": ").append(what).append(": 0x").append(ToUtf8(Hex(code, 8)));
  throw std::runtime_error(text);
}

}  // namespace

ServerClasses::ServerClasses(const std::u16string& path, std::span<const CLSID> classes) {
  const HMODULE module =
      LoadLibraryExW(Native(path.c_str()), nullptr, LOAD_WITH_ALTERED_SEARCH_PATH);
  if (module == nullptr) Fail(path, "cannot be loaded", GetLastError());
  const auto getClassObject = reinterpret_cast<GetClassObject>(
      reinterpret_cast<void*>(GetProcAddress(module, "DllGetClassObject")));
  if (getClassObject == nullptr) Fail(path, "is no COM server", GetLastError());
  m_cookies.reserve(classes.size());
  for (const CLSID& clsid : classes) {
    DWORD cookie = 0;
    if (const HRESULT result = RegisterClassObject(getClassObject, clsid, cookie); FAILED(result)) {
      Revoke();
      Fail(path, "does not give its classes", static_cast<std::uint32_t>(result));
    }
    m_cookies.push_back(cookie);
  }
}

ServerClasses::~ServerClasses() { Revoke(); }

void ServerClasses::Revoke() noexcept {
  for (const DWORD cookie : m_cookies) CoRevokeClassObject(cookie);
}

std::u16string EnvironmentText(const char16_t* name) {
  std::u16string text;
  // Asked again where another thread made it longer meanwhile.
  for (DWORD chars = GetEnvironmentVariableW(Native(name), nullptr, 0); chars > text.size();) {
    text.resize(chars);
    chars = GetEnvironmentVariableW(Native(name), Native(text.data()), chars);
    if (chars < text.size()) text.resize(chars);
  }
  return text;
}

void SetEnvironmentText(const char16_t* name, const std::u16string& text) noexcept {
  SetEnvironmentVariableW(Native(name), text.empty() ? nullptr : Native(text.c_str()));
}

}  // namespace platform::windows
