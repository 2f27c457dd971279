#include <cstring>
#include <optional>

#include "platform/setup_api.h"
#include "platform/usb_ioctl.h"
#include "simulation/pc/requests.h"

namespace platform::simulated {
namespace {

template <class Record>
void AppendRecord(Bytes& bytes, const Record& record) {
  const auto* first = reinterpret_cast<const std::uint8_t*>(&record);
  bytes.insert(bytes.end(), first, first + sizeof(Record));
}

// Drivers always tell the size of the whole record, and put an empty name where the text does not
// fit.
template <class Head>
Status AnswerName(Head head, const Text& name, Request& request) {
  if (request.outBytes < sizeof(Head) + sizeof(char16_t)) {
    return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  }
  const std::size_t nameBytes = (name.size() + 1) * sizeof(char16_t);
  head.ActualLength = static_cast<std::uint32_t>(sizeof(Head) + nameBytes);
  AppendRecord(request.reply, head);
  if (head.ActualLength > request.outBytes) {
    request.reply.resize(sizeof(Head) + sizeof(char16_t));
    return Status::Success();
  }
  request.reply.resize(head.ActualLength);
  std::memcpy(request.reply.data() + sizeof(Head), name.c_str(), nameBytes);
  return Status::Success();
}

Status AnswerOptionalName(const std::optional<Text>& name, Request& request) {
  if (!name) return Status::Failure(kERROR_INVALID_PARAMETER);
  return AnswerName(UsbNameHead{}, *name, request);
}

Status AnswerNodeInformation(const Hub& hub, Request& request) {
  if (request.outBytes < sizeof(USB_NODE_INFORMATION)) {
    return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  }
  constexpr std::uint8_t kHubDescriptorType = 0x29;
  USB_NODE_INFORMATION node{};
  const std::size_t ports = hub.ports.size();
  // Seven bytes and two bit masks of the ports, one bit more than there are ports.
  node.HubDescriptor.bDescriptorLength = static_cast<std::uint8_t>(7 + 2 * (ports / 8 + 1));
  node.HubDescriptor.bDescriptorType = kHubDescriptorType;
  node.HubDescriptor.bNumberOfPorts = static_cast<std::uint8_t>(ports);
  node.HubIsBusPowered = hub.busPowered ? 1 : 0;
  AppendRecord(request.reply, node);
  return Status::Success();
}

// The port that the request's first four bytes name.
Status FindPort(const Hub& hub, const Request& request, std::uint32_t& index, const Port*& port) {
  if (request.input.size() < sizeof(index)) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  std::memcpy(&index, request.input.data(), sizeof(index));
  if (index == 0 || index > hub.ports.size()) return Status::Failure(kERROR_INVALID_PARAMETER);
  port = &hub.ports[index - 1];
  return Status::Success();
}

// Both records have the same layout; they differ in what their speed field says.
Status AnswerConnection(std::uint32_t index, const Port& port, std::uint8_t speed,
                        Request& request) {
  USB_NODE_CONNECTION_INFORMATION_EX head{};
  if (request.outBytes < sizeof(head)) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  head.ConnectionIndex = index;
  head.DeviceDescriptor = port.descriptor;
  if (port.status != NoDeviceConnected) {
    head.DeviceDescriptor.bLength = sizeof(USB_DEVICE_DESCRIPTOR);
    head.DeviceDescriptor.bDescriptorType = kUSB_DEVICE_DESCRIPTOR_TYPE;
  }
  head.CurrentConfigurationValue = port.configuration;
  head.Speed = speed;
  head.DeviceIsHub = port.isHub ? 1 : 0;
  head.DeviceAddress = port.address;
  head.NumberOfOpenPipes = static_cast<std::uint32_t>(port.pipes.size());
  head.ConnectionStatus = port.status;
  AppendRecord(request.reply, head);
  for (const USB_PIPE_INFO& pipe : port.pipes) {
    if (request.reply.size() + sizeof(pipe) > request.outBytes) break;
    AppendRecord(request.reply, pipe);
  }
  return Status::Success();
}

}  // namespace

Status AnswerController(const HostController& controller, Request& request) {
  switch (request.code) {
    case kIOCTL_GET_HCD_DRIVERKEY_NAME:
      return AnswerOptionalName(controller.driverKey, request);
    case kIOCTL_USB_GET_ROOT_HUB_NAME:
      return AnswerOptionalName(controller.rootHub, request);
    default:
      return Status::Failure(kERROR_INVALID_FUNCTION);
  }
}

Status AnswerHub(const Hub& hub, Request& request) {
  if (request.code == kIOCTL_USB_GET_NODE_INFORMATION) return AnswerNodeInformation(hub, request);
  switch (request.code) {
    case kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION:
    case kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX:
    case kIOCTL_USB_GET_NODE_CONNECTION_NAME:
    case kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME:
      break;
    default:
      return Status::Failure(kERROR_INVALID_FUNCTION);
  }
  std::uint32_t index = 0;
  const Port* port = nullptr;
  if (const Status found = FindPort(hub, request, index, port); !found) return found;
  switch (request.code) {
    case kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION:
      return AnswerConnection(index, *port, port->speed == Speed::Low ? 1 : 0, request);
    case kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX:
      return AnswerConnection(index, *port, static_cast<std::uint8_t>(port->speed), request);
    case kIOCTL_USB_GET_NODE_CONNECTION_NAME:
      // A port without a hub has an empty name; the hub driver does not call that a failure.
      return AnswerName(UsbConnectionNameHead{index, 0}, port->hubName.value_or(Text()), request);
    default:
      // Without a device, or with one that has no driver key, the hub driver finds nothing to name.
      if (!port->driverKey) return Status::Failure(kERROR_INVALID_PARAMETER);
      return AnswerName(UsbConnectionNameHead{index, 0}, *port->driverKey, request);
  }
}

}  // namespace platform::simulated
