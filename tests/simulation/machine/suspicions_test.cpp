#include "simulation/machine/suspicions.h"

#include <gtest/gtest.h>

#include <fstream>
#include <nlohmann/json.hpp>

#include "simulation/machine/generated.h"
#include "simulation/machine/machine_file.h"
#include "simulation/machine/machine_writer.h"

namespace platform::simulated {
namespace {

TEST(Suspicions, FallOnWhatNoPcSays) {
  const Machine sound = GenerateMachine(GeneratedShape::Deep, 24);
  EXPECT_TRUE(Suspicions(sound).empty());
  const auto json = nlohmann::json::parse(WriteMachine(sound));
  // A change of that PC as a JSON patch, a tab, all that is said then.
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/machine/suspicions.tsv");
  int cases = 0;
  for (std::string patch, expected; std::getline(file, patch, '\t') && std::getline(file, expected); ++cases) {
    const std::string changed = json.patch(nlohmann::json::parse(patch)).dump();
    std::vector<std::string> faults;
    std::string found;
    for (const std::string& suspicion : Suspicions(ParseMachine(changed, "f", faults))) found += suspicion + "; ";
    EXPECT_EQ(found + "end", expected) << patch;
  }
  EXPECT_EQ(cases, 32);
}

}  // namespace
}  // namespace platform::simulated
