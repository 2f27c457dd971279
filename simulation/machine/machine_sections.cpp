#include "simulation/machine/machine_sections.h"

#include "platform/text.h"

namespace platform::simulated {
namespace {

constexpr std::size_t kMostIdCharacters = 199;  // 200 with the zero behind it
constexpr std::size_t kMostHubPorts = 255;

// A text by which something is found or opened.
struct Name {
  Text& text;
};
void FromJson(const JsonValue& value, Name& out) {
  out.text = value.AsText();
  if (out.text.empty()) value.Fail("must not be empty");
}

struct DeviceId {
  Text& text;
};
void FromJson(const JsonValue& value, DeviceId& out) {
  Name name{out.text};
  FromJson(value, name);
  if (out.text.size() > kMostIdCharacters) value.Fail("is longer than 199 characters");
}

template <class Target>
void NeedAs(JsonObject& object, const char* name, Text& out) {
  Target target{out};
  object.Need(name, target);
}

template <class Target>
void ReadAs(JsonObject& object, const char* name, Text& out) {
  Target target{out};
  object.Read(name, target);
}

void EndsInBackslash(const JsonValue& value, const Text& text) {
  if (!text.ends_with(u'\\')) value.Fail("must end in a backslash");
}

struct DriveType {
  std::uint32_t& value;
};
void FromJson(const JsonValue& value, DriveType& out) {
  // In the order of the values of DriveType.
  out.value = static_cast<std::uint32_t>(
      value.AsChoice({"unknown", "noRoot", "removable", "fixed", "remote", "cdrom", "ramdisk"}));
}

}  // namespace

void FromJson(const JsonValue& value, Guid& out) {
  const std::optional<Guid> guid = ParseGuid(value.AsText());
  if (!guid) value.Fail("is not a GUID");
  out = *guid;
}

void FromJson(const JsonValue& value, Device& out) {
  JsonObject object(value);
  NeedAs<DeviceId>(object, "id", out.id);
  ReadAs<DeviceId>(object, "parent", out.parent);
  object.Read("class", out.deviceClass);
  if (Guid guid; object.Read("classGuid", guid)) object.Read("classGuid", out.classGuid);
  object.Read("service", out.service);
  object.Read("driver", out.driver);
  object.Read("description", out.description);
  object.Read("friendlyName", out.friendlyName);
  object.Read("manufacturer", out.manufacturer);
  object.Read("location", out.location);
  object.Read("hardwareIds", out.hardwareIds);
  object.Read("physicalName", out.physicalName);
  object.Read("enumerator", out.enumerator);
  if (const auto type = object.Find("legacyBusType")) {
    value.File().Try(
        [&] { out.legacyBusType = static_cast<std::int32_t>(type->AsNumber(-1, 17)); });
  }
  object.Read("uiNumber", out.uiNumber);
  object.Read("noParent", out.noParent);
  object.Read("noClassImage", out.noClassImage);
  object.Read("noClassDescription", out.noClassDescription);
  object.Finish();
}

void FromJson(const JsonValue& value, Interface& out) {
  JsonObject object(value);
  object.Need("class", out.interfaceClass);
  NeedAs<Name>(object, "path", out.path);
  NeedAs<DeviceId>(object, "device", out.device);
  object.Finish();
}

void FromJson(const JsonValue& value, HostController& out) {
  JsonObject object(value);
  if (const auto names = object.Find("names")) {
    for (const JsonValue& element : names->AsList()) {
      Name name{out.names.emplace_back()};
      value.File().Try([&] { FromJson(element, name); });
    }
    if (out.names.empty()) value.File().Try([&] { names->Fail("must not be empty"); });
  }
  object.Read("driverKey", out.driverKey);
  object.Read("rootHub", out.rootHub);
  object.Finish();
  if (!object.Find("names")) FailAt(value.File(), object.PlaceOf("names"), "is missing");
}

void FromJson(const JsonValue& value, Speed& out) {
  out = static_cast<Speed>(value.AsChoice({"low", "full", "high", "super"}));
}

void FromJson(const JsonValue& value, USB_DEVICE_DESCRIPTOR& out) {
  JsonObject object(value);
  // The records are packed: a member is read into a variable of its own.
  const auto read = [&object](const char* name, auto number) {
    object.Read(name, number);
    return number;
  };
  out.bLength = sizeof out;
  out.bDescriptorType = kUSB_DEVICE_DESCRIPTOR_TYPE;
  out.bcdUSB = read("bcdUSB", std::uint16_t{0});
  out.bDeviceClass = read("bDeviceClass", std::uint8_t{0});
  out.bDeviceSubClass = read("bDeviceSubClass", std::uint8_t{0});
  out.bDeviceProtocol = read("bDeviceProtocol", std::uint8_t{0});
  out.bMaxPacketSize0 = read("bMaxPacketSize0", std::uint8_t{0});
  out.idVendor = read("idVendor", std::uint16_t{0});
  out.idProduct = read("idProduct", std::uint16_t{0});
  out.bcdDevice = read("bcdDevice", std::uint16_t{0});
  out.iManufacturer = read("iManufacturer", std::uint8_t{0});
  out.iProduct = read("iProduct", std::uint8_t{0});
  out.iSerialNumber = read("iSerialNumber", std::uint8_t{0});
  out.bNumConfigurations = read("bNumConfigurations", std::uint8_t{0});
  object.Finish();
}

void FromJson(const JsonValue& value, USB_PIPE_INFO& out) {
  JsonObject object(value);
  const auto read = [&object](const char* name, auto number) {
    object.Read(name, number);
    return number;
  };
  USB_ENDPOINT_DESCRIPTOR& endpoint = out.EndpointDescriptor;
  endpoint.bLength = sizeof endpoint;
  endpoint.bDescriptorType = kUSB_ENDPOINT_DESCRIPTOR_TYPE;
  endpoint.bEndpointAddress = read("bEndpointAddress", std::uint8_t{0});
  endpoint.bmAttributes = read("bmAttributes", std::uint8_t{0});
  endpoint.wMaxPacketSize = read("wMaxPacketSize", std::uint16_t{0});
  endpoint.bInterval = read("bInterval", std::uint8_t{0});
  out.ScheduleOffset = read("scheduleOffset", std::uint32_t{0});
  object.Finish();
}

void ReadPort(JsonObject& object, Port& port) {
  object.Read("speed", port.speed);
  object.Read("hubName", port.hubName);
  port.isHub = port.hubName.has_value();
  object.Read("isHub", port.isHub);
  object.Read("driverKey", port.driverKey);
  const bool described = object.Read("descriptor", port.descriptor);
  port.status = described || port.driverKey || port.hubName ? DeviceConnected : NoDeviceConnected;
  if (std::uint8_t status = 0; object.Read("status", status)) port.status = status;
  port.configuration = port.status == DeviceConnected ? 1 : 0;
  object.Read("configuration", port.configuration);
  object.Read("address", port.address);
  if (object.Read("pipes", port.pipes) && port.pipes.size() > kConnectionPipes) {
    object.Value().File().Try([&] {
      FailAt(object.Value().File(), object.PlaceOf("pipes"), "has more than 30 entries");
    });
  }
}

void FromJson(const JsonValue& value, Port& out) {
  JsonObject object(value);
  ReadPort(object, out);
  object.Finish();
}

void FromJson(const JsonValue& value, Hub& out) {
  JsonObject object(value);
  NeedAs<Name>(object, "name", out.name);
  if (object.Need("ports", out.ports) && out.ports.size() > kMostHubPorts) {
    value.File().Try(
        [&] { FailAt(value.File(), object.PlaceOf("ports"), "has more than 255 entries"); });
  }
  object.Read("busPowered", out.busPowered);
  object.Finish();
}

void FromJson(const JsonValue& value, DeviceNumber& out) {
  JsonObject object(value);
  object.Read("type", out.type);
  object.Read("number", out.number);
  object.Read("partition", out.partition);
  object.Finish();
}

void FromJson(const JsonValue& value, Storage& out) {
  JsonObject object(value);
  NeedAs<Name>(object, "path", out.path);
  object.Read("deviceType", out.deviceType);
  object.Read("deviceTypeModifier", out.deviceTypeModifier);
  object.Read("removable", out.removable);
  object.Read("vendor", out.vendor);
  object.Read("product", out.product);
  object.Read("revision", out.revision);
  object.Read("serial", out.serial);
  object.Read("deviceNumber", out.deviceNumber);
  object.Read("mediaSerialNumber", out.mediaSerialNumber);
  object.Finish();
}

void FromJson(const JsonValue& value, FolderMount& out) {
  JsonObject object(value);
  if (const auto folder = object.Find("folder")) {
    value.File().Try([&] {
      out.folder = folder->AsText();
      if (out.folder.starts_with(u'\\') || out.folder.find(u':') != Text::npos) {
        folder->Fail("must be relative to the root of the volume");
      }
      EndsInBackslash(*folder, out.folder);
    });
  }
  NeedAs<Name>(object, "volume", out.volume);
  object.Finish();
  if (!object.Find("folder")) FailAt(value.File(), object.PlaceOf("folder"), "is missing");
}

void FromJson(const JsonValue& value, Volume& out) {
  JsonObject object(value);
  NeedAs<Name>(object, "name", out.name);
  if (const auto name = object.Find("name")) {
    const Text lowered = ToLower(std::u16string_view(out.name));
    value.File().Try([&] {
      if (lowered.empty() ||
          (lowered.starts_with(u"\\\\?\\volume{") && lowered.ends_with(u"}\\"))) {
        return;
      }
      name->Fail("must have the form \\\\?\\Volume{...}\\");
    });
  }
  ReadAs<DeviceId>(object, "device", out.device);
  if (const auto paths = object.Find("paths")) {
    for (const JsonValue& path : paths->AsList()) {
      value.File().Try([&] { EndsInBackslash(path, out.paths.emplace_back(path.AsText())); });
    }
  }
  object.Read("serial", out.serial);
  DriveType type{out.driveType};
  object.Read("driveType", type);
  object.Read("reparsePoints", out.reparsePoints);
  object.Read("folderMounts", out.folderMounts);
  object.Finish();
}

void FromJson(const JsonValue& value, Drive& out) {
  JsonObject object(value);
  Text letter;
  if (object.Need("letter", letter)) {
    value.File().Try([&] {
      if (letter.size() != 1 || letter[0] < u'A' || letter[0] > u'Z') {
        FailAt(value.File(), object.PlaceOf("letter"), "must be one letter, \"A\" to \"Z\"");
      }
      out.letter = letter[0];
    });
  }
  DriveType type{out.type};
  object.Need("type", type);
  object.Read("dosDevice", out.dosDevice);
  ReadAs<DeviceId>(object, "device", out.device);
  object.Finish();
}

void ReadSections(JsonObject& object, Machine& machine) {
  object.Read("devices", machine.devices);
  object.Read("interfaces", machine.interfaces);
  object.Read("hostControllers", machine.hostControllers);
  object.Read("hubs", machine.hubs);
  object.Read("storage", machine.storage);
  object.Read("volumes", machine.volumes);
  object.Read("drives", machine.drives);
}

}  // namespace platform::simulated
