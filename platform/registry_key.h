// An open key of the registry that closes itself.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "platform/registry.h"

namespace platform {

// Owns one handle of a registry that outlives it; the predefined key is not closed. Not
// thread-safe. Failures are the registry's own; what needs memory may throw std::bad_alloc.
class RegistryKey {
 public:
  explicit RegistryKey(Registry& registry, RegistryKeyHandle key = kNoRegistryKey) noexcept
      : m_registry(&registry), m_key(key) {}
  RegistryKey(RegistryKey&& other) noexcept;
  RegistryKey& operator=(RegistryKey&& other) noexcept;
  ~RegistryKey() { Close(); }

  // The key to hand to the registry; still owned here.
  RegistryKeyHandle Handle() const noexcept { return m_key; }
  void Close() noexcept;

  // Open a key below `parent`, to read and write it, in the place of the one held; a failure leaves
  // none.
  Status Create(RegistryKeyHandle parent, const char16_t* path) noexcept;
  Status Open(RegistryKeyHandle parent, const char16_t* path) noexcept;

  // Writes a text with its terminator; `name` empty: the default value.
  Status SetText(const std::u16string& name, const std::u16string& text) noexcept;
  // The text of a value up to its first zero. A value of another type is kERROR_INVALID_DATA.
  Status Text(const char16_t* name, std::u16string& text) const;
  // Status::Success with `name` set, or kERROR_NO_MORE_ITEMS when there is no subkey.
  Status FirstSubkey(std::u16string& name) const;
  // Deletes a subkey with all below it. One that is not there is kERROR_FILE_NOT_FOUND. Loops
  // rather than recurses: how deep a subtree goes is up to whoever wrote it.
  Status DeleteTree(const std::u16string& name);

 private:
  Registry* m_registry;
  RegistryKeyHandle m_key;
};

}  // namespace platform
