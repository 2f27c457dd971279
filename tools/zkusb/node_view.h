// Nodes of the topology as the commands see them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "records/device_types.h"

namespace zkusb {

// What the device manager tells about a device.
struct InfoView {
  std::u16string Service;
  std::u16string FriendlyName;
  std::u16string Location;
  std::u16string Manufacturer;
  std::u16string HardwareId;
  std::u16string PhysicalName;
  std::u16string DevClass;
  std::u16string EnumName;
  std::u16string ClassGuid;
};

// What a storage device tells about itself, or the volume on it.
struct StorageView {
  std::u16string VolumeName;  // empty: a disk that no volume names
  std::u16string VendorId;
  std::u16string ProductId;
  std::u16string ProductRev;
  std::u16string DevicePath;
  std::vector<std::u16string> MountPoints;
};

// A copy of one node and of everything below it, under the names that the interfaces publish. What
// a kind of node does not have is empty, zero or absent.
struct NodeView {
  TUsbDeviceType Type = KUDTUnknown;
  std::u16string InstanceId;
  std::u16string Description;
  std::u16string DriverKeyName;
  std::u16string SerialNumber;
  std::u16string Vendor;
  std::u16string Product;
  std::int32_t VendorId = -1;
  std::int32_t ProductId = -1;

  std::u16string LeafName;  // of a controller

  std::u16string PathName;  // of a hub
  std::u16string ConnectionName;

  std::int32_t PortIndex = 0;  // of a port

  std::u16string Manufacturer1;  // of a port device
  std::uint32_t Speed = 0;
  std::uint32_t NumberInterfaces = 0;

  std::optional<InfoView> Info;        // of an info device, and of a port device that has one
  std::optional<StorageView> Storage;  // of an interface device

  std::vector<NodeView> Childs;
};

}  // namespace zkusb
