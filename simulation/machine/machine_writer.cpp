#include "simulation/machine/machine_writer.h"

#include <array>
#include <nlohmann/json.hpp>
#include <optional>
#include <string_view>
#include <type_traits>
#include <variant>

#include "platform/host.h"
#include "platform/text.h"

namespace platform::simulated {
namespace {

using OrderedJson = nlohmann::ordered_json;

constexpr std::size_t kLineChars = 110;

// In the order of their values.
constexpr std::array kDriveTypes = {"unknown", "noRoot", "removable", "fixed",
                                    "remote",  "cdrom",  "ramdisk"};
constexpr std::array kSpeeds = {"low", "full", "high", "super"};

// On one line what fits there.
void Print(const OrderedJson& json, std::size_t indent, std::string& out) {
  const std::string line = json.dump();
  if (!json.is_structured() || json.empty() || indent + line.size() <= kLineChars) {
    out += line;
    return;
  }
  const std::string begin = std::string(1, '\n').append(indent + 2, ' ');
  const bool isObject = json.is_object();
  out += isObject ? "{" : "[";
  for (auto item = json.begin(); item != json.end(); ++item) {
    if (item != json.begin()) out += ",";
    out += begin;
    if (isObject) out += OrderedJson(item.key()).dump() + ": ";
    Print(*item, indent + 2, out);
  }
  out.append(begin, 0, begin.size() - 2);
  out += isObject ? "}" : "]";
}

std::string Printed(const OrderedJson& json) {
  std::string out;
  Print(json, 0, out);
  return out + "\n";
}

template <class Number>
std::string HexText(Number number) {
  return std::string("0x") += ToUtf8(Hex(number, sizeof(Number) * 2));
}

OrderedJson JsonOf(const Text& text) { return ToUtf8(text); }
// Each byte is a character of its own.
OrderedJson JsonOf(const std::string& bytes) {
  Text text;
  for (const char byte : bytes) text += static_cast<unsigned char>(byte);
  return ToUtf8(text);
}
template <class Number>
requires std::is_arithmetic_v<Number> OrderedJson JsonOf(Number number) { return number; }

OrderedJson JsonOf(const Device& device);
OrderedJson JsonOf(const Interface& entry);
OrderedJson JsonOf(const HostController& controller);
OrderedJson JsonOf(const Port& port);
OrderedJson JsonOf(const Hub& hub);
OrderedJson JsonOf(const DeviceNumber& number);
OrderedJson JsonOf(const Storage& storage);
OrderedJson JsonOf(const FolderMount& mount);
OrderedJson JsonOf(const Volume& volume);
OrderedJson JsonOf(const Drive& drive);
OrderedJson JsonOf(const PortChange& change);
OrderedJson JsonOf(const USB_PIPE_INFO& pipe);

template <class T>
OrderedJson JsonOf(const std::vector<T>& list) {
  OrderedJson json = OrderedJson::array();
  for (const T& element : list) json.push_back(JsonOf(element));
  return json;
}

// Members that differ from what their absence means.
template <class T>
void Put(OrderedJson& object, const char* name, const std::optional<T>& value) {
  if (value) object[name] = JsonOf(*value);
}
template <class T>
void PutUnless(OrderedJson& object, const char* name, const T& value, const T& otherwise) {
  if (value != otherwise) object[name] = JsonOf(value);
}
template <class T>
void PutList(OrderedJson& object, const char* name, const std::vector<T>& list) {
  if (!list.empty()) object[name] = JsonOf(list);
}

OrderedJson JsonOf(const Device& device) {
  OrderedJson json = {{"id", JsonOf(device.id)}};
  PutUnless(json, "parent", device.parent, Text());
  Put(json, "class", device.deviceClass);
  Put(json, "classGuid", device.classGuid);
  Put(json, "service", device.service);
  Put(json, "driver", device.driver);
  Put(json, "description", device.description);
  Put(json, "friendlyName", device.friendlyName);
  Put(json, "manufacturer", device.manufacturer);
  Put(json, "location", device.location);
  Put(json, "hardwareIds", device.hardwareIds);
  Put(json, "physicalName", device.physicalName);
  Put(json, "enumerator", device.enumerator);
  Put(json, "legacyBusType", device.legacyBusType);
  Put(json, "uiNumber", device.uiNumber);
  PutUnless(json, "noParent", device.noParent, false);
  PutUnless(json, "noClassImage", device.noClassImage, false);
  PutUnless(json, "noClassDescription", device.noClassDescription, false);
  return json;
}

OrderedJson JsonOf(const Interface& entry) {
  return {{"class", JsonOf(ToLower(GuidText(entry.interfaceClass)))},
          {"path", JsonOf(entry.path)},
          {"device", JsonOf(entry.device)}};
}

OrderedJson JsonOf(const HostController& controller) {
  OrderedJson json = {{"names", JsonOf(controller.names)}};
  Put(json, "driverKey", controller.driverKey);
  Put(json, "rootHub", controller.rootHub);
  return json;
}

// The records are packed: members are passed by value.
OrderedJson DescriptorJson(const USB_DEVICE_DESCRIPTOR& descriptor) {
  OrderedJson json = OrderedJson::object();
  const auto hex = [&json](const char* name, std::uint16_t value) {
    if (value != 0) json[name] = HexText(value);
  };
  const auto number = [&json](const char* name, std::uint8_t value) {
    if (value != 0) json[name] = value;
  };
  hex("bcdUSB", descriptor.bcdUSB);
  number("bDeviceClass", descriptor.bDeviceClass);
  number("bDeviceSubClass", descriptor.bDeviceSubClass);
  number("bDeviceProtocol", descriptor.bDeviceProtocol);
  number("bMaxPacketSize0", descriptor.bMaxPacketSize0);
  hex("idVendor", descriptor.idVendor);
  hex("idProduct", descriptor.idProduct);
  hex("bcdDevice", descriptor.bcdDevice);
  number("iManufacturer", descriptor.iManufacturer);
  number("iProduct", descriptor.iProduct);
  number("iSerialNumber", descriptor.iSerialNumber);
  number("bNumConfigurations", descriptor.bNumConfigurations);
  return json;
}

OrderedJson JsonOf(const USB_PIPE_INFO& pipe) {
  const USB_ENDPOINT_DESCRIPTOR& endpoint = pipe.EndpointDescriptor;
  OrderedJson json = {{"bEndpointAddress", HexText(endpoint.bEndpointAddress)},
                      {"bmAttributes", endpoint.bmAttributes},
                      {"wMaxPacketSize", std::uint16_t{endpoint.wMaxPacketSize}},
                      {"bInterval", endpoint.bInterval}};
  const std::uint32_t offset = pipe.ScheduleOffset;
  if (offset != 0) json["scheduleOffset"] = offset;
  return json;
}

void PutPort(const Port& port, OrderedJson& json) {
  const bool described = port.descriptor.bLength != 0;
  const bool plugged = described || port.driverKey || port.hubName;
  PutUnless(json, "status", port.status, plugged ? DeviceConnected : NoDeviceConnected);
  if (port.speed != Speed::Full) json["speed"] = kSpeeds.at(static_cast<std::size_t>(port.speed));
  Put(json, "hubName", port.hubName);
  PutUnless(json, "isHub", port.isHub, port.hubName.has_value());
  Put(json, "driverKey", port.driverKey);
  if (described) json["descriptor"] = DescriptorJson(port.descriptor);
  PutUnless(json, "configuration", port.configuration,
            static_cast<std::uint8_t>(port.status == DeviceConnected ? 1 : 0));
  PutUnless(json, "address", port.address, std::uint16_t{0});
  PutList(json, "pipes", port.pipes);
}

OrderedJson JsonOf(const Port& port) {
  OrderedJson json = OrderedJson::object();
  PutPort(port, json);
  return json;
}

OrderedJson JsonOf(const PortChange& change) {
  OrderedJson json = {{"hub", JsonOf(change.hub)}, {"index", change.index}};
  PutPort(change.port, json);
  return json;
}

OrderedJson JsonOf(const Hub& hub) {
  OrderedJson json = {{"name", JsonOf(hub.name)}, {"ports", JsonOf(hub.ports)}};
  PutUnless(json, "busPowered", hub.busPowered, false);
  return json;
}

OrderedJson JsonOf(const DeviceNumber& number) {
  OrderedJson json = OrderedJson::object();
  PutUnless(json, "type", number.type, 0u);
  PutUnless(json, "number", number.number, 0u);
  PutUnless(json, "partition", number.partition, 0u);
  return json;
}

OrderedJson JsonOf(const Storage& storage) {
  OrderedJson json = {{"path", JsonOf(storage.path)}};
  Put(json, "deviceType", storage.deviceType);
  PutUnless(json, "deviceTypeModifier", storage.deviceTypeModifier, std::uint8_t{0});
  PutUnless(json, "removable", storage.removable, false);
  Put(json, "vendor", storage.vendor);
  Put(json, "product", storage.product);
  Put(json, "revision", storage.revision);
  Put(json, "serial", storage.serial);
  Put(json, "deviceNumber", storage.deviceNumber);
  Put(json, "mediaSerialNumber", storage.mediaSerialNumber);
  return json;
}

OrderedJson JsonOf(const FolderMount& mount) {
  return {{"folder", JsonOf(mount.folder)}, {"volume", JsonOf(mount.volume)}};
}

OrderedJson JsonOf(const Volume& volume) {
  OrderedJson json = {{"name", JsonOf(volume.name)}};
  PutUnless(json, "device", volume.device, Text());
  PutList(json, "paths", volume.paths);
  if (volume.serial) json["serial"] = HexText(*volume.serial);
  if (volume.driveType != kDRIVE_FIXED) json["driveType"] = kDriveTypes.at(volume.driveType);
  PutUnless(json, "reparsePoints", volume.reparsePoints, false);
  PutList(json, "folderMounts", volume.folderMounts);
  return json;
}

OrderedJson JsonOf(const Drive& drive) {
  OrderedJson json = {{"letter", JsonOf(Text(1, drive.letter))},
                      {"type", kDriveTypes.at(drive.type)}};
  Put(json, "dosDevice", drive.dosDevice);
  PutUnless(json, "device", drive.device, Text());
  return json;
}

void PutSections(const Machine& machine, OrderedJson& json) {
  PutList(json, "devices", machine.devices);
  PutList(json, "interfaces", machine.interfaces);
  PutList(json, "hostControllers", machine.hostControllers);
  PutList(json, "hubs", machine.hubs);
  PutList(json, "storage", machine.storage);
  PutList(json, "volumes", machine.volumes);
  PutList(json, "drives", machine.drives);
}

void PutChange(const Plug& plug, OrderedJson& json) {
  OrderedJson& content = json["plug"] = OrderedJson::object();
  PutSections(plug.fragment, content);
  PutList(content, "ports", plug.ports);
}
void PutChange(const Unplug& unplug, OrderedJson& json) { json["unplug"] = JsonOf(unplug.device); }
void PutChange(const Mount& mount, OrderedJson& json) {
  json["mount"] = {{"volume", JsonOf(mount.volume)}, {"path", JsonOf(mount.path)}};
}
void PutChange(const Dismount& dismount, OrderedJson& json) {
  json["dismount"] = {{"volume", JsonOf(dismount.volume)}, {"path", JsonOf(dismount.path)}};
}
void PutChange(std::monostate, OrderedJson& json) { json["wait"] = true; }

}  // namespace

std::string WriteMachine(const Machine& machine) {
  OrderedJson json = OrderedJson::object();
  PutUnless(json, "name", machine.name, Text());
  PutList(json, "notes", machine.notes);
  PutSections(machine, json);
  return Printed(json);
}

std::string WriteScript(const Script& script, const ScriptText& about) {
  OrderedJson json = OrderedJson::object();
  PutUnless(json, "name", about.name, Text());
  PutList(json, "notes", about.notes);
  OrderedJson& steps = json["steps"] = OrderedJson::array();
  for (const Step& step : script) {
    OrderedJson& entry = steps.emplace_back(OrderedJson::object());
    entry["at"] = step.atMilliseconds;
    PutUnless(entry, "name", step.name, Text());
    if (step.broadcast == BroadcastTime::Before) entry["broadcast"] = "before";
    if (step.broadcast == BroadcastTime::None) entry["broadcast"] = "none";
    std::visit([&entry](const auto& change) { PutChange(change, entry); }, step.change);
  }
  return Printed(json);
}

}  // namespace platform::simulated
