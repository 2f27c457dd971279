#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::HasSubstr;
using Args = std::vector<std::string>;

TEST(FindCommand, GivesOneLineForEachHit) {
  const std::string asus = MachineFile("asus-b560"), hp = MachineFile("hp-cardreader");
  const struct {
    Args args;
    std::string out;
  } cases[] = {
      {{"find", "--vendor", "781"},
       "0781:5580  serial AA010603160707470215  controller 1, port 3  SanDisk Corporation, USB "
       "Mass Storage Device  D:\n"},
      {{"find", "--vendor", "0x413c", "--product", "0X8197"},
       "413C:8197  serial 28E347017777  controller 2, port 1, port 4  Dell Wireless 380 Bluetooth "
       "4.0 Module\n"},
      // A number that Windows made up is no serial number.
      {{"find", "--vendor", "3F0", "--machine", hp},
       "03F0:0024  no serial number  controller 4, port 1  Hewlett Packard, USB Human Interface "
       "Device\n"
       "03F0:134A  no serial number  controller 4, port 2  Hewlett Packard, USB Human Interface "
       "Device\n"},
      // Hubs are no devices of their own.
      {{"find", "--vendor", "424", "--machine", asus},
       "0424:284C  no serial number  controller 1, port 10, port 2, port 7  Standard Microsystems "
       "Corp., USB Composite Device\n"},
  };
  for (const auto& [args, out] : cases) EXPECT_EQ(Output(args), out);
}

TEST(VolumesCommand, ShowsDisksWithAndWithoutVolumes) {
  EXPECT_EQ(Output({"volumes"}),
            R"(0781:5580  SanDisk Corporation, USB Mass Storage Device  serial AA010603160707470215
  Disk SanDisk Extreme USB Device
    Volume \\?\Volume{3869c27a-31b8-11e8-9b12-ecf4bb487fed}\  D:
)");
  EXPECT_EQ(Output({"volumes", "--machine", MachineFile("hp-cardreader")}),
            R"(0BDA:0151  USB Mass Storage Device  serial 20060413092100000
  Disk Generic- Compact Flash USB Device  F:  no volume
  Disk Generic- MS/MS-Pro USB Device  G:  no volume
  Disk Generic- SD/MMC USB Device  H:  no volume
  Disk Generic- SM/xD-Picture USB Device  I:  no volume
)");
  const TemporaryFile unmounted(ChangedMachine([](Json& machine) {
    for (Json& volume : machine["volumes"]) volume["paths"] = Json::array();
  }));
  EXPECT_THAT(Output({"volumes", "--machine", unmounted.Path()}), HasSubstr("}\\  not mounted\n"));
}

// JSON says the same as the text, in the component's own words.
TEST(DeviceCommands, JsonHoldsTheSameFacts) {
  for (const Args& args : {Args{"find", "--vendor", "781"}, Args{"volumes"}}) {
    const Json json = JsonOutput(args);
    ASSERT_EQ(json.size(), 1u);
    const Json& device = json[0];
    const Json facts =
        Json::parse(R"({"Type": "KUDTPortDevice", "InstanceId": "USB\\VID_0781&PID_5580\\AA010603160707470215",
        "VendorId": 1921, "ProductId": 21888, "VendorName": "SanDisk Corporation", "SerialNumber": "AA010603160707470215",
        "Service": "USBSTOR", "Controller": 1, "Ports": [3], "MountPoints": ["D:\\"]})");
    for (const auto& [name, value] : facts.items()) EXPECT_EQ(device.at(name), value) << name;
    const Json& disk = device.at("Disks").at(0);
    EXPECT_EQ(disk.at("Name"), "SanDisk Extreme USB Device");
    const Json& volume = disk.at("Volumes").at(0);
    EXPECT_EQ(volume.at("VolumeName"), "\\\\?\\Volume{3869c27a-31b8-11e8-9b12-ecf4bb487fed}\\");
    EXPECT_EQ(volume.at("ProductId"), "Extreme         ");  // with its blanks
    EXPECT_EQ(volume.at("MountPoints"), device.at("MountPoints"));
  }

  const Json reader = JsonOutput({"volumes", "--machine", MachineFile("hp-cardreader")}).at(0);
  Json letters = Json::array();
  for (const Json& disk : reader.at("Disks")) {
    EXPECT_EQ(disk.at("Volumes").size(), 0u);
    letters.insert(letters.end(), disk.at("MountPoints").begin(), disk.at("MountPoints").end());
  }
  EXPECT_EQ(letters, Json::array({"F:\\", "G:\\", "H:\\", "I:\\"}));
  EXPECT_EQ(reader.at("MountPoints"), letters);
}

}  // namespace
}  // namespace zkusb
