#include <algorithm>
#include <regex>
#include <set>

#include "tests/support/cases.h"
#include "tests/tools/client.h"

namespace zkusb {
namespace {

using testing::HasSubstr;

std::ptrdiff_t WidestLine(const std::string& text) {
  std::ptrdiff_t widest = 0;
  for (const std::string& line : Lines(text)) {
    widest = std::max(widest, std::ranges::count_if(line, [](char byte) { return (byte & 0xC0) != 0x80; }));
  }
  return widest;
}

// The devices that the ports of a machine file hold, hubs left out.
std::multiset<std::string> PluggedIn(const Json& machine) {
  std::multiset<std::string> ids;
  for (const Json& hub : machine.at("hubs")) {
    for (const Json& port : hub.at("ports")) {
      if (!port.contains("descriptor") || port.contains("hubName")) continue;
      const auto number = [&](const char* member) {
        const Json& value = port.at("descriptor").at(member);
        return value.is_string() ? std::stoi(value.get<std::string>(), nullptr, 16) : value.get<int>();
      };
      ids.insert(IdOf({{"VendorId", number("idVendor")}, {"ProductId", number("idProduct")}}));
    }
  }
  return ids;
}

std::multiset<std::string> DevicesOfText(const std::string& text) {
  static const std::regex device("Port [0-9]+: .* speed  ([0-9A-F]{4}:[0-9A-F]{4}) ");
  return {std::sregex_token_iterator(text.begin(), text.end(), device, 1), {}};
}

void CollectDevices(const Json& node, std::multiset<std::string>& ids) {
  if (node.at("Type") != "KUDTPortDevice") {
    for (const Json& child : node.at("Childs")) CollectDevices(child, ids);
  } else if (!IdOf(node).empty()) {
    ids.insert(IdOf(node));
  }
}

// The dumps of the four PCs, derived once from their machine files by hand and by a model of its own. They are part of
// the published behaviour: a difference is a fault, not a reason to write them anew.
TEST(DumpCommand, DumpsEveryMachineByteForByte) {
  std::size_t compared = 0;
  for (const auto& entry : std::filesystem::directory_iterator(MachinesFolder())) {
    if (entry.path().extension() != ".json") continue;
    const std::string expected = Golden(entry.path().stem().string());
    const std::string dump = Output({"--machine", entry.path().string(), "dump"});
    const auto differs = std::ranges::mismatch(dump, expected).in1;
    EXPECT_EQ(JsonOutput({"--machine", entry.path().string(), "dump"}).at("ToString"), expected);
    EXPECT_TRUE(dump == expected) << entry.path() << ", from byte " << differs - dump.begin() << ": "
                                  << std::string(differs, dump.end()).substr(0, 80);
    ++compared;
  }
  EXPECT_EQ(compared, 4u);
}

TEST(TreeCommand, NamesEveryDeviceOnceWithinItsColumns) {
  for (const std::string machine : {"asus-b560", "dell-precision", "hp-cardreader", "vmware-win7"}) {
    if (machine != "dell-precision" && !testing_support::EveryCase()) continue;
    SCOPED_TRACE(machine);
    const std::string file = MachineFile(machine);
    const std::multiset<std::string> plugged = PluggedIn(LoadJson(file));
    EXPECT_GE(plugged.size(), 2u);

    const std::string text = Output({"tree", "--machine", file});
    EXPECT_EQ(text.find("…"), text.npos);
    EXPECT_EQ(Output({"tree", "--width", "0", "--machine", file}), text);
    for (const std::ptrdiff_t columns : {1, 50, 80}) {
      EXPECT_LE(WidestLine(Output({"tree", "--width", std::to_string(columns), "--machine", file})), columns);
    }
    EXPECT_EQ(DevicesOfText(text), plugged);

    std::multiset<std::string> ids;
    CollectDevices(JsonOutput({"tree", "--machine", file}).at("RootNode"), ids);
    EXPECT_EQ(ids, plugged);
  }
  // Internal disks are left out, but not what events may name.
  EXPECT_THAT(Output({"tree", "--machine", MachineFile("vmware-win7")}),
              HasSubstr("└─ PCI\\VEN_15AD&DEV_07A0&SUBSYS_07A015AD&REV_01\\3&18D45AA6&0&A8 (not USB)\n"
                        "   └─ VMware, VMware Virtual S SCSI Disk Device\n"));
}

TEST(TreeCommand, ShowsWhatGoesWrongOnAPort) {
  const TemporaryFile file(ChangedMachine([](Json& machine) {
    Json& ports = machine["hubs"][0]["ports"];
    ports[2]["configuration"] = 0;
    ports[2].erase("filledIn");
    ports[4] = {{"status", 2}, {"speed", "low"}};
    for (Json& device : machine["devices"]) {
      if (device["id"] != "USB\\VID_0781&PID_5580\\AA010603160707470215") continue;
      device["description"] = "\u001b[2J   Stick \u202e ";
      device.erase("filledIn");
    }
    for (Json& volume : machine["volumes"]) {
      if (volume.value("paths", Json::array()) == Json::array({"D:\\"})) {
        volume["paths"].push_back("C:\\All sticks\\One\\");
      }
    }
  }));
  const std::string text = Output({"tree", "--width", "80", "--machine", file.Path()});
  // The name is shortened, not the mount points.
  EXPECT_THAT(text, HasSubstr("├─ Port 3: full speed  0781:5580 SanDisk Corpora…  [D:, C:\\All sticks\\One]\n"));
  EXPECT_THAT(text, HasSubstr("├─ Port 5: low speed  0000:0000 unknown device\n"));
  EXPECT_THAT(text, HasSubstr("└─ Ports 1-2, 4, 6-8: empty\n"));
  EXPECT_LE(WidestLine(text), 80);

  const std::string found = Output({"find", "--vendor", "781", "--machine", file.Path()});
  EXPECT_THAT(found, HasSubstr("SanDisk Corporation, \\x1B[2J Stick \\u202E  D:, C:\\All"));
  EXPECT_EQ(JsonOutput({"find", "--vendor", "781", "--machine", file.Path()})["devices"][0].at("Description"),
            "\u001b[2J   Stick \u202e ");
  EXPECT_THAT(Output({"dump", "--machine", file.Path()}), HasSubstr("deviceDescr : \u001b[2J   Stick \u202e \r\n"));
}

// A hub on the first port of another one, and so on, below the root hub of the first controller.
std::string HubChain(std::size_t length) {
  return ChangedMachine([length](Json& machine) {
    Json& hubs = machine["hubs"];
    Json* port = &hubs[0]["ports"][0];
    for (std::size_t i = 0; i < length; ++i) {
      const std::string name = "USB#VID_1234&PID_5678#" + std::to_string(i) + "#{0}";
      *port = {{"hubName", name}};
      hubs.push_back({{"name", name}, {"ports", {Json::object()}}});
      port = &hubs.back()["ports"][0];
    }
  });
}

TEST(TreeCommand, CopesWithMoreHubsThanFitTheWindow) {
  const TemporaryFile deep(HubChain(60));
  const std::string text = Output({"tree", "--width", "80", "--machine", deep.Path()});
  EXPECT_THAT(text, HasSubstr("Port 1: hub 1234:5678 "));
  EXPECT_EQ(WidestLine(text), 80);
  EXPECT_GE(Lines(text).size(), 60u);

  const TemporaryFile tooDeep(HubChain(250));
  const ProgramResult refused = RunClient({"tree", "--machine", tooDeep.Path()});
  EXPECT_EQ(refused.code, kRefused);
  EXPECT_EQ(refused.err, "zkusb: the topology has more than 400 levels\n");
}

}  // namespace
}  // namespace zkusb
