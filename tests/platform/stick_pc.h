// A small PC for tests: one controller, a root hub of three ports with a stick on port 1 and a hub
// (two free ports) on port 2, an internal disk with C:, and the stick's E:.
#pragma once

#include "platform/simulated/machine.h"
#include "platform/simulated/simulated_pc.h"
#include "platform/text.h"

namespace platform::simulated {

inline constexpr char16_t kController[] = u"PCI\\VEN_8086&DEV_1E31\\3&A0";
inline constexpr char16_t kControllerPath[] = u"\\\\?\\PCI#VEN_8086&DEV_1E31#3&a0#{3abf6f2d}";
inline constexpr char16_t kRootHubName[] = u"USB#ROOT_HUB30#4&1#{f18a0e88}";
inline constexpr char16_t kHub[] = u"USB\\VID_0424&PID_2513\\5&2";
inline constexpr char16_t kHubName[] = u"USB#VID_0424&PID_2513#5&2#{f18a0e88}";
inline constexpr char16_t kStick[] = u"USB\\VID_0781&PID_5580\\AA01";
inline constexpr char16_t kDisk[] = u"USBSTOR\\DISK&VEN_SANDISK\\AA01&0";
inline constexpr char16_t kDiskPath[] = u"\\\\?\\USBSTOR#Disk&Ven_SanDisk#AA01&0#{53f56307}";
inline constexpr char16_t kStickVolume[] = u"STORAGE\\VOLUME\\_??_USBSTOR#DISK&VEN_SANDISK#AA01&0#{53F56307}";
inline constexpr char16_t kStickVolumePath[] =
    u"\\\\?\\STORAGE#Volume#_??_USBSTOR#Disk&Ven_SanDisk#AA01&0#{53f56307}#{53f5630d}";
inline constexpr char16_t kStickVolumeName[] = u"\\\\?\\Volume{3869c27a}\\";
inline constexpr char16_t kSystemVolume[] = u"STORAGE\\VOLUME\\{5C31}#01";
inline constexpr char16_t kSystemVolumePath[] = u"\\\\?\\STORAGE#Volume#{5c31}#01#{53f5630d}";
inline constexpr char16_t kSystemVolumeName[] = u"\\\\?\\Volume{09931f21}\\";
inline constexpr char16_t kDiskClass[] = u"{4d36e967-e325-11ce-bfc1-08002be10318}";

// The error of a refusal, 0 of a success.
inline std::uint32_t Error(const Status& status) { return status.ok ? 0 : status.error; }

inline Device MakeDevice(Text id, Text parent, Text deviceClass, Text driver) {
  Device device;
  device.id = std::move(id);
  device.parent = std::move(parent);
  device.deviceClass = std::move(deviceClass);
  device.driver = std::move(driver);
  return device;
}

inline Machine StickMachine() {
  Machine machine;
  machine.devices = {MakeDevice(kController, u"", u"USB", u"{usb}\\0000"),
                     MakeDevice(u"USB\\ROOT_HUB30\\4&1", kController, u"USB", u"{usb}\\0001"),
                     MakeDevice(kHub, u"USB\\ROOT_HUB30\\4&1", u"USB", u"{usb}\\0002"),
                     MakeDevice(kStick, u"usb\\root_hub30\\4&1", u"USB", u"{usb}\\0003"),
                     MakeDevice(kDisk, kStick, u"DiskDrive", u"{disk}\\0001"),
                     MakeDevice(u"ROOT\\VOLMGR\\0000", kRootDeviceId, u"System", u"{system}\\0000"),
                     MakeDevice(kStickVolume, u"ROOT\\VOLMGR\\0000", u"Volume", u"{volume}\\0001"),
                     MakeDevice(kSystemVolume, u"ROOT\\VOLMGR\\0000", u"Volume", u"{volume}\\0000")};
  Device& disk = machine.devices[4];
  disk.classGuid = kDiskClass;
  disk.description = u"Disk drive";
  disk.friendlyName = u"SanDisk Extreme USB Device";
  disk.hardwareIds = {{u"USBSTOR\\DiskSanDisk", u"GenDisk"}};
  disk.legacyBusType = -1;
  disk.uiNumber = 7;
  machine.devices[6].physicalName = u"\\Device\\HarddiskVolume5";
  machine.interfaces = {{{0x3ABF6F2D, 0, 0, {}}, kControllerPath, kController},
                        {GUID_DEVINTERFACE_DISK, kDiskPath, kDisk},
                        {GUID_DEVINTERFACE_VOLUME, kStickVolumePath, kStickVolume},
                        {GUID_DEVINTERFACE_VOLUME, kSystemVolumePath, kSystemVolume}};
  machine.hostControllers = {{{u"\\\\.\\HCD0", kControllerPath}, u"{usb}\\0000", kRootHubName}};

  Port stick{DeviceConnected, Speed::Super, false, {}, u"{usb}\\0003", {}, 1, 5, {}};
  stick.descriptor.idVendor = 0x0781;
  stick.descriptor.idProduct = 0x5580;
  stick.pipes = {{{7, 5, 0x81, 2, 1024, 0}, 0}, {{7, 5, 0x02, 2, 1024, 0}, 0}};
  const Port hub{DeviceConnected, Speed::Full, true, kHubName, u"{usb}\\0002", {}, 0, 0, {}};
  machine.hubs = {{kRootHubName, {stick, hub, Port{}}, false}, {kHubName, {Port{}, Port{}}, true}};
  machine.storage = {{kDiskPath, std::uint8_t{0}, 0, true, "SanDisk ", {}, {}, "AA01", DeviceNumber{7, 1, 0}, u"M1"},
                     {u"\\\\.\\E:", {}, 0, true, "SanDisk ", {}, {}, "AA01", DeviceNumber{7, 1, 1}, {}}};

  const FolderMount folder{u"Mount\\Stick\\", kStickVolumeName};
  machine.volumes = {
      {kSystemVolumeName, kSystemVolume, {u"C:\\"}, 0xB4D87E32, kDRIVE_FIXED, true, {folder}},
      {kStickVolumeName, kStickVolume, {u"E:\\", u"C:\\Mount\\Stick\\"}, 0x3E9A61C7, kDRIVE_REMOVABLE, false, {}}};
  machine.drives = {{u'E', kDRIVE_REMOVABLE, u"\\Device\\HarddiskVolume5", kDisk},
                    {u'C', kDRIVE_FIXED, u"\\Device\\HarddiskVolume4", u""}};
  return machine;
}

// What comes back with the stick.
inline Plug StickPlug() {
  const Machine whole = StickMachine();
  Plug back;
  back.fragment.devices = {whole.devices[3], whole.devices[4], whole.devices[6]};
  back.fragment.interfaces = {whole.interfaces[1], whole.interfaces[2]};
  back.fragment.storage = whole.storage;
  back.fragment.volumes = {whole.volumes[1]};
  back.fragment.drives = {whole.drives[0]};
  back.ports = {{ToUpper(std::u16string_view(kRootHubName)), 1, whole.hubs[0].ports[0]}};
  return back;
}

inline Step UnplugStep(Text device) { return {0, u"", Unplug{std::move(device)}}; }

}  // namespace platform::simulated
