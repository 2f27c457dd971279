// The DLL that ships, over whole PCs in the system's own ABI.
#include <windows.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <random>
#include <sstream>
#include <thread>

#include "simulation/machine/generated.h"
#include "simulation/machine/machine_writer.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/golden.h"
#include "tests/support/program.h"
#include "tests/support/random_pc.h"
#include "tests/windows/abi_pc/pictures.h"

namespace abi_pc {
namespace {

using Json = nlohmann::ordered_json;
using Lines = std::vector<std::string>;

constexpr const char* kMachines[] = {"dell-precision", "asus-b560", "hp-cardreader", "vmware-win7"};
std::string Beside(const char16_t* file) { return platform::ToUtf8(ModuleFile(file)); }
// A file of this process alone: two runs may go side by side.
std::string Temporary(const std::string& name, const std::string& text) {
  const std::string path = testing::TempDir() + "zkusb-abi-" + std::to_string(GetCurrentProcessId()) + "-" + name;
  std::ofstream(path, std::ios::binary) << text;
  return path;
}

// A program that has just ended may still hold its file for a moment; a file that stays does no harm.
void Remove(const std::string& path) {
  std::error_code ignored;
  std::filesystem::remove(path, ignored);
}

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

// ---------------------------------------------------------------- the client

// zkusb over the DLL that ships, inside the PC.
struct Watched {
  ProgramResult result;
  Lines breaches;
  std::string open;
};
Watched RunInPc(const std::string& id, const std::string& machine, const Lines& args, const std::string& script = {}) {
  const std::string report = Temporary(id + ".report", "");
  Lines words{Beside(u"bin\\zkusb_abi_pc_dll.dll"),
              "ABI_PC_MODULE=" + platform::ToUtf8(Module()),
              "ABI_PC_MACHINE=" + machine,
              "ABI_PC_REPORT=" + report,
              "ABI_PC_SCRIPT=" + script,
              Beside(u"zkusb.exe")};
  words.insert(words.end(), args.begin(), args.end());
  Watched watched{RunProgram(Beside(u"bin\\zkusb_launcher.exe"), words), {}, {}};
  std::ifstream lines(report);
  for (std::string line; std::getline(lines, line);) {
    if (line.starts_with("breach: ")) watched.breaches.push_back(line);
    if (line.starts_with("open: ")) watched.open = line.substr(6);
  }
  lines.close();
  Remove(report);
  return watched;
}
// The registration stays for the life of the process.
void ExpectNothingWrongInRun(const Watched& watched, const std::string& what, std::size_t mostSets) {
  for (const std::string& breach : watched.breaches) ADD_FAILURE() << what << ": " << breach;
  bool documented = false;
  for (std::size_t sets = kSetsOfABuild - 1; sets <= mostSets; ++sets) {
    documented |= watched.open == TextOf({.sets = sets, .notifications = 1});
  }
  EXPECT_TRUE(documented) << what << ": left open: " << watched.open << watched.result.err;
}

TEST(AbiPc, ClientShowsWhatTheNativeBuildShows) {
  for (const std::string machine : kMachines) {
    for (Lines args : {Lines{"tree"}, Lines{"dump"}, Lines{"volumes"}, Lines{"find", "--vendor", "413C"},
                       Lines{"find", "--vendor", "0781"}}) {
      for (const bool json : {false, true}) {
        if (json && args[0] == "dump") continue;
        if (json) args.push_back("--json");
        const std::string what = machine + " " + args[0] + (json ? " as JSON" : "");
        const Watched shown = RunInPc("client", MachinePath(machine), args);
        ExpectNothingWrongInRun(shown, what, kSetsOfABuild);
        Lines simulated = args;
        simulated.insert(simulated.end(), {"--machine", MachinePath(machine)});
        const ProgramResult expected = RunProgram(Beside(u"zkusb.exe"), simulated);
        EXPECT_EQ(shown.result.code, expected.code) << what << shown.result.err;
        EXPECT_EQ(shown.result.err, expected.err) << what;
        EXPECT_EQ(FirstDifference(shown.result.out, expected.out), "") << what;
        EXPECT_TRUE(expected.code == 0 ? !expected.out.empty() : args[0] == "find" || args[0] == "volumes") << what;
        // The dumps of the native build are kept as files.
        if (args[0] == "dump") {
          EXPECT_EQ(FirstDifference(shown.result.out, testing_support::Golden(machine)), "") << what;
        }
      }
    }
  }
}

// The events as the native build tells them on virtual time, kept in a file. Here the steps stand so far apart that a
// slow machine has answered one before the next.
TEST(AbiPc, ScriptsTellWhatTheNativeBuildTells) {
  constexpr int kStepMilliseconds = 3000;
  const Json expected = Json::parse(testing_support::Contents("tests/golden/script-events.json"));
  std::vector<std::thread> runs;
  std::map<std::string, Watched> watched;
  std::mutex mutex;
  for (const auto& [script, events] : expected.items()) {
    Json steps = Json::parse(testing_support::Contents("machines/scripts/" + script + ".json"));
    int at = 0;
    for (Json& step : steps.at("steps")) step["at"] = at += kStepMilliseconds;
    const std::string file = Temporary(script + ".json", steps.dump());
    runs.emplace_back([&, script = script, machine = events.at("machine").get<std::string>(), file, at] {
      const Lines args{"watch", "--json", "--for", std::to_string(at / 1000 + 5)};
      Watched run = RunInPc(script, MachinePath(machine), args, file);
      const std::lock_guard lock(mutex);
      watched.emplace(script, std::move(run));
    });
  }
  for (std::thread& run : runs) run.join();
  for (const auto& [script, run] : watched) {
    Remove(Temporary(script + ".json", ""));
    ExpectNothingWrongInRun(run, script, 30 * kSetsOfABuild);
    Json told = Json::array();
    std::istringstream lines(run.result.out);
    for (std::string line; std::getline(lines, line);) {
      const Json event = Json::parse(line, nullptr, false);
      if (!event.is_object() || !event.contains("event") || event["event"].is_null()) continue;
      told.push_back({event["event"], event["InstanceId"], event.value("mountPoints", Json())});
    }
    EXPECT_EQ(told.dump(1), expected.at(script).at("events").dump(1)) << script << run.result.err;
  }
  EXPECT_GE(watched.size(), 4u);
}

// A start that asks for notifications before its window is there is a breach, and leaves no registration.
TEST(AbiPc, EveryStartHearsOfInterfaces) {
  const int starts = static_cast<int>(FromEnvironment("ZKUSB_STARTS", 24));
  std::atomic<int> left = starts, heard = 0;
  std::mutex mutex;
  const auto work = [&](int thread) {
    while (left-- > 0) {
      const Watched start = RunInPc("start" + std::to_string(thread), MachinePath("vmware-win7"), {"volumes"});
      if (start.breaches.empty() && start.open.ends_with(" 1 notifications")) {
        ++heard;
        continue;
      }
      const std::lock_guard lock(mutex);
      for (const std::string& breach : start.breaches) ADD_FAILURE() << breach;
      ADD_FAILURE() << "code " << start.result.code << ", open: " << start.open << start.result.err;
    }
  };
  std::vector<std::thread> threads;
  for (int thread = 0; thread < 6; ++thread) threads.emplace_back(work, thread);
  for (std::thread& thread : threads) thread.join();
  std::printf("%d of %d starts heard of interfaces\n", heard.load(), starts);
  EXPECT_EQ(heard, starts);
}

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
  const unsigned pcs = FromEnvironment("ZKUSB_PCS", 200), first = FromEnvironment("ZKUSB_RANDOM_SEED", 1);
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
  for (unsigned at = 0; at < calls; at += 1 + calls / 150) {
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
