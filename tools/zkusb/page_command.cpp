#include <ctime>
#include <filesystem>
#include <fstream>
#include <stdexcept>
#include <utility>

#include "platform/text.h"
#include "tools/zkusb/commands.h"
#include "tools/zkusb/json_document.h"
#include "tools/zkusb/page/page_files.h"
#include "tools/zkusb/watch.h"

namespace zkusb {

namespace {

struct PageStep {
  std::uint32_t at;
  std::u16string name;
  std::size_t connected = 0;  // events of that kind, which every run sends for every device
  std::vector<DeviceEvent> events;
};

// Keeps what happens for the page.
class Recorder final : public WatchListener {
 public:
  Recorder() { m_steps.push_back({0, u"at the start", 0, {}}); }

  void Tell(const DeviceEvent& event) override {
    if (event.kind == KDeviceConnected) {
      ++m_steps.back().connected;
    } else {
      m_steps.back().events.push_back(event);
    }
  }
  void TellStart(std::size_t) override {}
  void BeginStep(const Pc::Step& step) override {
    m_steps.push_back({step.atMilliseconds, step.name, 0, {}});
  }
  void EndStep() override {}

  const std::vector<PageStep>& Steps() const { return m_steps; }

 private:
  std::vector<PageStep> m_steps;
};

std::string NowInUtc() {
  const std::time_t now = std::time(nullptr);
  char text[sizeof "2000-01-01T00:00:00Z"] = "";
  std::strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", std::gmtime(&now));
  return text;
}

void WriteTimeline(const std::vector<PageStep>& steps, JsonDocument& document) {
  document.BeginArray("timeline");
  for (const PageStep& step : steps) {
    document.BeginElement();
    document.Members(
        {{"at", step.at}, {"step", TextJson(step.name)}, {"connected", step.connected}});
    document.BeginArray("events");
    for (const DeviceEvent& event : step.events) document.Element(EventJson(event));
    document.End();
    document.End();
  }
  document.End();
}

// The page with a style, data and a script in the places that it marks.
void WritePage(const NodeView& root, const std::vector<PageStep>& steps, std::ostream& stream) {
  Writer out(stream);
  std::string_view rest = kPageHtml;
  const auto upTo = [&](std::string_view mark) {
    const std::size_t at = rest.find(mark);
    stream << rest.substr(0, at);
    rest.remove_prefix(at + mark.size());
  };
  upTo("<!--style-->");
  stream << kPageCss;
  upTo("<!--data-->");
  out.BeInMarkup();
  JsonDocument document("page", out);
  document.Members({{"made", NowInUtc()}});
  document.BeginObject("RootNode");
  WriteTree(root, document);
  document.End();
  WriteTimeline(steps, document);
  document.Finish();
  upTo("<!--script-->");
  stream << kPageJs << rest;
}

}  // namespace

bool PrintPage(Pc& pc, const std::string& file, bool json, Writer& out) {
  Recorder recorder;
  NodeView root;
  root.Type = KUDTRoot;
  PlayAndListen(pc, 0, recorder, [&](const Component& component) {
    std::optional<NodeView> now = component.Root();
    if (now && HasUsbController(*now)) root = std::move(*now);
  });
  const bool hasScript = !pc.Steps().empty();
  std::ofstream stream(std::filesystem::path(platform::FromUtf8(file)), std::ios::binary);
  WritePage(root, hasScript ? recorder.Steps() : std::vector<PageStep>(), stream);
  stream.close();
  if (!stream) throw std::runtime_error(file + ": cannot be written");

  const std::size_t devices = PortDevices(root).size();
  if (json) {
    JsonDocument document("page", out);
    document.Members({{"file", file}, {"devices", devices}});
    document.Finish();
  } else {
    out.Line(platform::FromUtf8(file) + u": " +
             platform::Decimal(static_cast<std::int32_t>(devices)) +
             (devices == 1 ? u" device" : u" devices"));
  }
  return HasUsbController(root);
}

}  // namespace zkusb
