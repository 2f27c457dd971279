// Reads node objects as a client does: through their interfaces alone.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "com/com_ptr.h"
#include "com/variant.h"
#include "com/zkusb_monitor.h"
#include "platform/text.h"

namespace testing_support {

using KelvoUHW::ComPtr;
using KelvoUHW::Variant;

// Calls visit(result of GetCurrent, node) for each element of a list, in order; the node is empty where the call
// failed.
template <class Visit>
void ForEachNode(IZKUMUsbTreeNodeEnumerator& nodes, Visit visit) {
  VARIANT_BOOL more = VARIANT_FALSE;
  while (SUCCEEDED(nodes.MoveNext(&more)) && more != VARIANT_FALSE) {
    ComPtr<IZKUMUsbTreeNode> node;
    const HRESULT result = nodes.GetCurrent(node.Put());
    visit(result, node);
  }
}

template <class Interface, class Visit>
void ReadText(Interface& object, const char* name, HRESULT (STDMETHODCALLTYPE Interface::*get)(BSTR*), Visit& visit) {
  BSTR text = nullptr;
  const HRESULT result = (object.*get)(&text);
  const Variant owner = Variant::OfBstr(text);
  visit(name, result, platform::BstrText(text));
}

template <class Interface, class Number, class Visit>
void ReadNumber(Interface& object, const char* name, HRESULT (STDMETHODCALLTYPE Interface::*get)(Number*),
                Visit& visit) {
  Number value{};
  const HRESULT result = (object.*get)(&value);
  visit(name, result, static_cast<std::int64_t>(value));
}

// Calls visit(element) for each VARIANT of a collection; the result is that of making it.
template <class Interface, class Visit>
HRESULT ForEachElement(Interface& object, HRESULT (STDMETHODCALLTYPE Interface::*get)(IEnumVARIANT**), Visit visit) {
  ComPtr<IEnumVARIANT> collection;
  const HRESULT result = (object.*get)(collection.Put());
  if (!collection) return result;
  for (Variant element; collection->Next(1, &element, nullptr) == S_OK; VariantClear(&element)) visit(element);
  return result;
}

template <class Visit>
void ReadInfo(IZKUMInfoDevice& info, Visit& visit) {
  ReadText(info, "Service", &IZKUMInfoDevice::get_Service, visit);
  ReadText(info, "FriendlyName", &IZKUMInfoDevice::get_FriendlyName, visit);
  ReadText(info, "Location", &IZKUMInfoDevice::get_Location, visit);
  ReadText(info, "Manufacturer", &IZKUMInfoDevice::get_Manufacturer, visit);
  ReadText(info, "HardwareId", &IZKUMInfoDevice::get_HardwareId, visit);
  ReadText(info, "PhysicalName", &IZKUMInfoDevice::get_PhysicalName, visit);
  ReadText(info, "DevClass", &IZKUMInfoDevice::get_DevClass, visit);
  ReadText(info, "EnumName", &IZKUMInfoDevice::get_EnumName, visit);
  GUID guid{};
  const HRESULT result = info.get_ClassGuid(&guid);
  visit("ClassGuid", result, std::u16string_view(platform::GuidText(platform::FromSystemGuid(guid))));
}

template <class Visit>
void ReadPortDevice(IZKUMPortDevice& device, Visit& visit) {
  ReadText(device, "Product", &IZKUMPortDevice::get_Product, visit);
  ReadText(device, "Manufacturer1", &IZKUMPortDevice::get_Manufacturer1, visit);
  ReadNumber(device, "Speed", &IZKUMPortDevice::get_Speed, visit);
  ReadNumber(device, "NumberInterfaces", &IZKUMPortDevice::get_NumberInterfaces, visit);
  const HRESULT result =
      ForEachElement(device, &IZKUMPortDevice::get_InterfaceDescriptors, [&](const Variant& element) {
        const auto descriptor = ComPtr<IUnknown>(element.punkVal).template As<IZKUMInterfaceDescr>();
        ReadNumber(*descriptor.Get(), "InterfaceClass", &IZKUMInterfaceDescr::get_InterfaceClass, visit);
        ReadNumber(*descriptor.Get(), "InterfaceSubClass", &IZKUMInterfaceDescr::get_InterfaceSubClass, visit);
        ReadNumber(*descriptor.Get(), "InterfaceProtocol", &IZKUMInterfaceDescr::get_InterfaceProtocol, visit);
      });
  visit("InterfaceDescriptors", result, std::u16string_view());
}

template <class Visit>
void ReadInterfaceDevice(IZKUMInterfaceDevice& device, Visit& visit) {
  ReadText(device, "VolumeName", &IZKUMInterfaceDevice::get_VolumeName, visit);
  ReadText(device, "VendorId", &IZKUMInterfaceDevice::get_VendorId, visit);
  ReadText(device, "ProductId", &IZKUMInterfaceDevice::get_ProductId, visit);
  ReadText(device, "ProductRev", &IZKUMInterfaceDevice::get_ProductRev, visit);
  ReadText(device, "DevicePath", &IZKUMInterfaceDevice::get_DevicePath, visit);
  ReadText(device, "MountPoint", &IZKUMInterfaceDevice::get_MountPoint, visit);
  const HRESULT result = ForEachElement(device, &IZKUMInterfaceDevice::get_MountPoints, [&](const Variant& element) {
    visit("one of MountPoints", S_OK, platform::BstrText(element.bstrVal));
  });
  visit("MountPoints", result, std::u16string_view());
}

// Calls visit(name, result, value) for each property of each interface the node has, but for those that lead to other
// nodes and for ToString. A value is a text or a number.
template <class Visit>
void ReadProperties(const ComPtr<IZKUMUsbTreeNode>& node, Visit visit) {
  ReadText(*node.Get(), "InstanceId", &IZKUMUsbTreeNode::get_InstanceId, visit);
  ReadNumber(*node.Get(), "Type", &IZKUMUsbTreeNode::get_Type, visit);
  if (const auto device = node.As<IZKUMUsbDevice>()) {
    ReadText(*device.Get(), "Description", &IZKUMUsbDevice::get_Description, visit);
    ReadText(*device.Get(), "SerialNumber", &IZKUMUsbDevice::get_SerialNumber, visit);
    ReadNumber(*device.Get(), "VendorId", &IZKUMUsbDevice::get_VendorId, visit);
    ReadNumber(*device.Get(), "ProductId", &IZKUMUsbDevice::get_ProductId, visit);
    ReadText(*device.Get(), "DriverKeyName", &IZKUMUsbDevice::get_DriverKeyName, visit);
    ReadText(*device.Get(), "Vendor", &IZKUMUsbDevice::get_Vendor, visit);
    ReadText(*device.Get(), "Product", &IZKUMUsbDevice::get_Product, visit);
  }
  if (const auto controller = node.As<IZKUMHostController>()) {
    ReadText(*controller.Get(), "LeafName", &IZKUMHostController::get_LeafName, visit);
  }
  if (const auto hub = node.As<IZKUMHubDevice>()) {
    ReadText(*hub.Get(), "PathName", &IZKUMHubDevice::get_PathName, visit);
    ReadText(*hub.Get(), "ConnectionName", &IZKUMHubDevice::get_ConnectionName, visit);
  }
  if (const auto port = node.As<IZKUMHubPort>()) {
    ReadNumber(*port.Get(), "PortIndex", &IZKUMHubPort::get_PortIndex, visit);
  }
  if (const auto device = node.As<IZKUMPortDevice>()) ReadPortDevice(*device.Get(), visit);
  if (const auto info = node.As<IZKUMInfoDevice>()) ReadInfo(*info.Get(), visit);
  if (const auto device = node.As<IZKUMInterfaceDevice>()) ReadInterfaceDevice(*device.Get(), visit);
}

// Calls visit(node) for every node of a subtree, parents before their children, and returns how many there were. A list
// that cannot be had ends the branch.
template <class Visit>
std::size_t WalkChilds(const ComPtr<IZKUMUsbTreeNode>& root, Visit visit) {
  std::vector<ComPtr<IZKUMUsbTreeNode>> waiting{root};
  std::size_t nodes = 0;
  while (!waiting.empty()) {
    const ComPtr<IZKUMUsbTreeNode> node = std::move(waiting.back());
    waiting.pop_back();
    ++nodes;
    visit(node);
    ComPtr<IZKUMUsbTreeNodeEnumerator> childs;
    if (FAILED(node->get_Childs(childs.Put()))) continue;
    const auto first = static_cast<std::ptrdiff_t>(waiting.size());
    ForEachNode(*childs.Get(), [&](HRESULT, ComPtr<IZKUMUsbTreeNode>& child) {
      if (child) waiting.push_back(std::move(child));
    });
    std::reverse(waiting.begin() + first, waiting.end());
  }
  return nodes;
}

inline std::u16string InstanceIdOf(const ComPtr<IZKUMUsbTreeNode>& node) {
  std::u16string id;
  auto keep = [&](const char*, HRESULT, std::u16string_view text) { id = text; };
  if (node) ReadText(*node.Get(), "InstanceId", &IZKUMUsbTreeNode::get_InstanceId, keep);
  return id;
}

// ToString; empty where it fails.
inline std::u16string DumpOf(const ComPtr<IZKUMUsbTreeNode>& node) {
  std::u16string dump;
  auto keep = [&](const char*, HRESULT, std::u16string_view text) { dump = text; };
  if (const auto device = node.As<IZKUMUsbDevice>()) {
    ReadText(*device.Get(), "ToString", &IZKUMUsbDevice::get_ToString, keep);
  }
  return dump;
}

}  // namespace testing_support
