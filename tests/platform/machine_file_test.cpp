#include "platform/simulated/machine_file.h"

#include <gmock/gmock.h>

#include "platform/host.h"

namespace platform::simulated {
namespace {

using testing::ElementsAre;
using testing::StartsWith;

std::string MachineError(const std::string& json) {
  try {
    ParseMachine(json, "pc.json");
  } catch (const MachineFileError& error) {
    return error.what();
  }
  return "no error";
}

std::string Repeated(const std::string& text, std::size_t times) {
  std::string all;
  for (std::size_t i = 0; i < times; ++i) all += text;
  return all;
}

// One list with one object.
std::string One(const std::string& section, const std::string& object) {
  return "{\"" + section + "\": [" + object + "]}";
}

std::string Port(const std::string& members) {
  return One("hubs", R"({"name": "H", "ports": [{}, {)" + members + "}]}");
}

std::string VolumeWith(const std::string& members) {
  return R"({"volumes": [{"name": "\\\\?\\Volume{1}\\", )" + members + "}]}";
}

std::string Devices(const std::string& others) { return R"({"devices": [{"id": "A\\1"}], )" + others + "}"; }

TEST(MachineFile, RefusesEachMistakeWithItsPlace) {
  const std::string port = "hubs[0].ports[1].";
  const std::string guid = "\"{36fc9e60-c465-11cf-8056-444553540000}\"";
  const struct {
    std::string json;
    std::string error;  // without the file's name
  } kCases[] = {
      // No JSON.
      {"",
       "line 1, column 1: syntax error while parsing value - unexpected end of input; expected '[', '{', or a literal"},
      {"{\n  \"name\": \"\xC3\xA4\xC3\xB6\" x",
       "line 2, column 16: syntax error while parsing object - invalid literal; expected '}'"},
      {"{\"name\": \"\xC3\x28\"}",
       "line 1, column 12: syntax error while parsing value - invalid string: ill-formed UTF-8 byte"},
      {R"({"name": "\ud800"})",
       "line 1, column 17: syntax error while parsing value - invalid string: surrogate U+D800..U+DBFF must be "
       "followed by U+DC00..U+DFFF"},
      {std::string("{}\0{}", 5), "line 1, column 3: unexpected zero byte"},
      {"{} {}", "line 1, column 4: syntax error while parsing value - unexpected '{'; expected end of input"},
      {R"({"devices": 1e999})", "line 1, column 17: number overflow parsing '1e999'"},
      {R"({"name": "a", "name": "b"})", R"((file): two members "name")"},
      {R"({"devices": [{"id": "A"}, {"id": "B", "id": "C"}]})", R"(devices[1]: two members "id")"},
      {Repeated("[", 100000), Repeated("[0]", 15) + ": is nested too deeply (at most 16 levels)"},
      // Types and names.
      {"[]", "(file): must be an object"},
      {R"({"foo": 1, "devices": []})", R"((file): unknown member "foo")"},
      {R"({"devices": {}})", "devices: must be a list"},
      {R"({"devices": [{"id": "A"}, 7]})", "devices[1]: must be an object"},
      {One("devices", R"({"Id": "A"})"), R"(devices[0]: unknown member "Id")"},
      {One("devices", "{}"), "devices[0].id: is missing"},
      {One("devices", R"({"id": 1})"), "devices[0].id: must be a text"},
      {One("devices", R"({"id": ""})"), "devices[0].id: must not be empty"},
      {One("devices", R"({"id": "A\u0000B"})"), "devices[0].id: must not hold a zero character"},
      {One("devices", "{\"id\": \"" + std::string(200, 'A') + "\"}"), "devices[0].id: is longer than 199 characters"},
      {One("devices", R"({"id": "A", "hardwareIds": "A"})"), "devices[0].hardwareIds: must be a list"},
      {One("devices", R"({"id": "A", "noParent": 1})"), "devices[0].noParent: must be true or false"},
      {One("devices", R"({"id": "A", "classGuid": "{36fc9e60-c465-11cf-8056-44455354000g}"})"),
       "devices[0].classGuid: is not a GUID"},
      {One("devices", R"({"id": "A", "service": "s", "filledIn": ["service", "driver"]})"),
       R"(devices[0].filledIn[1]: this object has no member "driver")"},
      {R"({"notes": [1]})", "notes[0]: must be a text"},
      // Numbers.
      {Port(R"("address": 70000)"), port + "address: 70000 does not fit (0 to 65535)"},
      {Port(R"("address": "0x10000")"), port + "address: 0x10000 does not fit (0 to 65535)"},
      {Port(R"("address": 18446744073709551615)"), port + "address: 18446744073709551615 does not fit (0 to 65535)"},
      {Port(R"("address": 1e30)"), port + "address: 1e+30 does not fit (0 to 65535)"},
      {Port(R"("address": 1.5)"), port + "address: must be a whole number, without point and exponent"},
      {Port(R"("address": null)"), port + "address: must be a number"},
      {Port(R"("address": "12")"),
       port + "address: must be a number, or a text of 0x and one to eight hexadecimal digits"},
      {Port(R"("status": 256)"), port + "status: 256 does not fit (0 to 255)"},
      {Port(R"("descriptor": {"idVendor": "0x1FFFF"})"),
       port + "descriptor.idVendor: 0x1FFFF does not fit (0 to 65535)"},
      {Port(R"("pipes": [{}, {"bInterval": 256}])"), port + "pipes[1].bInterval: 256 does not fit (0 to 255)"},
      {One("devices", R"({"id": "A", "legacyBusType": 18})"), "devices[0].legacyBusType: 18 does not fit (-1 to 17)"},
      {VolumeWith(R"("serial": 4294967296)"), "volumes[0].serial: 4294967296 does not fit (0 to 4294967295)"},
      // What one object says by itself.
      {Port(R"("speed": "fast")"), port + R"(speed: must be one of "low", "full", "high", "super")"},
      {Port("\"pipes\": [{}" + Repeated(", {}", 30) + "]"), port + "pipes: has more than 30 entries"},
      {One("hubs", R"({"name": "H", "ports": [{})" + Repeated(", {}", 255) + "]}"),
       "hubs[0].ports: has more than 255 entries"},
      {One("hostControllers", R"({"names": []})"), "hostControllers[0].names: must not be empty"},
      {One("interfaces", R"({"class": "x", "path": "P", "device": "A\\1"})"), "interfaces[0].class: is not a GUID"},
      {One("storage", R"({"path": "P", "vendor": "\u0100"})"), "storage[0].vendor: must be a text of 8-bit characters"},
      {One("volumes", R"({"name": "E:\\"})"), R"(volumes[0].name: must have the form \\?\Volume{...}\)"},
      {VolumeWith(R"("paths": ["E:"])"), "volumes[0].paths[0]: must end in a backslash"},
      {VolumeWith(R"("folderMounts": [{"folder": "C:\\M\\", "volume": "V"}])"),
       "volumes[0].folderMounts[0].folder: must be relative to the root of the volume"},
      {VolumeWith(R"("driveType": "floppy")"),
       R"(volumes[0].driveType: must be one of "unknown", "noRoot", "removable", "fixed", "remote", "cdrom", "ramdisk")"},
      {One("drives", R"({"letter": "e", "type": "fixed"})"), R"(drives[0].letter: must be one letter, "A" to "Z")"},
      // What spans objects; names are compared without regard to case.
      {R"({"devices": [{"id": "x"}, {"id": "USB\\A"}, {"id": "usb\\a"}]})",
       R"(devices[2].id: a second device with the id "usb\a" (the first is devices[1]))"},
      {One("devices", R"({"id": "HTREE\\Root\\0"})"), "devices[0].id: is the root device, which is always there"},
      {One("devices", R"({"id": "A", "parent": "B"})"), R"(devices[0].parent: no device with the id "B")"},
      {R"({"devices": [{"id": "A", "parent": "B"}, {"id": "B", "parent": "c"},
                       {"id": "C", "parent": "b"}]})",
       "devices[1].parent: the parents of this device form a circle"},
      {One("interfaces", "{\"class\": " + guid + R"(, "path": "P", "device": "A\\1"})"),
       R"(interfaces[0].device: no device with the id "A\1")"},
      {Devices("\"interfaces\": [{\"class\": " + guid + R"(, "path": "P", "device": "a\\1"},
               {"class": )" +
               guid + R"(, "path": "p", "device": "A\\1"}])"),
       R"(interfaces[1].path: a second interface with the path "p" (the first is interfaces[0]))"},
      {R"({"hostControllers": [{"names": ["A"]}, {"names": ["B", "a"]}]})",
       R"(hostControllers[1].names[1]: a second controller with the name "a" (the first is hostControllers[0]))"},
      {R"({"hubs": [{"name": "H", "ports": []}, {"name": "h", "ports": []}]})",
       R"(hubs[1].name: a second hub with the name "h" (the first is hubs[0]))"},
      {R"({"storage": [{"path": "P"}, {"path": "P"}]})",
       R"(storage[1].path: a second entry with the path "P" (the first is storage[0]))"},
      {R"({"volumes": [{"name": "\\\\?\\Volume{a}\\"}, {"name": "\\\\?\\Volume{A}\\"}]})",
       R"(volumes[1].name: a second volume with the name "\\?\Volume{A}\" (the first is volumes[0]))"},
      {R"({"volumes": [{"name": "\\\\?\\Volume{1}\\", "paths": ["E:\\"]},
                       {"name": "\\\\?\\Volume{2}\\", "paths": ["F:\\", "e:\\"]}]})",
       R"(volumes[1].paths[1]: a second volume with the path name "e:\" (the first is volumes[0]))"},
      {Devices(R"("volumes": [{"name": "\\\\?\\Volume{1}\\", "device": "B"}])"),
       R"(volumes[0].device: no device with the id "B")"},
      {R"({"drives": [{"letter": "E", "type": "fixed"}, {"letter": "E", "type": "fixed"}]})",
       R"(drives[1].letter: a second drive with the letter "E" (the first is drives[0]))"},
      {One("drives", R"({"letter": "E", "type": "fixed", "device": "B"})"),
       R"(drives[0].device: no device with the id "B")"},
  };
  for (const auto& test : kCases) {
    EXPECT_EQ(MachineError(test.json), "pc.json: " + test.error) << test.json.substr(0, 300);
  }
}

