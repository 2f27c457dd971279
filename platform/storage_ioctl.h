// Requests to disks and volumes: codes and records.
//
// Public source: the published header winioctl.h (ntddstor.h). All records have the same layout in
// 32-bit and 64-bit programs.
#pragma once

#include <cstddef>
#include <cstdint>

namespace platform {

inline constexpr std::uint32_t kIOCTL_STORAGE_QUERY_PROPERTY = 0x2D1400;
inline constexpr std::uint32_t kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER = 0x2D0C10;
inline constexpr std::uint32_t kIOCTL_STORAGE_GET_DEVICE_NUMBER = 0x2D1080;

struct STORAGE_PROPERTY_QUERY {
  std::uint32_t PropertyId;  // 0: StorageDeviceProperty
  std::uint32_t QueryType;   // 0: PropertyStandardQuery
  std::uint8_t AdditionalParameters[1];
  std::uint8_t Padding[3];
};
static_assert(sizeof(STORAGE_PROPERTY_QUERY) == 12);

// The offsets count from the start of the record; 0 means that there is no such text. The texts are
// 8-bit characters that end with a zero byte and follow the record.
struct STORAGE_DEVICE_DESCRIPTOR {
  std::uint32_t Version;
  std::uint32_t Size;
  std::uint8_t DeviceType;
  std::uint8_t DeviceTypeModifier;
  std::uint8_t RemovableMedia;
  std::uint8_t CommandQueueing;
  std::uint32_t VendorIdOffset;
  std::uint32_t ProductIdOffset;
  std::uint32_t ProductRevisionOffset;
  std::uint32_t SerialNumberOffset;
  std::uint32_t BusType;
  std::uint32_t RawPropertiesLength;
};
static_assert(sizeof(STORAGE_DEVICE_DESCRIPTOR) == 36);

struct STORAGE_DEVICE_NUMBER {
  std::uint32_t DeviceType;
  std::uint32_t DeviceNumber;
  std::uint32_t PartitionNumber;
};
static_assert(sizeof(STORAGE_DEVICE_NUMBER) == 12);

}  // namespace platform
