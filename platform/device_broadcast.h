// Messages about devices that come and go: codes and records.
//
// Public source: the published headers winuser.h and dbt.h.
#pragma once

#include <cstddef>
#include <cstdint>

#include "platform/guid.h"

namespace platform {

// The message; its wParam is one of the events, its lParam points to a record or is 0.
inline constexpr std::uint32_t kWM_DEVICECHANGE = 0x0219;

inline constexpr std::uint32_t kDBT_DEVNODES_CHANGED = 0x0007;
inline constexpr std::uint32_t kDBT_DEVICEARRIVAL = 0x8000;
inline constexpr std::uint32_t kDBT_DEVICEQUERYREMOVE = 0x8001;
inline constexpr std::uint32_t kDBT_DEVICEREMOVEPENDING = 0x8003;
inline constexpr std::uint32_t kDBT_DEVICEREMOVECOMPLETE = 0x8004;

// Values of dbch_devicetype.
inline constexpr std::uint32_t kDBT_DEVTYP_OEM = 0;
inline constexpr std::uint32_t kDBT_DEVTYP_VOLUME = 2;
inline constexpr std::uint32_t kDBT_DEVTYP_PORT = 3;
inline constexpr std::uint32_t kDBT_DEVTYP_DEVICEINTERFACE = 5;

// How a device notification is registered.
inline constexpr std::uint32_t kDEVICE_NOTIFY_WINDOW_HANDLE = 0;
inline constexpr std::uint32_t kDEVICE_NOTIFY_ALL_INTERFACE_CLASSES = 4;

// What every record starts with.
struct DEV_BROADCAST_HDR {
  std::uint32_t dbch_size = 0;  // bytes of the whole record
  std::uint32_t dbch_devicetype = 0;
  std::uint32_t dbch_reserved = 0;
};
static_assert(sizeof(DEV_BROADCAST_HDR) == 12);

// The name is as long as the record says; the one character here is its place.
struct DEV_BROADCAST_DEVICEINTERFACE_W {
  std::uint32_t dbcc_size = 0;
  std::uint32_t dbcc_devicetype = kDBT_DEVTYP_DEVICEINTERFACE;
  std::uint32_t dbcc_reserved = 0;
  Guid dbcc_classguid{};
  char16_t dbcc_name[1] = {};
};
static_assert(sizeof(DEV_BROADCAST_DEVICEINTERFACE_W) == 32);
inline constexpr std::size_t kInterfaceBroadcastNameOffset = 28;

struct DEV_BROADCAST_VOLUME {
  std::uint32_t dbcv_size = 0;
  std::uint32_t dbcv_devicetype = kDBT_DEVTYP_VOLUME;
  std::uint32_t dbcv_reserved = 0;
  std::uint32_t dbcv_unitmask = 0;  // bit 0 is A:
  std::uint16_t dbcv_flags = 0;
};
static_assert(sizeof(DEV_BROADCAST_VOLUME) == 20);

// dbcv_flags: the medium in the drive changed, the drive letter stays.
inline constexpr std::uint16_t kDBTF_MEDIA = 1;

}  // namespace platform
