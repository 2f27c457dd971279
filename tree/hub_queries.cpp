#include "tree/hub_queries.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "platform/text.h"
#include "records/devnode.h"
#include "records/identifiers.h"

namespace KelvoUHW {

namespace {

// Twice the longest name there is, in bytes.
constexpr std::uint32_t kMostNameBytes = 1U << 17;
// Holds nearly every name there is, so that few requests are made twice: they are what a build
// waits for.
constexpr std::uint32_t kFirstNameBytes = 512;

// A zeroed buffer for a name. A size above kFirstNameBytes is the driver's word alone: beyond what
// any name can have, and where there is no memory, there is no buffer and the name is empty.
class NameBuffer {
 public:
  // False without a buffer of that size.
  bool Grow(std::uint32_t size) noexcept {
    if (size > kMostNameBytes) return false;
    m_large.reset(static_cast<char16_t*>(std::calloc(size, 1)));
    m_size = size;
    return m_large != nullptr;
  }
  void* Data() noexcept { return Chars(); }
  std::uint32_t Size() const noexcept { return m_size; }
  // The characters between the head and `end`, as far as they were received, up to the terminating
  // zero.
  std::u16string Name(std::size_t head, std::uint32_t end) {
    end = std::min(end, m_size);
    if (end < head) return {};
    const std::u16string_view received(Chars() + head / sizeof(char16_t),
                                       (end - head) / sizeof(char16_t));
    // How much a driver claims to have written says nothing about the name.
    return std::u16string(platform::UpToZero(received));
  }

 private:
  struct Free {
    void operator()(char16_t* chars) const noexcept { std::free(chars); }
  };

  char16_t* Chars() noexcept { return m_large ? m_large.get() : m_first.data(); }

