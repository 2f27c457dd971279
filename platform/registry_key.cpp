#include "platform/registry_key.h"

#include <array>
#include <utility>
#include <vector>

#include "platform/text.h"

namespace platform {

RegistryKey::RegistryKey(RegistryKey&& other) noexcept
    : m_registry(other.m_registry), m_key(std::exchange(other.m_key, kNoRegistryKey)) {}

RegistryKey& RegistryKey::operator=(RegistryKey&& other) noexcept {
  if (this != &other) {
    Close();
    m_registry = other.m_registry;
    m_key = std::exchange(other.m_key, kNoRegistryKey);
  }
  return *this;
}

void RegistryKey::Close() noexcept {
  const RegistryKeyHandle key = std::exchange(m_key, kNoRegistryKey);
  if (key != kNoRegistryKey && key != kHKEY_CLASSES_ROOT) m_registry->CloseKey(key);
}

Status RegistryKey::Create(RegistryKeyHandle parent, const char16_t* path) noexcept {
  RegistryKey next(*m_registry);
  std::uint32_t disposition = 0;
  const Status status =
      m_registry->CreateKey(parent, path, kKEY_READ | kKEY_WRITE, next.m_key, disposition);
  *this = std::move(next);
  return status;
}

Status RegistryKey::Open(RegistryKeyHandle parent, const char16_t* path) noexcept {
  RegistryKey next(*m_registry);
  const Status status = m_registry->OpenKey(parent, path, kKEY_READ | kKEY_WRITE, next.m_key);
  *this = std::move(next);
  return status;
}

Status RegistryKey::SetText(const std::u16string& name, const std::u16string& text) noexcept {
  return m_registry->SetValue(m_key, name.c_str(), kREG_SZ, text.c_str(),
                              static_cast<std::uint32_t>((text.size() + 1) * sizeof(char16_t)));
}

Status RegistryKey::Text(const char16_t* name, std::u16string& text) const {
  // Asked for again when someone wrote a longer value between the two questions.
  for (std::uint32_t bytes = 0;;) {
    std::uint32_t type = 0;
    Status status = m_registry->QueryValue(m_key, name, &type, nullptr, bytes);
    if (!status) return status;
    if (type != kREG_SZ) return Status::Failure(kERROR_INVALID_DATA);
    std::u16string buffer(bytes / sizeof(char16_t) + 1, u'\0');
    bytes = static_cast<std::uint32_t>(buffer.size() * sizeof(char16_t));
    status = m_registry->QueryValue(m_key, name, &type, buffer.data(), bytes);
    if (!status && status.error == kERROR_MORE_DATA) continue;
    if (!status) return status;
    if (type != kREG_SZ) return Status::Failure(kERROR_INVALID_DATA);
    buffer.resize(bytes / sizeof(char16_t));
    text = UpToZero(buffer);
    return status;
  }
}

Status RegistryKey::FirstSubkey(std::u16string& name) const {
  std::array<char16_t, kMaxKeyNameChars + 1> buffer{};
  auto chars = static_cast<std::uint32_t>(buffer.size());
  const Status status = m_registry->EnumKey(m_key, 0, buffer.data(), chars);
  if (status) name.assign(buffer.data(), chars);
  return status;
}

Status RegistryKey::DeleteTree(const std::u16string& name) {
  struct Level {
    RegistryKey key;
    std::u16string name;
  };
  std::vector<Level> path;
  std::u16string next = name;
  for (;;) {
    const RegistryKeyHandle above = path.empty() ? m_key : path.back().key.m_key;
    if (!next.empty()) {
      RegistryKey key(*m_registry);
      if (const Status status = key.Open(above, next.c_str()); !status) {
        // Listed and not to be found: its name holds a zero, and its tree must not pass for gone.
        const bool hidden = !path.empty() && status.error == kERROR_FILE_NOT_FOUND;
        return hidden ? Status::Failure(kERROR_ACCESS_DENIED) : status;
      }
      path.push_back({std::move(key), std::exchange(next, {})});
    }
    const Status status = path.back().key.FirstSubkey(next);
    if (status) continue;
    if (status.error != kERROR_NO_MORE_ITEMS) return status;

    const std::u16string emptied = std::move(path.back().name);
    path.pop_back();
    const Status deleted =
        m_registry->DeleteKey(path.empty() ? m_key : path.back().key.m_key, emptied.c_str());
    if (!deleted || path.empty()) return deleted;
  }
}

}  // namespace platform
