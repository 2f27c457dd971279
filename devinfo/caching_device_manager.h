// A device manager that asks the system for each parent and each id once.
#pragma once

#include <string>
#include <unordered_map>

#include "platform/host.h"

namespace KelvoUHW {

// Serves one pass over a PC that is taken not to change meanwhile. What succeeded is remembered;
// a failure is asked again. Everything else is passed on. One thread at a time.
class CachingDeviceManager final : public platform::DeviceManager {
 public:
  explicit CachingDeviceManager(platform::DeviceManager& base) noexcept : m_base(base) {}

  platform::Status LocateRootDevNode(platform::DevInst& node) noexcept override;
  platform::Status GetParent(platform::DevInst node, platform::DevInst& parent) noexcept override;
  platform::Status GetChild(platform::DevInst node, platform::DevInst& child) noexcept override;
  platform::Status GetSibling(platform::DevInst node, platform::DevInst& sibling) noexcept override;
  platform::Status GetDeviceId(platform::DevInst node, char16_t* buffer,
                               std::uint32_t bufferChars) noexcept override;
  platform::Status GetDevNodeRegistryProperty(platform::DevInst node, std::uint32_t property,
                                              std::uint32_t* type, void* buffer,
                                              std::uint32_t& bytes) noexcept override;

 private:
  platform::DeviceManager& m_base;
  std::unordered_map<platform::DevInst, platform::DevInst> m_parents;
  std::unordered_map<platform::DevInst, std::u16string> m_ids;
};

}  // namespace KelvoUHW
