// The record of a volume or disk: what it starts with, and its text dump.
#include "records/interface_device.h"

#include <gtest/gtest.h>

#include "tests/support/outline.h"

namespace KelvoUHW {
namespace {

TEST(InterfaceDevice, NamesOfDeviceTypes) {
  std::u16string names;
  for (const int type : {0, 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16, 255}) {
    names.append(StorageDeviceTypeName(static_cast<std::uint8_t>(type))).append(u"|");
  }
  EXPECT_EQ(names,
            u"Direct Access Device|Tape Device|Printer Device|Processor Device|WORM Device|CDROM Device|"
            u"Scanner Device|Optical Disk|Media Changer|Comm. Device|ASCIT8|ASCIT8|Array Device|Enclosure Device|"
            u"RBC Device|Unknown Device|Unknown Device|Unknown Device|");
}

// The golden dumps of whole PCs show records of disks, whose descriptor is never received.
TEST(InterfaceDevice, DumpsWhatItHas) {
  EXPECT_EQ(CZKUMInterfaceDeviceImpl().InterfaceData.cbSize, sizeof(platform::SP_DEVICE_INTERFACE_DATA));
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
  std::u16string dump = u"before|\r\n";
  volume.ToString(dump, u"> ");
  EXPECT_EQ(platform::ToUtf8(dump), Golden("interface-device"));
}

}  // namespace
}  // namespace KelvoUHW
