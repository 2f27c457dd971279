#include "simulation/machine/generated.h"

#include <algorithm>
#include <stdexcept>

#include "platform/text.h"
#include "simulation/machine/generated_nodes.h"

namespace platform::simulated {
namespace {

constexpr std::size_t kControllers = 10;  // the names \\.\HCD0 to \\.\HCD9
constexpr std::size_t kMostPorts = 255;
constexpr std::size_t kChainLength = 5;
constexpr std::size_t kDevicesPerChain = 6;

std::size_t DividedUp(std::size_t number, std::size_t by) { return (number + by - 1) / by; }

// The part of `total` that falls to one of several equal takers.
std::size_t Share(std::size_t total, std::size_t takers, std::size_t index) {
  return total / takers + (index < total % takers ? 1 : 0);
}

class Generator {
 public:
  Machine Wide(std::size_t devices) {
    if (devices > kControllers * (kMostPorts * kMostPorts - 1)) TooMany();
    m_nodes.AddSystemNodes();
    for (std::size_t i = 0; i < kControllers; ++i) {
      const std::size_t sockets = Share(devices, kControllers, i) + 1;  // one stays free
      if (sockets <= kMostPorts) {
        Fill(AddController(i, sockets), sockets - 1);
        continue;
      }
      const std::size_t hubs = DividedUp(sockets, kMostPorts);
      const HubPlace root = AddController(i, hubs);
      for (std::size_t hub = 0; hub < hubs; ++hub) {
        const std::size_t ports = std::min(kMostPorts, sockets - hub * kMostPorts);
        Fill(AddHub(root, hub, ports), hub + 1 == hubs ? ports - 1 : ports);
      }
    }
    return std::move(m_machine);
  }

  Machine Deep(std::size_t devices) {
    const std::size_t chains = DividedUp(devices, kDevicesPerChain);
    if (chains > kControllers * kMostPorts) TooMany();
    m_nodes.AddSystemNodes();
    std::size_t left = devices;
    for (std::size_t i = 0; i < kControllers; ++i) {
      const std::size_t share = Share(chains, kControllers, i);
      const HubPlace root = AddController(i, std::min(share + 1, kMostPorts));
      for (std::size_t chain = 0; chain < share; ++chain) {
        HubPlace hub = AddHub(root, chain, 4);
        for (std::size_t level = 2; level < kChainLength; ++level) hub = AddHub(hub, 0, 4);
        const std::size_t plugged = std::min(kDevicesPerChain, left);
        Fill(AddHub(hub, 0, kDevicesPerChain + 1), plugged);
        left -= plugged;
      }
    }
    return std::move(m_machine);
  }

 private:
  struct HubPlace {
    Text device;
    std::size_t index;  // in `hubs` of the machine
  };

  [[noreturn]] static void TooMany() { throw std::length_error("too many devices for one PC"); }

  HubPlace AddController(std::size_t index, std::size_t ports) {
    GeneratedHub hub = m_nodes.AddController(index, ports);
    return {std::move(hub.device), m_machine.hubs.size() - 1};
  }

  static Socket SocketOf(const HubPlace& hub, std::size_t port) {
    return {hub.device, hub.index + 1, static_cast<std::uint32_t>(port + 1)};
  }

  HubPlace AddHub(const HubPlace& above, std::size_t port, std::size_t ports) {
    GeneratedHub hub = m_nodes.AddHub(SocketOf(above, port), ports);
    m_machine.hubs[above.index].ports[port] = std::move(hub.upstreamPort);
    return {std::move(hub.device), m_machine.hubs.size() - 1};
  }

  void Fill(const HubPlace& hub, std::size_t devices) {
    for (std::size_t port = 0; port < devices; ++port) {
      m_machine.hubs[hub.index].ports[port] = AddDevice(SocketOf(hub, port));
    }
  }

  Port AddDevice(const Socket& socket) {
    switch (m_plugged++ % 4) {
      case 0:
        return m_nodes.AddMouse(socket);
      case 1:
        return m_nodes.AddKeyboard(socket);
      case 2: {
        const char16_t letter = m_letter <= u'Z' ? m_letter++ : u'\0';
        return m_nodes.AddStick(socket, ++m_disks, letter);
      }
      default:
        return m_nodes.AddComposite(socket);
    }
  }

  Machine m_machine;
  NodeMaker m_nodes{m_machine, 0};
  std::size_t m_plugged = 0;
  std::uint32_t m_disks = 0;
  char16_t m_letter = u'D';
};

char16_t FreeLetter(const Machine& machine) {
  for (char16_t letter = u'D'; letter <= u'Z'; ++letter) {
    const auto has = [letter](const Drive& drive) { return drive.letter == letter; };
    if (std::none_of(machine.drives.begin(), machine.drives.end(), has)) return letter;
  }
  return 0;
}

Step StickInto(const Machine& machine, std::size_t hub, std::uint32_t port) {
  const Text& name = machine.hubs[hub].name;
  const Text hubDevice = ToUpper(Replaced(name.substr(0, name.rfind(u"#{")), u'#', u'\\'));
  Plug plug;
  NodeMaker nodes(plug.fragment, machine.devices.size());
  // Every stick has one volume, so this is a number that no disk has.
  const auto disk = static_cast<std::uint32_t>(machine.volumes.size() + 1);
  Port plugged = nodes.AddStick({hubDevice, hub + 1, port}, disk, FreeLetter(machine));
  plug.ports.push_back({name, port, std::move(plugged)});
  return {0, u"one more stick", std::move(plug)};
}

}  // namespace

Machine GenerateMachine(GeneratedShape shape, std::size_t devices) {
  Generator generator;
  return shape == GeneratedShape::Wide ? generator.Wide(devices) : generator.Deep(devices);
}

Step PlugOneMoreStick(const Machine& machine) {
  // A hub that holds devices comes first: so the stick is as deep in the PC as they are.
  for (const bool inhabited : {true, false}) {
    for (std::size_t hub = machine.hubs.size(); hub-- > 0;) {
      const std::vector<Port>& ports = machine.hubs[hub].ports;
      const auto isFree = [](const Port& port) { return port.status == NoDeviceConnected; };
      const auto holdsDevice = [&](const Port& port) { return !isFree(port) && !port.isHub; };
      const auto free = std::find_if(ports.begin(), ports.end(), isFree);
      if (free == ports.end()) continue;
      if (inhabited && std::none_of(ports.begin(), ports.end(), holdsDevice)) continue;
      return StickInto(machine, hub, static_cast<std::uint32_t>(free - ports.begin() + 1));
    }
  }
  throw std::logic_error("no port is free");
}

}  // namespace platform::simulated
