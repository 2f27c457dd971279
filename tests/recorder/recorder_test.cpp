#include "recorder/recorder.h"

#include <cstdlib>
#include <iostream>

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

void ExpectSameBuilds(std::uint32_t firstSeed, std::uint32_t count) {
  std::size_t devices = 0, volumes = 0;
  for (std::uint32_t seed = firstSeed; seed < firstSeed + count; ++seed) {
    SCOPED_TRACE("seed " + std::to_string(seed));
    const Machine machine = RandomMachine(seed);
    ExpectSameBuild(machine);
    devices += machine.devices.size();
    volumes += machine.volumes.size();
    ASSERT_FALSE(testing::Test::HasFailure());
  }
  std::cout << "seeds " << firstSeed << " to " << firstSeed + count - 1 << ": " << devices << " devices, " << volumes
            << " volumes\n";
  EXPECT_GE(devices, 10u * count);
  EXPECT_GE(volumes, count / 2);
}

TEST(Recorder, ShowsMadeUpPcsAsTheyAre) {
  const char* many = std::getenv("ZKUSB_RECORDED_PCS");
  ExpectSameBuilds(1, many == nullptr ? testing_support::Cases(30u, 5u)
                                      : static_cast<std::uint32_t>(std::strtoul(many, nullptr, 10)));
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
