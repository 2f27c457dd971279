#include "tools/zkusb/node_reader.h"

#include <stdexcept>

#include "com/com_ptr.h"
#include "platform/text.h"
#include "tools/zkusb/component.h"
#include "tools/zkusb/device_facts.h"

namespace zkusb {

namespace {

using KelvoUHW::ComPtr;

// Seven tiers of hubs and ports, and the device manager's levels below them, are far from it. Views
// are read, shown and dropped level inside level.
constexpr int kMostLevels = 400;

class OwnedBstr {
 public:
  OwnedBstr() noexcept = default;
  OwnedBstr(const OwnedBstr&) = delete;
  OwnedBstr& operator=(const OwnedBstr&) = delete;
  ~OwnedBstr() { SysFreeString(m_text); }
  BSTR* Put() noexcept { return &m_text; }
  std::u16string_view View() const { return platform::BstrText(m_text); }

 private:
  BSTR m_text = nullptr;
};

template <class Interface>
std::u16string Text(Interface& object, HRESULT (STDMETHODCALLTYPE Interface::*property)(BSTR*)) {
  OwnedBstr text;
  Check((object.*property)(text.Put()), "reading a text");
  return std::u16string(text.View());
}

template <class Number, class Interface>
Number Value(Interface& object, HRESULT (STDMETHODCALLTYPE Interface::*property)(Number*)) {
  Number value{};
  Check((object.*property)(&value), "reading a number");
  return value;
}

template <class Interface>
ComPtr<Interface> Ask(IZKUMUsbTreeNode& node) {
  ComPtr<Interface> answer;
  Check(node.QueryInterface(platform::IidOf<Interface>(), answer.PutVoid()), "QueryInterface");
  return answer;
}

// Empty where a port device has no device node of the device manager.
std::optional<InfoView> ReadInfo(IZKUMInfoDevice& info) {
  GUID classGuid{};
  if (FAILED(info.get_ClassGuid(&classGuid))) return std::nullopt;
  return InfoView{.Service = Text(info, &IZKUMInfoDevice::get_Service),
                  .FriendlyName = Text(info, &IZKUMInfoDevice::get_FriendlyName),
                  .Location = Text(info, &IZKUMInfoDevice::get_Location),
                  .Manufacturer = Text(info, &IZKUMInfoDevice::get_Manufacturer),
                  .HardwareId = Text(info, &IZKUMInfoDevice::get_HardwareId),
                  .PhysicalName = Text(info, &IZKUMInfoDevice::get_PhysicalName),
                  .DevClass = Text(info, &IZKUMInfoDevice::get_DevClass),
                  .EnumName = Text(info, &IZKUMInfoDevice::get_EnumName),
                  .ClassGuid = platform::GuidText(platform::FromSystemGuid(classGuid))};
}

std::vector<std::u16string> ReadMountPoints(IZKUMInterfaceDevice& device) {
  ComPtr<IEnumVARIANT> list;
  Check(device.get_MountPoints(list.Put()), "MountPoints");
  std::vector<std::u16string> mountPoints;
  VARIANT element;
  VariantInit(&element);
  while (list->Next(1, &element, nullptr) == S_OK) {
    if (element.vt == VT_BSTR) mountPoints.emplace_back(platform::BstrText(element.bstrVal));
    VariantClear(&element);
  }
  return mountPoints;
}

StorageView ReadStorage(IZKUMInterfaceDevice& device) {
  return {.VolumeName = Text(device, &IZKUMInterfaceDevice::get_VolumeName),
          .VendorId = Text(device, &IZKUMInterfaceDevice::get_VendorId),
          .ProductId = Text(device, &IZKUMInterfaceDevice::get_ProductId),
          .ProductRev = Text(device, &IZKUMInterfaceDevice::get_ProductRev),
          .DevicePath = Text(device, &IZKUMInterfaceDevice::get_DevicePath),
          .MountPoints = ReadMountPoints(device)};
}

void ReadOwnProperties(IZKUMUsbTreeNode& node, NodeView& view) {
  switch (view.Type) {
    case KUDTHostController:
      view.LeafName =
          Text(*Ask<IZKUMHostController>(node).Get(), &IZKUMHostController::get_LeafName);
      break;
    case KUDTHub: {
      const auto hub = Ask<IZKUMHubDevice>(node);
      view.PathName = Text(*hub.Get(), &IZKUMHubDevice::get_PathName);
      view.ConnectionName = Text(*hub.Get(), &IZKUMHubDevice::get_ConnectionName);
      break;
    }
    case KUDTHubPort:
      view.PortIndex = Value(*Ask<IZKUMHubPort>(node).Get(), &IZKUMHubPort::get_PortIndex);
      break;
    case KUDTPortDevice: {
      const auto device = Ask<IZKUMPortDevice>(node);
      view.Manufacturer1 = Text(*device.Get(), &IZKUMPortDevice::get_Manufacturer1);
      view.Speed = Value(*device.Get(), &IZKUMPortDevice::get_Speed);
      view.NumberInterfaces = Value(*device.Get(), &IZKUMPortDevice::get_NumberInterfaces);
      view.Info = ReadInfo(*Ask<IZKUMInfoDevice>(node).Get());
      break;
    }
    case KUDTInfoDevice:
      view.Info = ReadInfo(*Ask<IZKUMInfoDevice>(node).Get());
      break;
    case KUDTInterfaceDevice:
      view.Storage = ReadStorage(*Ask<IZKUMInterfaceDevice>(node).Get());
      break;
    case KUDTUnknown:
    case KUDTRoot:
      break;
  }
}

void CheckLevel(int level) {
  if (level <= kMostLevels) return;
  throw std::runtime_error("the topology has more than " + std::to_string(kMostLevels) + " levels");
}

void ForEachChild(IZKUMUsbTreeNode& node, const std::function<void(IZKUMUsbTreeNode&)>& visit) {
  ComPtr<IZKUMUsbTreeNodeEnumerator> childs;
  Check(node.get_Childs(childs.Put()), "Childs");
  VARIANT_BOOL more = VARIANT_FALSE;
  while (SUCCEEDED(childs->MoveNext(&more)) && more != VARIANT_FALSE) {
    ComPtr<IZKUMUsbTreeNode> child;
    Check(childs->GetCurrent(child.Put()), "GetCurrent");
    visit(*child.Get());
  }
}

NodeView ReadLevel(IZKUMUsbTreeNode& node, int level, int last) {
  CheckLevel(level);
  NodeView view;
  view.Type = Value(node, &IZKUMUsbTreeNode::get_Type);
  view.InstanceId = Text(node, &IZKUMUsbTreeNode::get_InstanceId);
  const auto device = Ask<IZKUMUsbDevice>(node);
  view.Description = Text(*device.Get(), &IZKUMUsbDevice::get_Description);
  view.DriverKeyName = Text(*device.Get(), &IZKUMUsbDevice::get_DriverKeyName);
  view.SerialNumber = Text(*device.Get(), &IZKUMUsbDevice::get_SerialNumber);
  view.Vendor = Text(*device.Get(), &IZKUMUsbDevice::get_Vendor);
  view.Product = Text(*device.Get(), &IZKUMUsbDevice::get_Product);
  view.VendorId = Value(*device.Get(), &IZKUMUsbDevice::get_VendorId);
  view.ProductId = Value(*device.Get(), &IZKUMUsbDevice::get_ProductId);
  ReadOwnProperties(node, view);
  if (level == last) return view;
  ForEachChild(node, [&](IZKUMUsbTreeNode& child) {
    view.Childs.push_back(ReadLevel(child, level + 1, last));
  });
  return view;
}

void ReadPlacesBelow(IZKUMUsbTreeNode& node, Place& place, int level, const PlaceHandler& handler) {
  CheckLevel(level);
  const TUsbDeviceType type = Value(node, &IZKUMUsbTreeNode::get_Type);
  if (type == KUDTPortDevice) {
    handler(Text(node, &IZKUMUsbTreeNode::get_InstanceId), PortPath(place));
    return;
  }
  const bool isPort = type == KUDTHubPort;
  if (isPort) {
    place.ports.push_back(Value(*Ask<IZKUMHubPort>(node).Get(), &IZKUMHubPort::get_PortIndex));
  }
  ForEachChild(node, [&](IZKUMUsbTreeNode& child) {
    if (level == 0) ++place.controller;
    ReadPlacesBelow(child, place, level + 1, handler);
  });
  if (isPort) place.ports.pop_back();
}

}  // namespace

NodeView ReadNode(IZKUMUsbTreeNode& node) { return ReadLevel(node, 0, -1); }

NodeView ReadTop(IZKUMUsbTreeNode& node, int levels) { return ReadLevel(node, 0, levels); }

void ReadPlaces(IZKUMUsbTreeNode& root, const PlaceHandler& handler) {
  Place place;
  ReadPlacesBelow(root, place, 0, handler);
}

void ReadDump(IZKUMUsbTreeNode& node, const std::function<void(std::u16string_view)>& handler) {
  OwnedBstr text;
  Check(Ask<IZKUMUsbDevice>(node)->get_ToString(text.Put()), "ToString");
  handler(text.View());
}

}  // namespace zkusb
