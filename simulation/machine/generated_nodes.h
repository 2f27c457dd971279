// The parts that generated PCs are made of: what a controller, a hub, a device bring along.
#pragma once

#include <cstddef>
#include <cstdint>

#include "simulation/machine/machine.h"

namespace platform::simulated {

// Where a device is plugged in: the device id of the hub and its port, from 1.
struct Socket {
  Text hubDevice;
  std::size_t hubNumber = 0;
  std::uint32_t port = 0;
};

struct GeneratedHub {
  Text device;        // its device id
  Port upstreamPort;  // what the port says that it is plugged into; means nothing for a root hub
};

struct GeneratedClass;

// Appends nodes, interfaces and the rest to a machine or to a fragment of one, which it refers to.
// Whatever must be unique carries the number of its node; nodes are numbered from `firstNumber`.
class NodeMaker {
 public:
  NodeMaker(Machine& out, std::size_t firstNumber) : m_out(out), m_firstNumber(firstNumber) {}

  void AddSystemNodes();
  // A controller and its root hub; the record that it appends to `hubs` has that many empty ports.
  GeneratedHub AddController(std::size_t index, std::size_t ports);
  GeneratedHub AddHub(const Socket& socket, std::size_t ports);

  // A device in that socket; the result is what the port says.
  Port AddMouse(const Socket& socket);
  Port AddKeyboard(const Socket& socket);
  Port AddComposite(const Socket& socket);
  // `letter` 0: no drive letter.
  Port AddStick(const Socket& socket, std::uint32_t diskNumber, char16_t letter);

 private:
  std::size_t NextNumber() const { return m_firstNumber + m_out.devices.size(); }
  Device& AddNode(const Text& native, const Text& parent, const GeneratedClass& deviceClass,
                  const Text& service, const Text& description);
  Device& AddUsbNode(const Text& hardwareId, const Text& instance, const Socket& socket,
                     const GeneratedClass& deviceClass, const Text& service,
                     const Text& description);
  void AddHidChild(const Text& hardwareId, const Text& parent, const GeneratedClass& deviceClass,
                   const Text& service);
  Text AddInterface(const Text& native, const Guid& interfaceClass);
  void AddVolume(const Text& disk, const Storage& storage, char16_t letter);

  Machine& m_out;
  std::size_t m_firstNumber;
};

}  // namespace platform::simulated
