// The passes that turn a built tree into a published one.
#pragma once

#include <cstddef>
#include <string>
#include <unordered_set>
#include <vector>

#include "devinfo/info_device_cache.h"
#include "platform/flat_index.h"
#include "platform/host.h"
#include "records/device_lists.h"
#include "records/node.h"
#include "records/port_device.h"
#include "tree/tree_index.h"

namespace KelvoUHW {

// Joins one build's results, by one thread. Writes into the nodes of the building tree, of the
// published one (list 2 only) and into the device records; the lists are handed out at the end, so
// that a build that runs out of memory leaves the published ones as they were.
class Publication {
 public:
  // `published` is the tree that is current, empty on the first build. `interfaceDevices` are the
  // storage records of this build.
  Publication(platform::DeviceManager& manager, InfoDeviceCache& devices,
              const std::vector<NodePtr>& interfaceDevices, NodePtr building, NodePtr published);

  // Runs the passes and refills `lists`; the list of removed devices stays as it is on a first
  // build.
  void Run(DeviceLists& lists);

 private:
  bool ForgetWhatLeft();
  void AttachInterfaceDevices();
  DeviceList MatchAll(const InfoDeviceSet& entries, TreeIndex& index);
  void Merge(const InfoDevicePtr& entry, CZKUMPortDeviceImpl& device, TreeIndex& index);
  void IdentifyHubs(const InfoDevicePtr& entry, CZKUMPortDeviceImpl& device, TreeIndex& index);
  DeviceList RemovedDevices();
  DeviceList ModifiedDevices(const DeviceList& attached, const TreeIndex& index);

  platform::DeviceManager& m_manager;
  InfoDeviceCache& m_devices;
  const std::vector<NodePtr>& m_interfaceDevices;
  const NodePtr m_building;
  const NodePtr m_published;
  // Hubs whose parent is known, as they stand: most are above many devices.
  std::unordered_set<const CZKUMUsbTreeNodeImpl*> m_identified;
};

// Asks every node of a tree, parents first, whether it is kept, and takes out of the child lists
// what is not. Returns whether the root itself is kept.
bool PruneTree(const NodePtr& root);
// Whether every node of the tree is kept.
bool AcceptsAll(const NodePtr& root);
// Whether the parent links of a record end at a root.
bool ReachesRoot(const CZKUMUsbTreeNodeImpl& record) noexcept;

// Climbs from records to the node directly below a hub port. Remembers where each record on the way
// led: a chain of devices would take its length at each of them. For the time in which no parent
// link changes; one thread.
class HubPortClimbs {
 public:
  // Null where there is no hub port on the way.
  CZKUMUsbTreeNodeImpl* From(CZKUMUsbTreeNodeImpl* start);
  // Records looked at so far.
  std::size_t Steps() const noexcept { return m_nSteps; }

 private:
  struct Climb {
    const CZKUMUsbTreeNodeImpl* node;
    CZKUMUsbTreeNodeImpl* found;
  };
  std::vector<Climb> m_climbs;
  platform::FlatIndex m_index;
  std::size_t m_nSteps = 0;
};

}  // namespace KelvoUHW
