// Devices as programs read them (docs/json.md). A name with a capital letter is a property of the
// interfaces, its text as the component has it, blanks included; one without is worked out here. No
// object has two names that differ in case alone, which some readers of JSON do not take.
#pragma once

#include <nlohmann/json.hpp>

#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/node_view.h"

namespace zkusb {

using Json = nlohmann::ordered_json;

// The version of the documents' shape. It rises when something that a program may rely on changes
// its meaning or goes; what is added keeps it.
inline constexpr int kJsonSchema = 1;

// A node without those below it.
Json NodeJson(const NodeView& node, const Place& place);

Json TextJson(std::u16string_view text);
Json TextsJson(const std::vector<std::u16string>& texts);
// "KDeviceAttached" and the like.
const char* EventName(TDeviceEventType kind) noexcept;

}  // namespace zkusb
