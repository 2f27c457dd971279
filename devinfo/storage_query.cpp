#include "devinfo/storage_query.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstring>
#include <span>
#include <utility>

#include "platform/setup_api.h"
#include "platform/storage_ioctl.h"
#include "platform/text.h"

namespace KelvoUHW {
namespace {

constexpr std::size_t kMediaSerialBytes = 800;
constexpr std::size_t kMediaSerialTextOffset = 16;
// Deliberate: four bytes are asked for although there is room for 800. A system that keeps to the
// size sends no text, and the media serial number stays empty.
constexpr std::uint32_t kMediaSerialBytesAsked = 4;

constexpr std::uint32_t kVolumeTextChars = 512;

constexpr std::uint8_t kCdromDeviceType = 5;

std::u16string ErrorNumber(std::uint32_t error) {
  return platform::Decimal(static_cast<std::int32_t>(error));
}

platform::Status ReadDescriptor(platform::DeviceIo& io, CZKUMInterfaceDeviceImpl& record) {
  const platform::STORAGE_PROPERTY_QUERY query{};
  const platform::FileHandle device =
      record.DeviceHandle ? record.DeviceHandle->Get() : platform::kInvalidHandle;
  std::array<std::uint8_t, kStorageDescriptorBytes> answer{};
  std::uint32_t received = 0;
  const platform::Status status =
      io.DeviceControl(device, platform::kIOCTL_STORAGE_QUERY_PROPERTY, &query, sizeof query,
                       answer.data(), kStorageDescriptorBytes, received);
  const std::span whole(answer);
  const std::span kept = whole.first(std::min<std::size_t>(received, whole.size()));
  record.Descriptor.assign(kept.begin(), kept.end());
  return status;
}

// Offset 0 stands for a text that is not there.
void AppendDescriptorText(const CZKUMInterfaceDeviceImpl& record, std::uint32_t offset,
                          std::u16string& text) {
  if (offset == 0) return;
  for (std::size_t i = offset; i < record.Descriptor.size() && record.Descriptor[i] != 0; ++i) {
    text += static_cast<char16_t>(record.Descriptor[i]);
  }
}

void ParseDescriptor(CZKUMInterfaceDeviceImpl& record) {
  const platform::STORAGE_DEVICE_DESCRIPTOR header = record.DescriptorHeader();
  record.m_strDeviceDescr = StorageDeviceTypeName(header.DeviceType);
  AppendDescriptorText(record, header.VendorIdOffset, record.StorageVendorId);
  AppendDescriptorText(record, header.ProductIdOffset, record.StorageProductId);
  AppendDescriptorText(record, header.ProductRevisionOffset, record.ProductRev);
  std::u16string serialNumber;
  AppendDescriptorText(record, header.SerialNumberOffset, serialNumber);
  record.SetSerialNumber(std::move(serialNumber));
}

}  // namespace

StorageOutcome QueryStorageProperties(platform::DeviceIo& io, platform::VolumeManager& volumes,
                                      CZKUMInterfaceDeviceImpl& record,
                                      std::u16string& diagnostics) {
  const platform::Status status = ReadDescriptor(io, record);
  if (!status) {
    diagnostics += u"IOCTL failed with error code " + ErrorNumber(status.error) + u".\r\n\r\n";
    return KStorageRejected;
  }
  ParseDescriptor(record);
  // Deliberate: CD and DVD drives are no volumes of ours.
  if (record.m_strDeviceDescr == StorageDeviceTypeName(kCdromDeviceType)) return KStorageRejected;

  const platform::FileHandle device =
      record.DeviceHandle ? record.DeviceHandle->Get() : platform::kInvalidHandle;
  record.MediaSerialNumber = QueryMediaSerialNumber(io, device, diagnostics);
  record.VolumeSerialNumber = QueryVolumeSerialNumber(volumes, record.DevicePath());
  return KStorageAccepted;
}

std::u16string QueryMediaSerialNumber(platform::DeviceIo& io, platform::FileHandle device,
                                      std::u16string& diagnostics) {
  constexpr std::u16string_view kErrorLine = u"IOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER error = ";
  std::array<std::uint8_t, kMediaSerialBytes> answer{};
  std::uint32_t received = 0;
  const platform::Status status =
      io.DeviceControl(device, platform::kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, nullptr, 0,
                       answer.data(), kMediaSerialBytesAsked, received);
  if (status) {
    diagnostics += u"IOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER found\r\n";
    std::array<char16_t, (kMediaSerialBytes - kMediaSerialTextOffset) / sizeof(char16_t)> text;
    std::memcpy(text.data(), answer.data() + kMediaSerialTextOffset, sizeof text);
    return std::u16string(platform::UpToZero({text.data(), text.size()}));
  }
  diagnostics += kErrorLine;
  switch (status.error) {
    case platform::kERROR_INVALID_FUNCTION:
      diagnostics += u"\r\n              The request is not valid for this device.\r\n";
      break;
    case platform::kERROR_NOT_SUPPORTED:
      diagnostics += u"\r\n              The request is not supported for this device.\r\n";
      break;
    default:
      diagnostics += ErrorNumber(status.error) + u"\r\n";
  }
  return {};
}

std::uint32_t QueryVolumeSerialNumber(platform::VolumeManager& volumes,
                                      const std::u16string& devicePath) {
  std::array<char16_t, kVolumeTextChars> label{};
  std::array<char16_t, kVolumeTextChars> fileSystem{};
  std::uint32_t serialNumber = kUnknownVolumeSerialNumber;
  std::uint32_t fileSystemFlags = 0;
  // Deliberate: the path goes in as it is, without the backslash at its end that the call asks for,
  // so a strict system tells no serial number.
  const platform::Status status =
      volumes.VolumeInformation(devicePath.c_str(), label.data(), kVolumeTextChars, serialNumber,
                                fileSystemFlags, fileSystem.data(), kVolumeTextChars);
  return status ? serialNumber : kUnknownVolumeSerialNumber;
}

}  // namespace KelvoUHW
