// Registry properties of device-information elements, read into info-device records.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/host.h"
#include "records/info_device.h"

namespace KelvoUHW {

// The buffer that goes from read to read. It only grows, and its address is valid from the start: a
// call that only asks for the size passes it too.
class PropertyBuffer {
 public:
  PropertyBuffer() : m_bytes(2) {}

  void* Address() noexcept { return m_bytes.data(); }
  // Makes room for a value of `valueBytes` and a terminating zero behind it.
  void Grow(std::uint32_t valueBytes);
  // How many bytes the last successful read left.
  void SetReceived(std::uint32_t bytes) noexcept;
  // The characters received, up to the first zero.
  std::u16string_view Text() const noexcept;

 private:
  std::vector<char16_t> m_bytes;
  std::size_t m_received = 0;  // characters
};

// Reads a property: size first, then the value, again while the value outgrows the size just told.
// On success `type` is its registry data type and `buffer` holds it. A failure is the system's, and
// may carry the code 0. A system that asks for more without end, or for more than
// kMostPropertyBytes, has failed with kERROR_INSUFFICIENT_BUFFER.
inline constexpr int kMostPropertyReads = 8;
inline constexpr std::uint32_t kMostPropertyBytes = 1U << 20;
platform::Status ReadDeviceProperty(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                                    const platform::SP_DEVINFO_DATA& element,
                                    std::uint32_t property, std::uint32_t& type,
                                    PropertyBuffer& buffer);

// The element's instance id with / turned into \, or empty on failure.
std::u16string GetInstanceId(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                             const platform::SP_DEVINFO_DATA& element);

// Stores the properties of an element in `record` and says whether the node is accepted; a service
// or a class that has no place below a USB device excludes it. A property that cannot be read
// leaves its field as it was (service and class become empty).
//
// This is meant: the properties of an excluded node are stored too, and LegacyBusType and UiNumber
// take the registry data type of their property (4 for an ordinary node), not its value.
bool ReadInfoDeviceProperties(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                              const platform::SP_DEVINFO_DATA& element, PropertyBuffer& buffer,
                              CZKUMInfoDeviceImpl& record);

}  // namespace KelvoUHW
