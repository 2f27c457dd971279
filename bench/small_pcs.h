// Small PCs, for benchmarks and tests that need one without a file.
#pragma once

#include <cstdint>
#include <string>
#include <utility>

#include "platform/text.h"
#include "simulation/machine/machine.h"

namespace testing_support {

using platform::simulated::Machine;
using platform::simulated::Text;

inline constexpr char16_t kControllerId[] =
    u"PCI\\VEN_8086&DEV_1C26&SUBSYS_1C268086&REV_05\\3&11583659&0&E8";
inline constexpr char16_t kRootHubId[] = u"USB\\ROOT_HUB20\\4&1";

inline Text HubName(const Text& id) {
  return platform::Replaced(id, u'\\', u'#') + u"#{f18a0e88-c30c-11d0-8815-00a0c906bed8}";
}

inline platform::simulated::Device BareDevice(Text id, Text parent = {}) {
  platform::simulated::Device device;
  device.id = std::move(id);
  device.parent = std::move(parent);
  return device;
}

inline platform::simulated::Device DeviceNode(Text id, Text parent, Text deviceClass, Text driver,
                                              Text description) {
  platform::simulated::Device device = BareDevice(std::move(id), std::move(parent));
  device.deviceClass = std::move(deviceClass);
  device.classGuid = u"{36fc9e60-c465-11cf-8056-444553540000}";
  device.driver = std::move(driver);
  device.description = std::move(description);
  return device;
}

inline platform::simulated::Port DevicePort(Text driverKey, std::uint16_t vendor,
                                            std::uint16_t product) {
  platform::simulated::Port port;
  port.status = 1;
  port.configuration = 1;
  port.driverKey = std::move(driverKey);
  port.descriptor.idVendor = vendor;
  port.descriptor.idProduct = product;
  return port;
}

inline platform::simulated::Port HubOnPort(Text driverKey, Text name) {
  platform::simulated::Port port = DevicePort(std::move(driverKey), 0x05E3, 0x0610);
  port.isHub = true;
  port.hubName = std::move(name);
  return port;
}

// One controller, HCD0, with a root hub of `ports` empty ports.
inline Machine OneController(std::size_t ports) {
  Machine machine;
  machine.devices = {
      DeviceNode(u"ACPI\\PNP0A08\\0", u"", u"System", u"{sys}\\0001", u"PCI"),
      DeviceNode(kControllerId, u"ACPI\\PNP0A08\\0", u"USB", u"{usb}\\0000", u"EHCI Controller"),
      DeviceNode(kRootHubId, kControllerId, u"USB", u"{usb}\\0001", u"USB Root Hub")};
  machine.hostControllers.push_back({{u"\\\\.\\HCD0"}, u"{usb}\\0000", HubName(kRootHubId)});
  machine.hubs.push_back({HubName(kRootHubId), {}, false});
  machine.hubs.back().ports.resize(ports);
  return machine;
}

}  // namespace testing_support

namespace KelvoUHW {

using platform::simulated::Machine;
using platform::simulated::Text;
using testing_support::DeviceNode;
using testing_support::DevicePort;
using testing_support::HubName;
using testing_support::HubOnPort;
using testing_support::kControllerId;
using testing_support::kRootHubId;
using testing_support::OneController;

}  // namespace KelvoUHW
