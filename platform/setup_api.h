// Device installation and configuration manager: codes and records.
//
// Public source: the published headers setupapi.h, cfgmgr32.h, devguid.h and the interface-class
// headers of the driver kits.
#pragma once

#include <cstddef>
#include <cstdint>

#include "platform/guid.h"

namespace platform {

// A device-manager node. 0 stands for none in the component's records.
using DevInst = std::uint32_t;

// Pointer-sized fields that only the system reads. Away from Windows the records keep their layout
// in 32-bit programs, so that sizes (28 and 6) are those of the component that ships.
#ifdef _WIN32
using SystemWord = std::uintptr_t;
#else
using SystemWord = std::uint32_t;
#endif

struct SP_DEVINFO_DATA {
  std::uint32_t cbSize = 0;
  Guid ClassGuid{};
  platform::DevInst DevInst = 0;
  SystemWord Reserved = 0;
};

struct SP_DEVICE_INTERFACE_DATA {
  std::uint32_t cbSize = 0;
  Guid InterfaceClassGuid{};
  std::uint32_t Flags = 0;
  SystemWord Reserved = 0;
};

// SP_DEVICE_INTERFACE_DETAIL_DATA_W is a 32-bit size field and the path's characters right behind
// it. The size field holds the size of the fixed part: 6, or 8 where the system aligns it.
inline constexpr std::size_t kInterfaceDetailPathOffset = 4;
#if defined(_WIN64)
inline constexpr std::uint32_t kInterfaceDetailSize = 8;
#else
inline constexpr std::uint32_t kInterfaceDetailSize = 6;
#endif

#ifndef _WIN32
static_assert(sizeof(SP_DEVINFO_DATA) == 28);
static_assert(sizeof(SP_DEVICE_INTERFACE_DATA) == 28);
#endif

// Flags of GetClassDevs.
inline constexpr std::uint32_t kDIGCF_PRESENT = 0x02;
inline constexpr std::uint32_t kDIGCF_ALLCLASSES = 0x04;
inline constexpr std::uint32_t kDIGCF_PROFILE = 0x08;
inline constexpr std::uint32_t kDIGCF_DEVICEINTERFACE = 0x10;

// Registry properties of a device-information element. The configuration manager counts the same
// properties from one instead of zero.
inline constexpr std::uint32_t kSPDRP_DEVICEDESC = 0x00;
inline constexpr std::uint32_t kSPDRP_HARDWAREID = 0x01;
inline constexpr std::uint32_t kSPDRP_SERVICE = 0x04;
inline constexpr std::uint32_t kSPDRP_CLASS = 0x07;
inline constexpr std::uint32_t kSPDRP_CLASSGUID = 0x08;
inline constexpr std::uint32_t kSPDRP_DRIVER = 0x09;
inline constexpr std::uint32_t kSPDRP_MFG = 0x0B;
inline constexpr std::uint32_t kSPDRP_FRIENDLYNAME = 0x0C;
inline constexpr std::uint32_t kSPDRP_LOCATION_INFORMATION = 0x0D;
inline constexpr std::uint32_t kSPDRP_PHYSICAL_DEVICE_OBJECT_NAME = 0x0E;
inline constexpr std::uint32_t kSPDRP_UI_NUMBER = 0x10;
inline constexpr std::uint32_t kSPDRP_LEGACYBUSTYPE = 0x14;
inline constexpr std::uint32_t kSPDRP_ENUMERATOR_NAME = 0x16;

inline constexpr std::uint32_t kCM_DRP_DEVICEDESC = kSPDRP_DEVICEDESC + 1;
inline constexpr std::uint32_t kCM_DRP_DRIVER = kSPDRP_DRIVER + 1;

// Registry data types.
inline constexpr std::uint32_t kREG_SZ = 1;
inline constexpr std::uint32_t kREG_DWORD = 4;
inline constexpr std::uint32_t kREG_MULTI_SZ = 7;

// Error codes that the component reads or reports.
inline constexpr std::uint32_t kERROR_INVALID_FUNCTION = 1;
inline constexpr std::uint32_t kERROR_FILE_NOT_FOUND = 2;
inline constexpr std::uint32_t kERROR_INVALID_HANDLE = 6;
inline constexpr std::uint32_t kERROR_INVALID_DATA = 13;
inline constexpr std::uint32_t kERROR_NO_MORE_FILES = 18;
inline constexpr std::uint32_t kERROR_NOT_SUPPORTED = 50;
inline constexpr std::uint32_t kERROR_INVALID_PARAMETER = 87;
inline constexpr std::uint32_t kERROR_INSUFFICIENT_BUFFER = 122;
inline constexpr std::uint32_t kERROR_INVALID_NAME = 123;
inline constexpr std::uint32_t kERROR_MORE_DATA = 234;
inline constexpr std::uint32_t kERROR_NO_MORE_ITEMS = 259;
inline constexpr std::uint32_t kERROR_DEVICE_NOT_CONNECTED = 1167;
inline constexpr std::uint32_t kERROR_INVALID_USER_BUFFER = 1784;
inline constexpr std::uint32_t kERROR_NOT_READY = 21;

// Results of the configuration manager.
inline constexpr std::uint32_t kCR_SUCCESS = 0;
inline constexpr std::uint32_t kCR_INVALID_DEVNODE = 0x05;
inline constexpr std::uint32_t kCR_NO_SUCH_DEVNODE = 0x0D;
inline constexpr std::uint32_t kCR_BUFFER_SMALL = 0x1A;
inline constexpr std::uint32_t kCR_NO_SUCH_VALUE = 0x25;

// Device interface classes.
inline constexpr Guid GUID_DEVINTERFACE_DISK{
    0x53F56307, 0xB6BF, 0x11D0, {0x94, 0xF2, 0x00, 0xA0, 0xC9, 0x1E, 0xFB, 0x8B}};
inline constexpr Guid GUID_DEVINTERFACE_CDROM{
    0x53F56308, 0xB6BF, 0x11D0, {0x94, 0xF2, 0x00, 0xA0, 0xC9, 0x1E, 0xFB, 0x8B}};
inline constexpr Guid GUID_DEVINTERFACE_VOLUME{
    0x53F5630D, 0xB6BF, 0x11D0, {0x94, 0xF2, 0x00, 0xA0, 0xC9, 0x1E, 0xFB, 0x8B}};
inline constexpr Guid GUID_DEVINTERFACE_FLOPPY{
    0x53F56311, 0xB6BF, 0x11D0, {0x94, 0xF2, 0x00, 0xA0, 0xC9, 0x1E, 0xFB, 0x8B}};

// Device setup classes.
inline constexpr Guid GUID_DEVCLASS_USB{
    0x36FC9E60, 0xC465, 0x11CF, {0x80, 0x56, 0x44, 0x45, 0x53, 0x54, 0x00, 0x00}};
inline constexpr Guid GUID_DEVCLASS_VOLUME{
    0x71A27CDD, 0x812A, 0x11D0, {0xBE, 0xC7, 0x08, 0x00, 0x2B, 0xE2, 0x09, 0x2F}};
inline constexpr Guid GUID_DEVCLASS_IMAGE{
    0x6BDD1FC6, 0x810F, 0x11D0, {0xBE, 0xC7, 0x08, 0x00, 0x2B, 0xE2, 0x09, 0x2F}};
inline constexpr Guid GUID_DEVCLASS_WCEUSBS{
    0x25DBCE51, 0x6C8F, 0x4A72, {0x8A, 0x6D, 0xB5, 0x4C, 0x2B, 0x4F, 0xC8, 0x35}};
inline constexpr Guid GUID_DEVCLASS_UNKNOWN{
    0x4D36E97E, 0xE325, 0x11CE, {0xBF, 0xC1, 0x08, 0x00, 0x2B, 0xE1, 0x03, 0x18}};
inline constexpr Guid GUID_DEVCLASS_DISKDRIVE{
    0x4D36E967, 0xE325, 0x11CE, {0xBF, 0xC1, 0x08, 0x00, 0x2B, 0xE1, 0x03, 0x18}};

}  // namespace platform
