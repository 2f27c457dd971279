#include <algorithm>
#include <array>
#include <mutex>
#include <optional>
#include <utility>

#include "platform/text.h"
#include "tools/zkusb/commands.h"
#include "tools/zkusb/component.h"
#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/device_texts.h"
#include "tools/zkusb/json.h"
#include "tools/zkusb/node_reader.h"

namespace zkusb {

namespace {

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

std::u16string EventText(TDeviceEventType kind, std::uint32_t at, const NodeView& device) {
  std::vector<std::u16string> parts{
      u"  " + Seconds(at), std::u16string(kEventWords.at(static_cast<std::size_t>(kind))),
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

// Prints as it goes. Events come on threads of the component, while the thread that plays the
// script waits; the lock says so to those who check.
class Watcher {
 public:
  Watcher(const Pc& pc, bool json, Writer& out) noexcept : m_pc(pc), m_json(json), m_out(out) {}

  void Tell(TDeviceEventType kind, IZKUMUsbTreeNode& node) {
    const NodeView device = ReadNode(node);
    const auto at = static_cast<std::uint32_t>(m_pc.Now());
    const std::lock_guard lock(m_mutex);
    ++m_events;
    if (m_json) {
      Json line = {{"at", at}, {"event", EventName(kind)}};
      line.update(DeviceJson(device));
      m_out.Json(line, false);
    } else {
      m_out.Line(EventText(kind, at, device));
    }
  }

  void TellStart(std::size_t devices) {
    const std::lock_guard lock(m_mutex);
    if (m_json) {
      m_out.Json({{"event", nullptr}, {"devices", devices}}, false);
    } else {
      m_out.Line(platform::Decimal(static_cast<std::int32_t>(devices)) +
                 (devices == 1 ? u" device at the start" : u" devices at the start"));
    }
  }

  void BeginStep(const Pc::Step& step) {
    const std::lock_guard lock(m_mutex);
    m_events = 0;
    if (m_json) {
      m_out.Json({{"at", step.atMilliseconds}, {"step", TextJson(step.name)}}, false);
    } else {
      m_out.Line(Joined({Seconds(step.atMilliseconds), step.name}, u"  "));
    }
  }

  // For people, a step without events says so; a late one may still come.
  void EndStep() {
    const std::lock_guard lock(m_mutex);
    if (m_events == 0 && !m_json) m_out.Line(u"  no event");
  }

 private:
  const Pc& m_pc;
  const bool m_json;
  Writer& m_out;
  std::mutex m_mutex;
  std::size_t m_events = 0;  // of the running step
};

}  // namespace

void Watch(Pc& pc, std::uint32_t milliseconds, bool json, Writer& out) {
  Watcher watcher(pc, json, out);
  const Component component(
      [&](TDeviceEventType kind, IZKUMUsbTreeNode& node) { watcher.Tell(kind, node); });
  const std::optional<NodeView> root = component.Root();
  watcher.TellStart(root ? PortDevices(*root).size() : 0);
  const std::uint64_t start = pc.Now();
  for (std::size_t index = 0; index < pc.Steps().size(); ++index) {
    const Pc::Step& step = pc.Steps()[index];
    // What an earlier step set off late comes before this one.
    const std::uint64_t at = std::max<std::uint64_t>(step.atMilliseconds, start);
    if (at > pc.Now()) pc.WaitFor(static_cast<std::uint32_t>(at - pc.Now()));
    watcher.BeginStep(step);
    pc.Play(index);
    watcher.EndStep();
  }
  if (milliseconds != 0) pc.WaitFor(milliseconds);
  pc.Settle();
}

}  // namespace zkusb
