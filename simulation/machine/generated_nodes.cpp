#include "simulation/machine/generated_nodes.h"

#include <string>

#include "platform/host.h"
#include "platform/text.h"

namespace platform::simulated {

struct GeneratedClass {
  const char16_t* name;
  const char16_t* guid;
};

namespace {

constexpr GeneratedClass kUsb{u"USB", u"{36fc9e60-c465-11cf-8056-444553540000}"};
constexpr GeneratedClass kSystem{u"System", u"{4d36e97d-e325-11ce-bfc1-08002be10318}"};
constexpr GeneratedClass kHid{u"HIDClass", u"{745a17a0-74d3-11d0-b6fe-00a0c90f57da}"};
constexpr GeneratedClass kMouse{u"Mouse", u"{4d36e96f-e325-11ce-bfc1-08002be10318}"};
constexpr GeneratedClass kKeyboard{u"Keyboard", u"{4d36e96b-e325-11ce-bfc1-08002be10318}"};
constexpr GeneratedClass kDisk{u"DiskDrive", u"{4d36e967-e325-11ce-bfc1-08002be10318}"};
constexpr GeneratedClass kVolume{u"Volume", u"{71a27cdd-812a-11d0-bec7-08002be2092f}"};

constexpr Guid kControllerInterface{
    0x3abf6f2d, 0x71c4, 0x462a, {0x8a, 0x92, 0x1e, 0x68, 0x61, 0xe6, 0xaf, 0x27}};
constexpr Guid kHubInterface{
    0xf18a0e88, 0xc30c, 0x11d0, {0x88, 0x15, 0x00, 0xa0, 0xc9, 0x06, 0xbe, 0xd8}};
constexpr Guid kUsbDeviceInterface{
    0xa5dcbf10, 0x6530, 0x11d2, {0x90, 0x1f, 0x00, 0xc0, 0x4f, 0xb9, 0x51, 0xed}};
constexpr Guid kHidInterface{
    0x4d1e55b2, 0xf16f, 0x11cf, {0x88, 0xcb, 0x00, 0x11, 0x11, 0x00, 0x00, 0x30}};
constexpr Guid kDiskInterface{
    0x53f56307, 0xb6bf, 0x11d0, {0x94, 0xf2, 0x00, 0xa0, 0xc9, 0x1e, 0xfb, 0x8b}};
constexpr Guid kVolumeInterface{
    0x53f5630d, 0xb6bf, 0x11d0, {0x94, 0xf2, 0x00, 0xa0, 0xc9, 0x1e, 0xfb, 0x8b}};

constexpr char16_t kPciRoot[] = u"ACPI\\PNP0A08\\0";
constexpr char16_t kVolumeManager[] = u"ROOT\\VOLMGR\\0000";

Text Padded(std::size_t number, std::size_t width) {
  const std::string digits = std::to_string(number);
  Text text(digits.size() < width ? width - digits.size() : 0, u'0');
  return text.append(digits.begin(), digits.end());
}

// "#" for "\" and the interface class behind it: what a symbolic name is made of.
Text SymbolicName(const Text& native, const Guid& interfaceClass) {
  return Replaced(native, u'\\', u'#') + u"#" + ToLower(GuidText(interfaceClass));
}

// As Windows makes it for a device without a serial number: it tells hub and port.
Text Instance(char16_t level, std::size_t number, std::uint32_t port) {
  return Text(1, level) + u"&" + HexLower(static_cast<std::uint32_t>(number), 7) + u"&0&" +
         Padded(port, 1);
}

USB_PIPE_INFO Pipe(std::uint8_t address, std::uint8_t attributes, std::uint16_t packet,
                   std::uint8_t interval) {
  USB_PIPE_INFO pipe{};
  pipe.EndpointDescriptor = {sizeof(USB_ENDPOINT_DESCRIPTOR),
                             kUSB_ENDPOINT_DESCRIPTOR_TYPE,
                             address,
                             attributes,
                             packet,
                             interval};
  return pipe;
}

Port PortOf(const Device& device, Speed speed, std::uint16_t vendor, std::uint16_t product,
            std::uint8_t deviceClass) {
  Port port;
  port.status = DeviceConnected;
  port.speed = speed;
  port.driverKey = device.driver;
  port.configuration = 1;
  port.descriptor.bLength = sizeof port.descriptor;
  port.descriptor.bDescriptorType = kUSB_DEVICE_DESCRIPTOR_TYPE;
  port.descriptor.bcdUSB = speed == Speed::High ? 0x0200 : 0x0110;
  port.descriptor.bDeviceClass = deviceClass;
  port.descriptor.bMaxPacketSize0 = speed == Speed::High ? 64 : 8;
  port.descriptor.idVendor = vendor;
  port.descriptor.idProduct = product;
  port.descriptor.bcdDevice = 0x0100;
  port.descriptor.iManufacturer = 1;
  port.descriptor.iProduct = 2;
  port.descriptor.bNumConfigurations = 1;
  return port;
}

Port WithAddress(Port port, std::size_t number) {
  port.address = static_cast<std::uint16_t>(number % 127 + 1);
  return port;
}

}  // namespace

Device& NodeMaker::AddNode(const Text& native, const Text& parent,
                           const GeneratedClass& deviceClass, const Text& service,
                           const Text& description) {
  const std::size_t number = NextNumber();
  Device& device = m_out.devices.emplace_back();
  device.id = ToUpper(native);
  device.parent = parent;
  device.deviceClass = deviceClass.name;
  device.classGuid = deviceClass.guid;
  device.service = service;
  device.driver = Text(deviceClass.guid) + u"\\" + Padded(number, 4);
  device.description = description;
  device.manufacturer = u"(Standard devices)";
  device.hardwareIds = {device.id.substr(0, device.id.rfind(u'\\'))};
  device.physicalName = u"\\Device\\" + HexLower(static_cast<std::uint32_t>(number), 8);
  device.enumerator = device.id.substr(0, device.id.find(u'\\'));
  return device;
}

Device& NodeMaker::AddUsbNode(const Text& hardwareId, const Text& instance, const Socket& socket,
                              const GeneratedClass& deviceClass, const Text& service,
                              const Text& description) {
  const std::size_t number = NextNumber();
  Device& device =
      AddNode(hardwareId + u"\\" + instance, socket.hubDevice, deviceClass, service, description);
  device.location = u"Port_#" + Padded(socket.port, 4) + u".Hub_#" + Padded(socket.hubNumber, 4);
  device.physicalName = u"\\Device\\USBPDO-" + Padded(number, 1);
  return device;
}

Text NodeMaker::AddInterface(const Text& native, const Guid& interfaceClass) {
  Text path = u"\\\\?\\" + SymbolicName(native, interfaceClass);
  m_out.interfaces.push_back({interfaceClass, path, ToUpper(native)});
  return path;
}

void NodeMaker::AddSystemNodes() {
  AddNode(kPciRoot, {}, kSystem, u"pci", u"PCI Express Root Complex");
  AddNode(kVolumeManager, {}, kSystem, u"volmgr", u"Volume Manager");
}

GeneratedHub NodeMaker::AddController(std::size_t index, std::size_t ports) {
  const auto function = static_cast<std::uint32_t>(0xA0 + index);
  const Text native = u"PCI\\VEN_8086&DEV_" + Hex(static_cast<std::uint32_t>(0x8C26 + index), 4) +
                      u"&SUBSYS_85348086&REV_04\\3&11583659&0&" + Hex(function, 2);
  Device& controller = AddNode(native, kPciRoot, kUsb, u"usbehci", u"USB Enhanced Host Controller");
  controller.location =
      u"PCI bus 0, device " + Padded(function / 8, 1) + u", function " + Padded(function % 8, 1);
  controller.legacyBusType = 5;
  const Text controllerId = controller.id;
  const std::optional<Text> driver = controller.driver;

  const Text root = u"USB\\ROOT_HUB20\\4&" +
                    HexLower(static_cast<std::uint32_t>(0x10000000 + NextNumber())) + u"&0";
  GeneratedHub hub;
  hub.device = AddNode(root, controllerId, kUsb, u"usbhub", u"USB Root Hub").id;
  AddInterface(root, kHubInterface);
  const Text path = AddInterface(native, kControllerInterface);
  const Text name = SymbolicName(root, kHubInterface);
  m_out.hostControllers.push_back({{u"\\\\.\\HCD" + Padded(index, 1), path}, driver, name});
  m_out.hubs.push_back({name, std::vector<Port>(ports), false});
  return hub;
}

GeneratedHub NodeMaker::AddHub(const Socket& socket, std::size_t ports) {
  const std::size_t number = NextNumber();
  const Text instance = Instance(u'5', number, socket.port);
  const Text native = u"USB\\VID_05E3&PID_0608\\" + instance;
  const Device& device =
      AddUsbNode(u"USB\\VID_05E3&PID_0608", instance, socket, kUsb, u"usbhub", u"Generic USB Hub");
  GeneratedHub hub;
  hub.device = device.id;
  hub.upstreamPort = WithAddress(PortOf(device, Speed::High, 0x05E3, 0x0608, 9), number);
  hub.upstreamPort.isHub = true;
  hub.upstreamPort.hubName = SymbolicName(native, kHubInterface);
  hub.upstreamPort.pipes = {Pipe(0x81, 3, 1, 12)};
  AddInterface(native, kHubInterface);
  m_out.hubs.push_back({*hub.upstreamPort.hubName, std::vector<Port>(ports), false});
  return hub;
}

void NodeMaker::AddHidChild(const Text& hardwareId, const Text& parent,
                            const GeneratedClass& deviceClass, const Text& service) {
  const Text native = hardwareId + u"\\" + Instance(u'7', NextNumber(), 0) + u"000";
  AddNode(native, parent, deviceClass, service, u"HID device");
  AddInterface(native, kHidInterface);
}

Port NodeMaker::AddMouse(const Socket& socket) {
  const std::size_t number = NextNumber();
  const Text instance = Instance(u'6', number, socket.port);
  const Device& device =
      AddUsbNode(u"USB\\VID_046D&PID_C077", instance, socket, kHid, u"HidUsb", u"USB Input Device");
  Port port = WithAddress(PortOf(device, Speed::Low, 0x046D, 0xC077, 0), number);
  port.pipes = {Pipe(0x81, 3, 4, 10)};
  AddHidChild(u"HID\\VID_046D&PID_C077", Text(device.id), kMouse, u"mouhid");
  AddInterface(u"USB\\VID_046D&PID_C077\\" + instance, kUsbDeviceInterface);
  return port;
}

Port NodeMaker::AddKeyboard(const Socket& socket) {
  const std::size_t number = NextNumber();
  const Text instance = Instance(u'6', number, socket.port);
  const Device& device =
      AddUsbNode(u"USB\\VID_413C&PID_2107", instance, socket, kHid, u"HidUsb", u"USB Input Device");
  Port port = WithAddress(PortOf(device, Speed::Low, 0x413C, 0x2107, 0), number);
  port.pipes = {Pipe(0x81, 3, 8, 24)};
  AddHidChild(u"HID\\VID_413C&PID_2107", Text(device.id), kKeyboard, u"kbdhid");
  AddInterface(u"USB\\VID_413C&PID_2107\\" + instance, kUsbDeviceInterface);
  return port;
}

Port NodeMaker::AddComposite(const Socket& socket) {
  const std::size_t number = NextNumber();
  const Text instance = Instance(u'6', number, socket.port);
  const Device& device = AddUsbNode(u"USB\\VID_046D&PID_C52B", instance, socket, kUsb, u"usbccgp",
                                    u"USB Composite Device");
  const Text id = device.id;
  Port port = WithAddress(PortOf(device, Speed::Full, 0x046D, 0xC52B, 0), number);
  port.pipes = {Pipe(0x81, 3, 8, 8), Pipe(0x82, 3, 8, 2)};
  AddInterface(u"USB\\VID_046D&PID_C52B\\" + instance, kUsbDeviceInterface);
  for (const bool second : {false, true}) {
    const Text function = second ? u"VID_046D&PID_C52B&MI_01" : u"VID_046D&PID_C52B&MI_00";
    const Text child = AddNode(u"USB\\" + function + u"\\" + Instance(u'7', number, 0) +
                                   (second ? u"001" : u"000"),
                               id, kHid, u"HidUsb", u"USB Input Device")
                           .id;
    AddHidChild(u"HID\\" + function, child, second ? kMouse : kKeyboard,
                second ? u"mouhid" : u"kbdhid");
  }
  return port;
}

Port NodeMaker::AddStick(const Socket& socket, std::uint32_t diskNumber, char16_t letter) {
  const std::size_t number = NextNumber();
  const Text serial = u"4C53" + Padded(number, 16);
  const Device& device = AddUsbNode(u"USB\\VID_0781&PID_5580", serial, socket, kUsb, u"USBSTOR",
                                    u"USB Mass Storage Device");
  Port port = WithAddress(PortOf(device, Speed::High, 0x0781, 0x5580, 0), number);
  port.descriptor.iSerialNumber = 3;
  port.pipes = {Pipe(0x81, 2, 512, 0), Pipe(0x02, 2, 512, 0)};
  AddInterface(u"USB\\VID_0781&PID_5580\\" + serial, kUsbDeviceInterface);

  const Text disk = u"USBSTOR\\Disk&Ven_SanDisk&Prod_Extreme&Rev_0001\\" + serial + u"&0";
  AddNode(disk, Text(device.id), kDisk, u"disk", u"Disk drive").friendlyName =
      u"SanDisk Extreme USB Device";
  Storage storage;
  storage.path = AddInterface(disk, kDiskInterface);
  storage.deviceType = 0;
  storage.removable = true;
  storage.vendor = "SanDisk ";
  storage.product = "Extreme         ";
  storage.revision = "0001";
  storage.serial = std::string(serial.begin(), serial.end());
  storage.deviceNumber = DeviceNumber{7, diskNumber, 0};
  m_out.storage.push_back(storage);
  AddVolume(disk, storage, letter);
  return port;
}

void NodeMaker::AddVolume(const Text& disk, const Storage& storage, char16_t letter) {
  const std::size_t number = NextNumber();
  const Text native = u"STORAGE\\Volume\\_??_" + SymbolicName(disk, kDiskInterface);
  Device& device = AddNode(native, kVolumeManager, kVolume, u"volume", u"Generic volume");
  device.physicalName = u"\\Device\\HarddiskVolume" + Padded(number, 1);

  Storage own = storage;
  own.deviceNumber->partition = 1;
  own.path = AddInterface(native, kVolumeInterface);
  m_out.storage.push_back(own);

  Volume volume;
  volume.name = u"\\\\?\\Volume{" + HexLower(static_cast<std::uint32_t>(number), 8) +
                u"-31b8-11e8-9b12-806e6f6e6963}\\";
  volume.device = device.id;
  volume.serial = static_cast<std::uint32_t>(0x10000000 + number);
  volume.driveType = kDRIVE_REMOVABLE;
  if (letter != 0) {
    volume.paths = {Text(1, letter) + u":\\"};
    own.path = u"\\\\.\\" + Text(1, letter) + u":";
    m_out.storage.push_back(own);
    m_out.drives.push_back({letter, kDRIVE_REMOVABLE, device.physicalName, ToUpper(disk)});
  }
  m_out.volumes.push_back(volume);
}

}  // namespace platform::simulated
