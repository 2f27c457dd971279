// What a build costs grows with the number of devices and not with its square: exact numbers of
// platform calls and allocations, compared between a PC and one ten times as large.
#include <gtest/gtest.h>

#include <string>
#include <tuple>

#include "bench/metered_host.h"
#include "bench/workload.h"
#include "platform/text.h"

namespace bench {
namespace {

using platform::simulated::GeneratedShape;

constexpr std::size_t kDevices = 1'000;
constexpr std::uint64_t kTimesAsMany = 10;
constexpr std::uint64_t kMostGrowth = 11;

Cost CostOf(Work work, GeneratedShape shape, std::size_t devices) {
  platform::simulated::SimulatedPc pc(GenerateMachine(shape, devices));
  MeteredHost host(pc);
  Workload workload(work, devices, pc, host.Host());
  workload.Prepare();
  return host.Measure([&] { workload.Run(); });
}

class Growth : public testing::TestWithParam<std::tuple<Work, GeneratedShape>> {};

TEST_P(Growth, StaysNearLinear) {
  const auto [work, shape] = GetParam();
  const Cost small = CostOf(work, shape, kDevices);
  const Cost large = CostOf(work, shape, kDevices * kTimesAsMany);
  // Whatever is done, every device is asked for at least once, and costs at least one allocation
  // where it is new.
  EXPECT_GE(large.CallsOf(CallKind::Request), kDevices * kTimesAsMany);
  EXPECT_GE(large.CallsOf(CallKind::DeviceManager), kDevices * kTimesAsMany);
  EXPECT_GE(large.allocations, kDevices * kTimesAsMany);

  EXPECT_LE(large.allocations, small.allocations * kMostGrowth);
  for (std::size_t i = 0; i < small.calls.size(); ++i) {
    const auto name = platform::wrappers::NameOf(static_cast<platform::wrappers::Operation>(i));
    EXPECT_LE(large.calls[i], small.calls[i] * kMostGrowth)
        << std::string(name.begin(), name.end()) << ": " << small.calls[i] << " calls, then "
        << large.calls[i];
  }
}

INSTANTIATE_TEST_SUITE_P(
    Work, Growth,
    testing::Combine(testing::Values(Work::Walk, Work::First, Work::Unchanged, Work::OneMore),
                     testing::Values(GeneratedShape::Wide, GeneratedShape::Deep)),
    [](const auto& info) {
      return std::string(NameOf(std::get<0>(info.param))) + "_" + NameOf(std::get<1>(info.param));
    });

}  // namespace
}  // namespace bench
