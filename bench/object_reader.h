// Reads node objects as a client does: through their interfaces alone.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>
#include <vector>

#include "com/com_ptr.h"
#include "com/variant.h"
#include "com/zkusb_monitor.h"
#include "platform/text.h"

namespace testing_support {

using KelvoUHW::ComPtr;
using KelvoUHW::Variant;

// Calls visit(result of GetCurrent, node) for each element of a list; the node is empty where the
// call failed.
template <class Visit>
void ForEachNode(IZKUMUsbTreeNodeEnumerator& nodes, Visit visit) {
  VARIANT_BOOL more = VARIANT_FALSE;
  while (SUCCEEDED(nodes.MoveNext(&more)) && more != VARIANT_FALSE) {
    ComPtr<IZKUMUsbTreeNode> node;
    const HRESULT result = nodes.GetCurrent(node.Put());
    visit(result, node);
  }
}

// Calls visit(name, result, value) for the properties of an object: a name, its getter, the next
// name, its getter, ...
template <class Visit, class Interface, class Value, class... More>
void ReadAll(Interface& object, Visit& visit, const char* name,
             HRESULT (STDMETHODCALLTYPE Interface::*get)(Value*), More... more) {
  Value value{};
  const HRESULT result = (object.*get)(&value);
  if constexpr (std::is_same_v<Value, BSTR>) {
    const Variant owner = Variant::OfBstr(value);
    visit(name, result, platform::BstrText(value));
  } else {
    visit(name, result, static_cast<std::int64_t>(value));
  }
  if constexpr (sizeof...(more) != 0) ReadAll(object, visit, more...);
}

// Calls visit(element) for each VARIANT of a collection; the result is that of making it.
template <class Interface, class Visit>
HRESULT ForEachElement(Interface& object,
                       HRESULT (STDMETHODCALLTYPE Interface::*get)(IEnumVARIANT**), Visit visit) {
  ComPtr<IEnumVARIANT> collection;
  const HRESULT result = (object.*get)(collection.Put());
  if (!collection) return result;
  for (Variant element; collection->Next(1, &element, nullptr) == S_OK; VariantClear(&element))
    visit(element);
  return result;
}

template <class Visit>
void ReadInfo(IZKUMInfoDevice& info, Visit& visit) {
  ReadAll(info, visit, "Service", &IZKUMInfoDevice::get_Service, "FriendlyName",
          &IZKUMInfoDevice::get_FriendlyName, "Location", &IZKUMInfoDevice::get_Location,
          "Manufacturer", &IZKUMInfoDevice::get_Manufacturer, "HardwareId",
          &IZKUMInfoDevice::get_HardwareId, "PhysicalName", &IZKUMInfoDevice::get_PhysicalName,
          "DevClass", &IZKUMInfoDevice::get_DevClass, "EnumName", &IZKUMInfoDevice::get_EnumName);
  GUID guid{};
  const HRESULT result = info.get_ClassGuid(&guid);
  visit("ClassGuid", result,
        std::u16string_view(platform::GuidText(platform::FromSystemGuid(guid))));
}

template <class Visit>
void ReadPortDevice(IZKUMPortDevice& device, Visit& visit) {
  ReadAll(device, visit, "Product", &IZKUMPortDevice::get_Product, "Manufacturer1",
          &IZKUMPortDevice::get_Manufacturer1, "Speed", &IZKUMPortDevice::get_Speed,
          "NumberInterfaces", &IZKUMPortDevice::get_NumberInterfaces);
  const HRESULT result = ForEachElement(
      device, &IZKUMPortDevice::get_InterfaceDescriptors, [&](const Variant& element) {
        const auto descriptor =
            ComPtr<IUnknown>(element.punkVal).template As<IZKUMInterfaceDescr>();
        ReadAll(*descriptor.Get(), visit, "InterfaceClass",
                &IZKUMInterfaceDescr::get_InterfaceClass, "InterfaceSubClass",
                &IZKUMInterfaceDescr::get_InterfaceSubClass, "InterfaceProtocol",
                &IZKUMInterfaceDescr::get_InterfaceProtocol);
      });
  visit("InterfaceDescriptors", result, std::u16string_view());
}

template <class Visit>
void ReadInterfaceDevice(IZKUMInterfaceDevice& device, Visit& visit) {
  ReadAll(device, visit, "VolumeName", &IZKUMInterfaceDevice::get_VolumeName, "VendorId",
          &IZKUMInterfaceDevice::get_VendorId, "ProductId", &IZKUMInterfaceDevice::get_ProductId,
          "ProductRev", &IZKUMInterfaceDevice::get_ProductRev, "DevicePath",
          &IZKUMInterfaceDevice::get_DevicePath, "MountPoint",
          &IZKUMInterfaceDevice::get_MountPoint);
  const HRESULT result =
      ForEachElement(device, &IZKUMInterfaceDevice::get_MountPoints, [&](const Variant& element) {
        visit("one of MountPoints", S_OK, platform::BstrText(element.bstrVal));
      });
  visit("MountPoints", result, std::u16string_view());
}

// The same for each interface of the node, but for what leads to other nodes and ToString. A value
// is text or number.
template <class Visit>
void ReadProperties(const ComPtr<IZKUMUsbTreeNode>& node, Visit visit) {
  ReadAll(*node.Get(), visit, "InstanceId", &IZKUMUsbTreeNode::get_InstanceId, "Type",
          &IZKUMUsbTreeNode::get_Type);
  if (const auto device = node.As<IZKUMUsbDevice>()) {
    ReadAll(*device.Get(), visit, "Description", &IZKUMUsbDevice::get_Description, "SerialNumber",
            &IZKUMUsbDevice::get_SerialNumber, "VendorId", &IZKUMUsbDevice::get_VendorId,
            "ProductId", &IZKUMUsbDevice::get_ProductId, "DriverKeyName",
            &IZKUMUsbDevice::get_DriverKeyName, "Vendor", &IZKUMUsbDevice::get_Vendor, "Product",
            &IZKUMUsbDevice::get_Product);
  }
  if (const auto controller = node.As<IZKUMHostController>()) {
    ReadAll(*controller.Get(), visit, "LeafName", &IZKUMHostController::get_LeafName);
  }
  if (const auto hub = node.As<IZKUMHubDevice>()) {
    ReadAll(*hub.Get(), visit, "PathName", &IZKUMHubDevice::get_PathName, "ConnectionName",
            &IZKUMHubDevice::get_ConnectionName);
  }
  if (const auto port = node.As<IZKUMHubPort>()) {
    ReadAll(*port.Get(), visit, "PortIndex", &IZKUMHubPort::get_PortIndex);
  }
  if (const auto device = node.As<IZKUMPortDevice>()) ReadPortDevice(*device.Get(), visit);
  if (const auto info = node.As<IZKUMInfoDevice>()) ReadInfo(*info.Get(), visit);
  if (const auto device = node.As<IZKUMInterfaceDevice>())
    ReadInterfaceDevice(*device.Get(), visit);
}

// Calls visit(node) for a subtree, parents first; returns the number of nodes. A list that cannot
// be had ends a branch.
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
  if (node) ReadAll(*node.Get(), keep, "InstanceId", &IZKUMUsbTreeNode::get_InstanceId);
  return id;
}

// ToString; empty where it fails.
inline std::u16string DumpOf(const ComPtr<IZKUMUsbTreeNode>& node) {
  std::u16string dump;
  auto keep = [&](const char*, HRESULT, std::u16string_view text) { dump = text; };
  if (const auto device = node.As<IZKUMUsbDevice>()) {
    ReadAll(*device.Get(), keep, "ToString", &IZKUMUsbDevice::get_ToString);
  }
  return dump;
}

}  // namespace testing_support
