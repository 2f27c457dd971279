// A small PC for tests: one controller, a root hub of three ports with a stick on port 1 and a hub
// (two free ports) on port 2, an internal disk with C:, and the stick's E:.
#pragma once

#include "platform/text.h"
#include "simulation/machine/machine_file.h"
#include "simulation/pc/simulated_pc.h"

namespace platform::simulated {

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

// The error of a refusal, 0 of a success.
inline std::uint32_t Error(const Status& status) { return status.ok ? 0 : status.error; }

inline Machine StickMachine() { return LoadMachine(ZKUSB_SOURCE_DIR "/tests/simulation/stick-pc.json"); }

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
