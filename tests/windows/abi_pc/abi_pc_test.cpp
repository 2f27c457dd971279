// The DLL that ships, over whole PCs in the system's own ABI.
#include <windows.h>

#include <gtest/gtest.h>
#include <tlhelp32.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <random>
#include <sstream>
#include <thread>

#include "simulation/machine/generated.h"
#include "simulation/machine/machine_file.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/golden.h"
#include "tests/support/program.h"
#include "tests/windows/abi_pc/shipping_module.h"

namespace abi_pc {
namespace {

namespace sim = platform::simulated;
using Json = nlohmann::ordered_json;
using Lines = std::vector<std::string>;

constexpr const char* kMachines[] = {"dell-precision", "asus-b560", "hp-cardreader", "vmware-win7"};
// What each build leaves open, which is documented: the sets of volumes, disks and their like.
constexpr std::size_t kSetsOfABuild = 4;

std::string MachinePath(const std::string& name) { return ZKUSB_SOURCE_DIR "/machines/" + name + ".json"; }
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

void ExpectNothingWrong(const std::string& what, const Open& most = {}) {
  for (const std::string& breach : Breaches()) ADD_FAILURE() << what << ": " << breach;
  const Open open = OpenNow();
  EXPECT_TRUE(open.files <= most.files && open.sets <= most.sets && open.imageLists <= most.imageLists &&
              open.searches <= most.searches && open.notifications <= most.notifications)
      << what << ": left open: " << TextOf(open);
}

// What a fresh module shows of a PC, and that it left nothing behind.
std::string PictureOf(const sim::Machine& machine, const std::string& what) {
  Begin(machine);
  std::string picture;
  {
    const LoadedModule module;
    EXPECT_TRUE(module.tree) << what;
    if (!module.tree) return {};
    EXPECT_GE(module.Build(), 0) << what;
    picture = module.Picture();
  }
  ExpectNothingWrong(what, {.sets = kSetsOfABuild});
  return picture;
}

// What the simulated module shows of the same file: the very sources of the native build, whose results are the same.
std::string SimulatedPictureOf(const std::string& file) {
  SetEnvironmentVariableA("ZKUSB_MACHINE", file.c_str());
  const LoadedModule module(SimulatedModule());
  EXPECT_GE(module.Build(), 0);
  return module.Picture();
}

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
void ExpectNothingWrong(const Watched& watched, const std::string& what, std::size_t mostSets) {
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
        ExpectNothingWrong(shown, what, kSetsOfABuild);
        Lines simulated = args;
        simulated.insert(simulated.end(), {"--machine", MachinePath(machine)});
        const ProgramResult expected = RunProgram(Beside(u"zkusb.exe"), simulated);
        EXPECT_EQ(shown.result.code, expected.code) << what << shown.result.err;
        EXPECT_EQ(shown.result.err, expected.err) << what;
        EXPECT_TRUE(shown.result.out == expected.out) << what;
        EXPECT_TRUE(expected.code == 0 ? !expected.out.empty() : args[0] == "find" || args[0] == "volumes") << what;
        // The dumps of the native build are kept as files.
        if (args[0] == "dump") {
          EXPECT_TRUE(shown.result.out == testing_support::Golden(machine)) << what;
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
    ExpectNothingWrong(run, script, 30 * kSetsOfABuild);
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
  const char* const more = std::getenv("ZKUSB_STARTS");
  const int starts = more != nullptr ? std::atoi(more) : 24;
  std::atomic<int> left = starts, heard = 0;
  const auto work = [&](int thread) {
    while (left-- > 0) {
      const Watched start = RunInPc("start" + std::to_string(thread), MachinePath("vmware-win7"), {"volumes"});
      if (start.breaches.empty() && start.open.ends_with(" 1 notifications")) ++heard;
    }
  };
  std::vector<std::thread> threads;
  for (int thread = 0; thread < 6; ++thread) threads.emplace_back(work, thread);
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(heard, starts);
}

// ---------------------------------------------------------------- made-up PCs

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
  constexpr unsigned kPcs = 200;
  const char* const given = std::getenv("ZKUSB_RANDOM_SEED");
  const unsigned first = given != nullptr ? static_cast<unsigned>(std::atoi(given)) : 1;
  unsigned odd = 0, distinct = 0;
  std::string before;
  for (unsigned seed = first; seed < first + kPcs && !HasFailure(); ++seed) {
    const std::string what = "ZKUSB_RANDOM_SEED=" + std::to_string(seed);
    std::mt19937 random(seed);
    Json machine = Json::parse(testing_support::Contents("machines/" + std::string(kMachines[seed % 4]) + ".json"));
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
    EXPECT_TRUE(picture == SimulatedPictureOf(file)) << what;
    Remove(file);
    distinct += picture != before ? 1 : 0;
    before = picture;
  }
  std::printf("%u PCs from seed %u on, %u changes, %u unlike the one before\n", kPcs, first, odd, distinct);
  EXPECT_GT(odd, kPcs * 5);
  EXPECT_GT(distinct, kPcs * 9 / 10);
}

TEST(AbiPc, LargePcsAreShownAlike) {
  for (const auto shape : {sim::GeneratedShape::Wide, sim::GeneratedShape::Deep}) {
    const std::string picture = PictureOf(sim::GenerateMachine(shape, 200), "a large PC");
    std::size_t lines = static_cast<std::size_t>(std::ranges::count(picture, '\n'));
    EXPECT_GT(lines, 200u * 20);
  }
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
    EXPECT_TRUE(PictureOf(machine, function) == whole) << function;
  }
  EXPECT_GT(told, 20) << "failures are seen in what is shown";
}

// A stick goes before the n-th call of a build; the module goes on being used.
TEST(AbiPc, AStickIsPulledOutWhileABuildLooks) {
  const sim::Machine machine = sim::LoadMachine(MachinePath("dell-precision"));
  std::u16string stick;
  for (const sim::Device& device : machine.devices) {
    if (device.service && platform::EqualIgnoringCase(*device.service, u"USBSTOR")) stick = device.id;
  }
  sim::SimulatedPc pc(machine);
  ASSERT_EQ(pc.Apply({0, u"", sim::Unplug{stick}, sim::BroadcastTime::None}), u"");
  const sim::Machine without = pc.Snapshot();
  const std::string whole = PictureOf(machine, "with it");
  unsigned calls = 0;
  for (const auto& entry : Calls()) calls += entry.second;
  const std::string rest = PictureOf(without, "without it");
  ASSERT_NE(whole, rest);
  int between = 0, stale = 0;
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
      module.Build();
      const std::string seen = module.Picture();
      between += seen != whole && seen != rest ? 1 : 0;
      for (int build = 0; build < 3; ++build) module.Build();
      stale += module.Picture() != rest ? 1 : 0;
    }
    ExpectNothingWrong(what, {.sets = 4 * kSetsOfABuild});
  }
  EXPECT_TRUE(PictureOf(without, "afterwards") == rest);
  std::printf("%u calls; %d builds showed something between, %d modules still did three builds later\n", calls, between,
              stale);
}

