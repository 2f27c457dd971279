// What a build that found a change publishes: the device-manager nodes joined to the port devices
// of the tree, and the five device lists.
#pragma once

#include <array>
#include <cstddef>
#include <vector>

#include "records/node.h"

namespace KelvoUHW {

// List n holds port devices for events of kind n; the last one is a copy of the first.
enum DeviceListKind : std::size_t {
  kConnectedList = 0,
  kAttachedList = 1,
  kRemovedList = 2,
  kModifiedList = 3,
  kConnectedCopyList = 4,
};
using DeviceList = std::vector<NodePtr>;
using DeviceLists = std::array<DeviceList, 5>;

}  // namespace KelvoUHW
