// The USB vendors that the dumps know by name. The rows come from data/usb-vendors.tsv at build
// time.
//
// Public source: the vendor-id list of the USB Implementers Forum.
#pragma once

#include <cstdint>
#include <span>
#include <string_view>

namespace KelvoUHW {

struct VendorRow {
  std::uint16_t Id;
  std::u16string_view Name;
};

// The rows by ascending id, then the closing row {0, "End"}. Constant data: every thread may read
// it.
std::span<const VendorRow> VendorTable() noexcept;

}  // namespace KelvoUHW
