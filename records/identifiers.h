// Texts that identify devices: instance ids, GUIDs, interface paths, PCI hardware ids.
//
// Nothing here fails loudly: a text that does not match leaves the unknown value. All functions may
// be called from every thread and throw std::bad_alloc only.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "platform/guid.h"
#include "platform/setup_api.h"

namespace KelvoUHW {

// An id that is not known; the interfaces show it as -1.
inline constexpr std::uint32_t kUnknownId = 0xFFFFFFFF;

// Whether `text` may be read as a string: the one check before a pointer into a text is used. It
// stands for a check that looks at no more than 512 characters, which is no limit to the length:
// null fails it, every pointer into a string that ends with a zero passes, however long the string
// is.
bool IsReadableText(const char16_t* text) noexcept;

// The identity of a record: what names its device, and what its instance id tells about it.
struct NodeIdentity {
  std::u16string m_strSerialNumber;
  std::u16string m_strDevInstId;
  std::u16string m_strVendor;
  std::u16string m_strProduct;
  std::uint32_t m_nVendorId = kUnknownId;
  std::uint32_t m_nProductId = kUnknownId;
  // Device-manager nodes of the device and of its parent; 0 means none.
  platform::DevInst m_devInstHandle = 0;
  platform::DevInst m_devInstHandleParent = 0;
  std::u16string m_strDevInstIdParent;

  // Stores the id and takes it apart.
  void SetInstanceId(std::u16string id);
  // Takes m_strDevInstId apart: VID_ and PID_, or VEN_ and PROD_, and the last component as serial
  // number. Writes only what it comes to: a part whose marker is missing ends the work, and what
  // lies behind keeps its earlier value.
  void ParseInstanceId();
  // An empty text keeps the serial number that is there: once known, it is not forgotten.
  void SetSerialNumber(std::u16string serialNumber);
  void SetParentInstanceId(std::u16string id) { m_strDevInstIdParent = std::move(id); }
};

// The hexadecimal number at the start of a text of `count` characters, scanned as "%x" scans:
// leading blanks, a sign and "0x" are taken, the scan ends at the first other character, digits
// beyond 32 bits push the upper ones out. kUnknownId when there is no digit.
std::uint32_t ParseHexField(const char16_t* text, std::size_t count) noexcept;

// A GUID in registry form. The first character, expected to be a brace, is skipped unseen. A text
// that is broken after its first groups gives those groups and zeros: this is deliberate.
platform::Guid ParseGuidText(const char16_t* text) noexcept;

// "USB#ROOT_HUB20#4&2f5a2f0&0#{...}" becomes "USB\ROOT_HUB20\4&2F5A2F0&0": cut at the last #, the
// other # turned into \, upper case. A \\?\ in front stays. Without # the result is empty.
std::u16string InterfacePathToInstanceId(const char16_t* path);

// The disk a volume of the volume manager lies on: the text (it may be empty) between "_??_" and
// "#{" in the volume's id with # turned into \. Nothing when a marker is missing or they stand the
// other way round.
std::optional<std::u16string> DiskIdOfVolumeId(std::u16string_view volumeId);

struct PciHardwareId {
  std::uint32_t VendorId = 0;
  std::uint32_t DeviceId = 0;
  std::uint32_t SubSysId = 0;
  std::uint32_t Revision = 0;
  bool Complete = false;  // all four were read
};

// Scans "PCI\VEN_%x&DEV_%x&SUBSYS_%x&REV_%x"; the letters must match exactly.
PciHardwareId ParsePciHardwareId(const char16_t* text) noexcept;

}  // namespace KelvoUHW
