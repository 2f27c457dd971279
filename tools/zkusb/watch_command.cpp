#include <array>
#include <utility>

#include "platform/text.h"
#include "tools/zkusb/commands.h"
#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/device_texts.h"
#include "tools/zkusb/json.h"

namespace zkusb {

namespace {

using platform::simulated::Step;

// As wide as the longest, so that the devices stand below each other.
constexpr std::array<std::u16string_view, 4> kEventWords{u"connected", u"attached ", u"removed  ",
                                                         u"modified "};

std::u16string Seconds(std::uint32_t milliseconds) {
  std::u16string fraction = platform::Decimal(static_cast<std::int32_t>(milliseconds % 1000));
  fraction.insert(0, 3 - fraction.size(), u'0');
  std::u16string text = u"+";
  text += platform::Decimal(static_cast<std::int32_t>(milliseconds / 1000));
  return text.append(u".").append(fraction).append(u"s");
}

std::u16string EventText(const Step& step, const DeviceEvent& event) {
  const NodeView& device = event.device;
  std::vector<std::u16string> parts{
      u"  " + Seconds(step.atMilliseconds),
      std::u16string(kEventWords.at(static_cast<std::size_t>(event.kind))),
      Joined({IdText(device), VendorText(device), ProductText(device)}, u" ")};
  const std::u16string serial = SerialText(device);
  if (!serial.empty()) parts.push_back(u"serial " + serial);
  for (const Disk& disk : DisksOf(device)) {
    parts.push_back(MountPointsText(disk.mountPoints));
    for (const StorageView* volume : disk.volumes) {
      parts.push_back(MountPointsText(volume->MountPoints));
      parts.push_back(volume->VolumeName);
    }
  }
  return Joined(parts, u"  ");
}

void TellAsText(const Step& step, bool changed, const std::vector<DeviceEvent>& events,
                Writer& out) {
  out.Line(Joined({Seconds(step.atMilliseconds), step.name}, u"  "));
  for (const DeviceEvent& event : events) out.Line(EventText(step, event));
  if (events.empty()) out.Line(changed ? u"  no event" : u"  no change");
}

void TellAsJson(const Step& step, bool changed, const std::vector<DeviceEvent>& events,
                Writer& out) {
  const Json head = {{"at", step.atMilliseconds}, {"step", TextJson(step.name)}};
  for (const DeviceEvent& event : events) {
    Json line = head;
    line["event"] = EventName(event.kind);
    line.update(DeviceJson(event.device));
    out.Json(line, false);
  }
  if (!events.empty()) return;
  Json line = head;
  line["event"] = nullptr;
  line["changed"] = changed;
  out.Json(line, false);
}

}  // namespace

void Watch(Topology& topology, bool json, Writer& out) {
  topology.Refresh();
  const std::optional<NodeView> root = topology.Root();
  const std::size_t devices = root ? PortDevices(*root).size() : 0;
  if (json) {
    out.Json({{"event", nullptr}, {"devices", devices}}, false);
  } else {
    out.Line(platform::Decimal(static_cast<std::int32_t>(devices)) +
             (devices == 1 ? u" device at the start" : u" devices at the start"));
  }
  for (std::size_t index = 0; index < topology.Steps().size(); ++index) {
    topology.Apply(index);
    const bool changed = topology.Refresh();
    const Step& step = topology.Steps()[index];
    if (json) {
      TellAsJson(step, changed, topology.Events(), out);
    } else {
      TellAsText(step, changed, topology.Events(), out);
    }
  }
}

}  // namespace zkusb
