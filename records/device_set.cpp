#include "records/device_set.h"

#include <algorithm>
#include <cstring>

#include "platform/text.h"

namespace KelvoUHW {

namespace {

// Twice the longest path there is, in bytes.
constexpr std::uint32_t kMostDetailBytes = 1U << 17;
// Holds nearly every path there is.
constexpr std::uint32_t kFirstDetailBytes = 1024;

}  // namespace

InterfaceDetail::InterfaceDetail(const std::vector<std::uint8_t>& bytes)
    : m_received(!bytes.empty()) {
  if (bytes.size() <= platform::kInterfaceDetailPathOffset) return;
  std::u16string rest((bytes.size() - platform::kInterfaceDetailPathOffset) / sizeof(char16_t),
                      u'\0');
  std::memcpy(rest.data(), bytes.data() + platform::kInterfaceDetailPathOffset,
              rest.size() * sizeof(char16_t));
  m_path = platform::UpToZero(rest);
}

InterfaceDetail ReadInterfaceDetail(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                                    const platform::SP_DEVICE_INTERFACE_DATA& data,
                                    platform::SP_DEVINFO_DATA* device, platform::Status& status) {
  const std::uint32_t fixedPart = platform::kInterfaceDetailSize;
  std::vector<std::uint8_t> bytes(kFirstDetailBytes);
  std::uint32_t required = 0;
  const auto ask = [&] {
    const auto offered = static_cast<std::uint32_t>(bytes.size());
    std::memcpy(bytes.data(), &fixedPart, sizeof fixedPart);
    if (device) {
      *device = {};
      device->cbSize = sizeof(platform::SP_DEVINFO_DATA);
    }
    status = sets.GetDeviceInterfaceDetail(set, data, bytes.data(), offered, &required, device);
  };
  ask();
  if (!status && required > bytes.size() && required <= kMostDetailBytes) {
    bytes.resize(required);
    ask();
  }
  if (!status) return {};
  bytes.resize(std::min<std::size_t>(required, bytes.size()));
  return InterfaceDetail(bytes);
}

InterfaceDetail GetInterfaceDetail(platform::DeviceSets& sets, platform::DebugOutput& debug,
                                   platform::DeviceSetHandle set,
                                   const platform::SP_DEVICE_INTERFACE_DATA* data,
                                   platform::SP_DEVINFO_DATA* device) {
  if (set == 0 || data == nullptr || device == nullptr) return {};
  platform::Status status;
  InterfaceDetail detail = ReadInterfaceDetail(sets, set, *data, device, status);
  // A failed size query is no failure of its own: it always fails for want of a buffer.
  if (!detail && !status && status.error == platform::kERROR_INVALID_USER_BUFFER) {
    debug.WriteDebugText(u"ERROR_INVALID_USER_BUFFER\r\n");
  }
  return detail;
}

}  // namespace KelvoUHW
