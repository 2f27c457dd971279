#include "tree/hub_queries.h"

#include <algorithm>
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

// A second buffer for a name, zeroed, of the size the driver asked for. The size is the driver's
// word alone: beyond what any name can have, and where there is no memory, there is no buffer and
// the name is empty.
class NameBuffer {
 public:
  explicit NameBuffer(std::uint32_t size) noexcept
      : m_bytes(size > kMostNameBytes ? nullptr : static_cast<std::uint8_t*>(std::calloc(size, 1))),
        m_size(size) {}

  explicit operator bool() const noexcept { return m_bytes != nullptr; }
  std::uint8_t* Data() noexcept { return m_bytes.get(); }
  std::uint32_t Size() const noexcept { return m_size; }
  void PutHead(const void* head, std::size_t size) noexcept {
    std::memcpy(m_bytes.get(), head, std::min<std::size_t>(size, m_size));
  }
  // The characters behind the head, as far as they were received, up to the terminating zero.
  std::u16string Name(std::size_t head, std::uint32_t received) const {
    const std::size_t end = std::min(received, m_size);
    if (end <= head) return {};
    // Taken one by one: how much a driver claims to have written says nothing about the name.
    std::u16string name;
    for (std::size_t at = head; at + sizeof(char16_t) <= end; at += sizeof(char16_t)) {
      char16_t unit;
      std::memcpy(&unit, m_bytes.get() + at, sizeof unit);
      if (unit == u'\0') break;
      name += unit;
    }
    return name;
  }

 private:
  struct Free {
    void operator()(std::uint8_t* bytes) const noexcept { std::free(bytes); }
  };

  std::unique_ptr<std::uint8_t[], Free> m_bytes;
  std::uint32_t m_size;
};

// The record with its one declared character, for the first request.
template <class Head>
struct FirstAnswer {
  Head head{};
  char16_t name = 0;
};

// Both port queries: one buffer for input and output, the port set in it each time.
std::u16string ConnectionText(platform::DeviceIo& io, platform::FileHandle hub, std::uint32_t port,
                              std::uint32_t code) {
  using Head = platform::UsbConnectionNameHead;
  constexpr std::uint32_t kSize = platform::kConnectionNameRecordSize;
  std::uint32_t received = 0;

  FirstAnswer<Head> first;
  first.head.ConnectionIndex = port;
  if (!io.DeviceControl(hub, code, &first, kSize, &first, kSize, received)) return {};
  if (first.head.ActualLength <= kSize) return {};

  NameBuffer second(first.head.ActualLength);
  if (!second) return {};
  const Head head{port, 0};
  second.PutHead(&head, sizeof head);
  if (!io.DeviceControl(hub, code, second.Data(), second.Size(), second.Data(), second.Size(),
                        received)) {
    return {};
  }
  return second.Name(sizeof head, received);
}

}  // namespace

std::u16string GetHcdDriverKeyName(platform::DeviceIo& io, platform::FileHandle controller) {
  constexpr std::uint32_t kCode = platform::kIOCTL_GET_HCD_DRIVERKEY_NAME;
  constexpr std::uint32_t kSize = platform::kNameRecordSize;
  std::uint32_t received = 0;

  FirstAnswer<platform::UsbNameHead> first;
  if (!io.DeviceControl(controller, kCode, &first, kSize, &first, kSize, received)) return {};
  if (first.head.ActualLength <= kSize) return {};

  NameBuffer second(first.head.ActualLength);
  if (!second) return {};
  if (!io.DeviceControl(controller, kCode, second.Data(), second.Size(), second.Data(),
                        second.Size(), received)) {
    return {};
  }
  return second.Name(sizeof(platform::UsbNameHead), received);
}

std::u16string GetRootHubName(platform::DeviceIo& io, platform::FileHandle controller) {
  constexpr std::uint32_t kCode = platform::kIOCTL_USB_GET_ROOT_HUB_NAME;
  std::uint32_t received = 0;

  FirstAnswer<platform::UsbNameHead> first;
  if (!io.DeviceControl(controller, kCode, nullptr, 0, &first, platform::kNameRecordSize,
                        received)) {
    return {};
  }
  // No input and no test of the size, unlike the other name queries. This is meant: the controller
  // driver takes nothing in, and a size that is too small simply fails the second request.
  NameBuffer second(first.head.ActualLength);
  if (!second) return {};
  if (!io.DeviceControl(controller, kCode, nullptr, 0, second.Data(), second.Size(), received)) {
    return {};
  }
  return second.Name(sizeof(platform::UsbNameHead), received);
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
  const auto buffer = std::make_unique<platform::ConnectionInformationEx>();
  buffer->Info.ConnectionIndex = port;
  std::uint32_t received = 0;
  return io
      .DeviceControl(hub, platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX, buffer.get(),
                     sizeof *buffer, buffer.get(), sizeof *buffer, received)
      .ok;
}

bool GetConnectionInformation(platform::DeviceIo& io, platform::FileHandle hub, std::uint32_t port,
                              ConnectionRecord& record) {
  const auto answer = std::make_unique<platform::LegacyConnectionInformation>();
  answer->Info.ConnectionIndex = port;
  std::uint32_t received = 0;
  if (!io.DeviceControl(hub, platform::kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, answer.get(),
                        sizeof *answer, answer.get(), sizeof *answer, received)) {
    return false;
  }
  const platform::USB_NODE_CONNECTION_INFORMATION& from = answer->Info;
  record.Info.ConnectionIndex = from.ConnectionIndex;
  record.Info.DeviceDescriptor = from.DeviceDescriptor;
  record.Info.CurrentConfigurationValue = from.CurrentConfigurationValue;
  // A device never shows more than full speed: the older request knows low speed or not. This is
  // meant, as is discarding the newer answer, which would know.
  record.Info.Speed = from.LowSpeed == 0 ? platform::UsbFullSpeed : platform::UsbLowSpeed;
  record.Info.DeviceIsHub = from.DeviceIsHub;
  record.Info.DeviceAddress = from.DeviceAddress;
  record.Info.NumberOfOpenPipes = from.NumberOfOpenPipes;
  record.Info.ConnectionStatus = from.ConnectionStatus;
  record.PipeList = answer->PipeList;
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
