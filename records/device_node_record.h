// One device of the device-manager forest that each build reads.
#pragma once

#include <string>
#include <vector>

#include "platform/setup_api.h"

namespace KelvoUHW {

struct DeviceNodeRecord {
  platform::DevInst DevInst = 0;
  platform::DevInst ParentDevInst = 0;
  std::u16string InstanceId;
  std::u16string ParentInstanceId;
  std::u16string Name;
  std::u16string ClassDescription;
  std::u16string ClassName;
  std::u16string Location;
  std::u16string HardwareId;
  std::vector<DeviceNodeRecord> Children;
};

}  // namespace KelvoUHW
