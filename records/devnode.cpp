#include "records/devnode.h"

#include <algorithm>
#include <array>
#include <optional>
#include <string_view>
#include <utility>

#include "platform/flat_index.h"
#include "platform/text.h"
#include "records/device_set.h"
#include "records/received_text.h"

namespace KelvoUHW {

namespace {

constexpr std::size_t kTextChars = 200;

// Walks for one key before it is answered from one that broke off, and for all keys of a build.
constexpr int kWalksInARow = 3;
constexpr int kMostWalks = 300;

using TextBuffer = std::array<char16_t, kTextChars>;

// A text property of a node, in `buffer`; nothing when the call fails.
std::optional<std::u16string_view> ReadTextProperty(platform::DeviceManager& manager,
                                                    platform::DevInst node, std::uint32_t property,
                                                    TextBuffer& buffer) {
  buffer.fill(u'\0');
  static_assert(sizeof buffer == 400);
  std::uint32_t bytes = sizeof buffer;
  std::uint32_t type = 0;
  if (!manager.GetDevNodeRegistryProperty(node, property, &type, buffer.data(), bytes)) {
    return std::nullopt;
  }
  const std::size_t received = std::min<std::size_t>(bytes / sizeof(char16_t), buffer.size());
  std::fill(buffer.begin() + static_cast<std::ptrdiff_t>(received), buffer.end(), u'\0');
  return ReceivedView(buffer);
}

// As GetDeviceId, into a text whose memory is used again.
void ReadDeviceId(platform::DeviceManager& manager, platform::DevInst node, std::u16string& id) {
  id.clear();
  if (node == 0 || node == kUnknownDevInst) return;
  TextBuffer buffer{};
  if (!manager.GetDeviceId(node, buffer.data(), static_cast<std::uint32_t>(buffer.size()))) return;
  id = ReceivedView(buffer).value_or(u"");
  id = platform::Replaced(std::move(id), u'/', u'\\');
}

// The part of a driver key before its last backslash; all of it where it has none.
std::u16string_view ClassOf(std::u16string_view key) noexcept {
  return key.substr(0, key.rfind(u'\\'));
}

// Calls `visit` with each node, depth first from the root, until it returns true. The way up asks
// the system for the parent: a node without one ends the walk, as the root does. No two nodes are
// visited or climbed to twice, so the walk ends on a system that answers in circles, and one on
// which new nodes never end is left at kMostElements.
//
// False where a walk ended anywhere but at the root: a device that went while it was looked at has
// neither sibling nor parent any more, and what comes behind it was not seen.
template <class Visit>
bool WalkDevNodes(platform::DeviceManager& manager, Visit visit) {
  platform::FlatNumberSet visited;
  platform::FlatNumberSet climbedTo;
  platform::DevInst root = 0;
  if (!manager.LocateRootDevNode(root) || root == 0) return false;
  platform::DevInst node = root;
  for (std::uint32_t seen = 0; seen < kMostElements; ++seen) {
    if (!visited.Insert(node)) return false;
    if (visit(node)) return true;
    platform::DevInst next = 0;
    // A handle of 0 is no node, whatever the result code says.
    if (manager.GetChild(node, next) && next != 0) {
      node = next;
      continue;
    }
    while (next = 0, !manager.GetSibling(node, next) || next == 0) {
      platform::DevInst parent = 0;
      if (!manager.GetParent(node, parent) || parent == 0) return node == root;
      if (!climbedTo.Insert(parent)) return false;
      node = parent;
    }
    node = next;
  }
  return true;
}

}  // namespace

std::u16string GetDeviceDescription(platform::DeviceManager& manager, platform::DevInst node) {
  if (node == 0) return {};
  TextBuffer buffer;
  return std::u16string(
      ReadTextProperty(manager, node, platform::kCM_DRP_DEVICEDESC, buffer).value_or(u""));
}

std::u16string GetDeviceId(platform::DeviceManager& manager, platform::DevInst node) {
  std::u16string id;
  ReadDeviceId(manager, node, id);
  return id;
}

bool ReadParent(platform::DeviceManager& manager, NodeIdentity& node) {
  manager.GetParent(node.m_devInstHandle, node.m_devInstHandleParent);
  ReadDeviceId(manager, node.m_devInstHandleParent, node.m_strDevInstIdParent);
  return node.m_strDevInstIdParent.starts_with(u"ROOT\\VOLMGR\\");
}

void ResolveParentInstanceId(platform::DeviceManager& manager, NodeIdentity& node) {
  if (ReadParent(manager, node)) NameDiskAsParent(node);
}

void NameDiskAsParent(NodeIdentity& node) {
  if (auto diskId = DiskIdOfVolumeId(node.m_strDevInstId)) {
    node.m_strDevInstIdParent = *std::move(diskId);
  }
}

platform::DevInst FindDevNodeByDriverKey(platform::DeviceManager& manager,
                                         const std::u16string& driverKey) {
  platform::DevInst found = 0;
  WalkDevNodes(manager, [&](platform::DevInst node) {
    TextBuffer buffer;
    const auto key = ReadTextProperty(manager, node, platform::kCM_DRP_DRIVER, buffer);
    if (!key || !platform::EqualIgnoringCase(*key, driverKey)) return false;
    found = node;
    return true;
  });
  return found;
}

platform::DevInst DriverKeyIndex::Find(const std::u16string& driverKey) {
  for (int walks = 0; !m_complete && walks < kWalksInARow && m_walks < kMostWalks; ++walks) Fill();
  platform::ToLower(driverKey, m_lowered);
  const auto found = m_index.First(platform::HashOf(m_lowered),
                                   [&](auto entry) { return IsKeyOf(entry, m_lowered); });
  return found == platform::FlatIndex::kNone ? 0 : m_nodes[found].handle;
}

void DriverKeyIndex::Fill() {
  m_nodes.clear();
  m_rests.clear();
  m_index.Clear();
  ++m_walks;
  m_complete = WalkDevNodes(m_manager, [this](platform::DevInst node) {
    TextBuffer buffer;
    if (const auto key = ReadTextProperty(m_manager, node, platform::kCM_DRP_DRIVER, buffer)) {
      platform::ToLower(*key, m_lowered);
      Add(m_lowered, node);
    }
    return false;
  });
}

// A key that an earlier node has is entered behind that one, and never found.
void DriverKeyIndex::Add(std::u16string_view key, platform::DevInst node) {
  const std::u16string_view keyClass = ClassOf(key);
  const std::u16string_view rest = key.substr(keyClass.size());
  m_nodes.push_back({static_cast<std::uint32_t>(m_rests.size()),
                     static_cast<std::uint32_t>(rest.size()), PlaceOfClass(keyClass), node});
  m_rests += rest;
  m_index.Add(platform::HashOf(key), static_cast<platform::FlatIndex::Entry>(m_nodes.size() - 1),
              [&](auto entry) { return IsKeyOf(entry, key); });
}

std::uint32_t DriverKeyIndex::PlaceOfClass(std::u16string_view keyClass) {
  const std::size_t hash = platform::HashOf(keyClass);
  const auto same = [&](auto entry) { return m_classes[entry] == keyClass; };
  const auto known = m_classIndex.First(hash, same);
  if (known != platform::FlatIndex::kNone) return known;
  const auto place = static_cast<std::uint32_t>(m_classes.size());
  m_classes.emplace_back(keyClass);
  m_classIndex.Add(hash, place, same);
  return place;
}

bool DriverKeyIndex::IsKeyOf(platform::FlatIndex::Entry entry,
                             std::u16string_view key) const noexcept {
  const Node& node = m_nodes[entry];
  const std::u16string_view keyClass = m_classes[node.keyClass];
  return key.starts_with(keyClass) &&
         key.substr(keyClass.size()) ==
             std::u16string_view(m_rests).substr(node.restBegin, node.restChars);
}

}  // namespace KelvoUHW
