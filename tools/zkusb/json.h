// The same facts for programs, under the names that the interfaces publish. Texts are as the
// component has them, blanks included.
#pragma once

#include <nlohmann/json.hpp>

#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/node_view.h"

namespace zkusb {

using Json = nlohmann::ordered_json;

// A node with everything below it, in "Childs".
Json TreeJson(const NodeView& node);
// A port device without the nodes below it; instead "MountPoints" and "Disks" sum up what they say.
Json DeviceJson(const NodeView& device);
// The same with "Controller" and "Ports" in front.
Json PlacedDeviceJson(const PlacedDevice& placed);

Json TextJson(std::u16string_view text);
// "KDeviceAttached" and the like.
const char* EventName(TDeviceEventType kind) noexcept;

}  // namespace zkusb
