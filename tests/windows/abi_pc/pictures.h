// What a module shows of a PC, and what it must leave as it was.
#pragma once

#include <windows.h>

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <string>

#include "simulation/machine/machine_file.h"
#include "tests/support/cases.h"
#include "tests/windows/abi_pc/shipping_module.h"

namespace abi_pc {

namespace sim = platform::simulated;
using testing_support::Cases;

// What each build leaves open, which is documented: the sets of volumes, disks and their like.
inline constexpr std::size_t kSetsOfABuild = 4;

inline constexpr const char* kMachines[] = {"dell-precision", "asus-b560", "hp-cardreader", "vmware-win7"};

inline std::string MachinePath(const std::string& name) { return ZKUSB_SOURCE_DIR "/machines/" + name + ".json"; }
inline std::string Beside(const char16_t* file) { return platform::ToUtf8(ModuleFile(file)); }
// A file of this process alone: two runs may go side by side.
inline std::string Temporary(const std::string& name, const std::string& text) {
  const std::string path = testing::TempDir() + "zkusb-abi-" + std::to_string(GetCurrentProcessId()) + "-" + name;
  std::ofstream(path, std::ios::binary) << text;
  return path;
}

// A program that has just ended may still hold its file for a moment; a file that stays does no harm.
inline void Remove(const std::string& path) {
  std::error_code ignored;
  std::filesystem::remove(path, ignored);
}

inline unsigned FromEnvironment(const char* name, unsigned otherwise) {
  const char* const given = std::getenv(name);
  return given != nullptr ? static_cast<unsigned>(std::atoi(given)) : otherwise;
}

inline void ExpectNothingWrong(const std::string& what, const Open& most = {}) {
  for (const std::string& breach : Breaches()) ADD_FAILURE() << what << ": " << breach;
  const Open open = OpenNow();
  EXPECT_TRUE(open.files <= most.files && open.sets <= most.sets && open.imageLists <= most.imageLists &&
              open.searches <= most.searches && open.notifications <= most.notifications)
      << what << ": left open: " << TextOf(open);
}

// The first line in which two texts differ, as both have it; empty where they are equal.
inline std::string FirstDifference(const std::string& one, const std::string& other) {
  std::istringstream ones(one), others(other);
  std::string line, otherLine;
  for (int number = 1;; ++number) {
    const bool more = static_cast<bool>(std::getline(ones, line));
    const bool otherMore = static_cast<bool>(std::getline(others, otherLine));
    if (!more && !otherMore) return one == other ? "" : "the ends of lines";
    if (more != otherMore || line != otherLine) {
      return "line " + std::to_string(number) + ": \"" + (more ? line : "nothing") + "\" and \"" +
             (otherMore ? otherLine : "nothing") + "\"";
    }
  }
}

// What a fresh module shows of a PC, and that it left nothing behind.
inline std::string PictureOf(const sim::Machine& machine, const std::string& what, const std::string& failing = {}) {
  Begin(machine);
  if (!failing.empty()) Fail(failing, 1, UINT_MAX);
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
inline std::string SimulatedPictureOf(const std::string& file) {
  SetEnvironmentVariableA("ZKUSB_MACHINE", file.c_str());
  const LoadedModule module(SimulatedModule());
  EXPECT_GE(module.Build(), 0);
  return module.Picture();
}

}  // namespace abi_pc
