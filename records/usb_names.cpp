#include "records/usb_names.h"

#include <algorithm>
#include <array>

#include "records/vendor_table.h"

namespace KelvoUHW {

namespace {

constexpr VendorRow kVendors[] = {
#include "vendor_table.inc"
    {0, u"End"},
};

struct ClassRow {
  std::uint8_t Class;
  std::u16string_view Name;
};

constexpr ClassRow kClasses[] = {
    {0x00, u"Device: Use class information in the Interface Descriptors"},
    {0x01, u"Interface: Audio"},
    {0x02, u"Device&Interface: Communications and CDC Control"},
    {0x03, u"Interface: HID"},
    {0x05, u"Interface: Physical"},
    {0x06, u"Interface: Image"},
    {0x07, u"Interface: Printer"},
    {0x08, u"Interface: Mass Storage"},
    {0x09, u"Device: Hub"},
    {0x0A, u"Interface: CDC-Data"},
    {0x0B, u"Interface: Smart Card"},
    {0x0D, u"Interface: Content Security"},
    {0x0E, u"Interface: Video"},
    {0xDC, u"Device&Interface: Diagnostic Device"},
    {0xE0, u"Interface: Wireless Controller"},
    {0xEF, u"Device&Interface: Miscellaneous"},
    {0xFE, u"Interface: Application Specific"},
    {0xFF, u"Device&Interface: Vendor Specific"},
};

struct SubClassRow {
  std::uint8_t Class;
  std::uint8_t SubClass;
  std::u16string_view Name;
};

constexpr SubClassRow kSubClasses[] = {
    {0x01, 0x01, u"Audio Control"},
    {0x01, 0x02, u"Audio Streaming"},
    {0x01, 0x03, u"MIDI Streaming"},
    {0x03, 0x01, u"Boot interface"},
    {0x08, 0x01, u"Reduced Block Command (RBC)"},
    {0x08, 0x02, u"SFF-8020i, MMC-2 (ATAPI)"},
    {0x08, 0x04, u"UFI"},
    {0x08, 0x05, u"SFF-8070i"},
    {0x08, 0x06, u"SCSI transparent"},
};

constexpr std::uint16_t kAnySubClass = 0x100;

struct ProtocolRow {
  std::uint8_t Class;
  std::uint16_t SubClass;
  std::uint8_t Protocol;
  std::u16string_view Name;
};

constexpr ProtocolRow kProtocols[] = {
    {0x03, kAnySubClass, 0x01, u"Keyboard"},
    {0x03, kAnySubClass, 0x02, u"Mouse"},
    {0x08, kAnySubClass, 0x00, u"Control/Bulk/Interrupt (with command completion interrupt)"},
    {0x08, kAnySubClass, 0x01, u"Control/Bulk/Interrupt (with no command completion interrupt)"},
    {0x08, kAnySubClass, 0x50, u"Bulk-Only Transport"},
    {0x09, kAnySubClass, 0x00, u"Full speed Hub"},
    {0x09, kAnySubClass, 0x01, u"Hi-speed hub with single TT"},
    {0x09, kAnySubClass, 0x02, u"Hi-speed hub with multiple TTs"},
    {0xEF, 0x01, 0x01, u"Active Sync device"},
    {0xEF, 0x01, 0x02, u"Palm Sync"},
    {0xEF, 0x02, 0x01, u"Interface Association Descriptor"},
    {0xEF, 0x02, 0x02, u"Wire Adapter Multifunction Peripheral programming interface"},
    {0xEF, 0x03, 0x01, u"Cable Based Association Framework"},
    {0xFE, 0x01, 0x01, u"Device Firmware Upgrade"},
    {0xFE, 0x02, 0x00, u"IRDA Bridge device"},
    {0xFE, 0x03, 0x00, u"USB Test and Measurement Device"},
    {0xFE, 0x03, 0x01, u"USB Test and Measurement Device conforming to the USBTMC USB488"},
};

constexpr std::u16string_view kConnectionStatus[] = {
    u"NoDeviceConnected",    u"DeviceConnected",         u"DeviceFailedEnumeration",
    u"DeviceGeneralFailure", u"DeviceCausedOvercurrent", u"DeviceNotEnoughPower",
};

// The name of the first row that fits.
template <class Rows, class Fits>
std::u16string_view Find(const Rows& rows, std::u16string_view otherwise, Fits fits) noexcept {
  const auto* const row = std::find_if(std::begin(rows), std::end(rows), fits);
  return row == std::end(rows) ? otherwise : row->Name;
}

}  // namespace

std::span<const VendorRow> VendorTable() noexcept { return kVendors; }

std::optional<std::u16string_view> VendorName(std::uint16_t vendorId) noexcept {
  // A scan from the first row up to the closing one, on purpose although the
  // ids ascend: a name is asked for once per dumped device, and no order of the
  // rows can make the scan miss one. The closing row has no name to give: id 0
  // finds none.
  for (const VendorRow* row = kVendors; row->Id != 0; ++row) {
    if (row->Id == vendorId) return row->Name;
  }
  return std::nullopt;
}

std::u16string_view UsbClassName(std::uint8_t classCode) noexcept {
  return Find(kClasses, u"Unknown", [=](const ClassRow& row) { return row.Class == classCode; });
}

std::u16string_view UsbSubClassName(std::uint8_t classCode, std::uint8_t subClass) noexcept {
  return Find(kSubClasses, {}, [=](const SubClassRow& row) {
    return row.Class == classCode && row.SubClass == subClass;
  });
}

std::u16string_view UsbProtocolName(std::uint8_t classCode, std::uint8_t subClass,
                                    std::uint8_t protocol) noexcept {
  return Find(kProtocols, {}, [=](const ProtocolRow& row) {
    return row.Class == classCode && row.Protocol == protocol &&
           (row.SubClass == kAnySubClass || row.SubClass == subClass);
  });
}

std::u16string_view ConnectionStatusName(std::uint32_t status) noexcept {
  return status < std::size(kConnectionStatus) ? kConnectionStatus[status] : u"(unknown)";
}

}  // namespace KelvoUHW
