// The record of a volume or disk: what it starts with, and its text dump.
#include "devinfo/interface_device.h"

#include <gtest/gtest.h>

namespace KelvoUHW {
namespace {

TEST(InterfaceDevice, NamesOfDeviceTypes) {
  std::u16string names;
  for (const unsigned type : {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 255}) {
    names.append(StorageDeviceTypeName(static_cast<std::uint8_t>(type))).append(u"|");
  }
  EXPECT_EQ(names,
            u"Direct Access Device|Tape Device|Printer Device|Processor Device|WORM Device|CDROM Device|"
            u"Scanner Device|Optical Disk|Media Changer|Comm. Device|ASCIT8|ASCIT8|Array Device|Enclosure Device|"
            u"RBC Device|Unknown Device|Unknown Device|Unknown Device|");
}

std::u16string DumpOf(const CZKUMInterfaceDeviceImpl& record) {
  std::u16string out = u"before|\r\n";
  record.ToString(out, u"> ");
  return out;
}

TEST(InterfaceDevice, Dumps) {
  CZKUMInterfaceDeviceImpl disk;  // its descriptor is never received
  disk.m_strDevInstId = u"USBSTOR\\DISK\\1";
  EXPECT_EQ(disk.m_nType, KUDTInterfaceDevice);
  EXPECT_EQ(disk.InterfaceData.cbSize, sizeof(platform::SP_DEVICE_INTERFACE_DATA));
  EXPECT_EQ(disk.MountPoint(), u"");
  EXPECT_EQ(DumpOf(disk),
            u"before|\r\n>  Interface ++++++++++++++++++++++++++++\r\n"
            u"> DevInstId            : USBSTOR\\DISK\\1\r\n"
            u"> devInstHandle        : -1\r\n> devInstHandleParent  : -1\r\n> Device Properties:\r\n"
            u"> Device Type         : 0x0 (Direct Access Device)\r\n> Removable Media     : No\r\n"
            u"> Vendor ID           : \r\n> Product ID          : \r\n> Product Revision    : \r\n"
            u"> DevicePath: \r\n> Volume serial number: -1\r\n> devVolumeName   : \r\n"
            u"childvector size0\r\nChildsToString End\r\n");
  CZKUMInterfaceDeviceImpl volume;
  volume.m_devInstHandle = volume.m_devInstHandleParent = 0;
  volume.m_strSerialNumber = u"4C53";
  volume.MountPoints = {u"E:\\", u"C:\\Stick\\"};
  volume.Detail = InterfaceDetail({6, 0, 0, 0, 0x5C, 0, 0x5C, 0, 0x3F, 0, 0x5C, 0, 0x73, 0});
  volume.StorageVendorId = u"SanDisk ";
  volume.StorageProductId = u"Cruzer";
  volume.ProductRev = u"1.00";
  volume.MediaSerialNumber = u"M-1";
  volume.VolumeSerialNumber = 0x80000000;
  volume.VolumeName = u"\\\\?\\Volume{1}\\";
  volume.Descriptor[8] = 0x1F;
  volume.Descriptor[9] = 0xAB;
  volume.Descriptor[10] = 2;
  EXPECT_EQ(volume.MountPoint(), u"E:\\");
  EXPECT_EQ(DumpOf(volume),
            u"before|\r\n>  Interface ++++++++++++++++++++++++++++\r\n> serial number        : 4C53\r\n"
            u"> Device Properties:\r\n> Device Type         : 0x1F (Unknown Device)\r\n"
            u"> Device Modifier : 0xab\r\n> Removable Media     : Yes\r\n> Vendor ID           : SanDisk \r\n"
            u"> Product ID          : Cruzer\r\n> Product Revision    : 1.00\r\n> Serial Number       : 4C53\r\n"
            u"> DevicePath: \\\\?\\s\r\n> Volume serial number: -2147483648\r\n> MediaSerialNumber  : M-1\r\n"
            u"> devVolumeName   : \\\\?\\Volume{1}\\\r\n> devMountPoint   : E:\\\r\n"
            u"> devMountPoint   : C:\\Stick\\\r\nchildvector size0\r\nChildsToString End\r\n");
}

}  // namespace
}  // namespace KelvoUHW
