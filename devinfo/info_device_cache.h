// Change detection for device-manager nodes: which devices below USB, PCI, SCSI and SD parents have
// arrived or been removed since the last pass. A build makes one pass. StorageCache
// (devinfo/storage_cache.h) does the same for disks and volumes.
#pragma once

#include <cstdint>
#include <string_view>
#include <vector>

#include "devinfo/device_answers.h"
#include "devinfo/info_device_set.h"
#include "platform/host.h"
#include "records/device_node_record.h"

namespace KelvoUHW {

class ElementReader;
class PassedElements;

// The setup class that a name stands for; null, which means all classes, for any other name.
const platform::Guid* DeviceClassByName(std::u16string_view name) noexcept;

// One pass is SetDiskDrives, Collect and, when the builder is done with the sets, Commit. A device
// that stays present keeps the record, and so the property values, of the pass that first saw it.
// Its handle and its ids must not be changed by anybody.
//
// When a device below another one disappears, its parent and the parent's parent are reported as
// removed with it and taken out of the running pass ("held"). A held record returns to a later pass
// when that pass has a child of it, one level at a time.
//
// One thread at a time. Exceptions: std::bad_alloc only.
class InfoDeviceCache {
 public:
  // `answers` keeps what the system answered during the running build; whoever starts a pass
  // empties it.
  InfoDeviceCache(platform::DeviceSets& sets, DeviceAnswers& answers) noexcept
      : m_sets(sets), m_answers(answers) {}

  // The records of disk drives found by the builder, for the next passes.
  void SetDiskDrives(std::vector<DeviceNodeRecord> diskDrives);

  // Forgets the records that a client has destroyed: their devices are new to the next pass. Comes
  // first in a pass, and nothing is destroyed until the pass has ended.
  void DropDestroyed() noexcept;

  // Reads all present device nodes and compares them with the last committed pass. `treeRoot` is
  // the topology tree just walked: a new device that it does not show yet is not reported before it
  // does. True when something was added or removed; false when the system gives no list of devices,
  // which leaves all sets as they were.
  bool Collect(const NodePtr& treeRoot);

  // The first half of Collect: fills Current() and adds to Added() from the devices of a class
  // (empty name: all). 0, or the system's error code, never 0 on failure.
  std::uint32_t EnumerateDeviceNodes(std::u16string_view className);

  // Ends a pass: what is current is what the next pass compares with.
  void Commit();

  // Hangs a node below the first current record whose instance id is the node's parent instance id.
  void AttachToParentInfoDevice(const NodePtr& node) const;

  // The records of the running pass; those that came with it; those that left, with parents. Valid
  // between Collect and Commit.
  const InfoDeviceSet& Current() const noexcept { return m_current; }
  const InfoDeviceSet& Added() const noexcept { return m_added; }
  const InfoDeviceSet& Removed() const noexcept { return m_removed; }
  // Records kept over passes: parents that wait for a child, new records the tree does not show
  // yet.
  const InfoDeviceSet& Held() const noexcept { return m_held; }
  const InfoDeviceSet& Pending() const noexcept { return m_pending; }
  std::int32_t AddedCount() const noexcept { return m_nAddedCount; }
  std::int32_t RemovedCount() const noexcept { return m_nRemovedCount; }

 private:
  bool IsAdmitted(const ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
                  CZKUMInfoDeviceImpl& record);
  bool IsKnown(platform::DevInst handle);
  bool ReadNewNode(ElementReader& reader, const platform::SP_DEVINFO_DATA& element,
                   PassedElements& passed, CZKUMInfoDeviceImpl& record);
  void KeepAsNewUnlessPrevious(const InfoDevicePtr& record);
  void CreateDiskDriveRecords();
  void ReturnHeldParents();
  void FindRemoved();
  InfoDeviceSet AncestorsOfRemoved() const;
  void HoldBack(const InfoDeviceSet& ancestors);
  void SortPending(const NodePtr& treeRoot);

  platform::DeviceSets& m_sets;
  DeviceAnswers& m_answers;
  std::vector<DeviceNodeRecord> m_diskDrives;
  NodeIdentity m_identity;  // of the element that is looked at
  InfoDeviceSet m_previous;
  InfoDeviceSet m_current;
  InfoDeviceSet m_removed;
  InfoDeviceSet m_added;
  InfoDeviceSet m_held;
  InfoDeviceSet m_pending;
  std::int32_t m_nAddedCount = 0;
  std::int32_t m_nRemovedCount = 0;
};

}  // namespace KelvoUHW
