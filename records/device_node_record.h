// One device of the device-manager forest that each build reads.
#pragma once

#include <string>
#include <vector>

#include "platform/setup_api.h"

namespace KelvoUHW {

// Copying and destroying are loops: how deep devices hang below each other is up to the PC.
// Destroying allocates nothing.
struct DeviceNodeRecord {
  DeviceNodeRecord() = default;
  DeviceNodeRecord(const DeviceNodeRecord& other);
  DeviceNodeRecord(DeviceNodeRecord&&) noexcept = default;
  DeviceNodeRecord& operator=(const DeviceNodeRecord& other) {
    return *this = DeviceNodeRecord(other);
  }
  DeviceNodeRecord& operator=(DeviceNodeRecord&&) noexcept = default;
  ~DeviceNodeRecord();

  // A copy without the children.
  DeviceNodeRecord OwnFields() const;

  platform::DevInst DevInst = 0;
  platform::DevInst ParentDevInst = 0;
  std::u16string InstanceId;
  std::u16string ParentInstanceId;
  std::u16string Name;
  std::u16string ClassDescription;
  std::u16string ClassName;
  std::u16string Location;
  std::u16string HardwareId;
  platform::SP_DEVINFO_DATA Element;  // of the set that was read
  std::vector<DeviceNodeRecord> Children;
};

}  // namespace KelvoUHW
