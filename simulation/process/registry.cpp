#include "simulation/process/registry.h"

#include <algorithm>
#include <cstring>
#include <iterator>
#include <utility>

#include "platform/text.h"

namespace platform::simulated {
namespace {

// Far from the handles of files and sets, so that one is never taken for the other.
constexpr RegistryKeyHandle kFirstKey = 0x20000000;
constexpr RegistryKeyHandle kKeyStep = 4;

constexpr std::size_t kMaxLevels = 512;
constexpr std::size_t kMaxValueNameChars = 16383;
constexpr std::uint32_t kERROR_BAD_PATHNAME = 161;

std::u16string_view NameOf(const char16_t* name) {
  return name == nullptr ? std::u16string_view() : name;
}

std::u16string DataText(std::uint32_t type, const std::vector<std::uint8_t>& bytes) {
  if (type == kREG_SZ && !bytes.empty() && bytes.size() % sizeof(char16_t) == 0) {
    std::u16string text(bytes.size() / sizeof(char16_t), u'\0');
    std::memcpy(text.data(), bytes.data(), bytes.size());
    if (text.find(u'\0') == text.size() - 1) {
      text.back() = u'"';
      return text.insert(0, 1, u'"');
    }
  }
  if (type == kREG_DWORD && bytes.size() == sizeof(std::uint32_t)) {
    std::uint32_t number = 0;
    std::memcpy(&number, bytes.data(), sizeof number);
    return std::u16string(u"dword 0x").append(Hex(number, 8));
  }
  std::u16string text = std::u16string(u"type ").append(Decimal(static_cast<std::int32_t>(type)));
  text += u':';
  for (const std::uint8_t byte : bytes) text.append(u" ").append(Hex(byte, 2));
  return text;
}

}  // namespace

SimulatedRegistry::SimulatedRegistry() : m_root(std::make_shared<Key>()), m_nextHandle(kFirstKey) {
  m_root->name = u"HKEY_CLASSES_ROOT";
}

// The open key behind a handle that was opened with all of `access`.
Status SimulatedRegistry::Find(RegistryKeyHandle handle, std::uint32_t access,
                               std::shared_ptr<Key>& key) const {
  if (handle == kHKEY_CLASSES_ROOT) {
    key = m_root;
    return Status::Success();
  }
  const auto found = m_open.find(handle);
  if (found == m_open.end()) return Status::Failure(kERROR_INVALID_HANDLE);
  if (found->second.key->deleted) return Status::Failure(kERROR_KEY_DELETED);
  if ((found->second.access & access) != access) return Status::Failure(kERROR_ACCESS_DENIED);
  key = found->second.key;
  return Status::Success();
}

// The names of a path; none for an empty one. A backslash may stand at the end and between names.
Status SimulatedRegistry::Split(const char16_t* path,
                                std::vector<std::u16string_view>& names) const {
  std::u16string_view rest = NameOf(path);
  while (!rest.empty()) {
    const std::u16string_view name = rest.substr(0, rest.find(u'\\'));
    if (name.empty()) return Status::Failure(kERROR_BAD_PATHNAME);
    if (name.size() > kMaxKeyNameChars) return Status::Failure(kERROR_INVALID_PARAMETER);
    names.push_back(name);
    rest.remove_prefix(std::min(name.size() + 1, rest.size()));
  }
  return Status::Success();
}

RegistryKeyHandle SimulatedRegistry::Hand(const std::shared_ptr<Key>& key, std::uint32_t access) {
  const RegistryKeyHandle handle = m_nextHandle;
  m_nextHandle += kKeyStep;
  m_open.emplace(handle, OpenedKey{key, access, PathOf(*key)});
  return handle;
}

Status SimulatedRegistry::CreateKey(RegistryKeyHandle parent, const char16_t* path,
                                    std::uint32_t access, RegistryKeyHandle& key,
                                    std::uint32_t& disposition) noexcept {
  key = kNoRegistryKey;
  const std::lock_guard lock(m_mutex);
  std::shared_ptr<Key> current;
  std::vector<std::u16string_view> names;
  if (const Status status = Find(parent, 0, current); !status) return status;
  if (const Status status = Split(path, names); !status) return status;
  std::size_t levels = names.size();
  for (const Key* above = current.get(); above != nullptr; above = above->parent) ++levels;
  if (levels > kMaxLevels) return Status::Failure(kERROR_INVALID_PARAMETER);

  disposition = kREG_OPENED_EXISTING_KEY;
  for (const std::u16string_view name : names) {
    std::shared_ptr<Key>& next = current->subkeys[ToUpper(name)];
    if (next == nullptr) {
      next = std::make_shared<Key>();
      next->name = name;
      next->parent = current.get();
      disposition = kREG_CREATED_NEW_KEY;
    }
    current = next;
  }
  key = Hand(current, access);
  return Status::Success();
}

Status SimulatedRegistry::OpenKey(RegistryKeyHandle parent, const char16_t* path,
                                  std::uint32_t access, RegistryKeyHandle& key) noexcept {
  key = kNoRegistryKey;
  const std::lock_guard lock(m_mutex);
  std::shared_ptr<Key> current;
  std::vector<std::u16string_view> names;
  if (const Status status = Find(parent, 0, current); !status) return status;
  if (const Status status = Split(path, names); !status) return status;
  for (const std::u16string_view name : names) {
    const auto next = current->subkeys.find(ToUpper(name));
    if (next == current->subkeys.end()) return Status::Failure(kERROR_FILE_NOT_FOUND);
    current = next->second;
  }
  key = Hand(current, access);
  return Status::Success();
}

Status SimulatedRegistry::SetValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t type,
                                   const void* data, std::uint32_t dataBytes) noexcept {
  const std::lock_guard lock(m_mutex);
  std::shared_ptr<Key> found;
  if (const Status status = Find(key, kKEY_SET_VALUE, found); !status) return status;
  const std::u16string_view valueName = NameOf(name);
  if (valueName.size() > kMaxValueNameChars || (data == nullptr && dataBytes != 0)) {
    return Status::Failure(kERROR_INVALID_PARAMETER);
  }
  Value& value = found->values[ToUpper(valueName)];
  if (value.name.empty()) value.name = valueName;
  value.type = type;
  value.bytes.resize(dataBytes);
  if (dataBytes != 0) std::memcpy(value.bytes.data(), data, dataBytes);
  return Status::Success();
}

