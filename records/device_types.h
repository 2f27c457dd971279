// The two enumerations of the interfaces. A value of one is numerically equal to a value of the
// other, and nothing keeps callers from mixing them.
#pragma once

#include <cstdint>

// What happened to a device.
enum TDeviceEventType : std::int32_t {
  KDeviceConnected = 0,
  KDeviceAttached = 1,
  KDeviceRemoved = 2,
  KDeviceModified = 3,
};

// Kinds of nodes. The name with the underscore is published, as the alias is.
enum _TUsbDeviceType : std::int32_t {
  KUDTUnknown = 0,
  KUDTRoot = 1,
  KUDTHostController = 2,
  KUDTHub = 3,
  KUDTHubPort = 4,
  KUDTPortDevice = 5,
  KUDTInfoDevice = 6,
  KUDTInterfaceDevice = 7,
};
using TUsbDeviceType = _TUsbDeviceType;
