#include "tree/publication.h"

#include <algorithm>
#include <cstdint>
#include <utility>

#include "devinfo/info_device_linking.h"
#include "platform/text.h"
#include "records/devnode.h"

namespace KelvoUHW {

namespace {

platform::FlatTextSet IdsOf(const DeviceList& list) {
  platform::FlatTextSet ids;
  for (const NodePtr& node : list) ids.Insert(node->m_strDevInstId);
  return ids;
}

}  // namespace

Publication::Publication(platform::DeviceManager& manager, InfoDeviceCache& devices,
                         const std::vector<NodePtr>& interfaceDevices, NodePtr building,
                         NodePtr published)
    : m_manager(manager),
      m_devices(devices),
      m_interfaceDevices(interfaceDevices),
      m_building(std::move(building)),
      m_published(std::move(published)) {}

void Publication::Run(DeviceLists& lists) {
  // A record that came back still held the children of its first stay, and refused the same nodes
  // of the second as being there already; those it forgot have made room.
  if (ForgetWhatLeft()) LinkToParents(m_devices.Current());
  AttachInterfaceDevices();

  TreeIndex index(m_building);
  DeviceList connected = MatchAll(m_devices.Current(), index);
  DeviceList attached = MatchAll(m_devices.Added(), index);

  // Nobody asks whether a record hangs anywhere. Deliberate: it is published all the same.
  DeviceList removed;
  if (m_published) {
    // Neither changes anything, since every class of node keeps its nodes. This is deliberate.
    PruneTree(m_published);
    AcceptsAll(m_published);
    removed = RemovedDevices();
  }
  DeviceList modified = ModifiedDevices(attached, index);
  DeviceList connectedCopy = connected;

  lists[kConnectedList].swap(connected);
  lists[kAttachedList].swap(attached);
  if (m_published) lists[kRemovedList].swap(removed);
  lists[kModifiedList].swap(modified);
  lists[kConnectedCopyList].swap(connectedCopy);
}

// Device records live on from build to build and only ever gain children. What is no longer there
// has to go, or a swapped card would go on showing the first card's volume. Removed records are
// left alone: they say what went with them. Returns whether anything had to go.
bool Publication::ForgetWhatLeft() {
  const InfoDeviceSet& current = m_devices.Current();
  bool forgotten = false;
  for (const InfoDevicePtr& record : current) {
    const std::size_t gone = std::erase_if(record->m_childs, [&](const NodePtr& child) {
      if (!child) return true;
      const bool leaves = child->m_nType == KUDTInterfaceDevice ||
                          (child->m_nType == KUDTInfoDevice && !current.HasRecord(child.Get()));
      if (leaves) child->m_pParent.ClearIfNaming(record.Get());
      return leaves;
    });
    forgotten = forgotten || gone != 0;
  }
  return forgotten;
}

void Publication::AttachInterfaceDevices() {
  for (const NodePtr& device : m_interfaceDevices) m_devices.AttachToParentInfoDevice(device);
}

DeviceList Publication::MatchAll(const InfoDeviceSet& entries, TreeIndex& index) {
  DeviceList list;
  for (const InfoDevicePtr& entry : entries) {
    const NodePtr found = index.FindPortDevice(entry->m_strDevInstId);
    if (!found) continue;
    Merge(entry, static_cast<CZKUMPortDeviceImpl&>(*found), index);
    list.push_back(found);
  }
  return list;
}

void Publication::Merge(const InfoDevicePtr& entry, CZKUMPortDeviceImpl& device, TreeIndex& index) {
  if (device.m_infoDevice && device.m_infoDevice != entry) {
    device.m_infoDevice->m_pParent.ClearIfNaming(device.m_pParent);
  }
  device.m_infoDevice = entry;
  // The entry's parent is the hub port and not the device it belongs to. This is deliberate.
  entry->m_pParent = static_cast<CZKUMUsbTreeNodeImpl*>(device.m_pParent);
  for (const NodePtr& child : entry->m_childs) {
    const std::size_t before = device.m_childs.size();  // nothing comes of an empty pointer
    AddChild(child, &device);
    if (device.m_childs.size() != before) index.Added(child);
  }
  IdentifyHubs(entry, device, index);
}

// The hubs above the device take their device-manager identity from the parents of its entry, one
// device-manager level for each hub, up to the first ancestor that is no hub.
void Publication::IdentifyHubs(const InfoDevicePtr& entry, CZKUMPortDeviceImpl& device,
                               TreeIndex& index) {
  const auto twoAbove = [](const CZKUMUsbTreeNodeImpl& node) -> CZKUMUsbTreeNodeImpl* {
    return node.m_pParent ? static_cast<CZKUMUsbTreeNodeImpl*>(node.m_pParent->m_pParent) : nullptr;
  };
  const CZKUMUsbTreeNodeImpl* node = entry.Get();
  CZKUMUsbTreeNodeImpl* hub = twoAbove(device);
  while (hub != nullptr && hub->m_nType == KUDTHub) {
    const bool asBefore = hub->m_devInstHandle == node->m_devInstHandleParent &&
                          platform::SameText(hub->m_strDevInstId, node->m_strDevInstIdParent);
    if (!asBefore || !m_identified.contains(hub)) {
      const std::u16string earlierId = hub->m_strDevInstId;
      hub->m_devInstHandle = node->m_devInstHandleParent;
      hub->SetInstanceId(node->m_strDevInstIdParent);
      ResolveParentInstanceId(m_manager, *hub);
      index.Renamed(*hub, earlierId);
      // A parent that could not be told is asked for again.
      if (!hub->m_strDevInstIdParent.empty()) m_identified.insert(hub);
    }
    node = hub;
    hub = twoAbove(*hub);
  }
}

DeviceList Publication::RemovedDevices() {
  DeviceList removed;
  if (!m_devices.Removed().empty()) {
    TreeIndex index(m_published);
    removed = MatchAll(m_devices.Removed(), index);
  }
  platform::FlatTextSet known = IdsOf(removed);
  platform::FlatTextSet present;
  VisitPreOrder(m_building, [&](const NodePtr& node) {
    if (node->m_nType == KUDTPortDevice) present.Insert(node->m_strDevInstId);
    return true;
  });
  VisitPreOrder(m_published, [&](const NodePtr& node) {
    if (node->m_nType == KUDTPortDevice && !present.Contains(node->m_strDevInstId) &&
        known.Insert(node->m_strDevInstId)) {
      removed.push_back(node);
    }
    return true;
  });
  return removed;
}

DeviceList Publication::ModifiedDevices(const DeviceList& attached, const TreeIndex& index) {
  DeviceList modified;
  const platform::FlatTextSet attachedIds = IdsOf(attached);
  platform::FlatTextSet modifiedIds;
  HubPortClimbs climbs;
  const auto append = [&](const std::u16string& instanceId) {
    NodePtr node = index.Find(instanceId);
    if (!node) return;
    modifiedIds.Insert(instanceId);
    modified.push_back(std::move(node));
  };
  for (const InfoDevicePtr& entry : m_devices.Added()) {
    const CZKUMUsbTreeNodeImpl* below = climbs.From(entry->m_pParent);
    if (below == nullptr || below->m_nType != KUDTPortDevice) continue;
    const std::u16string& id = below->m_strDevInstId;
    if (!attachedIds.Contains(id) && !modifiedIds.Contains(id)) append(id);
  }
  // A device is appended here once for each of its volumes, however often it is listed already.
  // This is deliberate.
  for (const NodePtr& device : m_interfaceDevices) {
    const CZKUMUsbTreeNodeImpl* below = climbs.From(device->m_pParent);
    if (below != nullptr && !attachedIds.Contains(below->m_strDevInstId)) {
      append(below->m_strDevInstId);
    }
  }
  return modified;
}

CZKUMUsbTreeNodeImpl* HubPortClimbs::From(CZKUMUsbTreeNodeImpl* start) {
  const std::size_t firstOfWay = m_climbs.size();
  CZKUMUsbTreeNodeImpl* found = nullptr;
  for (CZKUMUsbTreeNodeImpl* node = start; node != nullptr && found == nullptr;) {
    ++m_nSteps;
    const std::size_t hash = platform::HashOf(reinterpret_cast<std::uintptr_t>(node));
    const auto isNode = [&](auto entry) { return m_climbs[entry].node == node; };
    if (const auto known = m_index.First(hash, isNode); known != platform::FlatIndex::kNone) {
      found = m_climbs[known].found;
      break;
    }
    // Nothing is known yet of what is on the way: a circle of parents would end here.
    m_climbs.push_back({node, nullptr});
    m_index.Add(hash, static_cast<platform::FlatIndex::Entry>(m_climbs.size() - 1), isNode);
    CZKUMUsbTreeNodeImpl* parent = node->m_pParent;
    if (parent != nullptr && parent->m_nType == KUDTHubPort) found = node;
    node = parent;
  }
  for (std::size_t i = firstOfWay; i < m_climbs.size(); ++i) m_climbs[i].found = found;
  return found;
}

bool ReachesRoot(const CZKUMUsbTreeNodeImpl& record) noexcept {
  const CZKUMUsbTreeNodeImpl* node = &record;
  while (const CZKUMUsbTreeNodeImpl* parent = node->m_pParent) node = parent;
  return node->m_nType == KUDTRoot;
}

bool PruneTree(const NodePtr& root) {
  if (!root->AcceptNode(root)) return false;
  struct Scan {
    CZKUMUsbTreeNodeImpl* node;
    std::size_t next;
  };
  std::vector<Scan> path{{root.Get(), 0}};
  while (!path.empty()) {
    auto& [node, next] = path.back();
    if (next == node->m_childs.size()) {
      path.pop_back();
      continue;
    }
    const NodePtr& child = node->m_childs[next];
    if (!child) {
      ++next;
    } else if (child->AcceptNode(child)) {
      CZKUMUsbTreeNodeImpl* below = child.Get();
      ++next;
      path.push_back({below, 0});
    } else {
      // The scan of this list starts again, since whether a node is kept may depend on what went.
      node->m_childs.erase(node->m_childs.begin() + static_cast<std::ptrdiff_t>(next));
      next = 0;
    }
  }
  return true;
}

bool AcceptsAll(const NodePtr& root) {
  bool all = true;
  VisitPreOrder(root, [&](const NodePtr& node) { return all = node->AcceptNode(node); });
  return all;
}

}  // namespace KelvoUHW
