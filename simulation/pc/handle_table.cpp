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
  const std::uint32_t number = known.first->second;
  const std::intptr_t handle =
      kFirstHandle + kHandleStep * static_cast<std::intptr_t>(m_handedOut++);
  m_slots.push_back({static_cast<std::uint32_t>(object.index()), number});
  if (m_slots.size() > kRemembered) m_slots.pop_front();
  m_open.emplace(handle, OpenEntry{std::move(object), number});
  return handle;
}

bool HandleTable::WasHandedOut(std::intptr_t handle) const {
  if (handle < kFirstHandle || (handle - kFirstHandle) % kHandleStep != 0) return false;
  return static_cast<std::uint64_t>((handle - kFirstHandle) / kHandleStep) < m_handedOut;
}

Text HandleTable::Describe(std::size_t kind, std::uint32_t name) const {
  Text text(KindName(kind));
  return m_names[name].empty() ? text : text + u" " + m_names[name];
}

Text HandleTable::DescribeClosed(std::intptr_t handle) const {
  const auto number = static_cast<std::uint64_t>((handle - kFirstHandle) / kHandleStep);
  const std::uint64_t first = m_handedOut - m_slots.size();
  if (number < first) return u"what was closed long ago";
  const Slot& slot = m_slots[static_cast<std::size_t>(number - first)];
  return Describe(slot.kind, slot.name);
}

Status HandleTable::Refuse(std::intptr_t handle, std::u16string_view closedAs) {
  if (const auto open = m_open.find(handle); open != m_open.end()) {
    const auto& [object, name] = open->second;
    m_misuses.push_back(u"close of " + Describe(object.index(), name) + u" as " + Text(closedAs));
  } else if (WasHandedOut(handle)) {
    m_misuses.push_back(u"second close of " + DescribeClosed(handle));
  } else {
    m_misuses.push_back(u"close of what never was a handle, as " + Text(closedAs));
  }
  return Status::Failure(kERROR_INVALID_HANDLE);
}

OpenCounts HandleTable::Counts() const {
  OpenCounts counts;
  for (const auto& [handle, open] : m_open) {
    const OpenObject& object = open.object;
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
  for (const auto& [handle, open] : m_open) {
    names.push_back(Describe(open.object.index(), open.name));
  }
  return names;
}

}  // namespace platform::simulated
