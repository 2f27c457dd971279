#include "simulation/machine/suspicions.h"

#include <gmock/gmock.h>

#include <functional>

#include "platform/host.h"
#include "simulation/machine/generated.h"

namespace platform::simulated {
namespace {

using testing::HasSubstr;

TEST(Suspicions, FallOnWhatNoPcSays) {
  const Machine sound = GenerateMachine(GeneratedShape::Deep, 24);
  EXPECT_THAT(Suspicions(sound), testing::IsEmpty());
  ASSERT_FALSE(sound.volumes.empty());
  const std::tuple<const char*, std::function<void(Machine&)>> cases[] = {
      {"devices[3].driver: the driver key of devices[2]",
       [](Machine& pc) { pc.devices[3].driver = pc.devices[2].driver; }},
      {".location: on one port with devices[",
       [](Machine& pc) {
         auto twin = pc.devices[4];
         twin.id += u"X";
         twin.driver.reset();
         pc.devices.push_back(twin);
       }},
      {"noParent: ", [](Machine& pc) { pc.devices[5].noParent = true; }},
      {"hostControllers[0].names: nobody opens it",
       [](Machine& pc) { pc.hostControllers[0].names = {u"\\\\.\\HCD10"}; }},
      {"hostControllers[0]: without driverKey", [](Machine& pc) { pc.hostControllers[0].driverKey.reset(); }},
      {"hostControllers[0].driverKey: no device has", [](Machine& pc) { pc.hostControllers[0].driverKey = u"{}\\1"; }},
      {"hostControllers[0]: without rootHub", [](Machine& pc) { pc.hostControllers[0].rootHub.reset(); }},
      {"hostControllers[0].rootHub: no hub with the name", [](Machine& pc) { pc.hostControllers[0].rootHub = u"HUB"; }},
      {"hubs[0]: no controller and no port names it", [](Machine& pc) { pc.hostControllers[0].rootHub = u"HUB"; }},
      {"hostControllers[1].rootHub: the hub \"",
       [](Machine& pc) { pc.hostControllers[1].rootHub = pc.hostControllers[0].rootHub; }},
      {"lacks SUBSYS_",
       [](Machine& pc) {
         auto& id = pc.devices[2].id;
         id.erase(id.find(u"SUBSYS_"), 16);
       }},
      {"has no description", [](Machine& pc) { pc.devices[2].description.reset(); }},
      {".driverKey: no device has the driver key \"{}\\9\"",
       [](Machine& pc) { pc.hubs[1].ports[0].driverKey = u"{}\\9"; }},
      {"without driverKey has no name",
       [](Machine& pc) {
         pc.hubs[1].ports[0].driverKey.reset();
         pc.hubs[1].ports[0].status = 1;
       }},
      {".driverKey: its device is on hubs[", [](Machine& pc) { pc.hubs[5].ports.at(6) = pc.hubs[5].ports.at(0); }},
      {".hubName: no hub with the name \"HUB\"", [](Machine& pc) { pc.hubs[1].ports[0].hubName = u"HUB"; }},
      {".name: no device with such an id",
       [](Machine& pc) {
         pc.hubs.push_back({u"USB#NOBODY#1#{}", {}, false});
       }},
      {"storage[0].path: no interface with the path", [](Machine& pc) { pc.storage[0].path = u"\\\\?\\NOWHERE"; }},
      {".path: no drive with that letter", [](Machine& pc) { pc.storage[0].path = u"\\\\.\\B:"; }},
      {"volumes[0]: without device", [](Machine& pc) { pc.volumes[0].device.clear(); }},
      {"volumes[0].paths[0]: no drive", [](Machine& pc) { pc.volumes[0].paths = {u"B:\\"}; }},
      {"volumes[0].folderMounts[0].volume: no volume",
       [](Machine& pc) {
         pc.volumes[0].folderMounts = {{u"a\\", u"V"}};
       }},
      {"no volume names B:\\",
       [](Machine& pc) {
         pc.drives.push_back({u'B', kDRIVE_FIXED, {}, {}});
       }},
      {"no volume names B:\\",
       [](Machine& pc) {
         pc.drives.push_back({u'B', kDRIVE_REMOVABLE, {}, {}});
       }},
  };
  for (const auto& [expected, change] : cases) {
    Machine machine = sound;
    change(machine);
    EXPECT_THAT(Suspicions(machine), testing::Contains(HasSubstr(expected)));
  }
  Machine emptySlot = sound;
  emptySlot.drives.push_back({u'B', kDRIVE_REMOVABLE, {}, emptySlot.devices[0].id});
  EXPECT_THAT(Suspicions(emptySlot), testing::IsEmpty());
}

}  // namespace
}  // namespace platform::simulated
