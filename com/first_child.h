// The search behind IZKUMPortDevice::FirstChildOfType.
#pragma once

#include "com/zkusb_monitor.h"

namespace KelvoUHW {

// The first node of a kind below `node`, parents before their children and children in their order,
// asked for through the interfaces alone. S_OK with one reference for the caller; E_POINTER when it
// is found and `out` is null; S_FALSE when there is none, and then `*out` stays as it was. A list
// that breaks off ends the search in that list only. Throws std::bad_alloc, and what a client's own
// node throws.
HRESULT FindBelow(IZKUMUsbTreeNode& node, TUsbDeviceType kind, IZKUMUsbTreeNode** out);

}  // namespace KelvoUHW
