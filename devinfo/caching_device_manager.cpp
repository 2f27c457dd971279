#include "devinfo/caching_device_manager.h"

#include <algorithm>
#include <new>

#include "platform/text.h"

namespace KelvoUHW {

namespace {

// No memory to remember an answer is no reason to lose it.
template <class Map, class Value>
void Remember(Map& map, platform::DevInst node, const Value& value) noexcept {
  try {
    map.try_emplace(node, value);
  } catch (const std::bad_alloc&) {
  }
}

}  // namespace

platform::Status CachingDeviceManager::LocateRootDevNode(platform::DevInst& node) noexcept {
  return m_base.LocateRootDevNode(node);
}

platform::Status CachingDeviceManager::GetParent(platform::DevInst node,
                                                 platform::DevInst& parent) noexcept {
  if (const auto known = m_parents.find(node); known != m_parents.end()) {
    parent = known->second;
    return platform::Status::Success();
  }
  const platform::Status status = m_base.GetParent(node, parent);
  if (status) Remember(m_parents, node, parent);
  return status;
}

platform::Status CachingDeviceManager::GetChild(platform::DevInst node,
                                                platform::DevInst& child) noexcept {
  return m_base.GetChild(node, child);
}

platform::Status CachingDeviceManager::GetSibling(platform::DevInst node,
                                                  platform::DevInst& sibling) noexcept {
  return m_base.GetSibling(node, sibling);
}

platform::Status CachingDeviceManager::GetDeviceId(platform::DevInst node, char16_t* buffer,
                                                   std::uint32_t bufferChars) noexcept {
  if (const auto known = m_ids.find(node);
      known != m_ids.end() && known->second.size() < bufferChars) {
    *std::copy(known->second.begin(), known->second.end(), buffer) = u'\0';
    return platform::Status::Success();
  }
  const platform::Status status = m_base.GetDeviceId(node, buffer, bufferChars);
  if (status) Remember(m_ids, node, platform::UpToZero({buffer, bufferChars}));
  return status;
}

platform::Status CachingDeviceManager::GetDevNodeRegistryProperty(platform::DevInst node,
                                                                  std::uint32_t property,
                                                                  std::uint32_t* type, void* buffer,
                                                                  std::uint32_t& bytes) noexcept {
  return m_base.GetDevNodeRegistryProperty(node, property, type, buffer, bytes);
}

}  // namespace KelvoUHW
