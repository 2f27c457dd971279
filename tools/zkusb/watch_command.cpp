#include <algorithm>
#include <array>
#include <mutex>
#include <thread>
#include <unordered_map>
#include <utility>

#include "platform/console.h"
#include "platform/text.h"
#include "tools/zkusb/commands.h"
#include "tools/zkusb/device_texts.h"
#include "tools/zkusb/json_document.h"
#include "tools/zkusb/node_reader.h"
#include "tools/zkusb/watch.h"

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

// Where the devices are that events tell of. An event brings a node without its place, so the tree
// is looked at once in each run of the component; what was removed is where it was before.
class Places {
 public:
  std::u16string Of(TDeviceEventType kind, const std::u16string& id) {
    if (IsNewRun(kind)) {
      m_before = std::exchange(m_now, {});
      ReadNow();
    }
    if (const auto found = m_now.find(id); found != m_now.end()) return found->second;
    if (kind == KDeviceRemoved) {
      const auto found = m_before.find(id);
      return found == m_before.end() ? std::u16string() : found->second;
    }
    // A run that went unnoticed, or a device that has no place.
    ReadNow();
    return m_now[id];
  }

 private:
  // A run tells of attached, connected, removed and modified devices in this order, on one thread.
  bool IsNewRun(TDeviceEventType kind) {
    constexpr std::array<int, 4> kOrder{1, 0, 2, 3};
    const int order = kOrder.at(static_cast<std::size_t>(kind));
    const bool isNew = order < m_order || std::this_thread::get_id() != m_thread;
    m_order = order;
    m_thread = std::this_thread::get_id();
    return isNew;
  }

  void ReadNow() {
    const auto root = CurrentRoot();
    if (!root) return;
    ReadPlaces(*root.Get(), [&](std::u16string id, std::u16string portPath) {
      m_now[std::move(id)] = std::move(portPath);
    });
  }

  std::unordered_map<std::u16string, std::u16string> m_now;
  std::unordered_map<std::u16string, std::u16string> m_before;
  int m_order = 0;
  std::thread::id m_thread;
};

void PrintEvent(const DeviceEvent& event, Writer& out) {
  const NodeView& device = event.device;
  std::vector<std::u16string> facts;
  const std::u16string serial = SerialText(device);
  const std::u16string path = event.portPath.empty() ? u"-" : event.portPath;
  std::u16string names = Joined({VendorText(device), ProductText(device)}, u" ");
  if (!serial.empty()) facts.push_back(u"serial " + serial);
  facts.push_back(MountPointsText(MountPointsOf(device)));
  const std::u16string tail = Joined(facts, u"  ");
  out.FittedLine(Joined({u"  " + Seconds(event.at),
                         std::u16string(kEventWords.at(static_cast<std::size_t>(event.kind))), path,
                         IdText(device)},
                        u"  ") +
                     (names.empty() ? u"" : u"  "),
                 names, tail.empty() ? tail : u"  " + tail);
}

Json WatchLine(const char* line) {
  Json head = DocumentHead("watch");
  head["line"] = line;
  return head;
}

// Prints as it goes. Events come on threads of the component, while the thread that plays the
// script waits; the lock says so to those who check.
class Printer final : public WatchListener {
 public:
  Printer(bool json, Writer& out) noexcept : m_json(json), m_out(out) { out.FlushEachLine(); }

  void Tell(const DeviceEvent& event) override {
    if (m_json) {
      Json line = WatchLine("event");
      line.update(EventJson(event));
      m_out.JsonLine(line);
    } else {
      PrintEvent(event, m_out);
    }
    ++m_events;
    // The watch ends then.
    if (!m_out.Good()) platform::Interrupt();
  }

  void TellStart(std::size_t devices) override {
    if (m_json) {
      Json line = WatchLine("start");
      line["devices"] = devices;
      m_out.JsonLine(line);
    } else {
      m_out.Line(platform::Decimal(static_cast<std::int32_t>(devices)) +
                 (devices == 1 ? u" device at the start" : u" devices at the start"));
    }
  }

  void BeginStep(const Pc::Step& step) override {
    m_events = 0;
    if (m_json) {
      Json line = WatchLine("step");
      line["at"] = step.atMilliseconds;
      line["step"] = TextJson(step.name);
      m_out.JsonLine(line);
    } else {
      m_out.Line(Joined({Seconds(step.atMilliseconds), step.name}, u"  "));
    }
  }

  // For people, a step without events says so; a late one may still come.
  void EndStep() override {
    if (m_events == 0 && !m_json) m_out.Line(u"  no event");
  }

 private:
  const bool m_json;
  Writer& m_out;
  std::size_t m_events = 0;  // of the running step
};

}  // namespace

Json EventJson(const DeviceEvent& event) {
  Json json = {{"at", event.at}, {"event", EventName(event.kind)}};
  json.update(NodeJson(event.device, {}));
  json["portPath"] = TextJson(event.portPath);
  return json;
}

void PlayAndListen(Pc& pc, std::optional<std::uint32_t> milliseconds, WatchListener& listener,
                   const std::function<void(const Component&)>& atTheEnd) {
  platform::CatchInterrupts();
  std::mutex mutex;
  Places places;
  const Component component([&](TDeviceEventType kind, IZKUMUsbTreeNode& node) {
    DeviceEvent event{kind, static_cast<std::uint32_t>(pc.Now()), {}, ReadNode(node)};
    const std::lock_guard lock(mutex);
    event.portPath = places.Of(kind, event.device.InstanceId);
    listener.Tell(event);
  });
  const std::optional<NodeView> root = component.Root();
  const auto told = [&](const auto& call) {
    const std::lock_guard lock(mutex);
    call();
  };
  told([&] { listener.TellStart(root ? PortDevices(*root).size() : 0); });
  const std::uint64_t start = pc.Now();
  for (std::size_t index = 0; index < pc.Steps().size() && !platform::Interrupted(); ++index) {
    const Pc::Step& step = pc.Steps()[index];
    // What an earlier step set off late comes before this one.
    const std::uint64_t at = std::max<std::uint64_t>(step.atMilliseconds, start);
    if (at > pc.Now()) pc.WaitFor(static_cast<std::uint32_t>(at - pc.Now()));
    if (platform::Interrupted()) break;
    told([&] { listener.BeginStep(step); });
    pc.Play(index);
    told([&] { listener.EndStep(); });
  }
  if (milliseconds && !platform::Interrupted()) pc.WaitFor(*milliseconds);
  if (!platform::Interrupted()) pc.Settle();
  if (!milliseconds && pc.Steps().empty()) platform::WaitForInterrupt(std::nullopt);
  if (atTheEnd) atTheEnd(component);
}

void Watch(Pc& pc, std::optional<std::uint32_t> milliseconds, bool json, Writer& out) {
  Printer printer(json, out);
  PlayAndListen(pc, milliseconds, printer, nullptr);
}

}  // namespace zkusb
