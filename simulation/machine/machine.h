// A PC as data: what its operating system would answer to the component's questions. It is read
// from a machine file (docs/machine-file.md describes every member) or built by a program.
// SimulatedPc (simulation/pc/simulated_pc.h) is a PC that gives these answers.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "platform/guid.h"
#include "platform/usb_ioctl.h"

namespace platform::simulated {

using Text = std::u16string;

// A device-manager node. A property without a value cannot be read.
struct Device {
  Text id;
  Text parent;  // empty: the root device
  std::optional<Text> deviceClass;
  std::optional<Text> classGuid;
  std::optional<Text> service;
  std::optional<Text> driver;
  std::optional<Text> description;
  std::optional<Text> friendlyName;
  std::optional<Text> manufacturer;
  std::optional<Text> location;
  std::optional<std::vector<Text>> hardwareIds;
  std::optional<Text> physicalName;
  std::optional<Text> enumerator;
  std::optional<std::int32_t> legacyBusType;
  std::optional<std::uint32_t> uiNumber;
  bool noParent = false;
  bool noClassImage = false;
  bool noClassDescription = false;
};

struct Interface {
  Guid interfaceClass;
  Text path;
  Text device;
};

struct HostController {
  std::vector<Text> names;
  std::optional<Text> driverKey;
  std::optional<Text> rootHub;
};

enum class Speed : std::uint8_t { Low, Full, High, Super };

struct Port {
  std::uint32_t status = 0;
  Speed speed = Speed::Full;
  bool isHub = false;
  std::optional<Text> hubName;
  std::optional<Text> driverKey;
  USB_DEVICE_DESCRIPTOR descriptor{};
  std::uint8_t configuration = 0;
  std::uint16_t address = 0;
  std::vector<USB_PIPE_INFO> pipes;
};

struct Hub {
  Text name;
  std::vector<Port> ports;
  bool busPowered = false;
};

struct DeviceNumber {
  std::uint32_t type = 0;
  std::uint32_t number = 0;
  std::uint32_t partition = 0;
};

struct Storage {
  Text path;
  std::optional<std::uint8_t> deviceType;
  std::uint8_t deviceTypeModifier = 0;
  bool removable = false;
  std::optional<std::string> vendor;  // 8-bit characters as the device reports them
  std::optional<std::string> product;
  std::optional<std::string> revision;
  std::optional<std::string> serial;
  std::optional<DeviceNumber> deviceNumber;
  std::optional<Text> mediaSerialNumber;
};

struct FolderMount {
  Text folder;
  Text volume;
};

struct Volume {
  Text name;
  Text device;  // may be empty
  std::vector<Text> paths;
  std::optional<std::uint32_t> serial;
  std::uint32_t driveType = 3;  // a value of DriveType
  bool reparsePoints = false;
  std::vector<FolderMount> folderMounts;
};

struct Drive {
  char16_t letter = u'A';
  std::uint32_t type = 3;  // a value of DriveType
  std::optional<Text> dosDevice;
  Text device;  // may be empty
};

struct Machine {
  Text name;
  std::vector<Text> notes;
  std::vector<Device> devices;
  std::vector<Interface> interfaces;
  std::vector<HostController> hostControllers;
  std::vector<Hub> hubs;
  std::vector<Storage> storage;
  std::vector<Volume> volumes;
  std::vector<Drive> drives;
};

inline constexpr std::uint32_t kRootDeviceNumber = 0x7FFFFFFF;
inline constexpr char16_t kRootDeviceId[] = u"HTREE\\ROOT\\0";

}  // namespace platform::simulated
