// Drives and volumes of the system the tests run on, and files in place of devices.
#include <gmock/gmock.h>

#include <array>
#include <functional>
#include <set>
#include <string>

#include "devinfo/disk_letters.h"
#include "devinfo/volume_table.h"
#include "platform/storage_ioctl.h"
#include "platform/text.h"
#include "platform/usb_ioctl.h"
#include "platform/windows/windows_host.h"

namespace platform::windows {
namespace {

using testing::Contains;

constexpr char16_t kSystemRoot[] = u"C:\\";
constexpr char16_t kSystemFile[] = u"C:\\windows\\win.ini";

struct Name {
  std::array<char16_t, 260> chars{};
  char16_t* Data() { return chars.data(); }
  std::uint32_t Size() const { return static_cast<std::uint32_t>(chars.size()); }
  std::u16string Text() const { return std::u16string(UpToZero({chars.data(), chars.size()})); }
};

TEST(Volumes, OfTheSystemDriveAgreeWithEachOther) {
  WindowsHost host;
  EXPECT_EQ(host.DriveType(kSystemRoot), kDRIVE_FIXED);
  EXPECT_THAT(KelvoUHW::ReadDriveRoots(host), Contains(kSystemRoot));

  Name volume;
  ASSERT_TRUE(host.VolumeNameForMountPoint(kSystemRoot, volume.Data(), volume.Size()));
  EXPECT_TRUE(volume.Text().starts_with(u"\\\\?\\Volume{"));
  EXPECT_TRUE(volume.Text().ends_with(u"}\\"));

  std::array<char16_t, 512> paths{};
  std::uint32_t required = 0;
  ASSERT_TRUE(host.VolumePathNames(volume.Data(), paths.data(), 512, required));
  EXPECT_EQ(UpToZero({paths.data(), required}), kSystemRoot);

  std::set<std::u16string> found;
  Name name;
  FindHandle search = kInvalidHandle;
  ASSERT_TRUE(host.FirstVolume(name.Data(), name.Size(), search));
  Status status;
  do {
    EXPECT_TRUE(found.insert(name.Text()).second) << "told twice";
    status = host.NextVolume(search, name.Data(), name.Size());
  } while (status);
  EXPECT_EQ(status.error, kERROR_NO_MORE_FILES);
  EXPECT_TRUE(host.CloseVolumeSearch(search));
  EXPECT_THAT(found, Contains(volume.Text()));

  Name target;
  ASSERT_TRUE(host.DosDeviceTarget(u"C:", target.Data(), target.Size()));
  EXPECT_TRUE(target.Text().starts_with(u"\\Device\\"));

  const KelvoUHW::VolumeTable table = KelvoUHW::BuildVolumeTable(host);
  ASSERT_TRUE(table.VolumeOfPath.contains(kSystemRoot));
  EXPECT_EQ(table.VolumeOfPath.at(kSystemRoot), volume.Text());
  // A fixed drive: its letter is left out.
  std::vector<std::u16string> mountPoints{u"old"};
  KelvoUHW::MountPointFinder(host).FindMountPoints(volume.Text(), mountPoints);
  EXPECT_TRUE(mountPoints.empty());
}

TEST(Volumes, TellTheirSizesAndFileSystems) {
  WindowsHost host;
  std::array<char16_t, 512> roots{};
  const std::uint32_t written = host.LogicalDriveStrings(512, roots.data());
  ASSERT_GE(written, 4u);
  EXPECT_EQ(host.LogicalDriveStrings(2, roots.data()), written + 1);
  std::uint32_t serial = 0;
  std::uint32_t flags = 0;
  Name fileSystem;
  EXPECT_TRUE(host.VolumeInformation(kSystemRoot, nullptr, 0, serial, flags, fileSystem.Data(), fileSystem.Size()));
  EXPECT_NE(fileSystem.Text(), u"");
  EXPECT_NE(flags, 0u);
}

// Every call that fails says why, and a failed one that opens something leaves the invalid handle.
TEST(Failures, SayWhyAndLeaveNoHandle) {
  WindowsHost host;
  Name name;
  std::uint32_t number = 0;
  struct Case {
    const char* what;
    std::function<Status(std::intptr_t&)> call;
    bool opens = false;
  };
  const Case cases[] = {
      {"a controller that is not there",
       [&](auto& handle) { return host.OpenDevice(u"\\\\.\\HCD9", kGENERIC_WRITE, kFILE_SHARE_WRITE, handle); }, true},
      {"the mount points of no volume",
       [&](auto& handle) { return host.FirstMountPoint(u"\\\\?\\Volume{0}\\", name.Data(), name.Size(), handle); },
       true},
      {"a mount point without its backslash",
       [&](auto&) { return host.VolumeNameForMountPoint(u"C:", name.Data(), name.Size()); }},
      {"a buffer that is too small for a volume's name",
       [&](auto&) { return host.VolumeNameForMountPoint(kSystemRoot, name.Data(), 10); }},
      {"a DOS name that is not there",
       [&](auto&) { return host.DosDeviceTarget(u"NoSuchDevice:", name.Data(), name.Size()); }},
      {"the path names of no volume",
       [&](auto&) { return host.VolumePathNames(u"\\\\?\\Volume{0}\\", name.Data(), name.Size(), number); }},
      {"the information of a drive that is not there",
       [&](auto&) { return host.VolumeInformation(u"Q:\\", nullptr, 0, number, number, nullptr, 0); }},
  };
  for (const Case& c : cases) {
    std::intptr_t handle = 77;
    const Status status = c.call(handle);
    EXPECT_FALSE(status) << c.what;
    EXPECT_NE(status.error, 0u) << c.what;
    EXPECT_EQ(handle, c.opens ? kInvalidHandle : 77) << c.what;
  }
}

TEST(Files, AreOpenedAskedAndClosedOnce) {
  WindowsHost host;
  FileHandle file = kInvalidHandle;
  ASSERT_TRUE(host.OpenDevice(kSystemFile, 0, kFILE_SHARE_READ | kFILE_SHARE_WRITE, file));
  std::array<std::uint8_t, 64> out{};
  std::uint32_t returned = 77;
  EXPECT_FALSE(host.DeviceControl(file, kIOCTL_USB_GET_ROOT_HUB_NAME, nullptr, 0, out.data(), 64, returned));
  EXPECT_EQ(returned, 0u);
  EXPECT_TRUE(host.CloseDevice(file));
  EXPECT_EQ(host.CloseDevice(file).error, kERROR_INVALID_HANDLE);

  FileHandle drive = kInvalidHandle;
  ASSERT_TRUE(host.OpenDevice(u"\\\\.\\C:", 0, kFILE_SHARE_READ | kFILE_SHARE_WRITE, drive));
  STORAGE_DEVICE_NUMBER number{77, 77, 77};
  EXPECT_TRUE(
      host.DeviceControl(drive, kIOCTL_STORAGE_GET_DEVICE_NUMBER, nullptr, 0, &number, sizeof number, returned));
  EXPECT_EQ(returned, sizeof number);
  EXPECT_EQ(number.DeviceType, 7u) << "a disk";
  EXPECT_TRUE(host.CloseDevice(drive));
  // Nobody reads it here; it only may not harm.
  host.WriteDebugText(u"a text for a debugger\n");

  // Whatever the drives of this PC answer, looking for the letters of a disk ends.
  KelvoUHW::CZKUMInterfaceDeviceImpl disk;
  disk.m_strDevInstId = u"USBSTOR\\DISK\\NOT_HERE";
  std::vector<std::u16string> roots;
  KelvoUHW::DiskLetterFinder(host).FindDriveLettersForDisk(disk, roots);
  EXPECT_TRUE(roots.empty());
}

}  // namespace
}  // namespace platform::windows
