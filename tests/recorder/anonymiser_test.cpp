#include "recorder/anonymiser.h"

#include <array>
#include <fstream>
#include <map>

#include "recorder/recorder.h"
#include "tests/recorder/recordings.h"

namespace recorder {
namespace {

using platform::ToLower;
using platform::ToUtf8;
using platform::simulated::SimulatedPc;

Machine Recorded(const Machine& machine) {
  SimulatedPc pc(machine);
  return RecordMachine(pc);
}

bool IsWord(char unit) { return std::isalnum(static_cast<unsigned char>(unit)) != 0; }
char Shape(char unit) {
  const auto byte = static_cast<unsigned char>(unit);
  return std::isdigit(byte) ? '0' : std::islower(byte) ? 'a' : std::isupper(byte) ? 'A' : unit;
}

// The words in which two texts of one shape differ, and nothing else of them: what was replaced by what.
using Mapping = std::map<std::string, std::string>;
void AddReplacedWords(const std::string& before, const std::string& after, Mapping& mapping) {
  ASSERT_EQ(before.size(), after.size());
  for (std::size_t at = 0; at < before.size(); ++at) {
    if (before[at] == after[at]) continue;
    std::size_t begin = at, end = at;
    while (begin > 0 && IsWord(before[begin - 1])) --begin;
    while (end < before.size() && IsWord(before[end])) ++end;
    std::string was = before.substr(begin, end - begin), is = after.substr(begin, end - begin);
    for (std::size_t i = 0; i < was.size(); ++i) ASSERT_EQ(Shape(was[i]), Shape(is[i])) << was << " -> " << is;
    std::ranges::transform(was, was.begin(), [](unsigned char unit) { return std::tolower(unit); });
    std::ranges::transform(is, is.begin(), [](unsigned char unit) { return std::tolower(unit); });
    const auto [known, fresh] = mapping.try_emplace(was, is);
    ASSERT_EQ(known->second, is) << was << " is replaced in two ways";
    at = end;
  }
}

// The dump of the anonymous machine is that of the machine but for a mapping of words, one to one, that leaves nothing
// of what it maps. The result is the mapping.
Mapping ExpectSameButForAMapping(const Machine& machine, std::size_t fewest) {
  Anonymiser anonymiser;
  Machine anonymous = machine;
  anonymiser.Anonymise(anonymous);
  EXPECT_EQ(WriteMachine(ReadBack(anonymous)), WriteMachine(anonymous));
  Mapping mapping, back;
  const std::string after = BuildOver(anonymous);
  AddReplacedWords(BuildOver(machine), after, mapping);
  for (const auto& [was, is] : mapping) {
    EXPECT_TRUE(back.try_emplace(is, was).second) << is << " replaces two words";
  }
  EXPECT_GE(mapping.size(), fewest);
  // No number among them is left in the file. Shorter ones may be parts of GUIDs that are everybody's.
  const std::string file = ToUtf8(ToLower(platform::FromUtf8(WriteMachine(anonymous))));
  for (const auto& [was, is] : mapping) {
    const bool isNumber = was.size() > 8 && std::ranges::any_of(was, [](char unit) { return unit < 'a'; });
    EXPECT_TRUE(!isNumber || file.find(was) == std::string::npos) << was;
  }
  // The same object replaces the same by the same, another one begins anew and does as well.
  Machine again = machine;
  anonymiser.Anonymise(again);
  EXPECT_EQ(WriteMachine(again), WriteMachine(anonymous));
  return mapping;
}

TEST(Anonymiser, ShowsTheSamePcButForAMappingOfWords) {
  for (const char* name : kMachines) {
    SCOPED_TRACE(name);
    const Mapping mapping = ExpectSameButForAMapping(Recorded(LoadMachine(name)), 1);
    // Makes and places stay.
    for (const char* kept : {"usb", "disk", "volume", "0781", "root", "offset"}) EXPECT_FALSE(mapping.contains(kept));
  }
  for (std::uint32_t seed = 1; seed <= 15; ++seed) {
    SCOPED_TRACE(seed);
    const Machine machine = Recorded(RandomMachine(seed));
    ExpectSameButForAMapping(machine, machine.volumes.empty() ? 0 : 1);
    ASSERT_FALSE(testing::Test::HasFailure());
  }
}

// What a PC of a person says of that person.
Machine PersonalPc() {
  Machine pc;
  const auto device = [&pc](const char16_t* id, const char16_t* deviceClass, const char16_t* name) {
    platform::simulated::Device& added = pc.devices.emplace_back();
    added.id = id;
    added.deviceClass = deviceClass;
    added.friendlyName = name;
  };
  device(u"USB\\VID_0781&PID_5580\\AA010603160707470215", u"USB", u"SanDisk Extreme");
  device(u"USBSTOR\\DISK&VEN_SANDISK&PROD_EXTREME&REV_0001\\AA010603160707470215&0", u"DiskDrive", u"SanDisk Extreme");
  device(
      u"STORAGE\\VOLUME\\_??_USBSTOR#DISK&VEN_X&PROD_MS#PRO&REV_1#AA010603160707470215&0#{53F56307-B6BF-11D0-94F2-"
      u"00A0C91EFB8B}",
      u"Volume", u"E:\\");
  device(u"USB\\VID_0781&PID_5580\\K7B2", u"USB", u"SanDisk Extreme");
  // What stands behind the last & is the number of a unit only where it is a number.
  device(u"USB\\VID_0781&PID_5581\\QX77ZK&ANNA8812", u"USB", u"SanDisk Extreme");
  device(u"STORAGE\\VOLUME\\1&19F7E59C&0&SIGNATURE1A2B3C4DOFFSET7E00LENGTH100", u"Volume", u"C:\\");
  device(u"STORAGE\\VOLUME\\1&19F7E59C&0&SIGNATURE1A2B3C4DOFFSET9000LENGTH200", u"Volume", u"D:\\");
  device(u"PCI\\VEN_10EC&DEV_8168&SUBSYS_85051043&REV_0C\\01000000684CE00000", u"Net", u"Realtek GbE");
  device(u"BTHENUM\\DEV_F0D1A9C3B5E7\\7&1A2B3C4D&0&BLUETOOTHDEVICE_F0D1A9C3B5E7", u"Bluetooth", u"Anna's iPhone");
  device(u"USB\\VID_04E8&PID_6860\\R58M12ABCDE", u"WPD", u"Anna's Galaxy");
  device(u"SWD\\PRINTENUM\\{7F1A2B3C-1111-4222-8333-944455556666}", u"PrintQueue", u"Printer of Anna Muster");
  device(u"SWD\\DAFUPNPPROVIDER\\UUID:2C1A0B9D-0001-1000-8000-684CE0AABBCC", u"SoftwareDevice", u"Anna's TV");
  device(u"ROOT\\VOLMGR\\0000", u"System", u"Volume Manager");
  device(u"USB\\VID_046D&PID_C077\\6&1A2B3C4D&0&2", u"HIDClass", u"USB Input Device");
  platform::simulated::Storage& disk = pc.storage.emplace_back();
  disk.path = u"\\\\.\\E:";
  disk.serial = "  S3Z8NB0K123456 ";
  disk.product = "Extreme";
  disk.mediaSerialNumber = u"MEDIA77812";
  pc.volumes.push_back({u"\\\\?\\Volume{3869c27a-31b8-11e8-9b12-ecf4bb487fed}\\",
                        {},
                        {u"C:\\", u"C:\\Users\\Anna\\Photos\\"},
                        0xA1B2C3D4,
                        3,
                        true,
                        {{u"Users\\anna\\Photos\\", u"\\\\?\\Volume{3869c27a-31b8-11e8-9b12-ecf4bb487fed}\\"}}});
  pc.volumes.push_back({u"\\\\?\\Volume{00000000-0000-0000-0000-100000000001}\\", {}, {}, 0xA1B2C3D4, 3, false, {}});
  pc.drives.push_back({u'Z', 4, u"\\Device\\LanmanRedirector\\;Z:0000000000012abc\\mustersrv\\anna", {}});
  pc.drives.push_back({u'S', 3, u"\\??\\C:\\Users\\Anna", {}});
  pc.drives.push_back({u'E', 2, u"\\Device\\HarddiskVolume5", {}});
  return pc;
}

// Where words were replaced, a star for each of their letters and digits.
std::string Masked(const std::string& before, const std::string& after) {
  std::string masked = before;
  for (std::size_t begin = 0, end = 0; begin < before.size(); begin = end + 1) {
    for (end = begin; end < before.size() && IsWord(before[end]); ++end) continue;
    if (before.substr(begin, end - begin) != after.substr(begin, end - begin))
      masked.replace(begin, end - begin, end - begin, '*');
  }
  return masked;
}

// What stands where, the text, and what becomes of it.
TEST(Anonymiser, ReplacesWhatLeadsToAPersonAndNothingElse) {
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/recorder/anonymised.tsv");
  Machine pc;
  pc.interfaces.push_back({platform::GUID_DEVINTERFACE_DISK, u"P", {}});
  std::vector<std::array<std::string, 3>> rows;
  for (std::string line; std::getline(file, line);) {
    const std::size_t first = line.find('\t'), second = line.find('\t', first + 1);
    rows.push_back({line.substr(0, first), line.substr(first + 1, second - first - 1), line.substr(second + 1)});
  }
  // The text of each row, where it stands in the machine: made by the first pass, found again by the second.
  const auto textOf = [](Machine& machine, const std::string& kind, std::size_t i) -> std::optional<Text>& {
    machine.devices.resize(std::max(machine.devices.size(), i + 1));
    auto& device = machine.devices[i];
    const std::map<std::string, std::u16string> ids = {
        {"swd", u"SWD\\X\\"}, {"umb", u"umb\\X\\"}, {"wpd", u"WpdBusEnumRoot\\X\\"}, {"daf", u"SWD\\DAFX\\"}};
    if (device.id.empty())
      device.id = (ids.contains(kind) ? ids.at(kind) : u"ROOT\\X\\") + platform::Decimal(static_cast<int>(i));
    if (kind.starts_with("name ")) device.deviceClass = platform::FromUtf8(kind.substr(5));
    return kind == "daf" ? device.description : device.friendlyName;
  };
  for (std::size_t i = 0; i < rows.size(); ++i) {
    const Text text = platform::FromUtf8(rows[i][1]);
    textOf(pc, rows[i][0], i);
    if (rows[i][0] == "id")
      pc.devices[i].id = text;
    else if (rows[i][0] == "note")
      pc.notes.push_back(text);
    else if (rows[i][0] == "serial")
      pc.storage.emplace_back().serial = rows[i][1];
    else if (rows[i][0] == "media")
      pc.storage.emplace_back().mediaSerialNumber = text;
    else if (rows[i][0] == "volume")
      pc.volumes.emplace_back().name = text;
    else if (rows[i][0] == "path")
      pc.volumes.emplace_back().paths = {text};
    else if (rows[i][0] == "dos")
      pc.drives.emplace_back().dosDevice = text;
    else
      textOf(pc, rows[i][0], i) = text;
  }
  pc.devices[0].classGuid = u"{36FC9E60-C465-11CF-8056-444553540000}";
  pc.drives.emplace_back();
  Anonymiser().Anonymise(pc);
  std::size_t notes = 0, storage = 0, volumes = 0, drives = 0;
  for (std::size_t i = 0; i < rows.size(); ++i) {
    const auto& [kind, before, masked] = rows[i];
    const Text after = kind == "id"       ? pc.devices[i].id
                       : kind == "note"   ? pc.notes[notes++]
                       : kind == "serial" ? platform::FromUtf8(*pc.storage[storage++].serial)
                       : kind == "media"  ? *pc.storage[storage++].mediaSerialNumber
                       : kind == "volume" ? pc.volumes[volumes++].name
                       : kind == "path"   ? pc.volumes[volumes++].paths[0]
                       : kind == "dos"    ? *pc.drives[drives++].dosDevice
                                          : *textOf(pc, kind, i);
    EXPECT_EQ(Masked(before, ToUtf8(after)), masked) << kind << "\t" << before;
  }
  EXPECT_EQ(rows.size(), 66u);
}

TEST(Anonymiser, LeavesNothingOfAPerson) {
  const Machine pc = PersonalPc();
  Machine anonymous = pc;
  Anonymiser anonymiser;
  anonymiser.Anonymise(anonymous);
  const std::string was = ToUtf8(ToLower(platform::FromUtf8(WriteMachine(pc))));
  const std::string file = ToUtf8(ToLower(platform::FromUtf8(WriteMachine(anonymous))));
  for (const char* secret : {"aa010603160707470215", "k7b2", "1a2b3c4doffset", "684ce0", "f0d1a9c3b5e7", "anna",
                             "iphone", "galaxy", "r58m12abcde", "7f1a2b3c", "2c1a0b9d", "s3z8nb0k123456", "media77812",
                             "3869c27a", "ecf4bb487fed", "a1b2c3d4", "photos", "muster", "12abc\\"}) {
    EXPECT_NE(was.find(secret), std::string::npos) << secret;
    EXPECT_EQ(file.find(secret), std::string::npos) << secret;
  }
  for (const char* kept :
       {"vid_0781&pid_5580", "sandisk extreme", "prod_ms#pro", "{53f56307-b6bf-11d0-94f2-00a0c91efb8b}",
        "root\\\\volmgr\\\\0000", "6&1a2b3c4d&0&2", "c:\\\\", "offset7e00length100", "realtek gbe", "harddiskvolume5",
        "\\\\device\\\\lanmanredirector\\\\"}) {
    EXPECT_NE(file.find(kept), std::string::npos) << kept;
  }
  // Equal stays equal, and what names another thing goes on naming it.
  const auto& devices = anonymous.devices;
  const auto serial = devices[0].id.substr(devices[0].id.rfind(u'\\') + 1);
  EXPECT_EQ(devices[1].id.substr(devices[1].id.rfind(u'\\') + 1), serial + u"&0");
  EXPECT_NE(devices[2].id.find(u"#" + serial + u"&0#"), std::u16string::npos);
  EXPECT_EQ(devices[5].id.substr(0, devices[5].id.find(u"OFFSET")),
            devices[6].id.substr(0, devices[6].id.find(u"OFFSET")));
  EXPECT_EQ(anonymous.volumes[0].serial, anonymous.volumes[1].serial);
  EXPECT_EQ(anonymous.volumes[0].folderMounts[0].volume, anonymous.volumes[0].name);
  EXPECT_TRUE(platform::EqualIgnoringCase(anonymous.volumes[0].paths[1],
                                          u"C:\\" + anonymous.volumes[0].folderMounts[0].folder));
  EXPECT_EQ(anonymous.storage[0].serial->size(), pc.storage[0].serial->size());
  EXPECT_EQ(ToUtf8(anonymiser.Report()),
            "Replaced, equal ones by equal ones: 9 serial numbers, 3 volume GUIDs and other ids, 1 volume serial "
            "number, 1 Bluetooth address, 5 folder names, 8 words of names that people gave.");
}

}  // namespace
}  // namespace recorder
