// The commands find and volumes.
#include <algorithm>

#include "platform/text.h"
#include "tools/zkusb/command_line.h"
#include "tools/zkusb/commands.h"
#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/device_texts.h"
#include "tools/zkusb/json_document.h"

namespace zkusb {

namespace {

using Devices = std::vector<PlacedDevice>;

void PrintJson(const char* command, const Devices& devices, Writer& out) {
  JsonDocument document(command, out);
  document.BeginArray("devices");
  for (const PlacedDevice& placed : devices) {
    document.Element(NodeJson(*placed.device, placed.place));
  }
  document.Finish();
}

std::u16string SerialColumn(const NodeView& device) {
  const std::u16string serial = SerialText(device);
  return serial.empty() ? std::u16string(u"no serial number") : u"serial " + serial;
}

std::u16string WithBlanks(const std::u16string& text) { return text.empty() ? text : u"  " + text; }

void PrintFoundLine(const PlacedDevice& placed, Writer& out) {
  const NodeView& device = *placed.device;
  const std::u16string names = NamesText(device);
  out.FittedLine(Joined({IdText(device), PlaceText(placed.place), SerialColumn(device)}, u"  "),
                 names.empty() ? names : u"  " + names,
                 WithBlanks(MountPointsText(MountPointsOf(device))));
}

void PrintVolumeLines(const PlacedDevice& placed, Writer& out) {
  const NodeView& device = *placed.device;
  out.FittedLine(Joined({IdText(device), PlaceText(placed.place)}, u"  ") + u"  ",
                 NamesText(device), u"  " + SerialColumn(device));
  for (const Disk& disk : DisksOf(device)) {
    if (!disk.hasInterface) continue;
    out.FittedLine(u"  Disk ", disk.name,
                   WithBlanks(Joined({MountPointsText(disk.mountPoints),
                                      disk.volumes.empty() ? u"no volume" : u""},
                                     u"  ")));
    for (const StorageView* volume : disk.volumes) {
      const std::u16string mountPoints = MountPointsText(volume->MountPoints);
      out.FittedLine(u"    Volume ", volume->VolumeName,
                     u"  " + (mountPoints.empty() ? u"not mounted" : mountPoints));
    }
  }
}

bool Holds(std::u16string_view text, const std::u16string& lowered) {
  return platform::ToLower(text).find(lowered) != std::u16string::npos;
}

std::u16string WithoutEnd(std::u16string path) {
  if (path.ends_with(u'\\')) path.pop_back();
  return path;
}

bool MatchesTerm(const PlacedDevice& placed, const std::u16string& term) {
  const NodeView& device = *placed.device;
  const std::u16string lowered = platform::ToLower(term);
  const std::u16string path = WithoutEnd(lowered);
  const bool isMounted =
      std::ranges::any_of(MountPointsOf(device), [&](const std::u16string& mountPoint) {
        return WithoutEnd(platform::ToLower(mountPoint)) == path;
      });
  // "E:" stands in names too, such as "Device: none".
  if (isMounted || IsDriveLetter(platform::ToUtf8(term))) return isMounted;
  if (lowered == platform::ToLower(IdText(device)) || lowered == PortPath(placed.place)) {
    return true;
  }
  for (const std::u16string& text :
       {VendorText(device), Tidied(device.Vendor), Tidied(device.Manufacturer1),
        Tidied(device.Product), Tidied(device.Description), SerialText(device)}) {
    if (Holds(text, lowered)) return true;
  }
  if (device.Info && Holds(Tidied(device.Info->FriendlyName), lowered)) return true;
  return std::ranges::any_of(DisksOf(device),
                             [&](const Disk& disk) { return Holds(disk.name, lowered); });
}

bool Matches(const PlacedDevice& placed, const Wanted& wanted) {
  return (!wanted.vendor || placed.device->VendorId == *wanted.vendor) &&
         (!wanted.product || placed.device->ProductId == *wanted.product) &&
         std::ranges::all_of(wanted.terms,
                             [&](const std::u16string& term) { return MatchesTerm(placed, term); });
}

}  // namespace

bool PrintFound(const NodeView& root, const Wanted& wanted, bool json, Writer& out) {
  Devices devices = PortDevices(root);
  std::erase_if(devices, [&](const PlacedDevice& placed) { return !Matches(placed, wanted); });
  if (json) {
    PrintJson("find", devices, out);
  } else {
    for (const PlacedDevice& placed : devices) PrintFoundLine(placed, out);
  }
  return !devices.empty();
}

std::u16string WantedText(const Wanted& wanted) {
  std::vector<std::u16string> parts;
  for (const std::u16string& term : wanted.terms) parts.push_back(u"\"" + term + u"\"");
  if (wanted.vendor && wanted.product) {
    parts.push_back(platform::Hex(*wanted.vendor, 4) + u":" + platform::Hex(*wanted.product, 4));
  } else if (wanted.vendor) {
    parts.push_back(u"of vendor " + platform::Hex(*wanted.vendor, 4));
  } else if (wanted.product) {
    parts.push_back(u"of product " + platform::Hex(*wanted.product, 4));
  }
  return Joined(parts, u" ");
}

bool PrintVolumes(const NodeView& root, bool json, Writer& out) {
  Devices devices = PortDevices(root);
  std::erase_if(devices,
                [](const PlacedDevice& placed) { return !CarriesStorage(*placed.device); });
  if (json) {
    PrintJson("volumes", devices, out);
  } else {
    for (const PlacedDevice& placed : devices) PrintVolumeLines(placed, out);
  }
  return !devices.empty();
}

}  // namespace zkusb
