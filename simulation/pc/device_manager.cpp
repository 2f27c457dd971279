#include <cstring>
#include <optional>

#include "simulation/pc/state.h"

namespace platform::simulated {
namespace {

// The number of a node that a walk came to, or that there is none.
Status GiveNode(const MachineIndex& index, MachineIndex::Position position, DevInst& node) {
  if (position == MachineIndex::kNone) return Status::Failure(kCR_NO_SUCH_DEVNODE);
  node = index.NumberOf(position);
  return Status::Success();
}

}  // namespace

Status SimulatedPc::LocateRootDevNode(DevInst& node) noexcept {
  node = kRootDeviceNumber;
  return Status::Success();
}

Status SimulatedPc::GetParent(DevInst node, DevInst& parent) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const MachineIndex& index = m_state->now->index;
  const MachineIndex::Position position = index.DeviceByNumber(node);
  if (position == MachineIndex::kNone) return Status::Failure(kCR_INVALID_DEVNODE);
  return GiveNode(index, index.Parent(position), parent);
}

Status SimulatedPc::GetChild(DevInst node, DevInst& child) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const MachineIndex& index = m_state->now->index;
  const MachineIndex::Position position = index.DeviceByNumber(node);
  if (position == MachineIndex::kNone) return Status::Failure(kCR_INVALID_DEVNODE);
  return GiveNode(index, index.FirstChild(position), child);
}

Status SimulatedPc::GetSibling(DevInst node, DevInst& sibling) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const MachineIndex& index = m_state->now->index;
  const MachineIndex::Position position = index.DeviceByNumber(node);
  if (position == MachineIndex::kNone) return Status::Failure(kCR_INVALID_DEVNODE);
  return GiveNode(index, index.NextSibling(position), sibling);
}

Status SimulatedPc::GetDeviceId(DevInst node, char16_t* buffer,
                                std::uint32_t bufferChars) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const IndexedMachine& now = *m_state->now;
  const MachineIndex::Position position = now.index.DeviceByNumber(node);
  if (position == MachineIndex::kNone) return Status::Failure(kCR_INVALID_DEVNODE);
  const std::u16string_view id =
      position == MachineIndex::kRoot ? kRootDeviceId : now.properties.Id(position);
  if (buffer == nullptr || id.size() >= bufferChars) return Status::Failure(kCR_BUFFER_SMALL);
  id.copy(buffer, id.size());
  buffer[id.size()] = u'\0';
  return Status::Success();
}

Status SimulatedPc::GetDevNodeRegistryProperty(DevInst node, std::uint32_t property,
                                               std::uint32_t* type, void* buffer,
                                               std::uint32_t& bytes) noexcept {
  const std::lock_guard lock(m_state->mutex);
  const IndexedMachine& now = *m_state->now;
  const MachineIndex::Position position = now.index.DeviceByNumber(node);
  if (position == MachineIndex::kNone) return Status::Failure(kCR_INVALID_DEVNODE);
  if (position == MachineIndex::kRoot) return Status::Failure(kCR_NO_SUCH_VALUE);
  // These properties count from one; zero wraps to a number that no property has.
  const std::optional<PropertyValue> value = now.properties.Value(position, property - 1);
  if (!value) return Status::Failure(kCR_NO_SUCH_VALUE);
  const bool fits = buffer != nullptr && bytes >= value->bytes.size();
  // Type and size are told in both cases: with them the caller finds a buffer that is large enough.
  if (type != nullptr) *type = value->type;
  bytes = static_cast<std::uint32_t>(value->bytes.size());
  if (!fits) return Status::Failure(kCR_BUFFER_SMALL);
  std::memcpy(buffer, value->bytes.data(), value->bytes.size());
  return Status::Success();
}

}  // namespace platform::simulated
