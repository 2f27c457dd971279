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
    machine.volumes.push_back({u"\\\\?\\Volume{0000}\\", u"", {}, std::nullopt, kDRIVE_CDROM, false, {}});
    return machine;
  }

  SimulatedPc pc{WithEmptySlot()};
};

TEST_F(VolumesTest, SearchesAreSnapshots) {
  char16_t name[64];
  FindHandle search = 7;
  EXPECT_EQ(Error(pc.FirstVolume(name, 21, search)), kERROR_FILENAME_EXCED_RANGE);
  EXPECT_EQ(search, kInvalidHandle);
  ASSERT_TRUE(pc.FirstVolume(name, 64, search));
  EXPECT_EQ(Text(name), kSystemVolumeName);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  EXPECT_EQ(Error(pc.NextVolume(search, name, 21)), kERROR_FILENAME_EXCED_RANGE);
  ASSERT_TRUE(pc.NextVolume(search, name, 22)) << "a name that did not fit is not skipped";
  EXPECT_EQ(Text(name), kStickVolumeName);
  ASSERT_TRUE(pc.NextVolume(search, name, 64));
  EXPECT_EQ(Error(pc.NextVolume(search, name, 64)), kERROR_NO_MORE_FILES);
  EXPECT_EQ(Error(pc.NextMountPoint(search, name, 64)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(Error(pc.CloseMountPointSearch(search)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Open().searches, 1u);
  EXPECT_TRUE(pc.CloseVolumeSearch(search));
  EXPECT_EQ(pc.Misuses(), std::vector<Text>{u"close of volume search as mount-point search"});
  EXPECT_EQ(Error(SimulatedPc(Machine{}).FirstVolume(name, 64, search)), kERROR_NO_MORE_FILES);
}

TEST_F(VolumesTest, MountPoints) {
  char16_t folder[64];
  FindHandle search = 7;
  EXPECT_EQ(Error(pc.FirstMountPoint(kStickVolumeName, folder, 64, search)), kERROR_NO_MORE_FILES);
  EXPECT_EQ(search, kInvalidHandle);
  EXPECT_EQ(Error(pc.FirstMountPoint(u"\\\\?\\Volume{9}\\", folder, 64, search)), kERROR_FILE_NOT_FOUND);
  ASSERT_TRUE(pc.FirstMountPoint(kSystemVolumeName, folder, 64, search));
  EXPECT_EQ(Text(folder), u"Mount\\Stick\\");
  EXPECT_EQ(Error(pc.NextMountPoint(search, folder, 64)), kERROR_NO_MORE_FILES);
  EXPECT_EQ(pc.OpenNames(), std::vector<Text>{Text(u"mount-point search ") + kSystemVolumeName});
  EXPECT_TRUE(pc.CloseMountPointSearch(search));
}

TEST_F(VolumesTest, ListsAtEverySize) {
  const Text paths(u"E:\\\0C:\\Mount\\Stick\\\0\0", 21);
  const Text drives(u"C:\\\0E:\\\0F:\\\0\0", 13);  // by letter, whatever the file's order
  for (std::uint32_t size = 0; size <= 22; ++size) {
    SCOPED_TRACE(size);
    Text buffer(22, u'?');
    std::uint32_t required = 0;
    const Status status = pc.VolumePathNames(kStickVolumeName, size == 0 ? nullptr : buffer.data(), size, required);
    EXPECT_EQ(required, 21u);
    EXPECT_EQ(Error(status), size >= 21 ? 0 : kERROR_MORE_DATA);
    EXPECT_EQ(buffer, status ? paths + u'?' : Text(22, u'?'));

    buffer.assign(22, u'?');
    EXPECT_EQ(pc.LogicalDriveStrings(size, buffer.data()), size >= 13 ? 12u : 13u);
    EXPECT_EQ(buffer, size >= 13 ? drives + Text(9, u'?') : Text(22, u'?'));
  }
  std::uint32_t required = 77;
  char16_t text[64] = u"???";
  EXPECT_EQ(Error(pc.VolumePathNames(u"\\\\?\\Volume{9}\\", text, 4, required)), kERROR_FILE_NOT_FOUND);
  EXPECT_EQ(Error(pc.VolumePathNames(u"\\\\?\\Volume{0000}", text, 4, required)), kERROR_INVALID_NAME);
  EXPECT_EQ(required, 77u);
  ASSERT_TRUE(pc.VolumePathNames(u"\\\\?\\Volume{0000}\\", text, 4, required));
  EXPECT_EQ(required, 1u);
  EXPECT_EQ(text[0], u'\0');

  ASSERT_TRUE(pc.DosDeviceTarget(u"e:", text, 64));
  EXPECT_EQ(Text(text, 25), Text(u"\\Device\\HarddiskVolume5\0\0", 25)) << "the list ends with an empty text";
  EXPECT_EQ(Error(pc.DosDeviceTarget(u"E:", text, 24)), kERROR_INSUFFICIENT_BUFFER);
  EXPECT_TRUE(pc.DosDeviceTarget(u"E:", text, 25));
  for (const char16_t* name : {u"F:", u"G:", u"E:\\", u"E", u""}) {
    EXPECT_EQ(Error(pc.DosDeviceTarget(name, text, 64)), kERROR_FILE_NOT_FOUND) << ToUtf8(name);
  }
}

// What each place is: its volume, its drive type, whether its volume can be read.
TEST_F(VolumesTest, Places) {
  const struct {
    Text place;
    std::uint32_t nameError;
    Text volume;
    std::uint32_t driveType, informationError;
  } kCases[] = {{u"c:\\", 0, kSystemVolumeName, kDRIVE_FIXED, 0},
                {u"E:\\", 0, kStickVolumeName, kDRIVE_REMOVABLE, 0},
                {u"C:\\mount\\stick\\", 0, kStickVolumeName, kDRIVE_REMOVABLE, 0},
                {u"C:\\Mount\\Stick\\Below\\", kERROR_FILE_NOT_FOUND, u"?", kDRIVE_REMOVABLE, 144},
                {u"C:\\Mount\\", kERROR_FILE_NOT_FOUND, u"?", kDRIVE_FIXED, 144},
                {kStickVolumeName, 0, kStickVolumeName, kDRIVE_REMOVABLE, 0},
                {Text(kStickVolumePath) + u"\\", 0, kStickVolumeName, kDRIVE_REMOVABLE, 0},
                {kStickVolumePath, kERROR_INVALID_NAME, u"?", kDRIVE_NO_ROOT_DIR, kERROR_INVALID_NAME},
                {Text(kDiskPath) + u"\\", kERROR_FILE_NOT_FOUND, u"?", kDRIVE_NO_ROOT_DIR, 3},
                {u"E:", kERROR_INVALID_NAME, u"?", kDRIVE_NO_ROOT_DIR, kERROR_INVALID_NAME},
                {u"F:\\", kERROR_FILE_NOT_FOUND, u"?", kDRIVE_REMOVABLE, kERROR_NOT_READY},
                {u"\\\\?\\Volume{0000}\\", 0, u"\\\\?\\Volume{0000}\\", kDRIVE_CDROM, kERROR_NOT_READY},
                {u"G:\\Folder\\", kERROR_FILE_NOT_FOUND, u"?", kDRIVE_NO_ROOT_DIR, 3},
                {u"\\", kERROR_FILE_NOT_FOUND, u"?", kDRIVE_NO_ROOT_DIR, 3},
                {u"", kERROR_INVALID_NAME, u"?", kDRIVE_NO_ROOT_DIR, kERROR_INVALID_NAME}};
  char16_t name[64];
  std::uint32_t serial = 5, flags = 5;
  for (const auto& entry : kCases) {
    SCOPED_TRACE(ToUtf8(entry.place));
    const char16_t* place = entry.place.c_str();
    name[0] = u'?', name[1] = u'\0';
    EXPECT_EQ(Error(pc.VolumeNameForMountPoint(place, name, 64)), entry.nameError);
    EXPECT_EQ(Text(name), entry.volume);
    EXPECT_EQ(pc.DriveType(place), entry.driveType);
    serial = flags = 5;
    EXPECT_EQ(Error(pc.VolumeInformation(place, nullptr, 0, serial, flags, nullptr, 0)), entry.informationError);
    EXPECT_EQ(serial == 5 && flags == 5, entry.informationError != 0);
  }
  EXPECT_EQ(Error(pc.VolumeNameForMountPoint(u"E:\\", name, 21)), kERROR_FILENAME_EXCED_RANGE);
  EXPECT_TRUE(pc.VolumeNameForMountPoint(u"E:\\", name, 22));

  const struct {
    const char16_t* root;
    std::uint32_t serial, flags;
    Text fileSystem;
  } kVolumes[] = {{u"C:\\", 0xB4D87E32, kFILE_SUPPORTS_REPARSE_POINTS, u"NTFS"}, {u"E:\\", 0x3E9A61C7, 0, u"FAT32"}};
  for (const auto& entry : kVolumes) {
    char16_t label[8] = u"?", fileSystem[8] = u"?";
    ASSERT_TRUE(pc.VolumeInformation(entry.root, label, 8, serial, flags, fileSystem, 8));
    EXPECT_EQ(Text(label) + Text(fileSystem), entry.fileSystem) << "no label";
    EXPECT_EQ(serial, entry.serial);
    EXPECT_EQ(flags, entry.flags);
    EXPECT_FALSE(pc.VolumeInformation(entry.root, label, 8, serial, flags, fileSystem, 4));
  }
}

}  // namespace
}  // namespace platform::simulated
