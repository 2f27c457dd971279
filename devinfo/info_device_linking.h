// Hanging the device records of a pass below each other.
#pragma once

#include "devinfo/info_device_set.h"

namespace KelvoUHW {

// Hangs each record below the first record of the set whose instance id is its parent instance id,
// by the rule of AddChild: nothing changes where the parent has the same node as a child already.
// Records whose parents lead back to themselves hang nowhere; they would own each other for ever.
//
// Takes time proportional to the records and to the children their parents have already.
void LinkToParents(const InfoDeviceSet& records);

}  // namespace KelvoUHW
