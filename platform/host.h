// The one seam: what the component asks of the operating system, call by call, and nothing more.
//
// Every operation mirrors one platform call: its sizes, its order and its ways to fail are the
// component's business, so no operation here combines, retries or interprets. Unless said otherwise
// an operation may be called from every thread, may block on a driver, never throws, keeps no
// pointer it is given, and writes its out values only as said. Texts passed in end with a zero.
// Buffer sizes are in bytes where the parameter is called `...Bytes`, in UTF-16 characters, the
// terminating zero included, where it is called `...Chars`.
//
// Names avoid those that the system's headers define as macros: a constant is the published name
// with a `k` before it, a record is the published name in this namespace.
#pragma once

#include <cstdint>

#include "platform/guid.h"
#include "platform/setup_api.h"

namespace platform {

// Outcome of a platform call. `error` is the system's code; it carries a meaning only when `ok` is
// false, and may be 0 even then (some systems fail without setting a code).
struct Status {
  bool ok = true;
  std::uint32_t error = 0;

  explicit operator bool() const noexcept { return ok; }
  static constexpr Status Success() noexcept { return {}; }
  static constexpr Status Failure(std::uint32_t code) noexcept { return {false, code}; }
};

// The system's handles. -1 is the invalid one for all three.
using FileHandle = std::intptr_t;
using DeviceSetHandle = std::intptr_t;
using FindHandle = std::intptr_t;
inline constexpr std::intptr_t kInvalidHandle = -1;

inline constexpr std::uint32_t kGENERIC_WRITE = 0x40000000;
inline constexpr std::uint32_t kFILE_SHARE_READ = 1;
inline constexpr std::uint32_t kFILE_SHARE_WRITE = 2;

// Devices opened as files.
class DeviceIo {
 public:
  // CreateFileW, existing objects only. The caller owns the handle; failure leaves kInvalidHandle.
  virtual Status OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                            FileHandle& handle) noexcept = 0;
  // DeviceIoControl, synchronous. `in` and `out` may be one buffer. `returnedBytes` is always set.
  virtual Status DeviceControl(FileHandle handle, std::uint32_t code, const void* in,
                               std::uint32_t inBytes, void* out, std::uint32_t outBytes,
                               std::uint32_t& returnedBytes) noexcept = 0;
  // CloseHandle. A handle that is not open is refused.
  virtual Status CloseDevice(FileHandle handle) noexcept = 0;

 protected:
  ~DeviceIo() = default;
};

// Device-information sets: the present devices and device interfaces, and their registry
// properties.
class DeviceSets {
 public:
  // SetupDiGetClassDevsW without enumerator and window. `guid` null: all classes. The caller owns
  // the set; failure leaves kInvalidHandle.
  virtual Status GetClassDevs(const Guid* guid, std::uint32_t flags,
                              DeviceSetHandle& set) noexcept = 0;
  // SetupDiEnumDeviceInfo. `data.cbSize` must be set; the end is kERROR_NO_MORE_ITEMS.
  virtual Status EnumDeviceInfo(DeviceSetHandle set, std::uint32_t index,
                                SP_DEVINFO_DATA& data) noexcept = 0;
  // SetupDiEnumDeviceInterfaces for no particular device. `data.cbSize` must be set.
  virtual Status EnumDeviceInterfaces(DeviceSetHandle set, const Guid& interfaceClass,
                                      std::uint32_t index,
                                      SP_DEVICE_INTERFACE_DATA& data) noexcept = 0;
  // SetupDiGetDeviceInterfaceDetailW. `detail` is a size field and the path behind it, see
  // setup_api.h; null asks for the size. `required` (may be null) is set to the needed bytes.
  // `device` (may be null, else with cbSize set) is set to the element the interface belongs to.
  virtual Status GetDeviceInterfaceDetail(DeviceSetHandle set, const SP_DEVICE_INTERFACE_DATA& data,
                                          void* detail, std::uint32_t detailBytes,
                                          std::uint32_t* required,
                                          SP_DEVINFO_DATA* device) noexcept = 0;
  // SetupDiGetDeviceInstanceIdW. `buffer` null asks for the length; `required` (may be null) is
  // set.
  virtual Status GetDeviceInstanceId(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                     char16_t* buffer, std::uint32_t bufferChars,
                                     std::uint32_t* required) noexcept = 0;
  // SetupDiGetDeviceRegistryPropertyW. `type` and `required` may be null; both are set on success
  // and with kERROR_INSUFFICIENT_BUFFER. A property the device lacks is kERROR_INVALID_DATA.
  virtual Status GetDeviceRegistryProperty(DeviceSetHandle set, const SP_DEVINFO_DATA& data,
                                           std::uint32_t property, std::uint32_t* type,
                                           void* buffer, std::uint32_t bufferBytes,
                                           std::uint32_t* required) noexcept = 0;
  // SetupDiDestroyDeviceInfoList. A set that is not open is refused.
  virtual Status DestroyDeviceInfoList(DeviceSetHandle set) noexcept = 0;
  // SetupDiGetClassImageList, SetupDiGetClassImageIndex, SetupDiDestroyClassImageList. The caller
  // owns the list.
  virtual Status GetClassImageList(DeviceSetHandle& imageList) noexcept = 0;
  virtual Status GetClassImageIndex(DeviceSetHandle imageList, const Guid& classGuid,
                                    std::int32_t& index) noexcept = 0;
  virtual Status DestroyClassImageList(DeviceSetHandle imageList) noexcept = 0;
  // SetupDiGetClassDescriptionW. `required` may be null.
  virtual Status GetClassDescription(const Guid& classGuid, char16_t* buffer,
                                     std::uint32_t bufferChars,
                                     std::uint32_t* required) noexcept = 0;

