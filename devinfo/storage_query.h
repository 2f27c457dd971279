// The questions put to one storage device: descriptor, media serial number, volume serial number.
//
// One record belongs to one thread at a time. The calls may block on a driver. Failures are told by
// the result and by lines appended to `diagnostics`; only std::bad_alloc is thrown.
#pragma once

#include <cstdint>
#include <string>

#include "platform/host.h"
#include "records/interface_device.h"

namespace KelvoUHW {

// What becomes of a record. Only an accepted volume enters the snapshot.
enum StorageOutcome : std::uint32_t {
  KStorageAccepted = 0,
  KStorageRejected = 1,  // not of a USB-like device, a CD drive, or the query failed
  KStorageCannotOpen = 3,
};

// Reads the storage descriptor through the record's open device handle (a closed one makes the
// query fail) into the record: device-type name as its description, the descriptor's texts, serial
// numbers. Texts are appended to those that are there. Descriptor bytes are not trusted: a text
// ends at a zero byte or at the end of what was received.
StorageOutcome QueryStorageProperties(platform::DeviceIo& io, platform::VolumeManager& volumes,
                                      CZKUMInterfaceDeviceImpl& record,
                                      std::u16string& diagnostics);

// The serial number of the medium in an opened device; empty when it has none to tell.
std::u16string QueryMediaSerialNumber(platform::DeviceIo& io, platform::FileHandle device,
                                      std::u16string& diagnostics);

// The serial number of the volume behind a device path, or kUnknownVolumeSerialNumber.
std::uint32_t QueryVolumeSerialNumber(platform::VolumeManager& volumes,
                                      const std::u16string& devicePath);

}  // namespace KelvoUHW
