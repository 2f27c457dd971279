#include "records/device_set.h"

#include <algorithm>
#include <cstring>

#include "platform/text.h"

namespace KelvoUHW {

namespace {

// Twice the longest path there is, in bytes.
constexpr std::uint32_t kMostDetailBytes = 1U << 17;

}  // namespace

std::u16string InterfaceDetail::DevicePath() const {
  if (m_bytes.size() <= platform::kInterfaceDetailPathOffset) return {};
  const std::size_t bytes = m_bytes.size() - platform::kInterfaceDetailPathOffset;
  std::u16string path(bytes / sizeof(char16_t), u'\0');
  std::memcpy(path.data(), m_bytes.data() + platform::kInterfaceDetailPathOffset,
              path.size() * sizeof(char16_t));
  return std::u16string(platform::UpToZero(path));
}

InterfaceDetail ReadInterfaceDetail(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                                    const platform::SP_DEVICE_INTERFACE_DATA& data,
                                    platform::SP_DEVINFO_DATA* device, platform::Status& status) {
  std::uint32_t required = 0;
  status = sets.GetDeviceInterfaceDetail(set, data, nullptr, 0, &required, nullptr);
  if (required == 0 || required > kMostDetailBytes) return {};

  // The size is the system's word; a buffer that could not even hold the size field is not offered.
  const std::uint32_t fixedPart = platform::kInterfaceDetailSize;
  std::vector<std::uint8_t> bytes(std::max<std::size_t>(required, sizeof fixedPart));
  std::memcpy(bytes.data(), &fixedPart, sizeof fixedPart);
  if (device) {
    *device = {};
    device->cbSize = sizeof(platform::SP_DEVINFO_DATA);
  }
  status = sets.GetDeviceInterfaceDetail(set, data, bytes.data(), required, nullptr, device);
  return status ? InterfaceDetail(std::move(bytes)) : InterfaceDetail();
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
