// The volumes and disks of USB-like devices, read anew by every build.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "devinfo/storage_pass.h"
#include "platform/guid.h"
#include "platform/host.h"
#include "records/device_set.h"
#include "records/interface_device.h"

namespace KelvoUHW {

// Used by one build at a time: it takes no lock of its own. Records handed out outlive the cache
// and each pass; a pass makes new ones and does not touch those of the pass before.
class StorageCache {
 public:
  // `host` must outlive the cache. Deliberate: a volume set is opened here already, and no set of
  // the cache is ever destroyed. A pass overwrites the handles of the one before and adds two sets
  // to those that are open.
  explicit StorageCache(platform::Host& host) : StorageCache(host, host) {}
  // Ids and parents of device-manager nodes are asked of `nodes`, which must outlive the cache too.
  StorageCache(platform::Host& host, platform::DeviceManager& nodes);
  StorageCache(const StorageCache&) = delete;
  StorageCache& operator=(const StorageCache&) = delete;

  // Reads all volumes and disks; blocks on their drivers. Returns whether the set of accepted
  // volumes differs from that of the last pass. Lines for a developer are appended to
  // `diagnostics`. Failures only leave records out; when std::bad_alloc is thrown, the cache still
  // shows the last pass.
  bool CollectStorage(std::u16string& diagnostics);

  // The accepted volumes in the system's order, then the disks that no volume names as its parent.
  // Every entry is a CZKUMInterfaceDeviceImpl.
  const std::vector<NodePtr>& Volumes() const noexcept { return m_volumes; }
  // All admitted disks of the last pass.
  const std::vector<NodePtr>& Disks() const noexcept { return m_disks; }

 private:
  struct InterfaceEnumeration {
    platform::DeviceSetHandle Set = platform::kInvalidHandle;
    platform::Guid InterfaceClass{};
  };

  void OpenEnumeration(InterfaceEnumeration& enumeration);
  RingPtr<CZKUMInterfaceDeviceImpl> ReadInterface(const InterfaceEnumeration& enumeration,
                                                  std::uint32_t index);
  std::vector<NodePtr> CollectVolumes(StoragePass& pass);
  std::vector<NodePtr> CollectDisks(StoragePass& pass);
  bool DiffersFromLastPass(const std::vector<NodePtr>& accepted) const;

  platform::Host& m_host;
  platform::DeviceManager& m_nodes;
  InterfaceEnumeration m_volumeEnumeration;
  std::vector<NodePtr> m_volumes;
  std::size_t m_acceptedVolumes = 0;  // the first ones of m_volumes
  // Deliberate: both spare lists are emptied by each pass, and nothing fills them.
  std::vector<NodePtr> m_spare;
  InterfaceEnumeration m_diskEnumeration;
  std::vector<NodePtr> m_disks;
  std::vector<NodePtr> m_diskSpare;
};

}  // namespace KelvoUHW
