// A registry in memory that answers the registry calls (platform/registry.h) as the system would.
// The other files of this room have the rest of what registration needs from a process: type
// libraries, and what a module knows about itself.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "platform/registry.h"

namespace platform::simulated {

// HKEY_CLASSES_ROOT alone, empty at the start. As strict as the system: the access of a handle is
// fixed when it is opened, a key with subkeys cannot be deleted, and calls on a deleted key fail.
// The value of a handle is never used again. Thread-safe.
class SimulatedRegistry final : public Registry {
 public:
  SimulatedRegistry();

  Status CreateKey(RegistryKeyHandle parent, const char16_t* path, std::uint32_t access,
                   RegistryKeyHandle& key, std::uint32_t& disposition) noexcept override;
  Status OpenKey(RegistryKeyHandle parent, const char16_t* path, std::uint32_t access,
                 RegistryKeyHandle& key) noexcept override;
  Status SetValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t type, const void* data,
                  std::uint32_t dataBytes) noexcept override;
  Status QueryValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t* type, void* data,
                    std::uint32_t& dataBytes) noexcept override;
  Status EnumKey(RegistryKeyHandle key, std::uint32_t index, char16_t* name,
                 std::uint32_t& nameChars) noexcept override;
  Status DeleteKey(RegistryKeyHandle parent, const char16_t* path) noexcept override;
  Status DeleteValue(RegistryKeyHandle key, const char16_t* name) noexcept override;
  Status CloseKey(RegistryKeyHandle key) noexcept override;

  // All that stands in the registry: a line for each key and for each of its values, keys above
  // their subkeys, in the order of their names:
  //   HKEY_CLASSES_ROOT\AppID\{...}
  //   HKEY_CLASSES_ROOT\AppID\{...}  (default) = "ZKUsbMonitor"
  // Numbers read "dword 0x0000002A", all else "type 3: 01 FF".
  std::vector<std::u16string> Snapshot() const;
  // The paths of the keys that are open, and the closings that were refused, oldest first.
  std::vector<std::u16string> OpenKeys() const;
  std::vector<std::u16string> Misuses() const;

 private:
  struct Value {
    std::u16string name;
    std::uint32_t type = 0;
    std::vector<std::uint8_t> bytes;
  };
  struct Key {
    std::u16string name;
    Key* parent = nullptr;
    bool deleted = false;
    // By name in upper case, which is also the order in which the system counts them up.
    std::map<std::u16string, std::shared_ptr<Key>> subkeys;
    std::map<std::u16string, Value> values;
  };
  struct OpenedKey {
    std::shared_ptr<Key> key;
    std::uint32_t access = 0;
    std::u16string path;
  };

  Status Find(RegistryKeyHandle handle, std::uint32_t access, std::shared_ptr<Key>& key) const;
  Status Split(const char16_t* path, std::vector<std::u16string_view>& names) const;
  RegistryKeyHandle Hand(const std::shared_ptr<Key>& key, std::uint32_t access);
  static std::u16string PathOf(const Key& key);
  static void AddLines(const Key& key, std::vector<std::u16string>& lines);

  mutable std::mutex m_mutex;
  std::shared_ptr<Key> m_root;
  RegistryKeyHandle m_nextHandle;
  std::map<RegistryKeyHandle, OpenedKey> m_open;
  std::map<RegistryKeyHandle, std::u16string> m_closed;  // with the path of what it was
  std::vector<std::u16string> m_misuses;
};

}  // namespace platform::simulated
