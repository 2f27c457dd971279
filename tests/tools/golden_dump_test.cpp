#include <algorithm>
#include <iterator>

#include "tests/tools/client.h"

namespace zkusb {
namespace {

// The dumps of the four PCs, derived once from their machine files by hand and by a model of its
// own. They are part of the published behaviour: a difference is a fault, not a reason to write
// them anew.
TEST(GoldenDump, EveryMachineIsDumpedByteForByte) {
  std::size_t compared = 0;
  for (const auto& entry : std::filesystem::directory_iterator(MachinesFolder())) {
    if (entry.path().extension() != ".json") continue;
    const std::string golden = ZKUSB_SOURCE_DIR "/tests/golden/" + entry.path().stem().string() + ".txt";
    std::ifstream stream(golden, std::ios::binary);
    ASSERT_TRUE(stream) << golden;
    const std::string expected{std::istreambuf_iterator<char>(stream), {}};
    const std::string dump = Output({"--machine", entry.path().string(), "dump"});
    const auto differs = std::ranges::mismatch(dump, expected).in1;
    EXPECT_TRUE(dump == expected) << golden << ", from byte " << differs - dump.begin() << ": "
                                  << std::string(differs, dump.end()).substr(0, 80);
    ++compared;
  }
  EXPECT_EQ(compared, 4u);
}

}  // namespace
}  // namespace zkusb
