// Host controllers, and hubs with their ports.
#include <algorithm>
#include <array>
#include <cstring>
#include <deque>

#include "platform/setup_api.h"
#include "platform/usb_ioctl.h"
#include "recorder/recording.h"
#include "records/device_set.h"

namespace recorder {
namespace {

using platform::simulated::HostController;
using platform::simulated::Hub;
using platform::simulated::Port;

constexpr int kLegacyNames = 10;

// A name query: size first. `port` 0: one of a controller, whose record has no index before it.
std::optional<Text> AskName(platform::DeviceIo& io, platform::FileHandle file, std::uint32_t code,
                            std::uint32_t port) {
  const std::size_t sizeAt = port == 0 ? 0 : sizeof(std::uint32_t);
  const std::size_t head = sizeAt + sizeof(std::uint32_t);
  std::vector<char16_t> bytes((head + sizeof(char16_t)) / sizeof(char16_t));
  std::uint32_t received = 0;
  const auto ask = [&] {
    const auto size = static_cast<std::uint32_t>(bytes.size() * sizeof(char16_t));
    if (port != 0) std::memcpy(bytes.data(), &port, sizeof port);
    // The root hub's name takes no input.
    const bool bare = port == 0 && code == platform::kIOCTL_USB_GET_ROOT_HUB_NAME;
    return io
        .DeviceControl(file, code, bare ? nullptr : bytes.data(), bare ? 0 : size, bytes.data(),
                       size, received)
        .ok;
  };
  if (!ask()) return std::nullopt;
  std::uint32_t needed = 0;
  std::memcpy(&needed, reinterpret_cast<const std::uint8_t*>(bytes.data()) + sizeAt, sizeof needed);
  if (needed <= bytes.size() * sizeof(char16_t)) return Text();
  if (needed > kMostBytes) return std::nullopt;
  bytes.assign(needed / sizeof(char16_t) + 1, u'\0');
  if (!ask()) return std::nullopt;
  const std::size_t end = std::min<std::size_t>(received / sizeof(char16_t), bytes.size());
  const std::size_t begin = head / sizeof(char16_t);
  if (end <= begin) return Text();
  return Text(platform::UpToZero({bytes.data() + begin, end - begin}));
}

class UsbRecorder {
 public:
  explicit UsbRecorder(Recording& recording) : m_recording(recording), m_host(recording.host) {}

  void Run() {
    for (char16_t digit = u'0'; digit < u'0' + kLegacyNames; ++digit) {
      RecordController(u"\\\\.\\HCD" + Text(1, digit), true);
    }
    const std::vector<platform::simulated::Interface> interfaces = m_recording.machine.interfaces;
    for (const auto& entry : interfaces) {
      if (entry.interfaceClass == kControllerClass || entry.interfaceClass == platform::kNullGuid) {
        RecordController(entry.path, false);
      }
    }
    for (const HostController& controller : m_recording.machine.hostControllers) {
      if (controller.rootHub) m_hubs.push_back(*controller.rootHub);
    }
    RecordHubs();
    // Hubs that no controller leads to: a plug may still come into their ports.
    for (const auto& entry : interfaces) {
      constexpr std::size_t kPrefix = 4;
      if (entry.interfaceClass == kHubClass && entry.path.size() > kPrefix) {
        m_hubs.push_back(entry.path.substr(kPrefix));
      }
    }
    RecordHubs();
  }

 private:
  static constexpr platform::Guid kControllerClass{
      0x3ABF6F2D, 0x71C4, 0x462A, {0x8A, 0x92, 0x1E, 0x68, 0x61, 0xE6, 0xAF, 0x27}};
  static constexpr platform::Guid kHubClass{
      0xF18A0E88, 0xC30C, 0x11D0, {0x88, 0x15, 0x00, 0xA0, 0xC9, 0x06, 0xBE, 0xD8}};

  // `evenSilent`: what opens under that name is a controller, whether it answers or not.
  void RecordController(const Text& name, bool evenSilent) {
    KelvoUHW::DeviceFile file(m_host);
    if (!file.Open(name, platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE)) return;
    HostController controller;
    controller.driverKey = AskName(m_host, file.Get(), platform::kIOCTL_GET_HCD_DRIVERKEY_NAME, 0);
    controller.rootHub = AskName(m_host, file.Get(), platform::kIOCTL_USB_GET_ROOT_HUB_NAME, 0);
    if (!controller.driverKey && !controller.rootHub && !evenSilent) return;
    auto& controllers = m_recording.machine.hostControllers;
    // One controller has several names; what it says tells whether it is the same.
    const auto same = std::find_if(controllers.begin(), controllers.end(), [&](const auto& known) {
      return known.driverKey && known.driverKey == controller.driverKey &&
             known.rootHub == controller.rootHub;
    });
    HostController& named =
        same != controllers.end() ? *same : controllers.emplace_back(controller);
    if (m_names.Add(name)) named.names.push_back(name);
  }

