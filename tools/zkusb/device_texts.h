// What people read about devices. Texts are tidied; each is empty where nothing is known.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/node_view.h"

namespace zkusb {

std::u16string IdText(const NodeView& node);      // "0781:5580"
std::u16string VendorText(const NodeView& node);  // by vendor id, or as the device says
std::u16string ProductText(const NodeView& device);
std::u16string NamesText(const NodeView& device);   // vendor, product
std::u16string SerialText(const NodeView& device);  // the device's own, not one Windows made up
std::u16string PlaceText(const Place& place);       // "port 2-1.4"
// "D:" for D:\, commas between several.
std::u16string MountPointsText(const std::vector<std::u16string>& mountPoints);

// The texts that are not empty, with `between` between them.
std::u16string Joined(const std::vector<std::u16string>& texts, std::u16string_view between);

}  // namespace zkusb