TEST(MachineFile, ReadsEveryMember) {
  const Machine machine = ParseMachine(R"({
    "name": "a PC", "notes": ["one", "z\u00e4hlt \ud83d\ude00"],
    "devices": [ {"id": "USB\\A\\1", "parent": "usb\\hub\\1", "class": "USB", "classGuid":
      "{36FC9E60-c465-11cf-8056-444553540000}", "service": "USBSTOR", "driver": "{36}\\0001", "description":
      "d", "friendlyName": "", "manufacturer": "m", "location": "l", "hardwareIds": ["h1", "h2"],
      "physicalName": "p", "enumerator": "USB", "legacyBusType": -1, "uiNumber": "0xFFFFFFFF", "noParent": true,
      "noClassImage": true, "noClassDescription": true, "filledIn": ["uiNumber"]}, {"id": "USB\\HUB\\1",
      "parent": "HTREE\\ROOT\\0"}],
    "interfaces": [{"class": "{00112233-4455-6677-8899-aAbBcCdDeEfF}", "path": "P", "device": "usb\\a\\1"}],
    "hostControllers": [{"names": ["\\\\.\\HCD0", "\\\\.\\HCD12"], "driverKey": "k", "rootHub": "H"}],
    "hubs": [{"name": "H", "busPowered": true, "ports": [ {}, {"driverKey": "k"}, {"hubName": "B"},
      {"descriptor": {}}, {"isHub": true, "status": "0xFf"}, {"status": 1, "speed": "super", "hubName": "B",
      "isHub": false, "driverKey": "k", "descriptor": {"bcdUSB": "0x0210", "bDeviceClass": 2, "bDeviceSubClass":
      3, "bDeviceProtocol": 4, "bMaxPacketSize0": 5, "idVendor": 6, "idProduct": 7, "bcdDevice": 8,
      "iManufacturer": 9, "iProduct": 10, "iSerialNumber": 11, "bNumConfigurations": 12, "filledIn": []},
      "configuration": 2, "address": 65535, "pipes": [{"bEndpointAddress": "0x81", "bmAttributes": 3,
      "wMaxPacketSize": 1024, "bInterval": 12, "scheduleOffset": 99}]}]}],
    "storage": [{"path": "P", "deviceType": 5, "deviceTypeModifier": 6, "removable": true, "vendor": "V\u00ff ",
      "product": "", "revision": "r", "serial": "s", "deviceNumber": {"type": 7, "number": 8, "partition": 9},
      "mediaSerialNumber": "media"}, {"path": "Q"}],
    "volumes": [{"name": "\\\\?\\Volume{1}\\", "device": "USB\\A\\1", "paths": ["E:\\", "C:\\M\\"], "serial": 7,
      "driveType": "removable", "reparsePoints": true, "folderMounts": [{"folder": "Mount\\", "volume":
      "\\\\?\\Volume{2}\\"}]}, {"name": "\\\\?\\Volume{2}\\"}],
    "drives": [{"letter": "E", "type": "cdrom", "dosDevice": "D", "device": "USB\\A\\1"}]})",
                                       "pc.json");
  const std::size_t sizes[] = {machine.devices.size(), machine.interfaces.size(), machine.hostControllers.size(),
                               machine.hubs.size(),    machine.storage.size(),    machine.volumes.size(),
                               machine.drives.size()};
  ASSERT_THAT(sizes, ElementsAre(2u, 1u, 1u, 1u, 2u, 2u, 1u));
  EXPECT_EQ(machine.name, u"a PC");
  EXPECT_THAT(machine.notes, ElementsAre(u"one", u"z\u00e4hlt \U0001F600"));
  const Device& device = machine.devices[0];
  EXPECT_THAT(
      (std::vector<std::optional<Text>>{device.id, device.parent, device.deviceClass, device.classGuid, device.service,
                                        device.driver, device.description, device.friendlyName, device.manufacturer,
                                        device.location, device.physicalName, device.enumerator}),
      ElementsAre(u"USB\\A\\1", u"usb\\hub\\1", u"USB", u"{36FC9E60-c465-11cf-8056-444553540000}", u"USBSTOR",
                  u"{36}\\0001", u"d", u"", u"m", u"l", u"p", u"USB"));
  EXPECT_THAT(device.hardwareIds.value(), ElementsAre(u"h1", u"h2"));
  EXPECT_EQ(device.legacyBusType, -1);
  EXPECT_EQ(device.uiNumber, 0xFFFFFFFF);
  EXPECT_TRUE(device.noParent && device.noClassImage && device.noClassDescription);
  const Device& bare = machine.devices[1];
  EXPECT_FALSE(bare.deviceClass || bare.hardwareIds || bare.uiNumber || bare.noParent);
  EXPECT_EQ(machine.interfaces[0].interfaceClass,
            (Guid{0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xaa, 0xbb, 0xcc, 0xdd, 0xee, 0xff}}));
  EXPECT_EQ(machine.interfaces[0].path + machine.interfaces[0].device, u"Pusb\\a\\1");
  EXPECT_THAT(machine.hostControllers[0].names, ElementsAre(u"\\\\.\\HCD0", u"\\\\.\\HCD12"));
  EXPECT_EQ(machine.hostControllers[0].driverKey.value() + *machine.hostControllers[0].rootHub, u"kH");
  EXPECT_EQ(machine.hubs[0].name, u"H");
  EXPECT_TRUE(machine.hubs[0].busPowered);
  const auto& ports = machine.hubs[0].ports;
  ASSERT_EQ(ports.size(), 6u);
  const std::uint32_t kStatus[] = {0, 1, 1, 1, 255, 1};
  const bool kIsHub[] = {false, false, true, false, true, false};
  const int kConfiguration[] = {0, 1, 1, 1, 0, 2};
  for (std::size_t i = 0; i < 6; ++i) {
    EXPECT_EQ(ports[i].status, kStatus[i]) << i;
    EXPECT_EQ(ports[i].isHub, kIsHub[i]) << i;
    EXPECT_EQ(ports[i].configuration, kConfiguration[i]) << i;
    EXPECT_EQ(ports[i].speed, i == 5 ? Speed::Super : Speed::Full) << i;
    EXPECT_EQ(ports[i].address, i == 5 ? 65535 : 0) << i;
  }
  EXPECT_EQ(ports[5].hubName.value() + ports[5].driverKey.value(), u"Bk");
  const auto bytes = [](const auto& record) {
    const auto* first = reinterpret_cast<const std::uint8_t*>(&record);
    return std::vector<std::uint8_t>(first, first + sizeof record);
  };
  EXPECT_THAT(bytes(ports[5].descriptor), ElementsAre(18, 1, 0x10, 0x02, 2, 3, 4, 5, 6, 0, 7, 0, 8, 0, 9, 10, 11, 12));
  ASSERT_EQ(ports[5].pipes.size(), 1u);
  EXPECT_THAT(bytes(ports[5].pipes[0]), ElementsAre(7, 5, 0x81, 3, 0, 4, 12, 99, 0, 0, 0));
  const Storage& disk = machine.storage[0];
  EXPECT_EQ(disk.path, u"P");
  EXPECT_TRUE(disk.deviceType == 5 && disk.deviceTypeModifier == 6 && disk.removable);
  EXPECT_THAT((std::vector{disk.vendor, disk.product, disk.revision, disk.serial}),
              ElementsAre("V\xFF ", "", "r", "s"));
  ASSERT_TRUE(disk.deviceNumber);
  EXPECT_THAT((std::vector{disk.deviceNumber->type, disk.deviceNumber->number, disk.deviceNumber->partition}),
              ElementsAre(7u, 8u, 9u));
  EXPECT_EQ(disk.mediaSerialNumber, u"media");
  const Storage& silent = machine.storage[1];
  EXPECT_FALSE(silent.deviceType || silent.vendor || silent.deviceNumber || silent.mediaSerialNumber ||
               silent.removable);
  const Volume& volume = machine.volumes[0];
  EXPECT_EQ(volume.name + volume.device, u"\\\\?\\Volume{1}\\USB\\A\\1");
  EXPECT_THAT(volume.paths, ElementsAre(u"E:\\", u"C:\\M\\"));
  EXPECT_TRUE(volume.serial == 7u && volume.driveType == kDRIVE_REMOVABLE && volume.reparsePoints);
  ASSERT_EQ(volume.folderMounts.size(), 1u);
  EXPECT_EQ(volume.folderMounts[0].folder + volume.folderMounts[0].volume, u"Mount\\\\\\?\\Volume{2}\\");
  EXPECT_TRUE(machine.volumes[1].driveType == kDRIVE_FIXED && !machine.volumes[1].serial);
  EXPECT_TRUE(machine.drives[0].letter == u'E' && machine.drives[0].type == kDRIVE_CDROM);
  EXPECT_EQ(machine.drives[0].dosDevice.value() + machine.drives[0].device, u"DUSB\\A\\1");
}

TEST(MachineFile, NamesTheFileThatCannotBeRead) {
  for (const std::string path : {"/no/such.json", ZKUSB_SOURCE_DIR}) {
    try {
      LoadMachine(path);
      ADD_FAILURE() << path;
    } catch (const MachineFileError& error) {
      EXPECT_THAT(error.what(), StartsWith(path + ": cannot be read: "));
    }
  }
}

}  // namespace
}  // namespace platform::simulated
