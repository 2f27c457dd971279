#include "bench/build_costs.h"

#include <vector>

#ifdef __GLIBC__
#include <malloc.h>
#endif

#include "platform/setup_api.h"
#include "records/device_set.h"
#include "simulation/pc/simulated_pc.h"
#include "tree/tree_builder.h"

namespace bench {
namespace {

using KelvoUHW::CZKUMUsbTreeBuilder;
using platform::simulated::Machine, platform::simulated::SimulatedPc;

template <class Work>
Cost CostOn(const Machine& machine, Work work) {
  SimulatedPc pc(machine);
  MeteredHost host(pc);
  return host.Measure([&] { work(host.Host()); });
}

void BuildAndCommit(CZKUMUsbTreeBuilder& builder) {
  builder.Build();
  builder.CommitDeviceCache();
}

std::size_t HeapBytes() noexcept {
#ifdef __GLIBC__
  const struct mallinfo2 info = mallinfo2();
  return info.uordblks + info.hblkhd;
#else
  return 0;
#endif
}

}  // namespace

BuildCosts CostsOfBuilds(const Machine& machine) {
  BuildCosts costs;
  costs.deviceNodes = machine.devices.size();
  for (const auto& hub : machine.hubs) costs.ports += hub.ports.size();
  SimulatedPc pc(machine);
  MeteredHost host(pc);
  CZKUMUsbTreeBuilder builder(host.Host());
  costs.first = host.Measure([&] { BuildAndCommit(builder); });
  BuildAndCommit(builder);
  costs.unchanged = host.Measure([&] { BuildAndCommit(builder); });
  return costs;
}

double CallsForEachNode(const Cost& cost, std::size_t deviceNodes) noexcept {
  return static_cast<double>(cost.CallsOf(CallKind::DeviceSet) +
                             cost.CallsOf(CallKind::DeviceManager)) /
         static_cast<double>(deviceNodes);
}

Cost CostOfDevNodeWalk(const Machine& machine) {
  return CostOn(machine, [](platform::Host& host) {
    std::vector<platform::DevInst> waiting(1);
    if (!host.LocateRootDevNode(waiting.front())) return;
    while (!waiting.empty()) {
      const platform::DevInst node = waiting.back();
      waiting.pop_back();
      char16_t text[200] = {};
      host.GetDeviceId(node, text, 200);
      std::uint32_t type = 0, bytes = sizeof text;
      host.GetDevNodeRegistryProperty(node, platform::kCM_DRP_DEVICEDESC, &type, text, bytes);
      platform::DevInst next = 0;
      if (host.GetChild(node, next)) waiting.push_back(next);
      if (host.GetSibling(node, next)) waiting.push_back(next);
    }
  });
}

Cost CostOfFullQuery(const Machine& machine) {
  return CostOn(machine, [](platform::Host& host) {
    KelvoUHW::DeviceSet set(host);
    set.Open(nullptr, platform::kDIGCF_PRESENT | platform::kDIGCF_ALLCLASSES);
    platform::SP_DEVINFO_DATA element{.cbSize = sizeof element};
    for (std::uint32_t index = 0; host.EnumDeviceInfo(set.Get(), index, element); ++index) {
      std::uint32_t required = 0;
      host.GetDeviceInstanceId(set.Get(), element, nullptr, 0, &required);
      std::vector<char16_t> id(required + 1);
      host.GetDeviceInstanceId(set.Get(), element, id.data(), required + 1, nullptr);
      for (std::uint32_t property = 0; property <= platform::kSPDRP_ENUMERATOR_NAME; ++property) {
        std::uint32_t type = 0;
        required = 0;
        host.GetDeviceRegistryProperty(set.Get(), element, property, &type, nullptr, 0, &required);
        if (required == 0) continue;
        std::vector<std::uint8_t> value(required);
        host.GetDeviceRegistryProperty(set.Get(), element, property, &type, value.data(), required,
                                       nullptr);
      }
    }
  });
}

double RetainedBytesForEachNode(const Machine& machine) {
  SimulatedPc pc(machine);
  CZKUMUsbTreeBuilder warm(pc);  // what the PC itself keeps for later questions is there by now
  BuildAndCommit(warm);
  const std::size_t before = HeapBytes();
  CZKUMUsbTreeBuilder builder(pc);
  builder.Build();
  std::size_t nodes = builder.DeviceInfo().Current().size();
  builder.CommitDeviceCache();
  const std::size_t after = HeapBytes();
  VisitPreOrder(builder.Root(), [&nodes](const KelvoUHW::NodePtr&) {
    ++nodes;
    return true;
  });
  return static_cast<double>(after - before) / static_cast<double>(nodes);
}

}  // namespace bench
