// The DLL that ships, over whole PCs in the system's own ABI.
#include <windows.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <random>

#include "simulation/machine/generated.h"
#include "simulation/machine/machine_writer.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/golden.h"
#include "tests/support/random_pc.h"
#include "tests/windows/abi_pc/pictures.h"

namespace abi_pc {
namespace {

using Json = nlohmann::ordered_json;
using Lines = std::vector<std::string>;

// A crash ends the program with the name of the test and of the last call, for whoever reads the output.
LONG WINAPI OnCrash(EXCEPTION_POINTERS* crash) {
  const DWORD code = crash->ExceptionRecord->ExceptionCode;
  if (code != EXCEPTION_ACCESS_VIOLATION && code != EXCEPTION_ILLEGAL_INSTRUCTION && code != EXCEPTION_STACK_OVERFLOW) {
    return EXCEPTION_CONTINUE_SEARCH;
  }
  const testing::TestInfo* const test = testing::UnitTest::GetInstance()->current_test_info();
  std::printf("[  FAILED  ] AbiPc.%s crashed after %s\n", test != nullptr ? test->name() : "?", LastCall());
  std::fflush(stdout);
  return TerminateProcess(GetCurrentProcess(), 3), EXCEPTION_CONTINUE_SEARCH;
}
[[maybe_unused]] void* const kCrashHandler = AddVectoredExceptionHandler(TRUE, OnCrash);

// ---------------------------------------------------------------- made-up PCs

// A PC of the simulation's generators: a small one on which things came and went, or one of many like devices.
Json MadeUpPc(unsigned seed) {
  if (seed % 8 < 2) {
    const auto shape = seed % 8 == 0 ? sim::GeneratedShape::Wide : sim::GeneratedShape::Deep;
    return Json::parse(sim::WriteMachine(sim::GenerateMachine(shape, 5 + seed % 40)));
  }
  testing_support::RandomPc pc(seed);
  for (unsigned changes = 8 + seed % 24; changes > 0; --changes) pc.Change();
  return Json::parse(sim::WriteMachine(pc.Pc().Snapshot()));
}

// A member somewhere in the file is taken out, emptied, made long, foreign or another number, or the value of the same
// member elsewhere.
void MakeOdd(Json& machine, std::mt19937& random) {
  const auto below = [&](std::size_t bound) { return static_cast<std::size_t>(random() % bound); };
  constexpr const char* kSections[] = {"devices", "interfaces", "hostControllers", "hubs",
                                       "storage", "volumes",    "drives"};
  Json* list = nullptr;
  while (list == nullptr || !list->is_array() || list->empty()) list = &machine[kSections[below(7)]];
  Json* record = &(*list)[below(list->size())];
  if (below(12) == 0) return static_cast<void>(list->erase(below(list->size())));
  if (below(12) == 0) return std::swap(*record, (*list)[below(list->size())]);
  if (record->contains("ports") && !(*record)["ports"].empty()) {
    Json& ports = (*record)["ports"];
    record = &ports[below(ports.size())];
  }
  if (!record->is_object() || record->empty()) return;
  const auto member = std::next(record->begin(), static_cast<std::ptrdiff_t>(below(record->size())));
  Json& value = member.value();
  switch (below(6)) {
    case 0:
      return static_cast<void>(record->erase(member.key()));
    case 1:
      if (value.is_string()) value = "";
      if (value.is_array()) value = Json::array();
      return;
    case 2:
      if (value.is_string()) value = value.get<std::string>() + std::string(90 + below(200), 'x');
      return;
    case 3:
      if (value.is_string()) value = "Größe Ωμέγα 漢字 \xF0\x9F\x94\x8C " + value.get<std::string>();
      return;
    case 4:
      if (value.is_boolean()) value = !value.get<bool>();
      if (value.is_number()) value = below(6);
      return;
    default:
      for (const Json& other : *list) {
        if (other.is_object() && other.contains(member.key()) && below(3) == 0) value = other[member.key()];
      }
  }
}

TEST(AbiPc, MadeUpPcsAreShownAlike) {
  const unsigned pcs = FromEnvironment("ZKUSB_PCS", Cases(200u, 20u)), first = FromEnvironment("ZKUSB_RANDOM_SEED", 1);
  unsigned odd = 0, distinct = 0;
  std::string before;
  for (unsigned seed = first; seed < first + pcs && !HasFailure(); ++seed) {
    const std::string what = "ZKUSB_RANDOM_SEED=" + std::to_string(seed);
    std::mt19937 random(seed);
    Json machine = MadeUpPc(seed);
    for (int changes = 0; changes < 16; ++changes) {
      Json changed = machine;
      MakeOdd(changed, random);
      try {
        sim::ParseMachine(changed.dump(), what);
      } catch (const sim::MachineFileError&) {
        continue;  // no PC could be so
      }
      odd += changed != machine ? 1 : 0;
      machine = std::move(changed);
    }
    const std::string file = Temporary("made-up.json", machine.dump());
    const std::string picture = PictureOf(sim::LoadMachine(file), what);
    EXPECT_EQ(FirstDifference(picture, SimulatedPictureOf(file)), "") << what;
    Remove(file);
    distinct += picture != before ? 1 : 0;
    before = picture;
  }
  std::printf("%u PCs from seed %u on, %u changes, %u unlike the one before\n", pcs, first, odd, distinct);
  EXPECT_GT(odd, pcs * 5);
  EXPECT_GT(distinct, pcs * 9 / 10);
}

TEST(AbiPc, LargePcsAreShownAlike) {
  for (const auto shape : {sim::GeneratedShape::Wide, sim::GeneratedShape::Deep}) {
    const std::string picture = PictureOf(sim::GenerateMachine(shape, 200), "a large PC");
    std::size_t lines = static_cast<std::size_t>(std::ranges::count(picture, '\n'));
    EXPECT_GT(lines, 200u * 20);
  }
}

// Mounted in a folder alone, a stick shows that folder: also on a system that tells no paths of a volume, where the
// fixed drives' folders are searched.
TEST(AbiPc, AFolderIsFoundTheOlderWayToo) {
  const sim::Machine machine = sim::LoadMachine(MachinePath("dell-precision"));
  const auto stick = std::ranges::find(machine.volumes, u"D:\\", [](const sim::Volume& volume) {
    return volume.paths.empty() ? std::u16string() : volume.paths[0];
  });
  ASSERT_NE(stick, machine.volumes.end());
  sim::SimulatedPc pc(machine);
  ASSERT_EQ(pc.Apply({0, u"", sim::Dismount{stick->name, u"D:\\"}, sim::BroadcastTime::None}), u"");
  ASSERT_EQ(pc.Apply({0, u"", sim::Mount{stick->name, u"C:\\sticks\\one\\"}, sim::BroadcastTime::None}), u"");
  const std::string told = PictureOf(pc.Snapshot(), "paths told");
  EXPECT_NE(told.find("C:\\sticks\\one\\"), told.npos);
  EXPECT_EQ(FirstDifference(PictureOf(pc.Snapshot(), "none told", "GetVolumePathNamesForVolumeNameW"), told), "");
  EXPECT_GT(Calls()["FindFirstVolumeMountPointW"], 0u);
}

// ---------------------------------------------------------------- failures

TEST(AbiPc, EveryFunctionMayFail) {
  const sim::Machine machine = sim::LoadMachine(MachinePath("asus-b560"));
  const std::string whole = PictureOf(machine, "whole");
  const std::map<std::string, unsigned> calls = Calls();
  EXPECT_GE(calls.size(), 26u);
  EXPECT_FALSE(whole.empty());
  int told = 0;
  for (const auto& [function, count] : calls) {
    for (const unsigned nth : {1u, (count + 1) / 2, count}) {
      for (const unsigned to : {nth, UINT_MAX}) {
        const std::string what = function + " " + std::to_string(nth) + (to == nth ? "" : " and on");
        Begin(machine);
        Fail(function, nth, to);
        {
          const LoadedModule module;
          ASSERT_TRUE(module.tree) << what;
          EXPECT_GE(module.Build(), 0) << what;
          told += module.Picture() != whole ? 1 : 0;
        }
        ExpectNothingWrong(what, {.sets = kSetsOfABuild});
      }
    }
    EXPECT_EQ(FirstDifference(PictureOf(machine, function), whole), "") << function;
  }
  EXPECT_GT(told, 20) << "failures are seen in what is shown";
}

// A stick goes before the n-th call of a build; the module goes on being used. Builds that find no change keep the tree
// that is there, and changes are found among the devices of the device manager: so a stick that went after its port was
// read, and before the devices were listed, is shown until the next change, whatever that is.
TEST(AbiPc, AStickIsPulledOutWhileABuildLooks) {
  const sim::Machine machine = sim::LoadMachine(MachinePath("dell-precision"));
  sim::SimulatedPc pc(machine);
  const auto unplug = [&](std::u16string_view service) {
    const auto device = std::ranges::find_if(machine.devices, [&](const sim::Device& each) {
      return each.service && platform::EqualIgnoringCase(*each.service, service);
    });
    EXPECT_EQ(pc.Apply({0, u"", sim::Unplug{device->id}, sim::BroadcastTime::None}), u"");
    return pc.Snapshot();
  };
  const sim::Machine without = unplug(u"USBSTOR"), later = unplug(u"BTHUSB");
  const std::string whole = PictureOf(machine, "with it");
  unsigned calls = 0;
  for (const auto& entry : Calls()) calls += entry.second;
  const std::string rest = PictureOf(without, "without it"), last = PictureOf(later, "without another");
  ASSERT_TRUE(whole != rest && rest != last);
  int between = 0, kept = 0;
  for (unsigned at = 0; at < calls; at += 1 + calls / Cases(150u, 20u)) {
    const std::string what = "pulled out before call " + std::to_string(at);
    Begin(machine);
    bool gone = false;
    BeforeCalls([&](unsigned before) {
      if (before >= at && !std::exchange(gone, true)) Change(without);
    });
    {
      const LoadedModule module;
      ASSERT_TRUE(module.tree) << what;
      EXPECT_EQ(module.Build(), S_OK) << what;
      const std::string seen = module.Picture();
      between += seen != whole && seen != rest ? 1 : 0;
      bool changed = false;
      for (int build = 0; build < 3; ++build) changed |= module.Build() == S_OK;
      const std::string after = module.Picture();
      EXPECT_EQ(FirstDifference(after, changed ? rest : seen), "") << what;
      kept += after != rest ? 1 : 0;
      Change(later);
      EXPECT_EQ(module.Build(), S_OK) << what;
      EXPECT_EQ(FirstDifference(module.Picture(), last), "") << what;
    }
    ExpectNothingWrong(what, {.sets = 5 * kSetsOfABuild});
  }
  EXPECT_EQ(FirstDifference(PictureOf(without, "afterwards"), rest), "");
  std::printf("%u calls; %d builds showed something between, %d kept it until the next change\n", calls, between, kept);
  EXPECT_TRUE(between > 0 && kept > 0);
}

}  // namespace
}  // namespace abi_pc