// ---------------------------------------------------------------- loading and unloading

struct Counts {
  int freeIndexes = 0;
  int handles = 0;
  int threads = 0;
  auto operator<=>(const Counts&) const = default;
};

Counts CountNow() {
  Counts counts;
  std::vector<DWORD> indexes;
  for (DWORD index; (index = TlsAlloc()) != TLS_OUT_OF_INDEXES;) indexes.push_back(index);
  for (const DWORD index : indexes) TlsFree(index);
  counts.freeIndexes = static_cast<int>(indexes.size());
  const HANDLE snapshot = CreateToolhelp32Snapshot(TH32CS_SNAPTHREAD, 0);
  THREADENTRY32 thread{};
  thread.dwSize = sizeof thread;
  for (BOOL more = Thread32First(snapshot, &thread); more; more = Thread32Next(snapshot, &thread)) {
    counts.threads += thread.th32OwnerProcessID == GetCurrentProcessId() ? 1 : 0;
  }
  CloseHandle(snapshot);
  // One by one, up to well beyond the next one: not every system tells their number.
  const HANDLE next = CreateEventW(nullptr, FALSE, FALSE, nullptr);
  CloseHandle(next);
  for (std::uintptr_t value = 4; value < reinterpret_cast<std::uintptr_t>(next) + 0x1000; value += 4) {
    DWORD flags = 0;
    counts.handles += GetHandleInformation(reinterpret_cast<HANDLE>(value), &flags) ? 1 : 0;
  }
  return counts;
}

void PrintTo(const Counts& counts, std::ostream* out) {
  *out << counts.freeIndexes << " free indexes, " << counts.handles << " handles, " << counts.threads << " threads";
}

// How many allocations of the module go well before one fails.
std::atomic<int> g_allocationsLeft = INT_MAX;
void* __cdecl FailingMalloc(std::size_t bytes) { return --g_allocationsLeft == 0 ? nullptr : std::malloc(bytes); }

