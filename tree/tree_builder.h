// Builds snapshots of the USB topology and says what changed. A build walks controllers, hubs and
// ports (topology_walker.h), reads the device-manager nodes (device_forest.h), compares devices,
// disks and volumes with the build before (devinfo/), and publishes a new tree when something
// changed (publication.h).
#pragma once

#include <cstddef>
#include <memory>
#include <string>

#include "devinfo/info_device_cache.h"
#include "devinfo/storage_cache.h"
#include "platform/host.h"
#include "records/device_lists.h"
#include "tree/topology_walker.h"

namespace KelvoUHW {

// One builder serves one tree object. Build, the lists and the caches belong to one thread at a
// time: callers serialise. Root may be copied by any thread at any time. `host` must outlive the
// builder.
class CZKUMUsbTreeBuilder {
 public:
  explicit CZKUMUsbTreeBuilder(platform::Host& host);

  // Reads the PC anew; blocks on its drivers. True when something changed: a new tree is published
  // and the lists are refilled. False when nothing did: tree and lists stay as they were. Throws
  // std::bad_alloc only, and then publishes neither tree nor lists; the next build does. Device
  // records, which live on from tree to tree, may have been joined anew by then.
  bool Build();

  // The published tree; empty before the first build that found something.
  NodePtr Root() const { return m_walker.m_current; }
  NodePtr BuildingRoot() const { return m_walker.m_building; }
  // The list of an event kind, 0 to 3; null for any other number.
  const DeviceList* GetDeviceList(std::size_t kind) const noexcept;
  const DeviceList& ConnectedCopy() const noexcept { return m_deviceLists[kConnectedCopyList]; }

  // Makes what is present now the state that the next build is compared with.
  void CommitDeviceCache() { m_deviceInfo.Commit(); }

  const CZKUMTopologyWalker& Walker() const noexcept { return m_walker; }
  const InfoDeviceCache& DeviceInfo() const noexcept { return m_deviceInfo; }
  const StorageCache& Storage() const noexcept { return m_storage; }

 private:
  DeviceLists m_deviceLists;
  CZKUMTopologyWalker m_walker;
  InfoDeviceCache m_deviceInfo;
  StorageCache m_storage;
  bool m_bOwesPublication = false;  // a change was reported and is not published yet
};

}  // namespace KelvoUHW
