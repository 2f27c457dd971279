// Runs the client as a program of its own, since the component stays in a process that has used it.
#pragma once

#include <gmock/gmock.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <nlohmann/json.hpp>
#include <random>
#include <sstream>

#include "platform/text.h"
#include "tests/support/cases.h"
#include "tests/support/golden.h"
#include "tests/support/program.h"
#include "tests/tools/json_schema.h"
#include "tools/zkusb/run.h"

namespace zkusb {

using Json = nlohmann::ordered_json;
using Args = std::vector<std::string>;
using testing_support::Golden;

inline std::vector<std::string> Lines(const std::string& text, char end = '\n') {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line, end);) lines.push_back(line);
  return lines;
}

// Of cases that start a program each. Programs start slowly under Wine, so `./test` runs every fourth there, and all of
// them natively.
inline bool TakesCase(std::size_t number) {
#ifdef _WIN32
  return number % testing_support::Cases<std::size_t>(1, 4) == 0;
#else
  return static_cast<void>(number), true;
#endif
}
template <class Cases>
auto ProgramCases(const Cases& cases) {
  std::vector<std::ranges::range_value_t<Cases>> some;
  for (std::size_t at = 0; at < std::size(cases); ++at) {
    if (TakesCase(at)) some.push_back(cases[at]);
  }
  return some;
}

// All JSON that any test makes is held against the schema: that of watch and record line by line.
inline void CheckJson(const std::string& text, bool byLine) {
  for (const std::string& part : byLine ? Lines(text) : std::vector{text}) {
    const Json json = Json::parse(part, nullptr, false);
    ASSERT_FALSE(json.is_discarded()) << part;
    EXPECT_EQ(SchemaFault(json), "");
  }
}

inline ProgramResult RunClient(const Args& args) {
  ProgramResult result = RunProgram(ZKUSB_PROGRAM, args);
  const bool help = std::ranges::count(args, "--help") != 0;
  const bool json = std::ranges::count(args, "--json") == 1 && result.code != kRefused && !help;
  const auto byLine = [](const std::string& arg) { return arg == "watch" || arg == "record"; };
  if (json) CheckJson(result.out, std::ranges::any_of(args, byLine));
  return result;
}

inline std::filesystem::path MachinesFolder() { return std::filesystem::path(ZKUSB_SOURCE_DIR) / "machines"; }
inline std::string MachineFile(const std::string& name) { return (MachinesFolder() / (name + ".json")).string(); }

// The same over the machine that is built in where the arguments name none: on Windows the client then looks at the PC
// that it runs on.
inline ProgramResult RunOverSimulatedPc(Args args) {
#ifdef _WIN32
  const auto names = [](const std::string& arg) { return arg.starts_with("--machine") || arg == "--script"; };
  if (std::ranges::none_of(args, names)) args.insert(args.end(), {"--machine", MachineFile("dell-precision")});
#endif
  return RunClient(args);
}

// What a run prints that is expected to do what it is asked.
inline std::string Output(const Args& args) {
  const ProgramResult result = RunOverSimulatedPc(args);
  EXPECT_EQ(result.code, kDone) << result.err;
  EXPECT_EQ(result.err, "");
  return result.out;
}

inline Json JsonOutput(Args args) {
  args.push_back("--json");
  const Json json = Json::parse(Output(args), nullptr, false);
  EXPECT_FALSE(json.is_discarded());
  return json;
}

inline Json LoadJson(const std::filesystem::path& path) {
  std::ifstream stream(path);
  return Json::parse(stream);
}

// A path that no other run of the tests uses at the same time; what stands there is the caller's to remove.
inline std::string UniquePath(const std::u8string& tail) {
  static const std::string run = std::to_string(std::random_device()()) + std::to_string(std::random_device()());
  static int count = 0;
  const std::filesystem::path folder(testing::TempDir());
  return (folder / ("zkusb-" + run + "-" + std::to_string(++count))).string() + std::string(tail.begin(), tail.end());
}

// A file that is gone with its owner.
class TemporaryFile {
 public:
  explicit TemporaryFile(const std::string& text) {
    m_path = UniquePath(u8"");
    std::ofstream(m_path, std::ios::binary) << text;
  }
  ~TemporaryFile() { std::filesystem::remove(m_path); }
  TemporaryFile(const TemporaryFile&) = delete;
  TemporaryFile& operator=(const TemporaryFile&) = delete;

  std::string Path() const { return m_path; }

 private:
  std::string m_path;
};

// The built-in machine with changes.
inline std::string ChangedMachine(const std::function<void(Json&)>& change) {
  Json machine = LoadJson(MachineFile("dell-precision"));
  change(machine);
  return machine.dump();
}

// "0781:5580" of a node, empty where an id is unknown.
inline std::string IdOf(const Json& node) {
  const int vendor = node.at("VendorId").get<int>();
  const int product = node.at("ProductId").get<int>();
  const auto hex = [](int id) { return platform::ToUtf8(platform::Hex(static_cast<std::uint32_t>(id), 4)); };
  return vendor < 0 || product < 0 ? "" : hex(vendor) + ":" + hex(product);
}

}  // namespace zkusb
