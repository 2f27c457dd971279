#include "tools/zkusb/json.h"

#include <array>

#include "platform/text.h"
#include "records/usb_names.h"

namespace zkusb {

namespace {

constexpr std::array<const char*, 8> kTypeNames{
    "KUDTUnknown", "KUDTRoot",       "KUDTHostController", "KUDTHub",
    "KUDTHubPort", "KUDTPortDevice", "KUDTInfoDevice",     "KUDTInterfaceDevice"};
constexpr std::array<const char*, 4> kEventNames{"KDeviceConnected", "KDeviceAttached",
                                                 "KDeviceRemoved", "KDeviceModified"};

Json TextsJson(const std::vector<std::u16string>& texts) {
  Json list = Json::array();
  for (const std::u16string& text : texts) list.push_back(TextJson(text));
  return list;
}

void AddInfo(const InfoView& info, Json& object) {
  object["Service"] = TextJson(info.Service);
  object["FriendlyName"] = TextJson(info.FriendlyName);
  object["Location"] = TextJson(info.Location);
  object["Manufacturer"] = TextJson(info.Manufacturer);
  object["HardwareId"] = TextJson(info.HardwareId);
  object["PhysicalName"] = TextJson(info.PhysicalName);
  object["DevClass"] = TextJson(info.DevClass);
  object["EnumName"] = TextJson(info.EnumName);
  object["ClassGuid"] = TextJson(info.ClassGuid);
}

// The ids of an interface device are the texts of its storage descriptor and not numbers.
void AddStorage(const StorageView& storage, Json& object) {
  object["VolumeName"] = TextJson(storage.VolumeName);
  object["VendorId"] = TextJson(storage.VendorId);
  object["ProductId"] = TextJson(storage.ProductId);
  object["ProductRev"] = TextJson(storage.ProductRev);
  object["DevicePath"] = TextJson(storage.DevicePath);
  object["MountPoints"] = TextsJson(storage.MountPoints);
}

void AddVendorName(const NodeView& node, Json& object) {
  std::u16string_view name;
  if (node.VendorId >= 0 && node.VendorId <= 0xFFFF) {
    name = KelvoUHW::VendorName(static_cast<std::uint16_t>(node.VendorId)).value_or(u"");
  }
  object["VendorName"] = TextJson(name);
}

void AddProperties(const NodeView& node, Json& object) {
  object["Type"] = kTypeNames.at(static_cast<std::size_t>(node.Type));
  object["InstanceId"] = TextJson(node.InstanceId);
  object["Description"] = TextJson(node.Description);
  object["SerialNumber"] = TextJson(node.SerialNumber);
  object["VendorId"] = node.VendorId;
  object["ProductId"] = node.ProductId;
  object["DriverKeyName"] = TextJson(node.DriverKeyName);
  object["Vendor"] = TextJson(node.Vendor);
  object["Product"] = TextJson(node.Product);
  switch (node.Type) {
    case KUDTHostController:
      object["LeafName"] = TextJson(node.LeafName);
      break;
    case KUDTHub:
      AddVendorName(node, object);
      object["PathName"] = TextJson(node.PathName);
      object["ConnectionName"] = TextJson(node.ConnectionName);
      break;
    case KUDTHubPort:
      object["PortIndex"] = node.PortIndex;
      break;
    case KUDTPortDevice:
      AddVendorName(node, object);
      object["Manufacturer1"] = TextJson(node.Manufacturer1);
      object["Speed"] = node.Speed;
      object["NumberInterfaces"] = node.NumberInterfaces;
      break;
    default:
      break;
  }
  if (node.Info) AddInfo(*node.Info, object);
  if (node.Storage) AddStorage(*node.Storage, object);
}

Json DiskJson(const Disk& disk) {
  Json volumes = Json::array();
  for (const StorageView* volume : disk.volumes) {
    Json& object = volumes.emplace_back(Json::object());
    AddStorage(*volume, object);
  }
  return {{"InstanceId", TextJson(disk.id)},
          {"Name", TextJson(disk.name)},
          {"MountPoints", TextsJson(disk.mountPoints)},
          {"Volumes", std::move(volumes)}};
}

void AddDevice(const NodeView& device, Json& object) {
  AddProperties(device, object);
  object["MountPoints"] = TextsJson(MountPointsOf(device));
  Json& disks = object["Disks"] = Json::array();
  for (const Disk& disk : DisksOf(device)) disks.push_back(DiskJson(disk));
}

}  // namespace

Json TreeJson(const NodeView& node) {
  Json object = Json::object();
  AddProperties(node, object);
  Json& children = object["Childs"] = Json::array();
  for (const NodeView& child : node.Childs) children.push_back(TreeJson(child));
  return object;
}

Json DeviceJson(const NodeView& device) {
  Json object = Json::object();
  AddDevice(device, object);
  return object;
}

Json PlacedDeviceJson(const PlacedDevice& placed) {
  Json object = {{"Controller", placed.controller}, {"Ports", placed.ports}};
  AddDevice(*placed.device, object);
  return object;
}

Json TextJson(std::u16string_view text) { return platform::ToUtf8(text); }

const char* EventName(TDeviceEventType kind) noexcept {
  return kEventNames[static_cast<std::size_t>(kind)];
}

}  // namespace zkusb
