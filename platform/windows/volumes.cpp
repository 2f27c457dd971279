#include "platform/windows/native_types.h"
#include "platform/windows/windows_host.h"

namespace platform::windows {

static_assert(kDRIVE_UNKNOWN == DRIVE_UNKNOWN && kDRIVE_NO_ROOT_DIR == DRIVE_NO_ROOT_DIR &&
              kDRIVE_REMOVABLE == DRIVE_REMOVABLE && kDRIVE_FIXED == DRIVE_FIXED &&
              kDRIVE_REMOTE == DRIVE_REMOTE && kDRIVE_CDROM == DRIVE_CDROM &&
              kDRIVE_RAMDISK == DRIVE_RAMDISK);
static_assert(kFILE_SUPPORTS_REPARSE_POINTS == FILE_SUPPORTS_REPARSE_POINTS);

Status WindowsHost::FirstVolume(char16_t* name, std::uint32_t nameChars,
                                FindHandle& search) noexcept {
  return TakeHandle(FindFirstVolumeW(Native(name), nameChars), search);
}

Status WindowsHost::NextVolume(FindHandle search, char16_t* name,
                               std::uint32_t nameChars) noexcept {
  return FromBool(FindNextVolumeW(Native(search), Native(name), nameChars));
}

Status WindowsHost::CloseVolumeSearch(FindHandle search) noexcept {
  return FromBool(FindVolumeClose(Native(search)));
}

Status WindowsHost::VolumePathNames(const char16_t* volumeName, char16_t* names,
                                    std::uint32_t namesChars, std::uint32_t& required) noexcept {
  return FromBool(GetVolumePathNamesForVolumeNameW(Native(volumeName), Native(names), namesChars,
                                                   Native(&required)));
}

Status WindowsHost::VolumeNameForMountPoint(const char16_t* mountPoint, char16_t* name,
                                            std::uint32_t nameChars) noexcept {
  return FromBool(GetVolumeNameForVolumeMountPointW(Native(mountPoint), Native(name), nameChars));
}

std::uint32_t WindowsHost::LogicalDriveStrings(std::uint32_t bufferChars,
                                               char16_t* buffer) noexcept {
  return GetLogicalDriveStringsW(bufferChars, Native(buffer));
}

std::uint32_t WindowsHost::DriveType(const char16_t* path) noexcept {
  return GetDriveTypeW(Native(path));
}

Status WindowsHost::VolumeInformation(const char16_t* path, char16_t* label,
                                      std::uint32_t labelChars, std::uint32_t& serial,
                                      std::uint32_t& fileSystemFlags, char16_t* fileSystem,
                                      std::uint32_t fileSystemChars) noexcept {
  DWORD longestName = 0;
  return FromBool(GetVolumeInformationW(Native(path), Native(label), labelChars, Native(&serial),
                                        &longestName, Native(&fileSystemFlags), Native(fileSystem),
                                        fileSystemChars));
}

Status WindowsHost::FirstMountPoint(const char16_t* volumeName, char16_t* mountPoint,
                                    std::uint32_t mountPointChars, FindHandle& search) noexcept {
  return TakeHandle(
      FindFirstVolumeMountPointW(Native(volumeName), Native(mountPoint), mountPointChars), search);
}

Status WindowsHost::NextMountPoint(FindHandle search, char16_t* mountPoint,
                                   std::uint32_t mountPointChars) noexcept {
  return FromBool(FindNextVolumeMountPointW(Native(search), Native(mountPoint), mountPointChars));
}

Status WindowsHost::CloseMountPointSearch(FindHandle search) noexcept {
  return FromBool(FindVolumeMountPointClose(Native(search)));
}

Status WindowsHost::DosDeviceTarget(const char16_t* name, char16_t* target,
                                    std::uint32_t targetChars) noexcept {
  return FromBool(QueryDosDeviceW(Native(name), Native(target), targetChars) != 0);
}

}  // namespace platform::windows
