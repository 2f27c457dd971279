#include "recorder/difference.h"

#include <sstream>

#include "recorder/anonymiser.h"
#include "recorder/recorder.h"
#include "simulation/machine/steps.h"
#include "tests/recorder/recordings.h"

namespace recorder {
namespace {

using platform::simulated::Script;
using platform::simulated::SimulatedPc;
using platform::simulated::Step;

// What one client hears: the lists of each build that publishes something.
class Listener {
 public:
  explicit Listener(const Machine& machine) : m_pc(machine), m_builder(m_pc) { Build(); }

  // One build for each step that a person told of, as the messages of it are coalesced.
  void Apply(const Step& step) { EXPECT_EQ(platform::ToUtf8(m_pc.Apply(step)), ""); }
  void Build() {
    if (m_builder.Build()) {
      for (std::size_t kind = 0; kind < 4; ++kind) {
        m_heard += "list " + std::to_string(kind) + "\n";
        for (const auto& node : *m_builder.GetDeviceList(kind)) m_heard += KelvoUHW::DumpOf(*node, u"  ");
      }
      m_heard += KelvoUHW::DumpOf(*m_builder.Root());
    }
    m_builder.CommitDeviceCache();
  }
  SimulatedPc& Pc() { return m_pc; }
  const std::string& Heard() const { return m_heard; }

 private:
  SimulatedPc m_pc;
  KelvoUHW::CZKUMUsbTreeBuilder m_builder;
  std::string m_heard;
};

// Records a script as it is played, and plays the recording: both say the same. Returns the steps of the recording.
std::size_t ExpectSameEvents(const Machine& machine, const Script& script) {
  Listener original(machine);
  Machine state = RecordMachine(original.Pc());
  Listener replayed(ReadBack(state));
  Script recorded;
  for (const Step& step : script) {
    original.Apply(step);
    original.Build();
    Difference difference = StepsBetween(state, RecordMachine(original.Pc()), step.atMilliseconds);
    EXPECT_TRUE(difference.complete) << platform::ToUtf8(step.name);
    state = std::move(difference.after);
    for (const Step& told : difference.steps) {
      replayed.Apply(told);
      recorded.push_back(told);
    }
    replayed.Build();
    EXPECT_EQ(replayed.Heard(), original.Heard()) << platform::ToUtf8(step.name);
  }
  EXPECT_FALSE(original.Heard().empty());
  // The recording as a file, over the machine as a file.
  SimulatedPc first(machine);
  const Machine start = ReadBack(RecordMachine(first));
  const Script read = platform::simulated::ParseScript(WriteScript(recorded, {}), "recorded", start);
  EXPECT_EQ(WriteScript(read, {}), WriteScript(recorded, {}));
  return recorded.size();
}

TEST(StepsBetween, TellWhatTheScriptsAtHandTell) {
  const std::tuple<const char*, const char*, std::size_t> cases[] = {
      {"hp-cardreader", "card-in-slot", 2},
      {"dell-precision", "stick-comes-and-goes", 2},
      {"asus-b560", "hub-with-four-devices", 2},
      {"dell-precision", "usb-hard-disk", 2},
  };
  for (const auto& [name, scriptName, fewest] : std::span(cases).first(testing_support::Cases<std::size_t>(4, 1))) {
    SCOPED_TRACE(scriptName);
    const Machine machine = LoadMachine(name);
    const std::string file = std::string(ZKUSB_SOURCE_DIR "/machines/scripts/") + scriptName + ".json";
    EXPECT_GE(ExpectSameEvents(machine, platform::simulated::LoadScript(file, machine)), fewest);
  }
}

// What a build shows, in no order and without the numbers of nodes: a device that went and came back to its port
// between two looks has another place among the others, and nobody is told.
std::vector<std::string> LinesOf(const SimulatedPc& pc) {
  std::istringstream text(BuildOver(pc.Snapshot()));
  std::vector<std::string> lines;
  for (std::string line; std::getline(text, line);) {
    if (line.find("devInstHandle") == std::string::npos) lines.push_back(line);
  }
  std::ranges::sort(lines);
  return lines;
}

// Each state of PCs that change at random leads to the next.
TEST(StepsBetween, TellWhatMadeUpPcsDo) {
  const std::uint32_t pcs = testing_support::Cases(10u, 1u);
  std::size_t steps = 0;
  for (std::uint32_t seed = 1; seed <= pcs; ++seed) {
    testing_support::RandomPc pc(seed);
    Listener original(pc.Pc().Snapshot());
    Machine state = RecordMachine(pc.Pc());
    SimulatedPc replayed(state);
    for (int change = 0; change < 14; ++change) {
      pc.Change();
      Difference difference = StepsBetween(state, RecordMachine(pc.Pc()), 0);
      ASSERT_TRUE(difference.complete) << "seed " << seed << ":" << pc.Script();
      for (const Step& step : difference.steps) ASSERT_EQ(platform::ToUtf8(replayed.Apply(step)), "");
      steps += difference.steps.size();
      EXPECT_LE(difference.steps.size(), 2u) << "seed " << seed << ":" << pc.Script();
      state = std::move(difference.after);
      ASSERT_EQ(LinesOf(replayed), LinesOf(pc.Pc())) << "seed " << seed << ":" << pc.Script();
    }
  }
  EXPECT_GE(steps, 8 * pcs);
}

TEST(StepsBetween, SayWhenAChangeIsMoreThanStepsCanSay) {
  const Machine machine = LoadMachine("dell-precision");
  const auto change = [&machine](auto edit) {
    Machine changed = machine;
    edit(changed);
    return StepsBetween(machine, changed, 7);
  };
  const Difference nothing = change([](Machine&) {});
  EXPECT_TRUE(nothing.complete && nothing.steps.empty());
  const Difference renamed = change([](Machine& pc) { pc.devices[3].friendlyName = u"another"; });
  EXPECT_TRUE(!renamed.complete && renamed.steps.empty());
  const Difference silentVolume = change([](Machine& pc) { pc.volumes.pop_back(); });
  EXPECT_FALSE(silentVolume.complete);
  // A move is going and coming, at the moment that was given.
  const Difference moved = change([](Machine& pc) {
    for (auto& hub : pc.hubs) {
      const auto isStick = [](const auto& port) { return port.descriptor.idProduct == 0x5580; };
      const auto isFree = [](const auto& port) { return port.status == 0; };
      const auto stick = std::ranges::find_if(hub.ports, isStick), free = std::ranges::find_if(hub.ports, isFree);
      if (stick != hub.ports.end() && free != hub.ports.end()) return std::swap(*stick, *free);
    }
    FAIL() << "no stick beside a free port";
  });
  EXPECT_TRUE(moved.complete);
  ASSERT_EQ(moved.steps.size(), 2u);
  EXPECT_TRUE(std::holds_alternative<platform::simulated::Unplug>(moved.steps[0].change));
  EXPECT_TRUE(std::holds_alternative<platform::simulated::Plug>(moved.steps[1].change));
  EXPECT_EQ(moved.steps[0].atMilliseconds, 7u);
}

}  // namespace
}  // namespace recorder
