// What is plugged into a small PC, for benchmarks and tests.
#pragma once

#include <functional>

#include "bench/small_pcs.h"
#include "platform/host.h"
#include "platform/setup_api.h"
#include "simulation/machine/steps.h"

namespace KelvoUHW {

using platform::simulated::Plug;
using platform::simulated::Unplug;
using Change = decltype(platform::simulated::Step::change);

inline constexpr char16_t kVolumeManagerId[] = u"ROOT\\VOLMGR\\0000";
inline constexpr char16_t kInternalDiskId[] = u"SCSI\\DISK&VEN_WDC&PROD_INTERNAL\\4&0";
// Hubs with this service have no device record; the newer one is not on the list of exclusions.
inline constexpr char16_t kOldHubService[] = u"usbhub";
inline constexpr char16_t kNewHubService[] = u"USBHUB3";

inline Text UsbId(const Text& serial) { return u"USB\\VID_0781&PID_5567\\" + serial; }
inline Text DiskId(const Text& serial, std::uint32_t unit = 0) {
  return u"USBSTOR\\DISK&VEN_ACME&PROD_DISK&REV_1.00\\" + serial + u"&" +
         platform::Decimal(static_cast<std::int32_t>(unit));
}
inline Text VolumeId(const Text& diskId, const Text& partition = {}) {
  return u"STORAGE\\VOLUME\\_??_" + platform::Replaced(diskId, u'\\', u'#') +
         u"#{53F56307-B6BF-11D0-94F2-00A0C91EFB8B}" + partition;
}
inline Text DriverKey(const Text& id) { return u"{key}\\" + id; }

// What the parts of a Plug are added with.
inline void AddNode(Plug& plug, const Text& id, const Text& parent, const char16_t* deviceClass,
                    const char16_t* service) {
  plug.fragment.devices.push_back(
      DeviceNode(id, parent, deviceClass, DriverKey(id), u"Node of " + id));
  plug.fragment.devices.back().service = service;
}
inline void AddPort(Plug& plug, const Text& id, const Text& hub, std::uint32_t port) {
  plug.ports.push_back({HubName(hub), port, DevicePort(DriverKey(id), 0x0781, 0x5567)});
}
inline void AddStorageInterface(Plug& plug, const platform::Guid& kind, const Text& id,
                                const Text& diskId) {
  const Text path = u"\\\\?\\" + platform::Replaced(id, u'\\', u'#') + u"#" + GuidText(kind);
  plug.fragment.interfaces.push_back({kind, path, id});
  platform::simulated::Storage& storage = plug.fragment.storage.emplace_back();
  storage.path = path;
  storage.deviceType = 0;
  storage.vendor = "ACME    ";
  // Any number will do that differs from disk to disk.
  storage.deviceNumber = {7, static_cast<std::uint32_t>(std::hash<Text>{}(diskId)), 0};
}
inline void AddDisk(Plug& plug, const Text& id, const Text& parent) {
  AddNode(plug, id, parent, u"DiskDrive", u"disk");
  AddStorageInterface(plug, platform::GUID_DEVINTERFACE_DISK, id, id);
}
inline void AddVolume(Plug& plug, const Text& diskId, char16_t letter, const Text& partition = {}) {
  const Text id = VolumeId(diskId, partition);
  AddNode(plug, id, kVolumeManagerId, u"Volume", u"volsnap");
  AddStorageInterface(plug, platform::GUID_DEVINTERFACE_VOLUME, id, diskId);
  const Text drive = Text(1, letter) + u":";
  plug.fragment.volumes.push_back({u"\\\\?\\Volume{of " + drive + u"}\\",
                                   id,
                                   {drive + u"\\"},
                                   0x1234,
                                   platform::kDRIVE_REMOVABLE,
                                   false,
                                   {}});
  plug.fragment.drives.push_back(
      {letter, platform::kDRIVE_REMOVABLE, u"\\Device\\Volume of " + drive, id});
  plug.fragment.storage.push_back(plug.fragment.storage.back());
  plug.fragment.storage.back().path = u"\\\\.\\" + drive;
}

// Whole devices, each with its node and its port.
inline Plug Gadget(const Text& serial, std::uint32_t port, const Text& hub = kRootHubId,
                   const char16_t* deviceClass = u"HIDClass") {
  Plug plug;
  AddNode(plug, UsbId(serial), hub, deviceClass, u"HidUsb");
  AddPort(plug, UsbId(serial), hub, port);
  return plug;
}
inline Plug Stick(const Text& serial, std::uint32_t port, char16_t letter,
                  const Text& hub = kRootHubId) {
  Plug plug = Gadget(serial, port, hub, u"USB");
  AddDisk(plug, DiskId(serial), UsbId(serial));
  AddVolume(plug, DiskId(serial), letter);
  return plug;
}
// A reader with two slots, both empty. A card is a volume on the disk of its slot.
inline Plug CardReader(const Text& serial, std::uint32_t port) {
  Plug plug = Gadget(serial, port, kRootHubId, u"USB");
  AddDisk(plug, DiskId(serial, 0), UsbId(serial));
  AddDisk(plug, DiskId(serial, 1), UsbId(serial));
  return plug;
}
inline Plug Volume(const Text& diskId, char16_t letter, const Text& partition = {}) {
  Plug plug;
  AddVolume(plug, diskId, letter, partition);
  return plug;
}
inline Plug ExternalHub(const Text& serial, std::uint32_t port,
                        const char16_t* service = kOldHubService) {
  Plug plug;
  AddNode(plug, UsbId(serial), kRootHubId, u"USB", service);
  plug.fragment.hubs.push_back({HubName(UsbId(serial)), {{}, {}, {}}, false});
  plug.ports.push_back(
      {HubName(kRootHubId), port, HubOnPort(DriverKey(UsbId(serial)), HubName(UsbId(serial)))});
  return plug;
}

// One controller with a root hub of six free ports, and the volume manager.
inline Machine BarePc(const char16_t* hubService = kOldHubService) {
  Machine machine = OneController(6);
  machine.devices[2].service = hubService;
  machine.devices.push_back(
      DeviceNode(kVolumeManagerId, u"", u"System", u"{sys}\\0002", u"Volume manager"));
  return machine;
}
// What a PC has below its PCI bus besides: a storage controller with a disk and a fixed volume.
inline Plug InternalDisk() {
  Plug plug;
  AddNode(plug, u"PCI\\VEN_8086&DEV_2822\\3&0", u"ACPI\\PNP0A08\\0", u"SCSIAdapter", u"iaStor");
  AddDisk(plug, kInternalDiskId, u"PCI\\VEN_8086&DEV_2822\\3&0");
  AddNode(plug, u"STORAGE\\VOLUME\\{1}#00", kVolumeManagerId, u"Volume", u"volsnap");
  AddStorageInterface(plug, platform::GUID_DEVINTERFACE_VOLUME, u"STORAGE\\VOLUME\\{1}#00",
                      kInternalDiskId);
  return plug;
}

}  // namespace KelvoUHW