Status SimulatedRegistry::QueryValue(RegistryKeyHandle key, const char16_t* name,
                                     std::uint32_t* type, void* data,
                                     std::uint32_t& dataBytes) noexcept {
  const std::lock_guard lock(m_mutex);
  std::shared_ptr<Key> found;
  if (const Status status = Find(key, kKEY_QUERY_VALUE, found); !status) return status;
  const auto value = found->values.find(ToUpper(NameOf(name)));
  if (value == found->values.end()) return Status::Failure(kERROR_FILE_NOT_FOUND);
  const std::vector<std::uint8_t>& bytes = value->second.bytes;
  const std::uint32_t room = std::exchange(dataBytes, static_cast<std::uint32_t>(bytes.size()));
  if (type != nullptr) *type = value->second.type;
  if (data == nullptr) return Status::Success();
  if (room < bytes.size()) return Status::Failure(kERROR_MORE_DATA);
  if (!bytes.empty()) std::memcpy(data, bytes.data(), bytes.size());
  return Status::Success();
}

Status SimulatedRegistry::EnumKey(RegistryKeyHandle key, std::uint32_t index, char16_t* name,
                                  std::uint32_t& nameChars) noexcept {
  const std::lock_guard lock(m_mutex);
  std::shared_ptr<Key> found;
  if (const Status status = Find(key, kKEY_ENUMERATE_SUB_KEYS, found); !status) return status;
  if (index >= found->subkeys.size()) return Status::Failure(kERROR_NO_MORE_ITEMS);
  const auto subkey = std::next(found->subkeys.begin(), static_cast<std::ptrdiff_t>(index));
  const std::u16string& text = subkey->second->name;
  if (name == nullptr || nameChars <= text.size()) return Status::Failure(kERROR_MORE_DATA);
  std::copy_n(text.c_str(), text.size() + 1, name);
  nameChars = static_cast<std::uint32_t>(text.size());
  return Status::Success();
}

