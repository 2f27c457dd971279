#include "simulation/machine/generated.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include "platform/text.h"
#include "simulation/machine/machine_writer.h"
#include "simulation/machine/steps.h"
#include "simulation/machine/suspicions.h"
#include "tests/simulation/stick_pc.h"

namespace platform::simulated {
namespace {

std::size_t Count(const Machine& pc, bool hubs, bool free = false) {
  std::size_t count = 0;
  for (const Hub& hub : pc.hubs) {
    for (const Port& port : hub.ports) count += (port.status == 0) == free && (free || port.isHub == hubs) ? 1 : 0;
  }
  return count;
}

// One of each kind of device below a chain of hubs, and a stick more, as a file that was once looked through by eye.
TEST(Generated, ASmallPcIsTheOneAtHand) {
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/machine/generated-pc.txt", std::ios::binary);
  const std::string expected((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
  const Machine deep = GenerateMachine(GeneratedShape::Deep, 4), wide = GenerateMachine(GeneratedShape::Wide, 13);
  const std::string found = WriteMachine(deep) + WriteScript({PlugOneMoreStick(deep)}, {});
  EXPECT_TRUE(found == expected) << found;
  const Plug more = std::get<Plug>(PlugOneMoreStick(wide).change);
  EXPECT_EQ(more.ports.at(0).hub, wide.hubs[9].name);
  EXPECT_EQ(more.ports[0].index, 2u);
  EXPECT_EQ(more.fragment.devices.at(0).parent, u"USB\\ROOT_HUB20\\4&10000039&0");
}

TEST(Generated, PcsHoldWhatIsAskedForAndOneMore) {
  constexpr GeneratedShape kWide = GeneratedShape::Wide, kDeep = GeneratedShape::Deep;
  // The devices; hubs on ports, and ports that are free.
  const std::tuple<GeneratedShape, std::size_t, std::size_t, std::size_t> kCases[] = {
      {kWide, 0, 0, 10}, {kWide, 2541, 2, 10}, {kDeep, 0, 0, 10}, {kDeep, 1, 5, 28}, {kDeep, 61, 55, 158}};
  for (const auto& [shape, devices, hubs, free] : kCases) {
    SCOPED_TRACE(devices);
    Machine pc = GenerateMachine(shape, devices);
    EXPECT_EQ(Count(pc, false), devices);
    EXPECT_EQ(Count(pc, true), hubs);
    EXPECT_EQ(Count(pc, false, true), free);
    EXPECT_TRUE(Suspicions(pc).empty()) << Suspicions(pc).front();
    const Step more = PlugOneMoreStick(pc);
    EXPECT_EQ(std::visit([&](const auto& change) { return CarryOut(pc, change); }, more.change), u"");
    EXPECT_EQ(Count(pc, false), devices + 1);
    EXPECT_TRUE(Suspicions(pc).empty()) << Suspicions(pc).front();
    EXPECT_EQ(pc.drives.size(), std::min<std::size_t>(pc.volumes.size(), 23));
  }
  EXPECT_THROW(GenerateMachine(kWide, 650'241), std::length_error);
  EXPECT_THROW(GenerateMachine(kDeep, 15'301), std::length_error);
  EXPECT_THROW(PlugOneMoreStick(Machine{}), std::logic_error);
}

}  // namespace
}  // namespace platform::simulated
