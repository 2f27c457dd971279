#include "records/device_node_record.h"

#include <utility>

namespace KelvoUHW {

DeviceNodeRecord DeviceNodeRecord::OwnFields() const {
  DeviceNodeRecord own;
  own.DevInst = DevInst;
  own.ParentDevInst = ParentDevInst;
  own.InstanceId = InstanceId;
  own.ParentInstanceId = ParentInstanceId;
  own.Name = Name;
  own.ClassDescription = ClassDescription;
  own.ClassName = ClassName;
  own.Location = Location;
  own.HardwareId = HardwareId;
  return own;
}

DeviceNodeRecord::DeviceNodeRecord(const DeviceNodeRecord& other)
    : DeviceNodeRecord(other.OwnFields()) {
  struct Copy {
    const DeviceNodeRecord* from;
    DeviceNodeRecord* to;
  };
  std::vector<Copy> waiting{{&other, this}};
  while (!waiting.empty()) {
    const auto [from, to] = waiting.back();
    waiting.pop_back();
    to->Children.reserve(from->Children.size());  // the copies stay where they are
    for (const DeviceNodeRecord& child : from->Children) {
      to->Children.push_back(child.OwnFields());
      if (!child.Children.empty()) waiting.push_back({&child, &to->Children.back()});
    }
  }
}

DeviceNodeRecord::~DeviceNodeRecord() {
  // The records on the way down wait in the children of the one below which the work goes on, which
  // has given up its own.
  std::vector<DeviceNodeRecord> above;
  std::vector<DeviceNodeRecord> level = std::move(Children);
  for (;;) {
    if (level.empty()) {
      if (above.empty()) return;
      level = std::move(above);
      above = std::move(level.back().Children);
      level.pop_back();
    } else if (level.back().Children.empty()) {
      level.pop_back();
    } else {
      std::vector<DeviceNodeRecord> below = std::move(level.back().Children);
      level.back().Children = std::move(above);
      above = std::move(level);
      level = std::move(below);
    }
  }
}

}  // namespace KelvoUHW