Status SimulatedRegistry::DeleteKey(RegistryKeyHandle parent, const char16_t* path) noexcept {
  const std::lock_guard lock(m_mutex);
  std::shared_ptr<Key> current;
  std::vector<std::u16string_view> names;
  if (path == nullptr) return Status::Failure(kERROR_INVALID_PARAMETER);
  if (const Status status = Find(parent, 0, current); !status) return status;
  if (const Status status = Split(path, names); !status) return status;
  for (const std::u16string_view name : names) {
    const auto next = current->subkeys.find(ToUpper(name));
    if (next == current->subkeys.end()) return Status::Failure(kERROR_FILE_NOT_FOUND);
    current = next->second;
  }
  if (current == m_root || !current->subkeys.empty()) {
    return Status::Failure(kERROR_ACCESS_DENIED);
  }
  current->deleted = true;
  Key* const above = std::exchange(current->parent, nullptr);
  above->subkeys.erase(ToUpper(current->name));
  return Status::Success();
}

Status SimulatedRegistry::DeleteValue(RegistryKeyHandle key, const char16_t* name) noexcept {
  const std::lock_guard lock(m_mutex);
  std::shared_ptr<Key> found;
  if (const Status status = Find(key, kKEY_SET_VALUE, found); !status) return status;
  if (found->values.erase(ToUpper(NameOf(name))) == 0) {
    return Status::Failure(kERROR_FILE_NOT_FOUND);
  }
  return Status::Success();
}

Status SimulatedRegistry::CloseKey(RegistryKeyHandle key) noexcept {
  if (key == kHKEY_CLASSES_ROOT) return Status::Success();
  const std::lock_guard lock(m_mutex);
  const auto found = m_open.find(key);
  if (found != m_open.end()) {
    m_closed.emplace(key, std::move(found->second.path));
    m_open.erase(found);
    return Status::Success();
  }
  const auto closed = m_closed.find(key);
  m_misuses.push_back(closed == m_closed.end()
                          ? std::u16string(u"close of what never was a key")
                          : std::u16string(u"second close of ").append(closed->second));
  return Status::Failure(kERROR_INVALID_HANDLE);
}

std::u16string SimulatedRegistry::PathOf(const Key& key) {
  std::u16string path = key.name;
  for (const Key* above = key.parent; above != nullptr; above = above->parent) {
    path.insert(0, 1, u'\\').insert(0, above->name);
  }
  return path;
}

void SimulatedRegistry::AddLines(const Key& key, std::vector<std::u16string>& lines) {
  const std::u16string path = PathOf(key);
  if (key.parent != nullptr) lines.push_back(path);
  for (const auto& [upper, value] : key.values) {
    std::u16string line = path;
    line.append(u"  ").append(value.name.empty() ? u"(default)" : value.name).append(u" = ");
    lines.push_back(line.append(DataText(value.type, value.bytes)));
  }
  for (const auto& [upper, subkey] : key.subkeys) AddLines(*subkey, lines);
}

std::vector<std::u16string> SimulatedRegistry::Snapshot() const {
  const std::lock_guard lock(m_mutex);
  std::vector<std::u16string> lines;
  AddLines(*m_root, lines);
  return lines;
}

std::vector<std::u16string> SimulatedRegistry::OpenKeys() const {
  const std::lock_guard lock(m_mutex);
  std::vector<std::u16string> paths;
  for (const auto& [handle, opened] : m_open) paths.push_back(opened.path);
  return paths;
}

std::vector<std::u16string> SimulatedRegistry::Misuses() const {
  const std::lock_guard lock(m_mutex);
  return m_misuses;
}

}  // namespace platform::simulated
