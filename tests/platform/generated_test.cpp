#include "platform/simulated/generated.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <map>
#include <set>
#include <stdexcept>

#include "platform/simulated/machine_check.h"
#include "platform/simulated/simulated_pc.h"
#include "platform/text.h"

namespace platform::simulated {
namespace {

// What a walk from the controllers through the ports meets.
struct Walk {
  explicit Walk(const Machine& pc) : machine(pc) { Start(); }

  void Start() {
    EXPECT_NO_THROW(CheckMachine(Machine{}, machine, "generated", ""));
    for (const Device& device : machine.devices) {
      EXPECT_LE(device.id.size(), 199u);
      EXPECT_TRUE(byDriver.emplace(device.driver.value(), &device).second) << ToUtf8(*device.driver);
    }
    for (const Hub& hub : machine.hubs) hubs.emplace(hub.name, &hub);
    for (const HostController& controller : machine.hostControllers) {
      ASSERT_TRUE(byDriver.contains(controller.driverKey.value()));
      Visit(controller.rootHub.value(), 0);
    }
  }

  void Visit(const Text& name, std::size_t depth) {
    ASSERT_TRUE(hubs.contains(name)) << ToUtf8(name);
    const Hub* hub = hubs[name];
    ASSERT_LE(hub->ports.size(), 255u);
    for (const Port& port : hub->ports) {
      freePorts += port.status == 0 ? 1 : 0;
      if (port.status == 0) continue;
      ASSERT_TRUE(byDriver.contains(port.driverKey.value())) << ToUtf8(*port.driverKey);
      const Device& device = *byDriver[*port.driverKey];
      EXPECT_TRUE(ToUpper(name).starts_with(Replaced(device.parent, u'\\', u'#') + u"#{"));
      ASSERT_EQ(port.isHub, port.hubName.has_value());
      if (port.isHub) {
        EXPECT_TRUE(ToUpper(*port.hubName).starts_with(Replaced(device.id, u'\\', u'#') + u"#{"));
        Visit(*port.hubName, depth + 1);
      } else {
        ++devices;
        depths.insert(depth);
      }
    }
  }

  const Machine& machine;
  std::map<Text, const Device*> byDriver;
  std::map<Text, const Hub*> hubs;
  std::size_t devices = 0;
  std::size_t freePorts = 0;
  std::set<std::size_t> depths;  // of the devices: external hubs above them
};

TEST(GeneratedMachine, HoldsExactlyTheDevicesAskedForAndOneMoreStick) {
  using enum GeneratedShape;
  const struct {
    GeneratedShape shape;
    std::size_t devices, hubs;
    std::set<std::size_t> depths, depthsOfMore;
  } kCases[] = {{Wide, 0, 0, {}, {0}},           {Wide, 10, 0, {0}, {0}},    {Wide, 2540, 0, {0}, {0}},
                {Wide, 2541, 2, {0, 1}, {0, 1}}, {Wide, 5100, 30, {1}, {1}}, {Deep, 0, 0, {}, {0}},
                {Deep, 7, 10, {5}, {5}},         {Deep, 1000, 835, {5}, {5}}};
  for (const auto& [shape, devices, hubs, depths, depthsOfMore] : kCases) {
    SCOPED_TRACE(testing::Message() << "shape " << static_cast<int>(shape) << ", " << devices << " devices");
    const Machine before = GenerateMachine(shape, devices);
    const Walk walk(before);
    EXPECT_EQ(walk.devices, devices);
    EXPECT_EQ(walk.depths, depths);
    EXPECT_GE(walk.freePorts, 1u);
    EXPECT_EQ(before.hubs.size(), 10 + hubs);

    SimulatedPc pc(before);
    const Step step = PlugOneMoreStick(before);
    EXPECT_EQ(ToUtf8(pc.Apply(step)), "");
    const Machine more = pc.Snapshot();
    const Walk grown(more);
    EXPECT_EQ(grown.devices, devices + 1);
    EXPECT_EQ(grown.depths, depthsOfMore) << "the stick is as deep as the others";
    EXPECT_EQ(ToUtf8(pc.Apply({0, u"", Unplug{std::get<Plug>(step.change).fragment.devices.at(0).id}})), "");
    const Machine after = pc.Snapshot();
    EXPECT_EQ(Walk(after).devices, devices);
    EXPECT_EQ(after.devices.size(), before.devices.size());
    EXPECT_EQ(after.volumes.size(), before.volumes.size());
    EXPECT_EQ(after.interfaces.size(), before.interfaces.size());
  }
  EXPECT_THROW(GenerateMachine(Wide, 650241), std::length_error);
  EXPECT_THROW(GenerateMachine(Deep, 15301), std::length_error);
  EXPECT_THROW(PlugOneMoreStick(Machine{}), std::logic_error);
}

TEST(GeneratedMachine, LinksEachStickWithItsVolumeAndLetter) {
  const Machine machine = GenerateMachine(GeneratedShape::Wide, 200);
  EXPECT_EQ(std::ranges::count(machine.devices, u"USBSTOR", &Device::service), 50);
  ASSERT_EQ(machine.volumes.size(), 50u);
  ASSERT_EQ(machine.drives.size(), 23u);
  EXPECT_EQ(machine.storage.size(), 50u + 50u + 23u);
  for (std::size_t i = 0; i < machine.volumes.size(); ++i) {
    const Volume& volume = machine.volumes[i];
    ASSERT_TRUE(volume.device.starts_with(u"STORAGE\\VOLUME\\_??_USBSTOR#")) << i;
    const Text disk = Replaced(volume.device.substr(19, volume.device.find(u"#{") - 19), u'#', u'\\');
    EXPECT_EQ(std::ranges::count(machine.devices, disk, &Device::id), 1) << ToUtf8(disk);
    ASSERT_EQ(volume.paths.size(), i < 23 ? 1u : 0u);
    if (i >= 23) continue;
    EXPECT_EQ(volume.paths[0], Text(1, machine.drives[i].letter) + u":\\");
    EXPECT_EQ(machine.drives[i].device, disk);
  }
}

}  // namespace
}  // namespace platform::simulated
