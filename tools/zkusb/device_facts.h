// What the commands say about devices, worked out from their nodes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "tools/zkusb/node_view.h"

namespace zkusb {

// The way to a node.
struct Place {
  std::size_t controller = 0;       // 1 is the first child of the root; 0 is no controller's
  std::vector<std::int32_t> ports;  // from the root hub on
};

// The number of the controller among the children of the root, a hyphen, and the ports from the
// root hub on with dots between them: "2-1.4". A port and what is plugged into it have the same
// path. Where there is no port it is the controller's number alone: for a root hub, and for what a
// storage controller of the device manager has below it, whose ports have the number 0.
std::u16string PortPath(const Place& place);

// A port device and the way to it. The node belongs to the tree that was searched.
struct PlacedDevice {
  const NodeView* device;
  Place place;
};

// All port devices below a root, in the order of the tree.
std::vector<PlacedDevice> PortDevices(const NodeView& root);

// Whether a host controller was opened and has a root hub. Storage controllers, which come from the
// device manager, do not count.
bool HasUsbController(const NodeView& root);
bool IsUsbController(const NodeView& controller);

// A disk below a device, with what lies on it.
struct Disk {
  std::u16string id;
  std::u16string name;                      // tidied; never empty
  std::vector<std::u16string> mountPoints;  // of the disk itself, where no volume names it
  std::vector<const StorageView*> volumes;
  bool hasInterface = false;  // false: the device manager alone knows of it
};

// The disks below a port device, in the order in which its subtree names them.
std::vector<Disk> DisksOf(const NodeView& device);

// Whether an interface device lies below.
bool CarriesStorage(const NodeView& device);

// All mount points below a device.
std::vector<std::u16string> MountPointsOf(const NodeView& device);
// Those that are roots of drives, as "D:".
std::vector<std::u16string> DriveLetters(const std::vector<std::u16string>& mountPoints);

}  // namespace zkusb
