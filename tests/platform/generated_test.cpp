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

Text DeviceOfHub(const Text& name) {
  return ToUpper(Replaced(name.substr(0, name.rfind(u"#{")), u'#', u'\\'));
}

// What a walk from the controllers through the ports meets.
struct Walk {
  std::size_t devices = 0;
  std::size_t hubs = 0;
  std::size_t freePorts = 0;
  std::set<std::size_t> depths;  // of the devices: external hubs above them
};

class Walker {
 public:
  explicit Walker(const Machine& machine) : m_machine(machine) {
    for (const Device& device : machine.devices) {
      EXPECT_EQ(device.id, ToUpper(device.id));
      EXPECT_LE(device.id.size(), 199u);
      EXPECT_TRUE(m_byDriver.emplace(device.driver.value(), &device).second)
          << ToUtf8(*device.driver);
    }
    for (const Hub& hub : machine.hubs) m_hubs.emplace(hub.name, &hub);
  }

  Walk Run() {
    for (const HostController& controller : m_machine.hostControllers) {
      const auto device = m_byDriver.find(controller.driverKey.value());
      if (device == m_byDriver.end()) {
        ADD_FAILURE() << "no device with the key " << ToUtf8(*controller.driverKey);
        continue;
      }
      EXPECT_EQ(device->second->parent, u"ACPI\\PNP0A08\\0");
      EXPECT_TRUE(device->second->id.starts_with(u"PCI\\VEN_8086&DEV_"));
      EXPECT_NE(device->second->id.find(u"&SUBSYS_85348086&REV_"), Text::npos);
      Visit(controller.rootHub.value(), 0);
    }
    return m_walk;
  }

 private:
  void Visit(const Text& name, std::size_t depth) {
    const auto found = m_hubs.find(name);
    ASSERT_NE(found, m_hubs.end()) << ToUtf8(name);
    const Hub& hub = *found->second;
    ASSERT_LE(hub.ports.size(), 255u);
    const Text hubDevice = DeviceOfHub(name);
    for (const Port& port : hub.ports) {
      if (port.status == 0) {
        ++m_walk.freePorts;
        continue;
      }
      const auto device = m_byDriver.find(port.driverKey.value());
      ASSERT_NE(device, m_byDriver.end()) << ToUtf8(*port.driverKey);
      EXPECT_EQ(device->second->parent, hubDevice);
      EXPECT_EQ(port.isHub, port.hubName.has_value());
      EXPECT_EQ(port.isHub, port.descriptor.bDeviceClass == 9);
      if (!port.isHub) {
        ++m_walk.devices;
        m_walk.depths.insert(depth);
        continue;
      }
      ++m_walk.hubs;
      EXPECT_EQ(device->second->id, DeviceOfHub(*port.hubName));
      Visit(*port.hubName, depth + 1);
    }
  }

  const Machine& m_machine;
  std::map<Text, const Device*> m_byDriver;
  std::map<Text, const Hub*> m_hubs;
  Walk m_walk;
};

TEST(GeneratedMachine, HoldsExactlyTheDevicesAskedFor) {
  const struct {
    GeneratedShape shape;
    std::size_t devices;
    std::size_t hubs;
    std::set<std::size_t> depths;
  } kCases[] = {
      {GeneratedShape::Wide, 0, 0, {}},      {GeneratedShape::Wide, 10, 0, {0}},
      {GeneratedShape::Wide, 2540, 0, {0}},  {GeneratedShape::Wide, 2541, 2, {0, 1}},
      {GeneratedShape::Wide, 5100, 30, {1}}, {GeneratedShape::Deep, 0, 0, {}},
      {GeneratedShape::Deep, 7, 10, {5}},    {GeneratedShape::Deep, 1000, 835, {5}},

  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(testing::Message()
                 << "shape " << static_cast<int>(test.shape) << ", " << test.devices << " devices");
    const Machine machine = GenerateMachine(test.shape, test.devices);
    EXPECT_NO_THROW(CheckMachine(Machine{}, machine, "generated", ""));
    const Walk walk = Walker(machine).Run();
    EXPECT_EQ(walk.devices, test.devices);
    EXPECT_EQ(walk.hubs, test.hubs);
    EXPECT_EQ(walk.depths, test.depths);
    EXPECT_GE(walk.freePorts, 1u);
    EXPECT_EQ(machine.hubs.size(), 10 + test.hubs);
  }
  EXPECT_THROW(GenerateMachine(GeneratedShape::Wide, 650241), std::length_error);
  EXPECT_THROW(GenerateMachine(GeneratedShape::Deep, 15301), std::length_error);
}

