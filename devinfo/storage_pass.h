// One pass over the volumes and disks of the PC: how their records are prepared and queried.
#pragma once

#include <string>

#include "devinfo/disk_letters.h"
#include "devinfo/storage_query.h"
#include "devinfo/volume_table.h"
#include "platform/host.h"
#include "records/interface_device.h"

namespace KelvoUHW {

// What concerns the whole PC (mount points, drive letters) is asked once, when it is first needed,
// and forgotten with the pass. `nodes` is asked for ids and parents of device-manager nodes.
// `host`, `nodes` and `diagnostics`, to which lines are appended, must outlive it. Used by one
// thread; the calls may block on drivers; only std::bad_alloc is thrown.
//
// The records passed in carry the interface, its device data and its detail.
class StoragePass {
 public:
  StoragePass(platform::Host& host, platform::DeviceManager& nodes,
              std::u16string& diagnostics) noexcept
      : m_host(host),
        m_nodes(nodes),
        m_diagnostics(diagnostics),
        m_mountPoints(host),
        m_letters(host, nodes) {}

  // Identity, volume name and mount points. KStorageAccepted also without a volume name.
  StorageOutcome PrepareVolumeRecord(CZKUMInterfaceDeviceImpl& record);
  // The same, then what the opened device tells. No device is left open.
  StorageOutcome OpenAndQueryVolume(CZKUMInterfaceDeviceImpl& record);
  // Identity and drive letters of a disk.
  StorageOutcome PrepareDiskRecord(CZKUMInterfaceDeviceImpl& record);
  // Whether a prepared disk is kept.
  bool KeepsDisk(CZKUMInterfaceDeviceImpl& record);

 private:
  StorageOutcome Identify(CZKUMInterfaceDeviceImpl& record);

  platform::Host& m_host;
  platform::DeviceManager& m_nodes;
  std::u16string& m_diagnostics;
  MountPointFinder m_mountPoints;
  DiskLetterFinder m_letters;
};

}  // namespace KelvoUHW
