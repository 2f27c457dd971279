// The record of a volume or disk: what it starts with, and its text dump.
#include "records/interface_device.h"

#include <gtest/gtest.h>

#include <cstring>
#include <tuple>

#include "platform/wrappers/intercepting_host.h"
#include "records/device_set.h"
#include "simulation/pc/simulated_pc.h"
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
  volume.Descriptor = {0, 0, 0, 0, 0, 0, 0, 0, 0x1F, 0xAB, 2};
  EXPECT_EQ(volume.MountPoint(), u"E:\\");
  std::u16string dump = u"before|\r\n";
  volume.ToString(dump, u"> ");
  EXPECT_EQ(platform::ToUtf8(dump), Golden("interface-device"));
}

// Tells a path that takes so many bytes with what stands before it.
struct LongPaths final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  platform::Status BeforeCall(const platform::wrappers::HostCall&) noexcept override { return {}; }
  platform::Status GetDeviceInterfaceDetail(platform::DeviceSetHandle, const platform::SP_DEVICE_INTERFACE_DATA&,
                                            void* detail, std::uint32_t bytes, std::uint32_t* required,
                                            platform::SP_DEVINFO_DATA*) noexcept override {
    ++calls;
    *required = needed;
    if (bytes < needed || refuses) return platform::Status::Failure(platform::kERROR_INSUFFICIENT_BUFFER);
    for (std::uint32_t at = platform::kInterfaceDetailPathOffset; at < needed; at += sizeof(char16_t)) {
      const char16_t unit = at + sizeof unit < needed ? u'x' : u'\0';
      std::memcpy(static_cast<char*>(detail) + at, &unit, sizeof unit);
    }
    return platform::Status::Success();
  }
  std::uint32_t needed = 0, calls = 0;
  bool refuses = false;  // whatever the size
};

TEST(InterfaceDetail, IsAskedForAgainWhereThePathIsLong) {
  platform::simulated::SimulatedPc pc{platform::simulated::Machine()};
  constexpr std::uint32_t kMost = 1 << 17;
  const std::tuple<std::uint32_t, std::uint32_t, bool> cases[] = {
      {6, 1, true}, {1024, 1, true}, {1026, 2, true}, {kMost, 2, true}, {kMost + 2, 1, false}};
  for (const auto& [needed, calls, told] : cases) {
    LongPaths host(pc);
    host.needed = needed;
    platform::Status status;
    const InterfaceDetail detail = ReadInterfaceDetail(host, 1, {}, nullptr, status);
    EXPECT_EQ(detail.DevicePath(), std::u16string(told ? needed / 2 - 3 : 0, u'x')) << needed;
    EXPECT_EQ(host.calls, calls) << needed;
    EXPECT_EQ(static_cast<bool>(status), told) << needed;
  }
  LongPaths refusing(pc);
  refusing.needed = 1024;
  refusing.refuses = true;
  platform::Status status;
  EXPECT_FALSE(ReadInterfaceDetail(refusing, 1, {}, nullptr, status));
  EXPECT_EQ(refusing.calls, 1u) << "it is told no other size";
  // The shared query asks for nothing without a set, an interface and an element to fill.
  const platform::SP_DEVICE_INTERFACE_DATA data{};
  platform::SP_DEVINFO_DATA element;
  LongPaths host(pc);
  host.needed = 8;
  for (const int missing : {1, 2, 3, 0}) {
    const InterfaceDetail detail = GetInterfaceDetail(host, host, missing == 1 ? 0 : 1, missing == 2 ? nullptr : &data,
                                                      missing == 3 ? nullptr : &element);
    EXPECT_EQ(detail.DevicePath(), missing == 0 ? u"x" : u"") << missing;
    EXPECT_EQ(host.calls, missing == 0 ? 1u : 0u) << missing;
  }
}

}  // namespace
}  // namespace KelvoUHW
