// Owners of the system's handles: device-information sets, opened devices, searches.
#pragma once

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

#include "platform/host.h"

namespace KelvoUHW {

// Far beyond any PC: an enumeration that a system never ends is left there.
inline constexpr std::uint32_t kMostElements = 200'000;

// A device-information set, destroyed with its owner unless it is let go.
class DeviceSet {
 public:
  explicit DeviceSet(platform::DeviceSets& sets) noexcept : m_sets(sets) {}
  ~DeviceSet() { Reset(); }
  DeviceSet(const DeviceSet&) = delete;
  DeviceSet& operator=(const DeviceSet&) = delete;

  // Replaces the set by that of a class (null: all classes).
  platform::Status Open(const platform::Guid* classGuid, std::uint32_t flags) noexcept {
    Reset();
    return m_sets.GetClassDevs(classGuid, flags, m_handle);
  }
  platform::DeviceSetHandle Get() const noexcept { return m_handle; }
  // Gives the handle up without destroying the set.
  platform::DeviceSetHandle Release() noexcept {
    return std::exchange(m_handle, platform::kInvalidHandle);
  }
  void Reset() noexcept {
    if (m_handle != platform::kInvalidHandle) m_sets.DestroyDeviceInfoList(Release());
  }

 private:
  platform::DeviceSets& m_sets;
  platform::DeviceSetHandle m_handle = platform::kInvalidHandle;
};

// An opened device path, closed with its owner.
class DeviceFile {
 public:
  explicit DeviceFile(platform::DeviceIo& io) noexcept : m_io(io) {}
  ~DeviceFile() { Close(); }
  DeviceFile(const DeviceFile&) = delete;
  DeviceFile& operator=(const DeviceFile&) = delete;

  platform::Status Open(const std::u16string& path, std::uint32_t access,
                        std::uint32_t share) noexcept {
    Close();
    return m_io.OpenDevice(path.c_str(), access, share, m_handle);
  }
  platform::FileHandle Get() const noexcept { return m_handle; }
  void Close() noexcept {
    if (m_handle != platform::kInvalidHandle) {
      m_io.CloseDevice(std::exchange(m_handle, platform::kInvalidHandle));
    }
  }

 private:
  platform::DeviceIo& m_io;
  platform::FileHandle m_handle = platform::kInvalidHandle;
};

// A search over all volumes, closed with its owner. Names as platform::VolumeManager gives them.
class VolumeSearch {
 public:
  explicit VolumeSearch(platform::VolumeManager& volumes) noexcept : m_volumes(volumes) {}
  ~VolumeSearch() { Close(); }
  VolumeSearch(const VolumeSearch&) = delete;
  VolumeSearch& operator=(const VolumeSearch&) = delete;

  platform::Status First(char16_t* name, std::uint32_t nameChars) noexcept {
    Close();
    return m_volumes.FirstVolume(name, nameChars, m_handle);
  }
  platform::Status Next(char16_t* name, std::uint32_t nameChars) noexcept {
    return m_volumes.NextVolume(m_handle, name, nameChars);
  }
  void Close() noexcept {
    if (m_handle != platform::kInvalidHandle) {
      m_volumes.CloseVolumeSearch(std::exchange(m_handle, platform::kInvalidHandle));
    }
  }

 private:
  platform::VolumeManager& m_volumes;
  platform::FindHandle m_handle = platform::kInvalidHandle;
};

// A search over the folders of one volume in which others are mounted, closed with its owner.
class MountPointSearch {
 public:
  explicit MountPointSearch(platform::VolumeManager& volumes) noexcept : m_volumes(volumes) {}
  ~MountPointSearch() { Close(); }
  MountPointSearch(const MountPointSearch&) = delete;
  MountPointSearch& operator=(const MountPointSearch&) = delete;

  platform::Status First(const std::u16string& volumeName, char16_t* folder,
                         std::uint32_t folderChars) noexcept {
    Close();
    return m_volumes.FirstMountPoint(volumeName.c_str(), folder, folderChars, m_handle);
  }
  platform::Status Next(char16_t* folder, std::uint32_t folderChars) noexcept {
    return m_volumes.NextMountPoint(m_handle, folder, folderChars);
  }
  void Close() noexcept {
    if (m_handle != platform::kInvalidHandle) {
      m_volumes.CloseMountPointSearch(std::exchange(m_handle, platform::kInvalidHandle));
    }
  }

 private:
  platform::VolumeManager& m_volumes;
  platform::FindHandle m_handle = platform::kInvalidHandle;
};

// The detail record of a device interface: a size field and the device path.
class InterfaceDetail {
 public:
  InterfaceDetail() = default;
  // The record as it was received. Only the path is kept.
  explicit InterfaceDetail(const std::vector<std::uint8_t>& bytes);

  // The path, or an empty text where there is no detail.
  const std::u16string& DevicePath() const noexcept { return m_path; }
  explicit operator bool() const noexcept { return m_received; }

 private:
  std::u16string m_path;
  bool m_received = false;
};

// Reads the detail of an interface, a second time where it is longer than most. `device` (may be
// null) is filled with the element the interface belongs to. Empty when the size told is 0 or the
// system fails; `status` is that of the last call.
InterfaceDetail ReadInterfaceDetail(platform::DeviceSets& sets, platform::DeviceSetHandle set,
                                    const platform::SP_DEVICE_INTERFACE_DATA& data,
                                    platform::SP_DEVINFO_DATA* device, platform::Status& status);

// The same for the storage passes: empty without any call when an argument is null; and when the
// system refuses the buffer itself, a line is written to the debugger.
InterfaceDetail GetInterfaceDetail(platform::DeviceSets& sets, platform::DebugOutput& debug,
                                   platform::DeviceSetHandle set,
                                   const platform::SP_DEVICE_INTERFACE_DATA* data,
                                   platform::SP_DEVINFO_DATA* device);

}  // namespace KelvoUHW
