#include "recorder/glance.h"

#include <array>
#include <vector>

#include "platform/setup_api.h"
#include "recorder/recording.h"
#include "records/device_set.h"

namespace recorder {

std::u16string Glance(platform::Host& host) {
  std::u16string seen;
  KelvoUHW::DeviceSet set(host);
  if (set.Open(nullptr, platform::kDIGCF_PRESENT | platform::kDIGCF_ALLCLASSES)) {
    for (std::uint32_t index = 0; index < kMostElements; ++index) {
      platform::SP_DEVINFO_DATA data{.cbSize = sizeof data};
      if (!host.EnumDeviceInfo(set.Get(), index, data)) break;
      seen += platform::Hex(data.DevInst) + u" ";
    }
  }
  std::array<char16_t, 260> name{};
  KelvoUHW::VolumeSearch search(host);
  std::uint32_t volumes = 0;
  for (platform::Status found = search.First(name.data(), name.size());
       found && volumes < kMostElements; found = search.Next(name.data(), name.size()), ++volumes) {
    std::array<char16_t, 1024> paths{};
    std::uint32_t required = 0;
    name.back() = u'\0';
    host.VolumePathNames(name.data(), paths.data(), paths.size(), required);
    seen += name.data();
    for (const Text& path : SplitTexts({paths.data(), paths.size()})) seen += u" " + path;
    seen += u"\n";
  }
  return seen;
}

}  // namespace recorder
