// The device-manager view of the PC: all present devices as a forest, reduced to the chains that
// end in disk drives.
#pragma once

#include <vector>

#include "platform/host.h"
#include "records/device_node_record.h"
#include "records/node.h"

namespace KelvoUHW {

// Reads every present device of every class in the system's order. A device without parent ends the
// reading at once with nothing read, and the device-information set stays open: this is meant. A
// failing set or image list gives an empty result. The records have no children yet.
std::vector<DeviceNodeRecord> ReadDeviceRecords(platform::Host& host);

// Links the records by their handles and prunes: what remains are the top-level records that are a
// disk drive or hold one, below them only what leads to a disk drive, and no record of class "USB"
// except at the top. Class names are compared ignoring case. Children and top level keep the order
// of reading.
std::vector<DeviceNodeRecord> LinkDeviceForest(std::vector<DeviceNodeRecord> records);

// Turns the PCI devices of the forest, with two levels below each, into controllers, hubs, ports
// and port devices below the root of a tree.
void AddForestNodes(const std::vector<DeviceNodeRecord>& forest, CZKUMUsbTreeNodeImpl& root);

// Copies of the disk-drive records, depth first; what lies below a disk drive is not searched.
std::vector<DeviceNodeRecord> DiskDriveRecords(const std::vector<DeviceNodeRecord>& forest);

}  // namespace KelvoUHW
