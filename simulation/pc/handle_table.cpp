#include "simulation/pc/handle_table.h"

#include <array>
#include <utility>

#include "platform/text.h"

namespace platform::simulated {
namespace {

// Multiples of four, as the system's; the start keeps clear of small numbers that a caller could
// mix up with an index.
constexpr std::intptr_t kFirstHandle = 0x1000;
constexpr std::intptr_t kHandleStep = 4;

}  // namespace

std::u16string_view HandleTable::KindName(std::size_t kind) {
  static constexpr std::array<std::u16string_view, std::variant_size_v<OpenObject>> kNames = {
      u"file", u"set", u"image list", u"volume search", u"mount-point search"};
  return kNames[kind];
}

std::intptr_t HandleTable::Open(OpenObject object, const Text& name) {
  const auto known = m_nameNumbers.try_emplace(name, static_cast<std::uint32_t>(m_names.size()));
  if (known.second) m_names.push_back(name);
  const std::intptr_t handle =
      kFirstHandle + kHandleStep * static_cast<std::intptr_t>(m_slots.size());
  m_slots.push_back({static_cast<std::uint32_t>(object.index()), known.first->second});
  m_open.emplace(handle, std::move(object));
  return handle;
}

const HandleTable::Slot* HandleTable::SlotOf(std::intptr_t handle) const {
  if (handle < kFirstHandle || (handle - kFirstHandle) % kHandleStep != 0) return nullptr;
  const auto number = static_cast<std::size_t>((handle - kFirstHandle) / kHandleStep);
  return number < m_slots.size() ? &m_slots[number] : nullptr;
}

Text HandleTable::Describe(std::intptr_t handle) const {
  const Slot& slot = *SlotOf(handle);
  Text text(KindName(slot.kind));
  const Text& name = m_names[slot.name];
  return name.empty() ? text : text + u" " + name;
}

Status HandleTable::Refuse(std::intptr_t handle, std::u16string_view closedAs) {
  const Slot* slot = SlotOf(handle);
  if (slot == nullptr) {
    m_misuses.push_back(u"close of what never was a handle, as " + Text(closedAs));
  } else if (!m_open.contains(handle)) {
    m_misuses.push_back(u"second close of " + Describe(handle));
  } else {
    m_misuses.push_back(u"close of " + Describe(handle) + u" as " + Text(closedAs));
  }
  return Status::Failure(kERROR_INVALID_HANDLE);
}

OpenCounts HandleTable::Counts() const {
  OpenCounts counts;
  for (const auto& [handle, object] : m_open) {
    if (std::holds_alternative<OpenFile>(object)) {
      ++counts.files;
    } else if (std::holds_alternative<OpenSet>(object)) {
      ++counts.sets;
    } else if (std::holds_alternative<OpenImageList>(object)) {
      ++counts.imageLists;
    } else {
      ++counts.searches;
    }
  }
  return counts;
}

std::vector<Text> HandleTable::OpenNames() const {
  std::vector<Text> names;
  for (const auto& [handle, object] : m_open) names.push_back(Describe(handle));
  return names;
}

}  // namespace platform::simulated