  void RecordHubs() {
    while (!m_hubs.empty()) {
      const Text name = std::move(m_hubs.front());
      m_hubs.pop_front();
      if (!name.empty() && m_met.Add(name)) RecordHub(name);
    }
  }

  void RecordHub(const Text& name) {
    KelvoUHW::DeviceFile file(m_host);
    if (!file.Open(u"\\\\.\\" + name, platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE)) {
      return;
    }
    platform::USB_NODE_INFORMATION node{};
    std::uint32_t received = 0;
    if (!m_host.DeviceControl(file.Get(), platform::kIOCTL_USB_GET_NODE_INFORMATION, &node,
                              sizeof node, &node, sizeof node, received)) {
      return;
    }
    Hub hub{name, {}, node.HubIsBusPowered != 0};
    for (std::uint32_t port = 1; port <= node.HubDescriptor.bNumberOfPorts; ++port) {
      hub.ports.push_back(ReadPort(file.Get(), name, port));
    }
    m_recording.machine.hubs.push_back(std::move(hub));
  }

  bool AskConnection(platform::FileHandle hub, std::uint32_t code, std::uint32_t index,
                     platform::ConnectionInformationEx& answer) {
    answer = {};
    answer.Info.ConnectionIndex = index;
    std::uint32_t received = 0;
    return m_host.DeviceControl(hub, code, &answer, sizeof answer, &answer, sizeof answer, received)
        .ok;
  }

  // A port that does not answer the newer request is, for the component, one without a device.
  Port ReadPort(platform::FileHandle hub, const Text& hubName, std::uint32_t index) {
    Port port;
    platform::ConnectionInformationEx answer;
    platform::ConnectionInformationEx older;
    if (!AskConnection(hub, platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX, index,
                       answer)) {
      return port;
    }
    // Both records have one layout. The component shows what the older request says.
    if (AskConnection(hub, platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, index, older)) {
      const std::uint8_t speed = answer.Info.Speed;
      answer = older;
      answer.Info.Speed =
          older.Info.Speed != 0 ? platform::UsbLowSpeed : std::max(speed, platform::UsbFullSpeed);
    } else {
      m_recording.Note(u"Port " + platform::Decimal(static_cast<std::int32_t>(index)) +
                       u" of hub " + hubName + u" does not answer the older request.");
    }
    const auto& info = answer.Info;
    // A packed record's member binds to no reference.
    const std::uint32_t status = info.ConnectionStatus;
    port.status = std::min<std::uint32_t>(status, 255);
    port.speed = static_cast<platform::simulated::Speed>(std::min<std::uint8_t>(info.Speed, 3));
    port.isHub = info.DeviceIsHub != 0;
    if (port.status != platform::NoDeviceConnected) {
      port.descriptor = info.DeviceDescriptor;
      port.descriptor.bLength = sizeof port.descriptor;
      port.descriptor.bDescriptorType = platform::kUSB_DEVICE_DESCRIPTOR_TYPE;
      port.driverKey =
          AskName(m_host, hub, platform::kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME, index);
    }
    port.configuration = info.CurrentConfigurationValue;
    port.address = info.DeviceAddress;
    const std::uint32_t pipes = info.NumberOfOpenPipes;
    for (std::size_t i = 0; i < std::min<std::size_t>(pipes, platform::kConnectionPipes); ++i) {
      platform::USB_PIPE_INFO pipe = answer.PipeList[i];
      pipe.EndpointDescriptor.bLength = sizeof pipe.EndpointDescriptor;
      pipe.EndpointDescriptor.bDescriptorType = platform::kUSB_ENDPOINT_DESCRIPTOR_TYPE;
      port.pipes.push_back(pipe);
    }
    if (port.isHub) {
      port.hubName = AskName(m_host, hub, platform::kIOCTL_USB_GET_NODE_CONNECTION_NAME, index);
      if (port.hubName && port.hubName->empty()) port.hubName.reset();
      if (port.hubName) m_hubs.push_back(*port.hubName);
    }
    return port;
  }

  Recording& m_recording;
  platform::Host& m_host;
  platform::simulated::NameSet m_names;
  platform::simulated::NameSet m_met;
  std::deque<Text> m_hubs;  // to be opened
};

}  // namespace

void RecordControllers(Recording& recording) { UsbRecorder(recording).Run(); }

}  // namespace recorder
