// The commands find and volumes.
#include "tools/zkusb/commands.h"
#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/device_texts.h"
#include "tools/zkusb/json.h"

namespace zkusb {

namespace {

using Devices = std::vector<PlacedDevice>;

void PrintJson(const Devices& devices, Writer& out) {
  Json list = Json::array();
  for (const PlacedDevice& placed : devices) list.push_back(PlacedDeviceJson(placed));
  out.Json(list, true);
}

std::u16string SerialColumn(const NodeView& device) {
  const std::u16string serial = SerialText(device);
  return serial.empty() ? std::u16string(u"no serial number") : u"serial " + serial;
}

void PrintFoundLine(const PlacedDevice& placed, Writer& out) {
  const NodeView& device = *placed.device;
  out.Line(Joined({IdText(device), SerialColumn(device), PlaceText(placed), NamesText(device),
                   MountPointsText(MountPointsOf(device))},
                  u"  "));
}

void PrintVolumeLines(const NodeView& device, Writer& out) {
  out.Line(Joined({IdText(device), NamesText(device), SerialColumn(device)}, u"  "));
  for (const Disk& disk : DisksOf(device)) {
    if (!disk.hasInterface) continue;
    out.Line(u"  " + Joined({u"Disk " + disk.name, MountPointsText(disk.mountPoints),
                             disk.volumes.empty() ? u"no volume" : u""},
                            u"  "));
    for (const StorageView* volume : disk.volumes) {
      const std::u16string mountPoints = MountPointsText(volume->MountPoints);
      out.Line(u"    " + Joined({u"Volume " + volume->VolumeName,
                                 mountPoints.empty() ? u"not mounted" : mountPoints},
                                u"  "));
    }
  }
}

}  // namespace

bool PrintFound(const NodeView& root, std::uint16_t vendor, std::optional<std::uint16_t> product,
                bool json, Writer& out) {
  Devices devices = PortDevices(root);
  std::erase_if(devices, [&](const PlacedDevice& placed) {
    return placed.device->VendorId != vendor || (product && placed.device->ProductId != *product);
  });
  if (json) {
    PrintJson(devices, out);
  } else {
    for (const PlacedDevice& placed : devices) PrintFoundLine(placed, out);
  }
  return !devices.empty();
}

bool PrintVolumes(const NodeView& root, bool json, Writer& out) {
  Devices devices = PortDevices(root);
  std::erase_if(devices,
                [](const PlacedDevice& placed) { return !CarriesStorage(*placed.device); });
  if (json) {
    PrintJson(devices, out);
  } else {
    for (const PlacedDevice& placed : devices) PrintVolumeLines(*placed.device, out);
  }
  return !devices.empty();
}

}  // namespace zkusb
