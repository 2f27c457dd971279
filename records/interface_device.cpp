#include "records/interface_device.h"

#include <algorithm>
#include <array>
#include <cstring>

#include "platform/text.h"
#include "records/devnode.h"

namespace KelvoUHW {
namespace {

constexpr std::array<std::u16string_view, 16> kDeviceTypeNames{
    u"Direct Access Device",
    u"Tape Device",
    u"Printer Device",
    u"Processor Device",
    u"WORM Device",
    u"CDROM Device",
    u"Scanner Device",
    u"Optical Disk",
    u"Media Changer",
    u"Comm. Device",
    // Deliberate: types 10 and 11 share one name.
    u"ASCIT8",
    u"ASCIT8",
    u"Array Device",
    u"Enclosure Device",
    u"RBC Device",
    u"Unknown Device",
};

}  // namespace

std::u16string_view StorageDeviceTypeName(std::uint8_t deviceType) noexcept {
  return kDeviceTypeNames[std::min<std::size_t>(deviceType, kDeviceTypeNames.size() - 1)];
}

CZKUMInterfaceDeviceImpl::CZKUMInterfaceDeviceImpl() noexcept
    : CZKUMUsbTreeNodeImpl(KUDTInterfaceDevice) {
  m_devInstHandle = kUnknownDevInst;
  m_devInstHandleParent = kUnknownDevInst;
  InterfaceData.cbSize = sizeof InterfaceData;
}

platform::STORAGE_DEVICE_DESCRIPTOR CZKUMInterfaceDeviceImpl::DescriptorHeader() const noexcept {
  platform::STORAGE_DEVICE_DESCRIPTOR header{};
  if (!Descriptor.empty()) {
    std::memcpy(&header, Descriptor.data(), std::min(sizeof header, Descriptor.size()));
  }
  return header;
}

void CZKUMInterfaceDeviceImpl::DevicePropertiesToString(std::u16string& out,
                                                        const std::u16string& indent) const {
  // Deliberate: the lines stand in every dump, also in that of a disk, whose descriptor is never
  // received and so reads as a fixed direct-access device without texts.
  const platform::STORAGE_DEVICE_DESCRIPTOR header = DescriptorHeader();
  AppendLine(out, indent, u"Device Properties:");
  AppendLineOf(out, indent, u"Device Type         : 0x", platform::Hex(header.DeviceType), u" (",
               StorageDeviceTypeName(header.DeviceType), u")");
  if (header.DeviceTypeModifier != 0) {
    AppendLine(out, indent, u"Device Modifier : 0x", platform::HexLower(header.DeviceTypeModifier));
  }
  AppendLine(out, indent, u"Removable Media     : ", header.RemovableMedia != 0 ? u"Yes" : u"No");
  AppendLine(out, indent, u"Vendor ID           : ", StorageVendorId);
  AppendLine(out, indent, u"Product ID          : ", StorageProductId);
  AppendLine(out, indent, u"Product Revision    : ", ProductRev);
  if (!m_strSerialNumber.empty()) {
    AppendLine(out, indent, u"Serial Number       : ", m_strSerialNumber);
  }
}

void CZKUMInterfaceDeviceImpl::OwnLines(std::u16string& out, const std::u16string& indent) const {
  AppendLine(out, indent, u" Interface ++++++++++++++++++++++++++++");
  BaseToString(out, indent);
  DevicePropertiesToString(out, indent);
  AppendLine(out, indent, u"DevicePath: ", DevicePath());
  // Deliberate: the number is printed signed, so an unknown one reads -1.
  AppendLine(out, indent, u"Volume serial number: ",
             platform::Decimal(static_cast<std::int32_t>(VolumeSerialNumber)));
  if (!MediaSerialNumber.empty()) {
    AppendLine(out, indent, u"MediaSerialNumber  : ", MediaSerialNumber);
  }
  AppendLine(out, indent, u"devVolumeName   : ", VolumeName);
  for (const std::u16string& mountPoint : MountPoints) {
    AppendLine(out, indent, u"devMountPoint   : ", mountPoint);
  }
}

}  // namespace KelvoUHW
