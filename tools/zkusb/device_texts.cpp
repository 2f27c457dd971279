#include "tools/zkusb/device_texts.h"

#include <utility>

#include "platform/text.h"
#include "records/usb_names.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

std::u16string IdText(const NodeView& node) {
  if (node.VendorId < 0 || node.ProductId < 0) return {};
  return platform::Hex(static_cast<std::uint32_t>(node.VendorId), 4) + u":" +
         platform::Hex(static_cast<std::uint32_t>(node.ProductId), 4);
}

std::u16string VendorText(const NodeView& node) {
  if (node.VendorId >= 0 && node.VendorId <= 0xFFFF) {
    const auto name = KelvoUHW::VendorName(static_cast<std::uint16_t>(node.VendorId));
    if (name) return Tidied(*name);
  }
  return Tidied(node.Manufacturer1);
}

std::u16string ProductText(const NodeView& device) {
  // The friendly name comes late: where a device has none, the component may show that of the
  // device-manager node it read before.
  for (const std::u16string& text : {Tidied(device.Product), Tidied(device.Description)}) {
    if (!text.empty()) return text;
  }
  if (device.Info && !device.Info->FriendlyName.empty()) return Tidied(device.Info->FriendlyName);
  const std::vector<Disk> disks = DisksOf(device);
  return disks.empty() ? std::u16string() : disks.front().name;
}

std::u16string NamesText(const NodeView& device) {
  return Joined({VendorText(device), ProductText(device)}, u", ");
}

std::u16string SerialText(const NodeView& device) {
  // Windows numbers devices that have no serial number; only those numbers hold an ampersand.
  const bool madeUp = device.SerialNumber.find(u'&') != std::u16string::npos;
  return madeUp ? std::u16string() : Tidied(device.SerialNumber);
}

std::u16string PlaceText(const Place& place) {
  const std::u16string path = PortPath(place);
  const bool hasPort = path.find(u'-') != std::u16string::npos;
  return (hasPort ? u"port " : u"controller ") + path;
}

std::u16string MountPointsText(const std::vector<std::u16string>& mountPoints) {
  std::vector<std::u16string> texts;
  for (std::u16string text : mountPoints) {
    if (text.ends_with(u'\\')) text.pop_back();
    texts.push_back(std::move(text));
  }
  return Joined(texts, u", ");
}

std::u16string Joined(const std::vector<std::u16string>& texts, std::u16string_view between) {
  std::u16string result;
  for (const std::u16string& text : texts) {
    if (text.empty()) continue;
    if (!result.empty()) result += between;
    result += text;
  }
  return result;
}

}  // namespace zkusb
