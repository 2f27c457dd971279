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
  for (const char* name : SomeMachines()) {
    SCOPED_TRACE(name);
    const Mapping mapping = ExpectSameButForAMapping(Recorded(LoadMachine(name)), 1);
    // Makes and places stay.
    for (const char* kept : {"usb", "disk", "volume", "0781", "root", "offset"}) EXPECT_FALSE(mapping.contains(kept));
  }
  for (std::uint32_t seed = 1; seed <= testing_support::Cases(15u, 4u); ++seed) {
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
  const std::size_t size = rows.size();
  pc.notes.resize(size), pc.devices.resize(size), pc.storage.resize(size), pc.volumes.resize(size);
  pc.drives.resize(size);
  const auto textOf = [&pc](const std::string& kind, std::size_t i) -> Text& {
    if (kind == "note") return pc.notes[i];
    if (kind == "id") return pc.devices[i].id;
    if (kind == "volume") return pc.volumes[i].name;
    if (kind == "path") return pc.volumes[i].paths.emplace(pc.volumes[i].paths.begin())[0];
    std::optional<Text>& text = kind == "dos"                   ? pc.drives[i].dosDevice
                                : kind == "media"               ? pc.storage[i].mediaSerialNumber
                                : kind.starts_with("describes") ? pc.devices[i].description
                                                                : pc.devices[i].friendlyName;
    return text ? *text : text.emplace();
  };
  std::map<std::string, std::size_t> last;  // of a kind
  for (std::size_t i = 0; i < size; ++i) {
    const Text owner = platform::FromUtf8(rows[i][0].substr(rows[i][0].find(' ') + 1));
    const bool isClass = rows[i][0].starts_with("class");
    pc.devices[i].id = (isClass ? Text(u"ROOT\\X\\") : owner + u"\\") + platform::Decimal(static_cast<int>(i));
    if (isClass) pc.devices[i].deviceClass = owner;
    textOf(rows[i][0], i) = platform::FromUtf8(rows[i][1]);
    last[rows[i][0]] = i;
  }
  pc.devices[0].classGuid = u"{36FC9E60-C465-11CF-8056-444553540000}";
  pc.storage[0].serial = "  S3Z8NB0K123456 ";
  const std::uint32_t serials[] = {0xA1B2C3D4, 0xA1B2C3D5, 0xA1B2C3D4};
  for (std::size_t i = 0; i < 3; ++i) pc.volumes[i].serial = serials[i];
  pc.volumes[0].folderMounts = {{u"Users\\anna\\", pc.volumes[last["volume"]].name}};
  Anonymiser anonymiser;
  anonymiser.Anonymise(pc);
  for (std::size_t i = 0; i < size; ++i) {
    const auto& [kind, before, masked] = rows[i];
    const Text after = kind == "path" ? pc.volumes[i].paths[0] : textOf(kind, i);
    EXPECT_EQ(Masked(before, ToUtf8(after)), masked) << kind << "\t" << before;
  }
  EXPECT_EQ(Masked("  S3Z8NB0K123456 ", *pc.storage[0].serial), "  ************** ");
  EXPECT_EQ(rows.size(), 66u);
  EXPECT_TRUE(pc.volumes[0].serial == pc.volumes[2].serial && pc.volumes[0].serial != pc.volumes[1].serial);
  EXPECT_EQ(pc.volumes[0].folderMounts[0].volume, pc.volumes[last["volume"]].name);
  EXPECT_EQ(pc.volumes[last["path"]].paths[0].substr(3, 5), pc.volumes[0].folderMounts[0].folder.substr(0, 5));
  const Text serial = pc.devices[12].id.substr(22, 8);
  EXPECT_NE(pc.devices[21].id.find(u"#" + serial + u"&0#"), Text::npos);
  const auto names = [&](const Text& note) { return note.find(u"(" + ToLower(serial) + u")") != Text::npos; };
  EXPECT_EQ(std::ranges::count_if(pc.notes, names), 1);
  EXPECT_EQ(ToUtf8(anonymiser.Report()),
            "Replaced, equal ones by equal ones: 18 serial numbers, 4 volume GUIDs and other ids, 2 volume serial "
            "numbers, 1 Bluetooth address, 19 folder names, 10 words of names that people gave.");
}

}  // namespace
}  // namespace recorder
