#include "tools/zkusb/node_view.h"

#include <stdexcept>

#include "devinfo/info_device.h"
#include "devinfo/interface_device.h"
#include "platform/text.h"
#include "tree/port_device.h"
#include "tree/records.h"

namespace zkusb {

namespace {

// Seven tiers of hubs and ports, and the device manager's levels below them, are far from it. Views
// are read, shown and dropped level inside level.
constexpr int kMostLevels = 400;

template <class Record>
const Record& As(const KelvoUHW::NodePtr& node) {
  return static_cast<const Record&>(*node);
}

InfoView ReadInfo(const KelvoUHW::CZKUMInfoDeviceImpl& record) {
  return {.Service = record.Service,
          .FriendlyName = record.FriendlyName,
          .Location = record.Location,
          .Manufacturer = record.Manufacturer,
          .HardwareId = record.HardwareId,
          .PhysicalName = record.PhysicalName,
          .DevClass = record.DevClass,
          .EnumName = record.EnumName,
          .ClassGuid = platform::GuidText(record.ClassGuid)};
}

StorageView ReadStorage(const KelvoUHW::CZKUMInterfaceDeviceImpl& record) {
  return {.VolumeName = record.VolumeName,
          .VendorId = record.StorageVendorId,
          .ProductId = record.StorageProductId,
          .ProductRev = record.ProductRev,
          .DevicePath = record.DevicePath(),
          .MountPoints = record.MountPoints};
}

void ReadPortDevice(const KelvoUHW::CZKUMPortDeviceImpl& record, NodeView& view) {
  view.Product = record.m_strUsbProduct;
  view.Manufacturer1 = record.m_strUsbManufacturer;
  view.Speed = record.Speed();
  view.NumberInterfaces = record.NumberInterfaces();
  if (record.m_infoDevice) {
    view.Info = ReadInfo(As<KelvoUHW::CZKUMInfoDeviceImpl>(record.m_infoDevice));
  }
}

void ReadOwnProperties(const KelvoUHW::NodePtr& node, NodeView& view) {
  switch (view.Type) {
    case NodeType::kHostController:
      view.LeafName = As<KelvoUHW::CZKUMHostControllerImpl>(node).m_strLeafName;
      break;
    case NodeType::kHub: {
      const auto& hub = As<KelvoUHW::CZKUMHubDeviceImpl>(node);
      view.PathName = hub.m_strPathName;
      view.ConnectionName = hub.m_strConnectionName;
      view.NumberOfPorts = hub.NumberOfPorts();
      break;
    }
    case NodeType::kHubPort: {
      const auto& port = As<KelvoUHW::CZKUMHubPortImpl>(node);
      view.PortIndex = port.m_nPortIndex;
      view.Status = port.m_nStatus == KelvoUHW::KPortEmpty       ? PortStatus::kEmpty
                    : port.m_nStatus == KelvoUHW::KPortConnected ? PortStatus::kConnected
                                                                 : PortStatus::kUnconfigured;
      break;
    }
    case NodeType::kPortDevice:
      ReadPortDevice(As<KelvoUHW::CZKUMPortDeviceImpl>(node), view);
      break;
    case NodeType::kInfoDevice:
      view.Info = ReadInfo(As<KelvoUHW::CZKUMInfoDeviceImpl>(node));
      break;
    case NodeType::kInterfaceDevice:
      view.Storage = ReadStorage(As<KelvoUHW::CZKUMInterfaceDeviceImpl>(node));
      break;
    case NodeType::kUnknown:
    case NodeType::kRoot:
      break;
  }
}

NodeView ReadLevel(const KelvoUHW::NodePtr& node, int level) {
  if (level > kMostLevels) {
    throw std::runtime_error("the topology has more than " + std::to_string(kMostLevels) +
                             " levels");
  }
  NodeView view;
  view.Type = static_cast<NodeType>(node->m_nType);
  view.InstanceId = node->m_strDevInstId;
  view.DeviceDescr = node->m_strDeviceDescr;
  view.DriverKeyName = node->m_strDriverKeyName;
  view.SerialNumber = node->m_strSerialNumber;
  view.Vendor = node->m_strVendor;
  view.Product = node->m_strProduct;
  view.VendorId = static_cast<std::int32_t>(node->m_nVendorId);
  view.ProductId = static_cast<std::int32_t>(node->m_nProductId);
  ReadOwnProperties(node, view);
  view.Childs.reserve(node->m_childs.size());
  for (const KelvoUHW::NodePtr& child : node->m_childs) {
    view.Childs.push_back(ReadLevel(child, level + 1));
  }
  return view;
}

}  // namespace

NodeView ReadNode(const KelvoUHW::NodePtr& node) { return ReadLevel(node, 0); }

}  // namespace zkusb
