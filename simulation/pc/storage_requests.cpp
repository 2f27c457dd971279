#include <algorithm>
#include <array>
#include <cstring>
#include <optional>
#include <string>
#include <utility>

#include "platform/setup_api.h"
#include "platform/storage_ioctl.h"
#include "simulation/pc/requests.h"

namespace platform::simulated {
namespace {

constexpr std::uint32_t kERROR_BAD_LENGTH = 24;

// The published record ends with a byte of raw properties and its padding, which it counts.
constexpr std::uint32_t kPublishedDescriptorSize = 40;

Bytes Descriptor(const Storage& storage) {
  STORAGE_DEVICE_DESCRIPTOR head{};
  Bytes bytes(sizeof(head));
  const std::array<std::pair<const std::optional<std::string>*, std::uint32_t*>, 4> texts = {{
      {&storage.vendor, &head.VendorIdOffset},
      {&storage.product, &head.ProductIdOffset},
      {&storage.revision, &head.ProductRevisionOffset},
      {&storage.serial, &head.SerialNumberOffset},
  }};
  for (const auto& [text, offset] : texts) {
    if (!*text) continue;
    *offset = static_cast<std::uint32_t>(bytes.size());
    bytes.insert(bytes.end(), (*text)->begin(), (*text)->end());
    bytes.push_back(0);
  }
  head.Version = kPublishedDescriptorSize;
  head.Size = static_cast<std::uint32_t>(bytes.size());
  head.DeviceType = storage.deviceType.value_or(0);
  head.DeviceTypeModifier = storage.deviceTypeModifier;
  head.RemovableMedia = storage.removable ? 1 : 0;
  std::memcpy(bytes.data(), &head, sizeof(head));
  return bytes;
}

Status AnswerProperty(const Storage& storage, Request& request) {
  constexpr std::size_t kQueryBytes = 8;  // the two numbers; additional parameters are optional
  constexpr std::size_t kSizesBytes = 8;  // Version and Size, all that a short buffer gets
  if (request.input.size() < kQueryBytes) return Status::Failure(kERROR_BAD_LENGTH);
  std::uint32_t query[2];
  std::memcpy(query, request.input.data(), sizeof(query));
  if (query[0] != 0 || query[1] != 0) return Status::Failure(kERROR_INVALID_PARAMETER);
  if (!storage.deviceType) return Status::Failure(kERROR_INVALID_FUNCTION);
  if (request.outBytes < kSizesBytes) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  request.reply = Descriptor(storage);
  const std::size_t fitting = request.outBytes < sizeof(STORAGE_DEVICE_DESCRIPTOR)
                                  ? kSizesBytes
                                  : std::min<std::size_t>(request.outBytes, request.reply.size());
  request.reply.resize(fitting);
  return Status::Success();
}

// The length of the serial number, a result, two reserved numbers, the serial number's characters.
// A buffer without room for all of it learns the length.
Status AnswerMediaSerialNumber(const Storage& storage, Request& request) {
  constexpr std::size_t kHeadBytes = 16;
  if (!storage.mediaSerialNumber) return Status::Failure(kERROR_NOT_SUPPORTED);
  const auto length =
      static_cast<std::uint32_t>((storage.mediaSerialNumber->size() + 1) * sizeof(char16_t));
  if (request.outBytes < sizeof(length)) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  request.reply.resize(request.outBytes < kHeadBytes + length ? sizeof(length)
                                                              : kHeadBytes + length);
  std::memcpy(request.reply.data(), &length, sizeof(length));
  if (request.reply.size() > sizeof(length)) {
    std::memcpy(request.reply.data() + kHeadBytes, storage.mediaSerialNumber->c_str(), length);
  }
  return Status::Success();
}

Status AnswerDeviceNumber(const Storage& storage, Request& request) {
  if (!storage.deviceNumber) return Status::Failure(kERROR_INVALID_FUNCTION);
  const STORAGE_DEVICE_NUMBER number{storage.deviceNumber->type, storage.deviceNumber->number,
                                     storage.deviceNumber->partition};
  if (request.outBytes < sizeof(number)) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  request.reply.resize(sizeof(number));
  std::memcpy(request.reply.data(), &number, sizeof(number));
  return Status::Success();
}

}  // namespace

Status AnswerStorage(const Storage* storage, Request& request) {
  if (storage == nullptr) return Status::Failure(kERROR_INVALID_FUNCTION);
  switch (request.code) {
    case kIOCTL_STORAGE_QUERY_PROPERTY:
      return AnswerProperty(*storage, request);
    case kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER:
      return AnswerMediaSerialNumber(*storage, request);
    case kIOCTL_STORAGE_GET_DEVICE_NUMBER:
      return AnswerDeviceNumber(*storage, request);
    default:
      return Status::Failure(kERROR_INVALID_FUNCTION);
  }
}

}  // namespace platform::simulated
