#include "recorder/recorder.h"

#include <cstdlib>
#include <fstream>
#include <iostream>
#include <iterator>
#include <map>

#include "platform/wrappers/failing_host.h"
#include "simulation/machine/generated.h"
#include "tests/recorder/recordings.h"

namespace recorder {
namespace {

using platform::simulated::SimulatedPc;

Machine RecordedCleanly(const Machine& machine) {
  SimulatedPc pc(machine);
  Machine recorded = RecordMachine(pc);
  EXPECT_EQ(pc.Open(), platform::simulated::OpenCounts());
  EXPECT_TRUE(pc.Misuses().empty());
  return recorded;
}

// The recording shows what the PC shows; read from its file it is the same recording.
void ExpectSameBuild(const Machine& machine) {
  const Machine recorded = RecordedCleanly(machine);
  EXPECT_TRUE(recorded.notes.empty()) << platform::ToUtf8(recorded.notes.front());
  const Machine read = ReadBack(recorded);
  EXPECT_EQ(WriteMachine(read), WriteMachine(recorded));
  EXPECT_EQ(BuildOver(read), BuildOver(machine));
}

TEST(Recorder, ShowsEveryMachineAsItIs) {
  for (const char* name : SomeMachines()) {
    SCOPED_TRACE(name);
    const Machine machine = LoadMachine(name);
    ExpectSameBuild(machine);
    // A file of its own says the same, too, and its recording has each interface, port and volume of it.
    EXPECT_EQ(WriteMachine(ReadBack(machine)), WriteMachine(machine));
    Machine recorded = RecordedCleanly(machine);
    EXPECT_EQ(recorded.interfaces.size(), machine.interfaces.size());
    EXPECT_EQ(recorded.hubs.size(), machine.hubs.size());
    EXPECT_EQ(recorded.volumes.size(), machine.volumes.size());
    EXPECT_EQ(recorded.storage.size(), machine.storage.size());
  }
  for (const auto shape : {platform::simulated::GeneratedShape::Wide, platform::simulated::GeneratedShape::Deep}) {
    ExpectSameBuild(platform::simulated::GenerateMachine(shape, 60));
  }
}

TEST(Recorder, ShowsMadeUpPcsAsTheyAre) {
  const char* many = std::getenv("ZKUSB_RECORDED_PCS");
  const std::uint32_t count =
      many == nullptr ? testing_support::Cases(30u, 5u) : static_cast<std::uint32_t>(std::strtoul(many, nullptr, 10));
  std::size_t devices = 0, volumes = 0;
  for (std::uint32_t seed = 1; seed <= count && !testing::Test::HasFailure(); ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    const Machine machine = RandomMachine(seed);
    ExpectSameBuild(machine);
    devices += machine.devices.size();
    volumes += machine.volumes.size();
  }
  EXPECT_TRUE(devices >= 10u * count && volumes >= count / 2) << devices << " devices, " << volumes << " volumes";
}

// The file has each member of each kind of record, in the order in which a recording has them.
TEST(Recorder, TellsEachMember) {
  Machine machine = platform::simulated::LoadMachine(ZKUSB_SOURCE_DIR "/tests/recorder/whole-pc.json");
  for (int i = 0; i < 100; ++i) {  // more than fits what is asked with at first
    machine.volumes[1].paths.push_back(u"C:\\" + platform::Decimal(i) + std::u16string(100, u'x') + u"\\");
  }
  EXPECT_EQ(WriteMachine(RecordedCleanly(machine)), WriteMachine(machine));
}

std::string Outline(const Machine& pc) {
  std::string text;
  for (const std::size_t size : {pc.devices.size(), pc.interfaces.size(), pc.hostControllers.size(), pc.hubs.size(),
                                 pc.storage.size(), pc.volumes.size(), pc.drives.size(), pc.notes.size()}) {
    text += " " + std::to_string(size);
  }
  return text;
}

// What is left without an answer, section by section, and the notes.
TEST(Recorder, LeavesOutWhatACallWouldHaveTold) {
  const Machine machine = platform::simulated::LoadMachine(ZKUSB_SOURCE_DIR "/tests/recorder/whole-pc.json");
  SimulatedPc pc(machine);
  platform::wrappers::FailingHost host(pc);
  std::string found;
  for (std::size_t i = 0; i < platform::wrappers::kOperations; ++i) {
    const auto operation = static_cast<platform::wrappers::Operation>(i);
    if (platform::wrappers::IsReleasing(operation)) continue;
    host.SetPlan({.call = 1, .onwards = true, .operation = operation});
    const Machine recorded = RecordMachine(host);
    found += platform::ToUtf8(NameOf(operation)) + Outline(recorded) + "\n";
    EXPECT_EQ(WriteMachine(ReadBack(recorded)), WriteMachine(recorded));
  }
  for (const std::uint32_t code :
       {0x220408u, 0x22040Cu, 0x220414u, 0x220420u, 0x220424u, 0x220448u, 0x2D0C10u, 0x2D1080u, 0x2D1400u}) {
    host.SetPlan({.call = 1, .onwards = true, .code = code});
    found += platform::ToUtf8(platform::Hex(code)) + Outline(RecordMachine(host)) + "\n";
  }
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/recorder/partial-recordings.txt");
  const std::string expected((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
  EXPECT_EQ(found, expected);
  // Without the set, the tree of nodes has the same devices with the same properties.
  host.SetPlan({.call = 1, .operation = platform::wrappers::Operation::GetClassDevs});
  Machine walked = RecordMachine(host), whole = machine;
  for (Machine* each : {&walked, &whole}) {
    std::ranges::sort(each->devices, {}, [](const auto& device) { return device.id; });
    for (auto& device : each->devices) device.noClassImage = device.noClassDescription = false;
  }
  EXPECT_EQ(WriteMachine(walked), WriteMachine(whole));
}

TEST(Recorder, WritesDownWhatAFileCanSay) {
  Machine machine = platform::simulated::LoadMachine(ZKUSB_SOURCE_DIR "/tests/recorder/whole-pc.json");
  Machine expected = machine;
  machine.devices[1].classGuid = u"no GUID";
  machine.devices[1].legacyBusType = 18;
  machine.devices[2].legacyBusType = -2;
  expected.devices[2].legacyBusType = -1;
  machine.devices.push_back(machine.devices[0]);
  machine.devices.back().id = std::u16string(200, u'x');
  machine.volumes.push_back({u"\\\\?\\Volume{4}", {}, {}, {}, 9, false, {}});
  machine.volumes.push_back({u"\\\\.\\Volume{4}\\", {}, {}, {}, 9, false, {}});
  machine.volumes.push_back({u"\\\\?\\Volume{5}\\", {}, {u"C:\\\\x\\", u"C:\\a:b\\"}, {}, 9, false, {}});
  machine.volumes.push_back({u"\\\\?\\Volume{6}\\", {}, {}, {}, 3, true, {{u"In\\", u""}}});
  machine.volumes.push_back({u"\\\\?\\Volume{7}\\", {}, {u"\\\\?\\Volume{6}\\In\\"}, {}, 3, false, {}});
  machine.volumes[0].folderMounts.push_back({u"\\x\\", u""});
  machine.volumes[0].folderMounts.push_back({u"a:b\\", u""});
  machine.volumes[5].serial = machine.volumes[6].serial = 7;
  for (const std::size_t i : {5u, 6u, 7u}) expected.volumes.push_back(machine.volumes[i]);
  expected.volumes[3].driveType = 6;
  expected.volumes[4].folderMounts[0].volume = u"\\\\?\\Volume{7}\\";
  const std::u16string noId = u"A device whose id cannot be read or written down is left out.";
  expected.notes = {noId, noId,  // in the set and in the tree
                    u"A volume is left out: its name is \\\\?\\Volume{4}",
                    u"A volume is left out: its name is \\\\.\\Volume{4}\\"};
  EXPECT_EQ(WriteMachine(RecordedCleanly(machine)), WriteMachine(expected));
}

struct ChangingPc final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  platform::Status BeforeCall(const platform::wrappers::HostCall&) noexcept override {
    return platform::Status::Success();
  }
  platform::Status GetParent(platform::DevInst node, platform::DevInst& parent) noexcept override {
    parent = parents.contains(node) ? parents[node] : 0x7FFFFFFF;
    return platform::Status::Success();
  }
  std::map<platform::DevInst, platform::DevInst> parents;
};

TEST(Recorder, MendsParentsThatLeadNowhere) {
  SimulatedPc pc(platform::simulated::LoadMachine(ZKUSB_SOURCE_DIR "/tests/recorder/whole-pc.json"));
  ChangingPc host(pc);
  host.parents = {{2, 3}, {3, 4}, {4, 3}, {5, 5}, {6, 1}, {7, 99}};
  const Machine recorded = RecordMachine(host);
  std::string parents;
  for (const auto& device : recorded.devices) parents += platform::ToUtf8(device.parent.substr(0, 8)) + "|";
  EXPECT_EQ(parents, "|||USB\\VID_||PCI\\VEN_||||||");
  std::string notes;
  for (const auto& note : recorded.notes) notes += platform::ToUtf8(note) + "\n";
  const std::string tail = " is not there; it hangs below the root here.\n";
  EXPECT_EQ(notes, "USB\\ROOT_HUB30\\4&1: its parent USB\\VID_0424&PID_2513\\5&2" + tail +
                       "USB\\VID_0424&PID_2513\\5&2: its parent USB\\VID_0781&PID_5580\\AA01" + tail +
                       "USBSTOR\\DISK&VEN_SANDISK\\AA01&0: its parent USBSTOR\\DISK&VEN_SANDISK\\AA01&0" + tail);
}

// What failed is left out, and what is there can be read, built over and recorded again; nothing stays open.
TEST(Recorder, WritesWhatItGetsWhenCallsFail) {
  const Machine machine = RandomMachine(7);
  const std::string whole = WriteMachine(RecordedCleanly(machine));
  SimulatedPc pc(machine);
  platform::wrappers::FailingHost host(pc);
  RecordMachine(host);
  const std::uint64_t calls = host.Calls();
  std::uint64_t partial = 0, tried = 0;
  for (std::uint64_t call = 1; call <= calls && !testing::Test::HasFailure();
       call += testing_support::Cases<std::uint64_t>(3, 41)) {
    SCOPED_TRACE("call " + std::to_string(call));
    host.SetPlan({.call = call, .onwards = call % 2 == 0});
    const Machine recorded = RecordMachine(host);
    EXPECT_GE(host.Failures(), 1u);
    EXPECT_EQ(pc.Open(), platform::simulated::OpenCounts());
    EXPECT_LE(recorded.devices.size(), machine.devices.size());
    const Machine read = ReadBack(recorded);  // throws for a file that could not be read
    EXPECT_EQ(WriteMachine(read), WriteMachine(recorded));
    EXPECT_NE(BuildOver(read), "");
    partial += WriteMachine(recorded) != whole ? 1 : 0;
    ++tried;
  }
  EXPECT_TRUE(pc.Misuses().empty());
  std::cout << tried << " failures, " << partial << " partial recordings\n";
  EXPECT_GT(partial, tried / 2);
}

}  // namespace
}  // namespace recorder