  std::array<char16_t, kFirstNameBytes / sizeof(char16_t)> m_first{};
  std::unique_ptr<char16_t[], Free> m_large;
  std::uint32_t m_size = kFirstNameBytes;
};

// Asks for a name, again with the size that the driver told where it is longer than most. One
// buffer serves for input (the head, where `takesInput`) and output. Empty where the request fails
// or the driver tells of fewer than `leastBytes`.
template <class Head>
std::u16string AskForName(platform::DeviceIo& io, platform::FileHandle device, std::uint32_t code,
                          const Head& head, bool takesInput, std::uint32_t leastBytes) {
  NameBuffer buffer;
  for (bool grown = false;; grown = true) {
    std::memcpy(buffer.Data(), &head, sizeof head);
    std::uint32_t received = 0;
    if (!io.DeviceControl(device, code, takesInput ? buffer.Data() : nullptr,
                          takesInput ? buffer.Size() : 0, buffer.Data(), buffer.Size(), received)) {
      return {};
    }
    if (grown) return buffer.Name(sizeof head, received);
    Head answer;
    std::memcpy(&answer, buffer.Data(), sizeof answer);
    if (answer.ActualLength < leastBytes) return {};
    if (answer.ActualLength <= buffer.Size()) {
      return buffer.Name(sizeof head, std::min(received, answer.ActualLength));
    }
    if (!buffer.Grow(answer.ActualLength)) return {};
  }
}

std::u16string ConnectionText(platform::DeviceIo& io, platform::FileHandle hub, std::uint32_t port,
                              std::uint32_t code) {
  return AskForName(io, hub, code, platform::UsbConnectionNameHead{port, 0}, true,
                    platform::kConnectionNameRecordSize + 1);
}

}  // namespace

std::u16string GetHcdDriverKeyName(platform::DeviceIo& io, platform::FileHandle controller) {
  return AskForName(io, controller, platform::kIOCTL_GET_HCD_DRIVERKEY_NAME,
                    platform::UsbNameHead{}, true, platform::kNameRecordSize + 1);
}

std::u16string GetRootHubName(platform::DeviceIo& io, platform::FileHandle controller) {
  // No input and no test of the size, unlike the other name queries. Deliberate: the controller
  // driver takes nothing in.
  return AskForName(io, controller, platform::kIOCTL_USB_GET_ROOT_HUB_NAME, platform::UsbNameHead{},
                    false, 0);
}

bool GetNodeInformation(platform::DeviceIo& io, platform::FileHandle hub,
                        platform::USB_NODE_INFORMATION& information) noexcept {
  std::uint32_t received = 0;
  return io
      .DeviceControl(hub, platform::kIOCTL_USB_GET_NODE_INFORMATION, &information,
                     sizeof information, &information, sizeof information, received)
      .ok;
}

bool ProbeConnectionInformationEx(platform::DeviceIo& io, platform::FileHandle hub,
                                  std::uint32_t port) {
  platform::ConnectionInformationEx buffer{};
  buffer.Info.ConnectionIndex = port;
  std::uint32_t received = 0;
  return io
      .DeviceControl(hub, platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX, &buffer,
                     sizeof buffer, &buffer, sizeof buffer, received)
      .ok;
}

bool GetConnectionInformation(platform::DeviceIo& io, platform::FileHandle hub, std::uint32_t port,
                              ConnectionRecord& record) {
  platform::LegacyConnectionInformation answer{};
  answer.Info.ConnectionIndex = port;
  std::uint32_t received = 0;
  if (!io.DeviceControl(hub, platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, &answer,
                        sizeof answer, &answer, sizeof answer, received)) {
    return false;
  }
  const platform::USB_NODE_CONNECTION_INFORMATION& from = answer.Info;
  record.Info.ConnectionIndex = from.ConnectionIndex;
  record.Info.DeviceDescriptor = from.DeviceDescriptor;
  record.Info.CurrentConfigurationValue = from.CurrentConfigurationValue;
  // A device never shows more than full speed: the older request knows low speed or not. This is
  // deliberate, as is discarding the newer answer, which would know.
  record.Info.Speed = from.LowSpeed == 0 ? platform::UsbFullSpeed : platform::UsbLowSpeed;
  record.Info.DeviceIsHub = from.DeviceIsHub;
  record.Info.DeviceAddress = from.DeviceAddress;
  record.Info.NumberOfOpenPipes = from.NumberOfOpenPipes;
  record.Info.ConnectionStatus = from.ConnectionStatus;
  record.PipeList = answer.PipeList;
  return true;
}

std::u16string GetConnectionName(platform::DeviceIo& io, platform::FileHandle hub,
                                 std::uint32_t port) {
  return ConnectionText(io, hub, port, platform::kIOCTL_USB_GET_NODE_CONNECTION_NAME);
}

std::u16string GetConnectionDriverKeyName(platform::DeviceIo& io, platform::FileHandle hub,
                                          std::uint32_t port) {
  return ConnectionText(io, hub, port, platform::kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME);
}

bool ReadDriverKeyName(platform::DeviceIo& io, platform::FileHandle handle,
                       CZKUMHostControllerImpl& controller) {
  controller.m_strDriverKeyName = GetHcdDriverKeyName(io, handle);
  return !controller.m_strDriverKeyName.empty();
}

bool Initialise(platform::DeviceIo& io, platform::DeviceManager& manager, DriverKeyIndex& index,
                platform::FileHandle handle, CZKUMHostControllerImpl& controller) {
  controller.m_devInstHandle = index.Find(controller.m_strDriverKeyName);
  const std::u16string deviceId = GetDeviceId(manager, controller.m_devInstHandle);
  if (deviceId.empty()) return false;
  controller.SetInstanceId(deviceId);

  const PciHardwareId pci = ParsePciHardwareId(deviceId.c_str());
  if (!pci.Complete) return false;
  controller.m_nPciVendorId = pci.VendorId;
  controller.m_nPciDeviceId = pci.DeviceId;
  controller.m_nPciSubSysId = pci.SubSysId;
  controller.m_nPciRevision = pci.Revision;

  controller.m_strDeviceDescr = GetDeviceDescription(manager, controller.m_devInstHandle);
  if (controller.m_strDeviceDescr.empty()) return false;
  controller.m_strRootHubName = GetRootHubName(io, handle);
  return !controller.m_strRootHubName.empty();
}

}  // namespace KelvoUHW