DWORD WINAPI ReadOnce(void* module) { return !static_cast<LoadedModule*>(module)->Picture().empty(); }

// One load: a tree, queries, from another thread too, and every other time an exception inside.
void LoadOnce(int cycle) {
  const LoadedModule module;
  ASSERT_TRUE(module.tree) << cycle;
  ASSERT_TRUE(Replace(module.Handle(), "malloc", reinterpret_cast<void*>(&FailingMalloc)));
  if (cycle % 2 == 0) {
    g_allocationsLeft = 1 + cycle % 400;
    module.build->BuildTree();
    g_allocationsLeft = INT_MAX;
  }
  module.Build();
  if (cycle % 3 == 0) {
    // One of the system's: those of the run-time keep handles for the next.
    const HANDLE thread = CreateThread(nullptr, 0, ReadOnce, const_cast<LoadedModule*>(&module), 0, nullptr);
    DWORD shown = 0;
    WaitForSingleObject(thread, INFINITE);
    GetExitCodeThread(thread, &shown);
    CloseHandle(thread);
    EXPECT_TRUE(shown || cycle % 2 == 0);
  }
  ComPtr<IZKUMUsbTreeNodeEnumerator> volumes;
  EXPECT_EQ(module.tree->get_PortDevicesWithVolume(volumes.Put()), S_OK);
}

// What the module has of the registry.
std::atomic<int> g_keys = 0;
LSTATUS WINAPI OpenKey(HKEY key, LPCWSTR name, DWORD options, REGSAM access, PHKEY opened) {
  const LSTATUS status = RegOpenKeyExW(key, name, options, access, opened);
  g_keys += status == ERROR_SUCCESS ? 1 : 0;
  return status;
}
LSTATUS WINAPI CreateKey(HKEY key, LPCWSTR name, DWORD reserved, LPWSTR type, DWORD options, REGSAM access,
                         const LPSECURITY_ATTRIBUTES security, PHKEY opened, LPDWORD disposition) {
  const LSTATUS status = RegCreateKeyExW(key, name, reserved, type, options, access, security, opened, disposition);
  g_keys += status == ERROR_SUCCESS ? 1 : 0;
  return status;
}
LSTATUS WINAPI CloseKey(HKEY key) { return --g_keys, RegCloseKey(key); }

void RegisterOnce() {
  const LoadedModule module;
  using Registration = HRESULT(STDAPICALLTYPE*)();
  EXPECT_TRUE(Replace(module.Handle(), "RegOpenKeyExW", reinterpret_cast<void*>(&OpenKey)) &&
              Replace(module.Handle(), "RegCreateKeyExW", reinterpret_cast<void*>(&CreateKey)) &&
              Replace(module.Handle(), "RegCloseKey", reinterpret_cast<void*>(&CloseKey)));
  EXPECT_EQ(module.Export<Registration>("DllRegisterServer")(), S_OK);
  EXPECT_EQ(module.Export<Registration>("DllUnregisterServer")(), S_OK);
}

TEST(AbiPc, IsLoadedAndUnloadedAnyNumberOfTimes) {
  if constexpr (sizeof(void*) == 4) {
    GTEST_SKIP() << "a known fault: each load of the 32-bit DLL keeps one index of thread-local data and two handles";
  }
  const char* const given = std::getenv("ZKUSB_CYCLES");
  const int cycles = given != nullptr ? std::atoi(given) : 5000;
  Begin(sim::LoadMachine(MachinePath("vmware-win7")));
  Counts early;
  for (int cycle = 0; cycle < cycles && !HasFailure(); ++cycle) {
    LoadOnce(cycle);
    ASSERT_EQ(GetModuleHandleW(L"ZKUsbMonitor.dll"), nullptr) << cycle;
    if (cycle == 9) early = CountNow();
  }
  const Counts late = CountNow();
  EXPECT_EQ(late, early);
  // The system's own registration of a type library keeps keys on Wine: handles are told from ours by counting ours.
  for (int cycle = 0; cycle < 50 && !HasFailure(); ++cycle) RegisterOnce();
  EXPECT_EQ(CountNow().freeIndexes, early.freeIndexes);
  EXPECT_EQ(g_keys, 0);
  ExpectNothingWrong("loading", {.sets = 2 * kSetsOfABuild * static_cast<std::size_t>(cycles)});
  std::printf("after %d loads: %s\n", cycles, testing::PrintToString(late).c_str());
}

}  // namespace
}  // namespace abi_pc
