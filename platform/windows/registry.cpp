#include "platform/registry.h"

#include "platform/windows/native_types.h"
#include "platform/windows/windows_module.h"

namespace platform::windows {

namespace {

static_assert(kKEY_QUERY_VALUE == KEY_QUERY_VALUE && kKEY_SET_VALUE == KEY_SET_VALUE &&
              kKEY_ENUMERATE_SUB_KEYS == KEY_ENUMERATE_SUB_KEYS && kKEY_READ == KEY_READ &&
              kKEY_WRITE == KEY_WRITE);
static_assert(kREG_BINARY == REG_BINARY && kREG_CREATED_NEW_KEY == REG_CREATED_NEW_KEY &&
              kREG_OPENED_EXISTING_KEY == REG_OPENED_EXISTING_KEY);
static_assert(kERROR_ACCESS_DENIED == ERROR_ACCESS_DENIED &&
              kERROR_KEY_DELETED == ERROR_KEY_DELETED);

HKEY NativeKey(RegistryKeyHandle key) noexcept { return reinterpret_cast<HKEY>(key); }

// These calls return their error, and leave none behind.
Status FromCode(LSTATUS code) noexcept {
  return code == ERROR_SUCCESS ? Status::Success()
                               : Status::Failure(static_cast<std::uint32_t>(code));
}

Status TakeKey(LSTATUS code, HKEY opened, RegistryKeyHandle& key) noexcept {
  key = code == ERROR_SUCCESS ? FromNative(opened) : kNoRegistryKey;
  return FromCode(code);
}

}  // namespace

Status WindowsRegistry::CreateKey(RegistryKeyHandle parent, const char16_t* path,
                                  std::uint32_t access, RegistryKeyHandle& key,
                                  std::uint32_t& disposition) noexcept {
  HKEY opened = nullptr;
  DWORD made = 0;
  const LSTATUS code = RegCreateKeyExW(NativeKey(parent), Native(path), 0, nullptr,
                                       REG_OPTION_NON_VOLATILE, access, nullptr, &opened, &made);
  if (code == ERROR_SUCCESS) disposition = made;
  return TakeKey(code, opened, key);
}

Status WindowsRegistry::OpenKey(RegistryKeyHandle parent, const char16_t* path,
                                std::uint32_t access, RegistryKeyHandle& key) noexcept {
  HKEY opened = nullptr;
  const LSTATUS code = RegOpenKeyExW(NativeKey(parent), Native(path), 0, access, &opened);
  return TakeKey(code, opened, key);
}

Status WindowsRegistry::SetValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t type,
                                 const void* data, std::uint32_t dataBytes) noexcept {
  return FromCode(RegSetValueExW(NativeKey(key), Native(name), 0, type,
                                 static_cast<const BYTE*>(data), dataBytes));
}

Status WindowsRegistry::QueryValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t* type,
                                   void* data, std::uint32_t& dataBytes) noexcept {
  return FromCode(RegQueryValueExW(NativeKey(key), Native(name), nullptr, Native(type),
                                   static_cast<BYTE*>(data), Native(&dataBytes)));
}

Status WindowsRegistry::EnumKey(RegistryKeyHandle key, std::uint32_t index, char16_t* name,
                                std::uint32_t& nameChars) noexcept {
  DWORD chars = nameChars;
  const LSTATUS code = RegEnumKeyExW(NativeKey(key), index, Native(name), &chars, nullptr, nullptr,
                                     nullptr, nullptr);
  if (code == ERROR_SUCCESS) nameChars = chars;
  return FromCode(code);
}

Status WindowsRegistry::DeleteKey(RegistryKeyHandle parent, const char16_t* path) noexcept {
  return FromCode(RegDeleteKeyW(NativeKey(parent), Native(path)));
}

Status WindowsRegistry::DeleteValue(RegistryKeyHandle key, const char16_t* name) noexcept {
  return FromCode(RegDeleteValueW(NativeKey(key), Native(name)));
}

Status WindowsRegistry::CloseKey(RegistryKeyHandle key) noexcept {
  return FromCode(RegCloseKey(NativeKey(key)));
}

}  // namespace platform::windows
