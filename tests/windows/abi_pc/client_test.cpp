// The client over the DLL that ships, inside whole PCs in the system's own ABI.
#include <windows.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <map>
#include <mutex>
#include <nlohmann/json.hpp>
#include <span>
#include <sstream>
#include <thread>

#include "simulation/pc/simulated_pc.h"
#include "tests/support/golden.h"
#include "tests/support/program.h"
#include "tests/tools/json_schema.h"
#include "tests/windows/abi_pc/pictures.h"

namespace abi_pc {
namespace {

using Json = nlohmann::ordered_json;
using Lines = std::vector<std::string>;

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
              std::string("ABI_PC_PROGRAM=") + (args[0] == "record" ? "1" : ""),
              Beside(u"zkusb.exe")};
  words.insert(words.end(), args.begin(), args.end());
  Watched watched{RunProgram(Beside(u"bin\\zkusb_launcher.exe"), words), {}, {}};
  if (std::ranges::count(args, "--json") != 0) {
    const bool byLine = args[0] == "watch" || args[0] == "record";
    std::istringstream documents(watched.result.out);
    for (std::string text; std::getline(documents, text, byLine ? '\n' : '\0');) {
      EXPECT_EQ(zkusb::SchemaFault(Json::parse(text, nullptr, false)), "");
    }
  }
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
  for (const std::string machine : std::span(kMachines).first(Cases<std::size_t>(4, 2))) {
    for (Lines args : {Lines{"tree"}, Lines{"dump"}, Lines{"volumes"}, Lines{"find", "--vendor", "413C"},
                       Lines{"find", "--vendor", "0781"}}) {
      for (const bool json : {false, true}) {
        if (json && (args[0] == "dump" || (args[0] != "tree" && !testing_support::EveryCase()))) continue;
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

// What the PC says at the start, and after each step that changes it.
Lines PicturesOf(const sim::Machine& machine, const sim::Script& script) {
  sim::SimulatedPc pc(machine);
  Lines pictures{PictureOf(machine, "at the start")};
  for (const sim::Step& step : script) {
    EXPECT_EQ(pc.Apply(step), u"");
    std::string picture = PictureOf(pc.Snapshot(), "after a step");
    if (picture != pictures.back()) pictures.push_back(std::move(picture));
  }
  return pictures;
}

// The client asks the PC itself, by its own imports. What it writes is the PC that the native build shows.
TEST(AbiPc, ClientRecordsThePc) {
  for (const std::string machine : std::span(kMachines).first(Cases<std::size_t>(4, 2))) {
    const std::string file = Temporary("recorded-" + machine + ".json", "");
    const Watched recorded = RunInPc("record", MachinePath(machine), {"record", file, "--with-serials", "--json"});
    EXPECT_EQ(recorded.result.code, 0) << machine << recorded.result.err;
    for (const std::string& breach : recorded.breaches) ADD_FAILURE() << machine << ": " << breach;
    EXPECT_EQ(recorded.open, TextOf({})) << machine;
    const ProgramResult dump = RunProgram(Beside(u"zkusb.exe"), {"dump", "--machine", file});
    EXPECT_EQ(FirstDifference(dump.out, testing_support::Golden(machine)), "") << machine << dump.err;
    Remove(file);
  }
}

TEST(AbiPc, ClientRecordsWhatChanges) {
  const std::string file = Temporary("watched.json", ""), changes = Temporary("watched.script.json", "");
  Json script = Json::parse(testing_support::Contents("machines/scripts/stick-comes-and-goes.json"));
  int at = 0;
  for (Json& step : script.at("steps")) step["at"] = at += 3000;
  const std::string played = Temporary("played.json", script.dump());
  const Watched run =
      RunInPc("changes", MachinePath("dell-precision"),
              {"record", file, "--with-serials", "--watch", "--for", std::to_string(at / 1000 + 3)}, played);
  EXPECT_EQ(run.result.code, 0) << run.result.err;
  for (const std::string& breach : run.breaches) ADD_FAILURE() << breach;
  EXPECT_NE(run.result.out.find("\n2 steps"), std::string::npos) << run.result.out;
  const sim::Machine original = sim::LoadMachine(MachinePath("dell-precision")), recorded = sim::LoadMachine(file);
  const Lines pictures = PicturesOf(original, sim::LoadScript(played, original));
  EXPECT_EQ(pictures.size(), 3u);
  EXPECT_TRUE(PicturesOf(recorded, sim::LoadScript(changes, recorded)) == pictures);
  for (const std::string& name : {file, changes, played}) Remove(name);
}

// A start that asks for notifications before its window is there is a breach, and leaves no registration.
TEST(AbiPc, EveryStartHearsOfInterfaces) {
  const int starts = static_cast<int>(FromEnvironment("ZKUSB_STARTS", Cases(24u, 4u)));
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

}  // namespace
}  // namespace abi_pc