 protected:
  ~DeviceSets() = default;
};

// The tree of device-manager nodes (configuration manager). `error` is a CR_ code here. A failed
// operation leaves its out value as it was.
class DeviceManager {
 public:
  // CM_Locate_DevNodeW with a null id: the root node.
  virtual Status LocateRootDevNode(DevInst& node) noexcept = 0;
  virtual Status GetParent(DevInst node, DevInst& parent) noexcept = 0;
  virtual Status GetChild(DevInst node, DevInst& child) noexcept = 0;
  virtual Status GetSibling(DevInst node, DevInst& sibling) noexcept = 0;
  // CM_Get_Device_IDW. An id that does not fit with its terminator is kCR_BUFFER_SMALL.
  virtual Status GetDeviceId(DevInst node, char16_t* buffer,
                             std::uint32_t bufferChars) noexcept = 0;
  // CM_Get_DevNode_Registry_PropertyW. `bytes` holds the buffer's size and is set to the value's.
  virtual Status GetDevNodeRegistryProperty(DevInst node, std::uint32_t property,
                                            std::uint32_t* type, void* buffer,
                                            std::uint32_t& bytes) noexcept = 0;

 protected:
  ~DeviceManager() = default;
};

// Values of DriveType.
inline constexpr std::uint32_t kDRIVE_UNKNOWN = 0;
inline constexpr std::uint32_t kDRIVE_NO_ROOT_DIR = 1;
inline constexpr std::uint32_t kDRIVE_REMOVABLE = 2;
inline constexpr std::uint32_t kDRIVE_FIXED = 3;
inline constexpr std::uint32_t kDRIVE_REMOTE = 4;
inline constexpr std::uint32_t kDRIVE_CDROM = 5;
inline constexpr std::uint32_t kDRIVE_RAMDISK = 6;

inline constexpr std::uint32_t kFILE_SUPPORTS_REPARSE_POINTS = 0x80;

// Volumes, drive letters and mount points.
class VolumeManager {
 public:
  // FindFirstVolumeW, FindNextVolumeW, FindVolumeClose. The caller owns the search; a failed first
  // call leaves kInvalidHandle. The end is kERROR_NO_MORE_FILES.
  virtual Status FirstVolume(char16_t* name, std::uint32_t nameChars,
                             FindHandle& search) noexcept = 0;
  virtual Status NextVolume(FindHandle search, char16_t* name,
                            std::uint32_t nameChars) noexcept = 0;
  virtual Status CloseVolumeSearch(FindHandle search) noexcept = 0;
  // GetVolumePathNamesForVolumeNameW: texts one behind the other, an empty one at the end.
  // `required` counts characters and is set on success and with kERROR_MORE_DATA.
  virtual Status VolumePathNames(const char16_t* volumeName, char16_t* names,
                                 std::uint32_t namesChars, std::uint32_t& required) noexcept = 0;
  // GetVolumeNameForVolumeMountPointW. The mount point (or device path) ends with a backslash.
  virtual Status VolumeNameForMountPoint(const char16_t* mountPoint, char16_t* name,
                                         std::uint32_t nameChars) noexcept = 0;
  // GetLogicalDriveStringsW. Returns the characters written without the last zero; more than
  // `bufferChars` when the buffer is too small (the size needed then); 0 on failure.
  virtual std::uint32_t LogicalDriveStrings(std::uint32_t bufferChars,
                                            char16_t* buffer) noexcept = 0;
  // GetDriveTypeW of a root, a folder in which a volume is mounted or a volume name.
  virtual std::uint32_t DriveType(const char16_t* path) noexcept = 0;
  // GetVolumeInformationW. The path needs a trailing backslash. Names are written where a buffer is
  // given; `serial` and `fileSystemFlags` are set on success.
  virtual Status VolumeInformation(const char16_t* path, char16_t* label, std::uint32_t labelChars,
                                   std::uint32_t& serial, std::uint32_t& fileSystemFlags,
                                   char16_t* fileSystem,
                                   std::uint32_t fileSystemChars) noexcept = 0;
  // FindFirstVolumeMountPointW, FindNextVolumeMountPointW, FindVolumeMountPointClose: the folders
  // of a volume in which other volumes are mounted, relative to its root.
  virtual Status FirstMountPoint(const char16_t* volumeName, char16_t* mountPoint,
                                 std::uint32_t mountPointChars, FindHandle& search) noexcept = 0;
  virtual Status NextMountPoint(FindHandle search, char16_t* mountPoint,
                                std::uint32_t mountPointChars) noexcept = 0;
  virtual Status CloseMountPointSearch(FindHandle search) noexcept = 0;
  // QueryDosDeviceW of one name such as "E:"; the first of its targets ends with a zero.
  virtual Status DosDeviceTarget(const char16_t* name, char16_t* target,
                                 std::uint32_t targetChars) noexcept = 0;

 protected:
  ~VolumeManager() = default;
};

class DebugOutput {
 public:
  // OutputDebugStringW.
  virtual void WriteDebugText(const char16_t* text) noexcept = 0;

 protected:
  ~DebugOutput() = default;
};

// Everything the component asks. Code takes the smallest interface that serves it.
class Host : public DeviceIo,
             public DeviceSets,
             public DeviceManager,
             public VolumeManager,
             public DebugOutput {
 public:
  virtual ~Host() = default;
};

}  // namespace platform
