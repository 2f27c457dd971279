// What a PC tells while it changes: for the command that prints it, and for pages that show it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "tools/zkusb/component.h"
#include "tools/zkusb/json.h"
#include "tools/zkusb/node_view.h"
#include "tools/zkusb/pc.h"

namespace zkusb {

struct DeviceEvent {
  TDeviceEventType kind;
  std::uint32_t at;         // milliseconds since the start
  std::u16string portPath;  // empty where the device has none
  NodeView device;
};

// A device with what happened to it, as programs read it.
Json EventJson(const DeviceEvent& event);

// Called by one thread at a time.
class WatchListener {
 public:
  virtual ~WatchListener() = default;
  virtual void Tell(const DeviceEvent& event) = 0;
  virtual void TellStart(std::size_t devices) = 0;  // after the events of the devices there are
  virtual void BeginStep(const Pc::Step& step) = 0;
  virtual void EndStep() = 0;
};

// Advises a sink, plays the script and goes on as Watch says. `atTheEnd` may be empty; it is called
// while the component is still there.
void PlayAndListen(Pc& pc, std::optional<std::uint32_t> milliseconds, WatchListener& listener,
                   const std::function<void(const Component&)>& atTheEnd);

}  // namespace zkusb
