// The descriptors found in a configuration descriptor, and the entries made of its interfaces.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "records/ring_ptr.h"
#include "records/usb_port_info.h"

namespace KelvoUHW {

// One descriptor: its bytes as received. Shorter than its own bLength where the data ended early;
// at least two bytes (length and type).
using RawDescriptor = std::span<const std::uint8_t>;

// Every descriptor of a configuration in order, up to wTotalLength or the end of what was received,
// whichever comes first. A bLength below 2 ends the list. The result points into `data`.
std::vector<RawDescriptor> SplitConfiguration(std::span<const std::uint8_t> data);

// One interface of a configuration. It owns a copy of its bytes, because descriptor objects held by
// clients outlive the port device.
struct InterfaceEntry {
  struct Text {
    std::uint16_t LanguageID = 0;
    std::u16string Value;
  };

  std::vector<std::uint8_t> Descriptor;  // 9 or 11 bytes
  std::optional<Text> String;            // of iInterface, where the device gave it

  // The byte at an offset of USB_INTERFACE_DESCRIPTOR; the offset lies within the 9 bytes.
  std::uint8_t Byte(std::size_t offset) const noexcept { return Descriptor[offset]; }
};
using InterfaceEntryPtr = RingPtr<InterfaceEntry>;

// An entry for each interface descriptor (type 4, 9 or 11 bytes, received whole), in order.
std::vector<InterfaceEntryPtr> MakeInterfaceEntries(std::span<const RawDescriptor> descriptors,
                                                    const StringDescriptorNode* strings);

}  // namespace KelvoUHW
