#include <gtest/gtest.h>

#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "tests/platform/stick_pc.h"

namespace platform::simulated {
namespace {

constexpr std::uint32_t kERROR_FILENAME_EXCED_RANGE = 206;

class VolumesTest : public testing::Test {
 protected:
  static Machine WithEmptySlot() {
    Machine machine = StickMachine();
    machine.drives.push_back({u'F', kDRIVE_REMOVABLE, std::nullopt, u""});
    machine.volumes.push_back(
        {u"\\\\?\\Volume{0000}\\", u"", {}, std::nullopt, kDRIVE_CDROM, false, {}});
    return machine;
  }

  SimulatedPc pc{WithEmptySlot()};
};

TEST_F(VolumesTest, SearchesAreSnapshots) {
  char16_t name[64];
  FindHandle search = 7;
  EXPECT_EQ(pc.FirstVolume(name, 21, search).error, kERROR_FILENAME_EXCED_RANGE);
  EXPECT_EQ(search, kInvalidHandle);
  ASSERT_TRUE(pc.FirstVolume(name, 64, search));
  EXPECT_EQ(Text(name), kSystemVolumeName);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  EXPECT_EQ(pc.NextVolume(search, name, 21).error, kERROR_FILENAME_EXCED_RANGE);
  ASSERT_TRUE(pc.NextVolume(search, name, 22)) << "a name that did not fit is not skipped";
  EXPECT_EQ(Text(name), kStickVolumeName);
  ASSERT_TRUE(pc.NextVolume(search, name, 64));
  EXPECT_EQ(pc.NextVolume(search, name, 64).error, kERROR_NO_MORE_FILES);
  EXPECT_EQ(pc.NextMountPoint(search, name, 64).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.CloseMountPointSearch(search).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Open().searches, 1u);
  EXPECT_TRUE(pc.CloseVolumeSearch(search));
  EXPECT_EQ(pc.Misuses(), std::vector<Text>{u"close of volume search as mount-point search"});
  SimulatedPc empty{Machine{}};
  EXPECT_EQ(empty.FirstVolume(name, 64, search).error, kERROR_NO_MORE_FILES);
}

TEST_F(VolumesTest, MountPoints) {
  char16_t folder[64];
  FindHandle search = 7;
  EXPECT_EQ(pc.FirstMountPoint(kStickVolumeName, folder, 64, search).error, kERROR_NO_MORE_FILES);
  EXPECT_EQ(search, kInvalidHandle);
  EXPECT_EQ(pc.FirstMountPoint(u"\\\\?\\Volume{9}\\", folder, 64, search).error,
            kERROR_FILE_NOT_FOUND);
  ASSERT_TRUE(pc.FirstMountPoint(kSystemVolumeName, folder, 64, search));
  EXPECT_EQ(Text(folder), u"Mount\\Stick\\");
  EXPECT_EQ(pc.NextMountPoint(search, folder, 64).error, kERROR_NO_MORE_FILES);
  EXPECT_EQ(pc.OpenNames(), std::vector<Text>{Text(u"mount-point search ") + kSystemVolumeName});
  EXPECT_TRUE(pc.CloseMountPointSearch(search));
}

TEST_F(VolumesTest, PathNamesAtEverySize) {
  const Text list(u"E:\\\0C:\\Mount\\Stick\\\0\0", 21);
  for (std::uint32_t size = 0; size <= 22; ++size) {
    Text buffer(size, u'?');
    std::uint32_t required = 0;
    const Status status =
        pc.VolumePathNames(kStickVolumeName, size == 0 ? nullptr : buffer.data(), size, required);
    EXPECT_EQ(required, 21u);
    EXPECT_EQ(status.ok, size >= 21);
    if (!status) {
      EXPECT_EQ(status.error, kERROR_MORE_DATA);
    }
    EXPECT_EQ(buffer.substr(0, 21), status ? list : Text(size, u'?'));
  }
  std::uint32_t required = 77;
  char16_t text[4] = u"???";
  EXPECT_EQ(pc.VolumePathNames(u"\\\\?\\Volume{9}\\", text, 4, required).error,
            kERROR_FILE_NOT_FOUND);
  EXPECT_EQ(pc.VolumePathNames(u"\\\\?\\Volume{0000}", text, 4, required).error,
            kERROR_INVALID_NAME);
  EXPECT_EQ(required, 77u);
  ASSERT_TRUE(pc.VolumePathNames(u"\\\\?\\Volume{0000}\\", text, 4, required));
  EXPECT_EQ(required, 1u);
  EXPECT_EQ(text[0], u'\0');
}

// What each place is: its volume, its drive type, whether its volume can be read.
TEST_F(VolumesTest, Places) {
  const struct {
    Text place;
    Text volume;
    std::uint32_t nameError;
    std::uint32_t driveType;
    std::uint32_t informationError;
  } kCases[] = {
      {u"c:\\", kSystemVolumeName, 0, kDRIVE_FIXED, 0},
      {u"E:\\", kStickVolumeName, 0, kDRIVE_REMOVABLE, 0},
      {u"C:\\mount\\stick\\", kStickVolumeName, 0, kDRIVE_REMOVABLE, 0},
      {u"C:\\Mount\\Stick\\Below\\", u"", kERROR_FILE_NOT_FOUND, kDRIVE_REMOVABLE, 144},
      {u"C:\\Mount\\", u"", kERROR_FILE_NOT_FOUND, kDRIVE_FIXED, 144},
      {kStickVolumeName, kStickVolumeName, 0, kDRIVE_REMOVABLE, 0},
      {Text(kStickVolumePath) + u"\\", kStickVolumeName, 0, kDRIVE_REMOVABLE, 0},
      {kStickVolumePath, u"", kERROR_INVALID_NAME, kDRIVE_NO_ROOT_DIR, kERROR_INVALID_NAME},
      {Text(kDiskPath) + u"\\", u"", kERROR_FILE_NOT_FOUND, kDRIVE_NO_ROOT_DIR, 3},
      {u"E:", u"", kERROR_INVALID_NAME, kDRIVE_NO_ROOT_DIR, kERROR_INVALID_NAME},
      {u"F:\\", u"", kERROR_FILE_NOT_FOUND, kDRIVE_REMOVABLE, kERROR_NOT_READY},
      {u"\\\\?\\Volume{0000}\\", u"\\\\?\\Volume{0000}\\", 0, kDRIVE_CDROM, kERROR_NOT_READY},
      {u"G:\\", u"", kERROR_FILE_NOT_FOUND, kDRIVE_NO_ROOT_DIR, 3},
      {u"G:\\Folder\\", u"", kERROR_FILE_NOT_FOUND, kDRIVE_NO_ROOT_DIR, 3},
      {u"\\", u"", kERROR_FILE_NOT_FOUND, kDRIVE_NO_ROOT_DIR, 3},
      {u"", u"", kERROR_INVALID_NAME, kDRIVE_NO_ROOT_DIR, kERROR_INVALID_NAME},
  };
  for (const auto& entry : kCases) {
    SCOPED_TRACE(ToUtf8(entry.place));
    char16_t name[64] = u"?";
    const Status named = pc.VolumeNameForMountPoint(entry.place.c_str(), name, 64);
    EXPECT_EQ(named.error, entry.nameError);
    EXPECT_EQ(named.ok, entry.nameError == 0);
    EXPECT_EQ(Text(name), named ? entry.volume : u"?");
    EXPECT_EQ(pc.DriveType(entry.place.c_str()), entry.driveType);
    std::uint32_t serial = 5;
    std::uint32_t flags = 5;
    const Status read =
        pc.VolumeInformation(entry.place.c_str(), nullptr, 0, serial, flags, nullptr, 0);
    EXPECT_EQ(read.error, entry.informationError);
    EXPECT_EQ(read.ok, entry.informationError == 0);
    if (!read) {
      EXPECT_EQ(serial, 5u);
    }
  }
  char16_t name[64];
  EXPECT_EQ(pc.VolumeNameForMountPoint(u"E:\\", name, 21).error, kERROR_FILENAME_EXCED_RANGE);
  EXPECT_TRUE(pc.VolumeNameForMountPoint(u"E:\\", name, 22));
}

TEST_F(VolumesTest, Information) {
  const struct {
    const char16_t* root;
    std::uint32_t serial, flags;
    const char16_t* fileSystem;
  } kCases[] = {{u"C:\\", 0xB4D87E32, kFILE_SUPPORTS_REPARSE_POINTS, u"NTFS"},
                {u"E:\\", 0x3E9A61C7, 0, u"FAT32"}};
  for (const auto& entry : kCases) {
    char16_t label[8] = u"?";
    char16_t fileSystem[8] = u"?";
    std::uint32_t serial = 0;
    std::uint32_t flags = 99;
    ASSERT_TRUE(pc.VolumeInformation(entry.root, label, 8, serial, flags, fileSystem, 8));
    EXPECT_EQ(Text(label), u"");
    EXPECT_EQ(serial, entry.serial);
    EXPECT_EQ(flags, entry.flags);
    EXPECT_EQ(Text(fileSystem), entry.fileSystem);
    EXPECT_FALSE(pc.VolumeInformation(entry.root, label, 8, serial, flags, fileSystem, 4));
  }
}

TEST_F(VolumesTest, Drives) {
  const Text list(u"C:\\\0E:\\\0F:\\\0\0", 13);  // by letter, whatever the file's order
  for (std::uint32_t size = 0; size <= 14; ++size) {
    Text buffer(size, u'?');
    const std::uint32_t result = pc.LogicalDriveStrings(size, buffer.data());
    EXPECT_EQ(result, size >= 13 ? 12u : 13u) << size;
    EXPECT_EQ(buffer.substr(0, 13), size >= 13 ? list : Text(size, u'?')) << size;
  }
  char16_t target[64];
  ASSERT_TRUE(pc.DosDeviceTarget(u"e:", target, 64));
  EXPECT_EQ(Text(target), u"\\Device\\HarddiskVolume5");
  EXPECT_EQ(target[24], u'\0') << "the list ends with an empty text";
  EXPECT_EQ(pc.DosDeviceTarget(u"E:", target, 24).error, kERROR_INSUFFICIENT_BUFFER);
  EXPECT_TRUE(pc.DosDeviceTarget(u"E:", target, 25));
  for (const char16_t* name : {u"F:", u"G:", u"E:\\", u"E", u""}) {
    EXPECT_EQ(pc.DosDeviceTarget(name, target, 64).error, kERROR_FILE_NOT_FOUND) << ToUtf8(name);
  }
}

}  // namespace
}  // namespace platform::simulated