TEST(GeneratedMachine, LinksEachStickWithItsVolumeAndLetter) {
  const Machine machine = GenerateMachine(GeneratedShape::Wide, 200);
  const auto isStorage = [](const Device& device) { return device.service == u"USBSTOR"; };
  const auto isFunction = [](const Device& device) {
    return device.id.starts_with(u"USB\\") && device.id.find(u"&MI_00\\") != Text::npos;
  };
  EXPECT_EQ(std::count_if(machine.devices.begin(), machine.devices.end(), isStorage), 50);
  EXPECT_EQ(std::count_if(machine.devices.begin(), machine.devices.end(), isFunction), 50);
  ASSERT_EQ(machine.volumes.size(), 50u);
  EXPECT_EQ(machine.drives.size(), 23u);
  EXPECT_EQ(machine.storage.size(), 50u + 50u + 23u);

  std::set<Text> ids;
  for (const Device& device : machine.devices) ids.insert(device.id);
  for (const Interface& entry : machine.interfaces) {
    const Text path =
        ToUpper(Replaced(entry.device, u'\\', u'#') + u"#" + GuidText(entry.interfaceClass));
    EXPECT_EQ(ToUpper(entry.path), u"\\\\?\\" + path);
  }
  for (std::size_t i = 0; i < machine.volumes.size(); ++i) {
    const Volume& volume = machine.volumes[i];
    ASSERT_TRUE(volume.device.starts_with(u"STORAGE\\VOLUME\\_??_USBSTOR#")) << i;
    const Text disk =
        Replaced(volume.device.substr(19, volume.device.find(u"#{") - 19), u'#', u'\\');
    EXPECT_TRUE(ids.contains(disk)) << ToUtf8(disk);
    ASSERT_EQ(volume.paths.size(), i < 23 ? 1u : 0u);
    if (i >= 23) continue;
    EXPECT_EQ(volume.paths[0], Text(1, machine.drives[i].letter) + u":\\");
    EXPECT_EQ(machine.drives[i].device, disk);
  }
}

TEST(GeneratedMachine, TakesOneMoreStickAndGivesItBack) {
  for (const GeneratedShape shape : {GeneratedShape::Wide, GeneratedShape::Deep}) {
    for (const std::size_t devices : {1u, 40u, 600u}) {
      const Machine before = GenerateMachine(shape, devices);
      SimulatedPc pc(before);
      const Step step = PlugOneMoreStick(before);
      EXPECT_EQ(ToUtf8(pc.Apply(step)), "");
      const Machine more = pc.Snapshot();
      EXPECT_NO_THROW(CheckMachine(Machine{}, more, "one more", ""));
      const Walk walk = Walker(more).Run();
      EXPECT_EQ(walk.devices, devices + 1);
      EXPECT_EQ(walk.depths.size(), 1u) << "the stick is as deep as the others";
      const Text stick = std::get<Plug>(step.change).fragment.devices.at(0).id;
      EXPECT_EQ(ToUtf8(pc.Apply({0, u"", Unplug{stick}})), "");
      const Machine after = pc.Snapshot();
      EXPECT_EQ(Walker(after).Run().devices, devices);
      EXPECT_EQ(after.devices.size(), before.devices.size());
      EXPECT_EQ(after.volumes.size(), before.volumes.size());
      EXPECT_EQ(after.interfaces.size(), before.interfaces.size());
    }
  }
  EXPECT_THROW(PlugOneMoreStick(Machine{}), std::logic_error);
}

}  // namespace
}  // namespace platform::simulated
