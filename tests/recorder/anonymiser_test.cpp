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
  const std::uint32_t serials[] = {0xA1B2C3D4, 0xA1B2C3D5, 0xA1B2C3D4};
  for (std::size_t i = 0; i < 3; ++i) pc.volumes[i].serial = serials[i];
  pc.volumes[0].folderMounts = {{u"Users\\anna\\", pc.volumes[1].name}};
  Anonymiser anonymiser;
  anonymiser.Anonymise(pc);
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
  EXPECT_TRUE(pc.volumes[0].serial == pc.volumes[2].serial && pc.volumes[0].serial != pc.volumes[1].serial);
  EXPECT_NE(pc.volumes[0].serial, serials[0]);
  EXPECT_EQ(pc.volumes[0].folderMounts[0].volume, pc.volumes[1].name);
  // Equal ones by equal ones, in either case.
  EXPECT_EQ(pc.volumes[3].paths[0].substr(3, 5), pc.volumes[0].folderMounts[0].folder.substr(0, 5));
  const Text serial = pc.devices[12].id.substr(22, 8);
  EXPECT_NE(pc.devices[21].id.find(u"#" + serial + u"&0#"), Text::npos);
  EXPECT_NE(pc.notes[0].find(u"(" + ToLower(serial) + u")"), Text::npos);
  EXPECT_EQ(ToUtf8(anonymiser.Report()),
            "Replaced, equal ones by equal ones: 18 serial numbers, 4 volume GUIDs and other ids, 2 volume serial "
            "numbers, 1 Bluetooth address, 9 folder names, 10 words of names that people gave.");
}

}  // namespace
}  // namespace recorder
