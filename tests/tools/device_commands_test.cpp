#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::HasSubstr;

// Runs each command of a transcript and compares what it prints; its lines end where `ends` stands. Returns how many
// commands there are.
std::size_t CompareTranscript(const std::vector<std::string>& lines, const std::string& ends) {
  std::size_t cases = 0;
  for (auto line = lines.begin(); line != lines.end();) {
    const std::string command = *line++;
    if (!command.starts_with("$ zkusb ")) continue;
    Args args;
    std::istringstream words(command.substr(8));
    for (std::string word; words >> word;)
      args.push_back(word.starts_with("machines/") ? ZKUSB_SOURCE_DIR "/" + word : word);
    std::string expected;
    for (; line != lines.end() && !line->empty() && line->find_first_of(ends) != 0; ++line) expected += *line + "\n";
    ++cases;
#ifdef _WIN32  // where scripts play in real time, which is never the same
    if (command.find("--script") != command.npos) continue;
#endif
    EXPECT_EQ(Output(args), expected) << command;
  }
  return cases;
}

TEST(DeviceCommands, PrintWhatTheTranscriptShows) {
  EXPECT_EQ(CompareTranscript(Lines(Golden("client-transcript")), "$#"), 10u);
}

TEST(DeviceCommands, PrintWhatTheReadmeShows) {
  std::ifstream readme(ZKUSB_SOURCE_DIR "/README.md");
  std::vector<std::string> lines;
  bool client = false;
  for (std::string line; std::getline(readme, line);) {
    if (line.starts_with("## ")) client = line == "## The client";
    if (client) lines.push_back(line.starts_with("    ") ? line.substr(4) : "");
  }
  EXPECT_EQ(CompareTranscript(lines, "$"), 4u);
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
    EXPECT_EQ(json.at("command"), args[0]);
    ASSERT_EQ(json.at("devices").size(), 1u);
    const Json& device = json["devices"][0];
    const Json facts =
        Json::parse(R"({"Type": "KUDTPortDevice", "InstanceId": "USB\\VID_0781&PID_5580\\AA010603160707470215",
        "VendorId": 1921, "ProductId": 21888, "vendorName": "SanDisk Corporation", "SerialNumber": "AA010603160707470215",
        "Service": "USBSTOR", "portPath": "1-3", "speed": "full", "driveLetters": ["D:"], "mountPoints": ["D:\\"]})");
    for (const auto& [name, value] : facts.items()) EXPECT_EQ(device.at(name), value) << name;
    const Json& disk = device.at("disks").at(0);
    EXPECT_EQ(disk.at("name"), "SanDisk Extreme USB Device");
    const Json& volume = disk.at("volumes").at(0);
    EXPECT_EQ(volume.at("VolumeName"), "\\\\?\\Volume{3869c27a-31b8-11e8-9b12-ecf4bb487fed}\\");
    EXPECT_EQ(volume.at("ProductId"), "Extreme         ");  // with its blanks
    EXPECT_EQ(volume.at("MountPoints"), device.at("mountPoints"));
  }

  const Json reader = JsonOutput({"volumes", "--machine", MachineFile("hp-cardreader")}).at("devices").at(0);
  Json letters = Json::array();
  for (const Json& disk : reader.at("disks")) {
    EXPECT_EQ(disk.at("volumes").size(), 0u);
    letters.insert(letters.end(), disk.at("mountPoints").begin(), disk.at("mountPoints").end());
  }
  EXPECT_EQ(letters, Json::array({"F:\\", "G:\\", "H:\\", "I:\\"}));
  EXPECT_EQ(reader.at("mountPoints"), letters);
}

TEST(FindCommand, FindsByWhatAPersonKnows) {
  const TemporaryFile folder(ChangedMachine([](Json& machine) {
    for (Json& volume : machine["volumes"]) {
      if (volume.value("paths", Json::array()) == Json::array({"D:\\"})) volume["paths"].push_back("C:\\Sticks\\One\\");
    }
  }));
  // The arguments, a tab, the devices that are found; a bar between them.
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/tools/found.tsv");
  std::size_t cases = 0;
  for (std::string line, devices; std::getline(file, line, '\t') && std::getline(file, devices); ++cases) {
    if (!TakesCase(cases)) continue;
    SCOPED_TRACE(line);
    const Args ids = Lines(devices, '|');
    Args all = Lines(line, '|');
    all.insert(all.end(), {"--json", "--machine", folder.Path()});
    const ProgramResult result = RunClient(all);
    EXPECT_EQ(result.code, ids.empty() ? kNothingFound : kDone);
    std::vector<std::string> found;
    const Json json = Json::parse(result.out, nullptr, false);
    for (const Json& device : json.at("devices")) found.push_back(IdOf(device));
    EXPECT_THAT(found, testing::UnorderedElementsAreArray(ids));
  }
  EXPECT_EQ(cases, 17u);
}

}  // namespace
}  // namespace zkusb
