#include "simulation/machine/machine_file.h"

#include <gmock/gmock.h>

#include <fstream>

#include "platform/host.h"
#include "tests/support/cases.h"

namespace platform::simulated {
namespace {

using namespace testing;  // NOLINT: nothing but matchers

std::string MachineError(const std::string& json) {
  try {
    ParseMachine(json, "pc.json");
  } catch (const MachineFileError& error) {
    return error.what();
  }
  return "no error";
}

std::string Repeated(const char* text, std::size_t times) {
  std::string all;
  while (times-- > 0) all += text;
  return all;
}

TEST(MachineFile, RefusesEachMistakeWithItsPlace) {
  const std::string port = "hubs[0].ports[1].", ports = R"({"hubs": [{"name": "H", "ports": [{}, {)";
  const std::pair<std::string, std::string> kCases[] = {
      {"{\n  \"name\": \"\xC3\xA4\xC3\xB6\" x",
       "line 2, column 16: syntax error while parsing object - invalid literal; expected '}'"},
      {"{\"name\": \"\xC3\x28\"}",
       "line 1, column 12: syntax error while parsing value - invalid string: ill-formed UTF-8 byte"},
      // What was read last may look like a part of the reason, and is no part of it.
      {"{\"name\": \"a; expected secret\x01\"}",
       "line 1, column 29: syntax error while parsing value - invalid string: control character U+0001 (SOH) must be "
       "escaped to \\u0001"},
      {"{\"name\": \"'; expected secret\" \"'; expected secret\"}",
       "line 1, column 50: syntax error while parsing object - unexpected string literal; expected '}'"},
      {std::string("{}\0{}", 5), "line 1, column 3: unexpected zero byte"},
      {Repeated("[", 100000), Repeated("[0]", 15) + ": is nested too deeply (at most 16 levels)"},
      {R"({"devices": [{"id": ")" + std::string(200, 'A') + R"("}]})", "devices[0].id: is longer than 199 characters"},
      {ports + R"("pipes": [{})" + Repeated(", {}", 30) + "]}]}]}", port + "pipes: has more than 30 entries"},
      {ports + "}" + Repeated(", {}", 254) + "]}]}", "hubs[0].ports: has more than 255 entries"}};
  for (const auto& [json, error] : kCases) EXPECT_EQ(MachineError(json), "pc.json: " + error) << json.substr(0, 300);
  if (testing_support::EveryCase()) {
    EXPECT_EQ(MachineError(R"({"notes": [)" + Repeated("\"\",", 2'000'000) + "]}"),
              "pc.json: notes: the file has more than 2000000 values");
  }
  // The others in a file: the text, a tab, the error.
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/machine/machine-file-errors.tsv");
  int cases = 0;
  for (std::string json, error; std::getline(file, json, '\t') && std::getline(file, error); ++cases) {
    EXPECT_EQ(MachineError(json), "pc.json: " + error) << json;
  }
  EXPECT_EQ(cases, 49);
}

TEST(MachineFile, CollectsEachFaultOnce) {
  std::vector<std::string> faults;
  ParseMachine(R"({"devices": [{"id": "HTREE\\ROOT\\0"}, {"id": "htree\\root\\0"}, {"id": "A"}, {"id": "a"}]})", "f",
               faults);
  EXPECT_THAT(faults, ElementsAre("f: devices[0].id: is the root device, which is always there",
                                  "f: devices[1].id: is the root device, which is always there",
                                  StartsWith("f: devices[3].id: ")));
}

TEST(MachineFile, ReadsEveryMember) {
  const Machine machine = LoadMachine(ZKUSB_SOURCE_DIR "/tests/simulation/machine/every-member.json");
  EXPECT_EQ(machine.name, u"a PC");
  EXPECT_THAT(machine.notes, ElementsAre(u"one", u"z\u00e4hlt \U0001F600"));
  const Device& device = machine.devices.at(0);
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
  const Device& bare = machine.devices.at(1);
  EXPECT_FALSE(bare.deviceClass || bare.hardwareIds || bare.uiNumber || bare.noParent);
  const Guid guid{0x00112233, 0x4455, 0x6677, {0x88, 0x99, 0xaa, 0xbb, 0xcc, 0xdd, 0xee, 0xff}};
  EXPECT_THAT(machine.interfaces.at(0), FieldsAre(guid, u"P", u"usb\\a\\1"));
  EXPECT_THAT(machine.hostControllers.at(0), FieldsAre(ElementsAre(u"\\\\.\\HCD0", u"\\\\.\\HCD12"), u"k", u"H"));
  ASSERT_THAT(machine.hubs.at(0), FieldsAre(u"H", SizeIs(6), true));
  const auto& ports = machine.hubs[0].ports;
  // What a port says makes it connected, a hub or configured.
  const std::tuple<std::uint32_t, bool, int, Speed, int> kPorts[] = {
      {0, false, 0, Speed::Full, 0}, {1, false, 1, Speed::Full, 0},  {1, true, 1, Speed::Full, 0},
      {1, false, 1, Speed::Full, 0}, {255, true, 0, Speed::Full, 0}, {1, false, 2, Speed::Super, 65535}};
  for (std::size_t i = 0; i < 6; ++i) {
    const auto& [status, speed, isHub, hubName, driverKey, descriptor, configuration, address, pipes] = ports[i];
    EXPECT_EQ(std::tie(status, isHub, configuration, speed, address), kPorts[i]) << i;
  }
  EXPECT_EQ(ports[5].hubName.value() + ports[5].driverKey.value(), u"Bk");
  const auto bytes = [](const auto& record) {
    const auto* first = reinterpret_cast<const std::uint8_t*>(&record);
    return std::vector<std::uint8_t>(first, first + sizeof record);
  };
  EXPECT_THAT(bytes(ports[5].descriptor), ElementsAre(18, 1, 0x10, 0x02, 2, 3, 4, 5, 6, 0, 7, 0, 8, 0, 9, 10, 11, 12));
  EXPECT_THAT(bytes(ports[5].pipes.at(0)), ElementsAre(7, 5, 0x81, 3, 0, 4, 12, 99, 0, 0, 0));
  const auto kNone = Eq(std::nullopt);
  EXPECT_THAT(machine.storage, ElementsAre(FieldsAre(u"P", 5, 6, true, "V\xFF ", "", "r", "s",
                                                     Optional(FieldsAre(7u, 8u, 9u)), u"media"),
                                           FieldsAre(u"Q", kNone, 0, false, kNone, kNone, kNone, kNone, kNone, kNone)));
  EXPECT_THAT(machine.volumes,
              ElementsAre(FieldsAre(u"\\\\?\\Volume{1}\\", u"USB\\A\\1", ElementsAre(u"E:\\", u"C:\\M\\"), 7u,
                                    kDRIVE_REMOVABLE, true, ElementsAre(FieldsAre(u"Mount\\", u"\\\\?\\Volume{2}\\"))),
                          FieldsAre(u"\\\\?\\Volume{2}\\", u"", IsEmpty(), kNone, kDRIVE_FIXED, false, IsEmpty())));
  EXPECT_THAT(machine.drives.at(0), FieldsAre(u'E', kDRIVE_CDROM, u"D", u"USB\\A\\1"));
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
