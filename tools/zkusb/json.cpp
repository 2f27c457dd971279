#include "tools/zkusb/json.h"

#include <array>

#include "platform/text.h"
#include "platform/usb_ioctl.h"
#include "records/usb_names.h"

namespace zkusb {

namespace {

constexpr std::array<const char*, 8> kTypeNames{
    "KUDTUnknown", "KUDTRoot",       "KUDTHostController", "KUDTHub",
    "KUDTHubPort", "KUDTPortDevice", "KUDTInfoDevice",     "KUDTInterfaceDevice"};
constexpr std::array<const char*, 4> kEventNames{"KDeviceConnected", "KDeviceAttached",
                                                 "KDeviceRemoved", "KDeviceModified"};

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
  object["driveLetters"] = TextsJson(DriveLetters(storage.MountPoints));
}

void AddVendorName(const NodeView& node, Json& object) {
  std::u16string_view name;
  if (node.VendorId >= 0 && node.VendorId <= 0xFFFF) {
    name = KelvoUHW::VendorName(static_cast<std::uint16_t>(node.VendorId)).value_or(u"");
  }
  object["vendorName"] = TextJson(name);
}

std::string SpeedName(std::uint32_t speed) {
  switch (speed) {
    case platform::UsbLowSpeed:
      return "low";
    case platform::UsbFullSpeed:
      return "full";
    case platform::UsbHighSpeed:
      return "high";
    default:
      return "unknown (" + std::to_string(speed) + ")";
  }
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
      object["speed"] = SpeedName(node.Speed);
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
          {"name", TextJson(disk.name)},
          {"mountPoints", TextsJson(disk.mountPoints)},
          {"driveLetters", TextsJson(DriveLetters(disk.mountPoints))},
          {"volumes", std::move(volumes)}};
}

void AddDisks(const NodeView& device, Json& object) {
  const std::vector<std::u16string> mountPoints = MountPointsOf(device);
  object["driveLetters"] = TextsJson(DriveLetters(mountPoints));
  object["mountPoints"] = TextsJson(mountPoints);
  Json& disks = object["disks"] = Json::array();
  for (const Disk& disk : DisksOf(device)) disks.push_back(DiskJson(disk));
}

}  // namespace

Json NodeJson(const NodeView& node, const Place& place) {
  Json object = Json::object();
  if (node.Type == KUDTHostController) object["controller"] = place.controller;
  if (node.Type == KUDTHub || node.Type == KUDTHubPort || node.Type == KUDTPortDevice) {
    object["portPath"] = TextJson(PortPath(place));
  }
  AddProperties(node, object);
  if (node.Type == KUDTPortDevice) AddDisks(node, object);
  return object;
}

Json TextJson(std::u16string_view text) { return platform::ToUtf8(text); }

Json TextsJson(const std::vector<std::u16string>& texts) {
  Json list = Json::array();
  for (const std::u16string& text : texts) list.push_back(TextJson(text));
  return list;
}

const char* EventName(TDeviceEventType kind) noexcept {
  return kEventNames[static_cast<std::size_t>(kind)];
}

}  // namespace zkusb
