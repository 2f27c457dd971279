// The device-manager view of the PC: all present devices as a forest, reduced to the chains that
// end in disk drives.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "devinfo/device_answers.h"
#include "devinfo/property_reader.h"
#include "platform/host.h"
#include "records/device_node_record.h"
#include "records/device_set.h"
#include "records/node.h"
#include "records/shared_text.h"

namespace KelvoUHW {

// A present device before it is known whether anything is shown of it.
struct PresentDevice {
  platform::DevInst DevInst = 0;
  platform::DevInst ParentDevInst = 0;
  platform::SP_DEVINFO_DATA Element;  // of the set that was read
  SharedText ClassName;
};

// Reads the present devices of every class, in two steps: most devices lead to no disk drive, and
// of those nothing is shown. One thread; `host` and `answers` must outlive the reader.
class DeviceRecordReader {
 public:
  DeviceRecordReader(platform::Host& host, DeviceAnswers& answers) noexcept
      : m_host(host), m_answers(answers), m_set(host) {}

  // Handles, class and element of every device, in the system's order. A device without parent ends
  // the reading at once with nothing read, and the device-information set stays open: this is
  // deliberate. A failing set or image list gives an empty result.
  std::vector<PresentDevice> Read();
  // Fills the texts of the record of a device that Read gave.
  void Complete(DeviceNodeRecord& record);

 private:
  struct SetupClass {
    platform::Guid guid;
    std::u16string description;
  };

  const SetupClass* FindClass(const platform::Guid& guid) const noexcept;
  bool IsShown(const platform::Guid& guid, platform::DeviceSetHandle images);

  platform::Host& m_host;
  DeviceAnswers& m_answers;
  DeviceSet m_set;
  std::vector<SetupClass> m_classes;        // those found to be shown
  std::optional<ElementReader> m_elements;  // of the open set
};

// A record with what is known of a device, without texts but its class and without children.
DeviceNodeRecord RecordOf(const PresentDevice& device);

// Links the devices by their handles and prunes: what remains are the top-level records that are a
// disk drive or hold one, below them only what leads to a disk drive, and no record of class "USB"
// except at the top. Class names are compared ignoring case. Children and top level keep the order
// of reading.
std::vector<DeviceNodeRecord> LinkDeviceForest(const std::vector<PresentDevice>& devices);

// The forest of the PC: reads, links, and completes what remains.
std::vector<DeviceNodeRecord> ReadDeviceForest(platform::Host& host, DeviceAnswers& answers);

// Turns the PCI devices of the forest, with two levels below each, into controllers, hubs, ports
// and port devices below the root of a tree.
void AddForestNodes(const std::vector<DeviceNodeRecord>& forest, CZKUMUsbTreeNodeImpl& root);

// Copies of the disk-drive records, depth first; what lies below a disk drive is not searched.
std::vector<DeviceNodeRecord> DiskDriveRecords(const std::vector<DeviceNodeRecord>& forest);

}  // namespace KelvoUHW
