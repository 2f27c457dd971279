// The record of a volume or disk: what it starts with, and its text dump.
#include "devinfo/interface_device.h"

#include <gtest/gtest.h>

#include "platform/text.h"

namespace KelvoUHW {
namespace {

TEST(InterfaceDevice, NamesOfDeviceTypes) {
  std::u16string names;
  for (std::uint8_t type = 0; type < 17; ++type) {
    names.append(StorageDeviceTypeName(type)).append(u"|");
  }
  EXPECT_EQ(names,
            u"Direct Access Device|Tape Device|Printer Device|Processor Device|WORM Device|"
            u"CDROM Device|Scanner Device|Optical Disk|Media Changer|Comm. Device|ASCIT8|ASCIT8|"
            u"Array Device|Enclosure Device|RBC Device|Unknown Device|Unknown Device|");
  EXPECT_EQ(StorageDeviceTypeName(255), u"Unknown Device");
}

std::string DumpOf(const CZKUMInterfaceDeviceImpl& record) {
  std::u16string out = u"before|\r\n";
  record.ToString(out, u"> ");
  return platform::ToUtf8(out);
}

// The text with "\r\n" for each "\n".
std::string Lines(std::string_view text) {
  std::string lines;
  for (const char c : text) lines += c == '\n' ? std::string("\r\n") : std::string(1, c);
  return lines;
}

TEST(InterfaceDevice, DumpOfADiskWhoseDescriptorIsNeverReceived) {
  CZKUMInterfaceDeviceImpl record;
  record.m_strDevInstId = u"USBSTOR\\DISK\\1";
  EXPECT_EQ(record.m_nType, KUDTInterfaceDevice);
  EXPECT_EQ(record.InterfaceData.cbSize, 28u);
  EXPECT_EQ(record.MountPoint(), u"");
  EXPECT_EQ(DumpOf(record), Lines(R"(before|
>  Interface ++++++++++++++++++++++++++++
> DevInstId            : USBSTOR\DISK\1
> devInstHandle        : -1
> devInstHandleParent  : -1
> Device Properties:
> Device Type         : 0x0 (Direct Access Device)
> Removable Media     : No
> Vendor ID           : 
> Product ID          : 
> Product Revision    : 
> DevicePath: 
> Volume serial number: -1
> devVolumeName   : 
childvector size0
ChildsToString End
)"));
}

TEST(InterfaceDevice, DumpOfAVolume) {
  CZKUMInterfaceDeviceImpl record;
  record.m_devInstHandle = record.m_devInstHandleParent = 0;
  record.m_strSerialNumber = u"4C53";
  record.MountPoints = {u"E:\\", u"C:\\Stick\\"};
  record.Detail = InterfaceDetail({6, 0, 0, 0, 0x5C, 0, 0x5C, 0, 0x3F, 0, 0x5C, 0, 0x73, 0});
  record.StorageVendorId = u"SanDisk ";
  record.StorageProductId = u"Cruzer";
  record.ProductRev = u"1.00";
  record.MediaSerialNumber = u"M-1";
  record.VolumeSerialNumber = 0x80000000;
  record.VolumeName = u"\\\\?\\Volume{1}\\";
  record.Descriptor[8] = 0x1F;
  record.Descriptor[9] = 0xAB;
  record.Descriptor[10] = 2;
  EXPECT_EQ(record.MountPoint(), u"E:\\");
  EXPECT_EQ(DumpOf(record), Lines(R"(before|
>  Interface ++++++++++++++++++++++++++++
> serial number        : 4C53
> Device Properties:
> Device Type         : 0x1F (Unknown Device)
> Device Modifier : 0xab
> Removable Media     : Yes
> Vendor ID           : SanDisk 
> Product ID          : Cruzer
> Product Revision    : 1.00
> Serial Number       : 4C53
> DevicePath: \\?\s
> Volume serial number: -2147483648
> MediaSerialNumber  : M-1
> devVolumeName   : \\?\Volume{1}\
> devMountPoint   : E:\
> devMountPoint   : C:\Stick\
childvector size0
ChildsToString End
)"));
}

}  // namespace
}  // namespace KelvoUHW
