// The system's registry, as the component asks for it: call by call, like the rest of the seam.
//
// What host.h says about its operations holds here too. Names and texts compare without regard to
// case and keep the case they were written with.
#pragma once

#include <cstdint>

#include "platform/host.h"
#include "platform/setup_api.h"

namespace platform {

// An open key. The predefined one is always open and need not be closed; 0 is none.
using RegistryKeyHandle = std::intptr_t;
inline constexpr RegistryKeyHandle kNoRegistryKey = 0;
// Sign-extended, as the system's headers widen it.
inline constexpr RegistryKeyHandle kHKEY_CLASSES_ROOT = -0x7FFFFFFF - 1;

inline constexpr std::uint32_t kKEY_QUERY_VALUE = 0x0001;
inline constexpr std::uint32_t kKEY_SET_VALUE = 0x0002;
inline constexpr std::uint32_t kKEY_ENUMERATE_SUB_KEYS = 0x0008;
inline constexpr std::uint32_t kKEY_READ = 0x20019;
inline constexpr std::uint32_t kKEY_WRITE = 0x20006;

inline constexpr std::uint32_t kREG_BINARY = 3;  // the others stand in setup_api.h

inline constexpr std::uint32_t kREG_CREATED_NEW_KEY = 1;
inline constexpr std::uint32_t kREG_OPENED_EXISTING_KEY = 2;

// The longest name of a key, without its terminator.
inline constexpr std::uint32_t kMaxKeyNameChars = 255;

inline constexpr std::uint32_t kERROR_ACCESS_DENIED = 5;
inline constexpr std::uint32_t kERROR_KEY_DELETED = 1018;

class Registry {
 public:
  // RegCreateKeyExW without class, options and security: opens the key, made first where it is not
  // there, with all keys of the path above it. The caller owns `key`; failure leaves
  // kNoRegistryKey. `disposition` is set on success.
  virtual Status CreateKey(RegistryKeyHandle parent, const char16_t* path, std::uint32_t access,
                           RegistryKeyHandle& key, std::uint32_t& disposition) noexcept = 0;
  // RegOpenKeyExW. An empty or null path opens `parent` once more. The caller owns `key`; failure
  // leaves kNoRegistryKey.
  virtual Status OpenKey(RegistryKeyHandle parent, const char16_t* path, std::uint32_t access,
                         RegistryKeyHandle& key) noexcept = 0;
  // RegSetValueExW. `name` null or empty: the default value. Texts are given with their terminator.
  virtual Status SetValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t type,
                          const void* data, std::uint32_t dataBytes) noexcept = 0;
  // RegQueryValueExW. `type` may be null; `data` null asks for the size. `dataBytes` holds the
  // buffer's size and is set to the value's on success and with kERROR_MORE_DATA. What a text ends
  // with is what was written: its terminator may be missing.
  virtual Status QueryValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t* type,
                            void* data, std::uint32_t& dataBytes) noexcept = 0;
  // RegEnumKeyExW without class and time. `nameChars` holds the buffer's size and is set to the
  // name's, without its terminator, on success alone. The end is kERROR_NO_MORE_ITEMS.
  virtual Status EnumKey(RegistryKeyHandle key, std::uint32_t index, char16_t* name,
                         std::uint32_t& nameChars) noexcept = 0;
  // RegDeleteKeyW. A key that has subkeys is kERROR_ACCESS_DENIED. Handles to the key stay open and
  // answer kERROR_KEY_DELETED from then on.
  virtual Status DeleteKey(RegistryKeyHandle parent, const char16_t* path) noexcept = 0;
  // RegDeleteValueW.
  virtual Status DeleteValue(RegistryKeyHandle key, const char16_t* name) noexcept = 0;
  // RegCloseKey. A handle that is not open is refused.
  virtual Status CloseKey(RegistryKeyHandle key) noexcept = 0;

 protected:
  ~Registry() = default;
};

}  // namespace platform
