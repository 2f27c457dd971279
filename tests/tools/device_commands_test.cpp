#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::HasSubstr;

TEST(DeviceCommands, PrintWhatTheTranscriptShows) {
  const std::vector<std::string> lines = Lines(Golden("client-transcript"));
  std::size_t cases = 0;
  for (auto line = lines.begin(); line != lines.end();) {
    const std::string command = *line++;
    if (!command.starts_with("$ zkusb ")) continue;
    Args args;
    std::istringstream words(command.substr(8));
    for (std::string word; words >> word;)
      args.push_back(word.starts_with("machines/") ? ZKUSB_SOURCE_DIR "/" + word : word);
    std::string expected;
    for (; line != lines.end() && line->find_first_of("$#") != 0; ++line) expected += *line + "\n";
    ++cases;
#ifdef _WIN32  // where scripts play in real time, which is never the same
    if (command.find("--script") != command.npos) continue;
#endif
    EXPECT_EQ(Output(args), expected) << command;
  }
  EXPECT_EQ(cases, 8u);
}

TEST(VolumesCommand, ShowsVolumesThatAreNotMounted) {
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
