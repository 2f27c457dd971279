// Words for the numbers in USB descriptors and connection records.
//
// Pure functions over constant tables: callable from every thread, they neither allocate nor fail,
// and the texts live as long as the module.
//
// Public source: the USB class code list and the vendor-id list of the USB Implementers Forum.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace KelvoUHW {

// None for id 0 and for a vendor that is not in the table.
std::optional<std::u16string_view> VendorName(std::uint16_t vendorId) noexcept;

// "Unknown" for a class that is not in the table.
std::u16string_view UsbClassName(std::uint8_t classCode) noexcept;

// Empty for what is not in the table.
std::u16string_view UsbSubClassName(std::uint8_t classCode, std::uint8_t subClass) noexcept;
std::u16string_view UsbProtocolName(std::uint8_t classCode, std::uint8_t subClass,
                                    std::uint8_t protocol) noexcept;

// Of USB_CONNECTION_STATUS, such as "DeviceConnected"; "(unknown)" for a value above 5.
std::u16string_view ConnectionStatusName(std::uint32_t status) noexcept;

}  // namespace KelvoUHW
