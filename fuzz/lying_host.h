// A host that lies as its input says: about sizes, counts, statuses, terminators, neighbours and
// texts; and that changes the PC under the reader.
//
// One byte of input decides over one call; most values, and all once the input has ended, leave the
// call honest. The handles it gives out are counted by the PC behind it.
#pragma once

#include <algorithm>
#include <array>
#include <cstring>
#include <functional>
#include <utility>

#include "fuzz/fuzz.h"
#include "platform/wrappers/intercepting_host.h"

namespace fuzz {

class LyingHost final : public platform::wrappers::InterceptingHost {
 public:
  // `change` is called between calls, with a number that says how.
  LyingHost(platform::Host& base, Input& input, std::function<void(std::uint8_t)> change)
      : InterceptingHost(base), m_input(input), m_change(std::move(change)) {}

  platform::Status DeviceControl(platform::FileHandle handle, std::uint32_t code, const void* in,
                                 std::uint32_t inBytes, void* out, std::uint32_t outBytes,
                                 std::uint32_t& returned) noexcept override {
    const auto status =
        InterceptingHost::DeviceControl(handle, code, in, inBytes, out, outBytes, returned);
    switch (Lie()) {
      case kSize:
        returned = m_input.Number();
        return Success();
      case kNumber:
        // A length, a count or a status within the record, or what was in it goes on.
        if (outBytes >= 4) {
          const std::uint32_t at = m_input.Byte() % (outBytes - 3);
          const std::uint32_t number = m_input.Number();
          std::memcpy(static_cast<std::uint8_t*>(out) + at, &number, sizeof number);
          returned = outBytes;
        }
        return Success();
      case kText:
        Fill(static_cast<std::uint8_t*>(out), outBytes);
        returned = outBytes;
        return Success();
      case kFailure:
        return Failure();
      default:
        return status;
    }
  }

  platform::Status EnumDeviceInfo(platform::DeviceSetHandle set, std::uint32_t index,
                                  platform::SP_DEVINFO_DATA& data) noexcept override {
    const Lies lie = Lie();
    if (lie == kFailure) return Failure();
    if (lie == kSize) index = m_input.Byte();  // another element once more
    const auto status = InterceptingHost::EnumDeviceInfo(set, index, data);
    if (lie == kNumber) data.DevInst = m_input.Byte();
    return status;
  }
  platform::Status EnumDeviceInterfaces(
      platform::DeviceSetHandle set, const platform::Guid& interfaceClass, std::uint32_t index,
      platform::SP_DEVICE_INTERFACE_DATA& data) noexcept override {
    const Lies lie = Lie();
    if (lie == kFailure) return Failure();
    if (lie == kSize) index = m_input.Byte();
    return InterceptingHost::EnumDeviceInterfaces(set, interfaceClass, index, data);
  }
  platform::Status GetDeviceInterfaceDetail(platform::DeviceSetHandle set,
                                            const platform::SP_DEVICE_INTERFACE_DATA& data,
                                            void* detail, std::uint32_t detailBytes,
                                            std::uint32_t* required,
                                            platform::SP_DEVINFO_DATA* device) noexcept override {
    const auto status = InterceptingHost::GetDeviceInterfaceDetail(set, data, detail, detailBytes,
                                                                   required, device);
    const Lies lie = Lie();
    if (lie == kFailure) return Failure();
    if (lie == kSize && required) *required = m_input.Number() >> (m_input.Byte() % 32);
    if (lie == kNumber && device) device->DevInst = m_input.Byte();
    if (lie == kText && detail) {
      Fill(static_cast<std::uint8_t*>(detail) + 4, detailBytes > 4 ? detailBytes - 4 : 0);
      return Success();
    }
    return status;
  }
  platform::Status GetDeviceInstanceId(platform::DeviceSetHandle set,
                                       const platform::SP_DEVINFO_DATA& data, char16_t* buffer,
                                       std::uint32_t chars,
                                       std::uint32_t* required) noexcept override {
    const auto status = InterceptingHost::GetDeviceInstanceId(set, data, buffer, chars, required);
    return Text(status, buffer, chars, required);
  }
  platform::Status GetDeviceRegistryProperty(platform::DeviceSetHandle set,
                                             const platform::SP_DEVINFO_DATA& data,
                                             std::uint32_t property, std::uint32_t* type,
                                             void* buffer, std::uint32_t bytes,
                                             std::uint32_t* required) noexcept override {
    const auto status = InterceptingHost::GetDeviceRegistryProperty(set, data, property, type,
                                                                    buffer, bytes, required);
    const auto told = Text(status, static_cast<char16_t*>(buffer), bytes / 2, required);
    if (!told && m_lied == kSize) return Failure(platform::kERROR_INSUFFICIENT_BUFFER);
    return told;
  }
  platform::Status GetClassDescription(const platform::Guid& guid, char16_t* buffer,
                                       std::uint32_t chars,
                                       std::uint32_t* required) noexcept override {
    return Text(InterceptingHost::GetClassDescription(guid, buffer, chars, required), buffer, chars,
                required);
  }

  platform::Status LocateRootDevNode(platform::DevInst& node) noexcept override {
    return Node(InterceptingHost::LocateRootDevNode(node), node);
  }
  platform::Status GetParent(platform::DevInst node, platform::DevInst& parent) noexcept override {
    return Node(InterceptingHost::GetParent(node, parent), parent);
  }
  platform::Status GetChild(platform::DevInst node, platform::DevInst& child) noexcept override {
    return Node(InterceptingHost::GetChild(node, child), child);
  }
  platform::Status GetSibling(platform::DevInst node,
                              platform::DevInst& sibling) noexcept override {
    return Node(InterceptingHost::GetSibling(node, sibling), sibling);
  }
  platform::Status GetDeviceId(platform::DevInst node, char16_t* buffer,
                               std::uint32_t chars) noexcept override {
    return Text(InterceptingHost::GetDeviceId(node, buffer, chars), buffer, chars, nullptr);
  }
  platform::Status GetDevNodeRegistryProperty(platform::DevInst node, std::uint32_t property,
                                              std::uint32_t* type, void* buffer,
                                              std::uint32_t& bytes) noexcept override {
    const std::uint32_t room = bytes;
    const auto status =
        InterceptingHost::GetDevNodeRegistryProperty(node, property, type, buffer, bytes);
    return Text(status, static_cast<char16_t*>(buffer), room / 2, &bytes);
  }

  platform::Status NextVolume(platform::FindHandle search, char16_t* name,
                              std::uint32_t chars) noexcept override {
    return Text(InterceptingHost::NextVolume(search, name, chars), name, chars, nullptr);
  }
  platform::Status VolumePathNames(const char16_t* volume, char16_t* names, std::uint32_t chars,
                                   std::uint32_t& required) noexcept override {
    const auto status = InterceptingHost::VolumePathNames(volume, names, chars, required);
    const auto told = Text(status, names, chars, &required);
    if (!told && m_lied == kSize) return Failure(platform::kERROR_MORE_DATA);
    return told;
  }
  platform::Status VolumeNameForMountPoint(const char16_t* mountPoint, char16_t* name,
                                           std::uint32_t chars) noexcept override {
    return Text(InterceptingHost::VolumeNameForMountPoint(mountPoint, name, chars), name, chars,
                nullptr);
  }
  std::uint32_t LogicalDriveStrings(std::uint32_t chars, char16_t* buffer) noexcept override {
    const std::uint32_t honest = InterceptingHost::LogicalDriveStrings(chars, buffer);
    const Lies lie = Lie();
    if (lie == kFailure) return 0;
    if (lie == kSize) return m_input.Number() >> (m_input.Byte() % 32);
    if (lie != kText) return honest;
    Fill(reinterpret_cast<std::uint8_t*>(buffer), chars * 2);
    return chars;
  }
  std::uint32_t DriveType(const char16_t* path) noexcept override {
    const std::uint32_t honest = InterceptingHost::DriveType(path);
    return Lie() == kNumber ? m_input.Byte() % 8 : honest;
  }
  platform::Status VolumeInformation(const char16_t* path, char16_t* label, std::uint32_t chars,
                                     std::uint32_t& serial, std::uint32_t& flags,
                                     char16_t* fileSystem,
                                     std::uint32_t fileSystemChars) noexcept override {
    const auto status = InterceptingHost::VolumeInformation(path, label, chars, serial, flags,
                                                            fileSystem, fileSystemChars);
    const Lies lie = Lie();
    if (lie == kFailure) return Failure();
    if (lie == kNumber) flags = m_input.Number();
    return lie == kNumber ? Success() : status;
  }
  platform::Status NextMountPoint(platform::FindHandle search, char16_t* folder,
                                  std::uint32_t chars) noexcept override {
    return Text(InterceptingHost::NextMountPoint(search, folder, chars), folder, chars, nullptr);
  }
  platform::Status DosDeviceTarget(const char16_t* name, char16_t* target,
                                   std::uint32_t chars) noexcept override {
    return Text(InterceptingHost::DosDeviceTarget(name, target, chars), target, chars, nullptr);
  }

 private:
  enum Lies : std::uint8_t { kNone, kFailure, kSize, kNumber, kText };

  static platform::Status Success() noexcept { return platform::Status::Success(); }
  platform::Status Failure() noexcept {
    static constexpr std::array<std::uint32_t, 6> kCodes = {
        0, platform::kERROR_INSUFFICIENT_BUFFER, platform::kERROR_MORE_DATA, 31, 259, 1784};
    return Failure(kCodes[m_input.Byte() % kCodes.size()]);
  }
  static platform::Status Failure(std::uint32_t code) noexcept {
    return platform::Status::Failure(code);
  }

  // Calls that give something out are refused here: what the base gave is never taken back.
  platform::Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override {
    using platform::wrappers::Operation;
    switch (call.operation) {
      case Operation::OpenDevice:
      case Operation::GetClassDevs:
      case Operation::GetClassImageList:
      case Operation::GetClassImageIndex:
      case Operation::FirstVolume:
      case Operation::FirstMountPoint:
        return Lie() == kFailure ? Failure() : Success();
      default:
        return Success();
    }
  }

  Lies Lie() noexcept {
    m_lied = kNone;
    if (m_input.Empty()) return kNone;
    const std::uint8_t byte = m_input.Byte();
    if (byte >= 240) m_change(byte);
    if (byte >= 160 && byte < 240) m_lied = static_cast<Lies>(1 + byte % 4);
    return m_lied;
  }

  platform::Status Node(platform::Status status, platform::DevInst& node) noexcept {
    switch (Lie()) {
      case kFailure:
        return Failure(0x0D);
      case kNumber:
      case kSize:
        node = m_input.Byte();
        return Success();
      default:
        return status;
    }
  }

  platform::Status Text(platform::Status status, char16_t* buffer, std::uint32_t chars,
                        std::uint32_t* required) noexcept {
    switch (Lie()) {
      case kFailure:
        return Failure();
      case kSize:
        if (required) *required = m_input.Number() >> (m_input.Byte() % 32);
        return m_input.Byte() % 2 == 0 ? Success() : Failure();
      case kNumber:  // its terminator goes
        if (buffer == nullptr) return status;
        std::replace(buffer, buffer + chars, u'\0', u'x');
        return Success();
      case kText:
        if (buffer == nullptr) return status;
        Fill(reinterpret_cast<std::uint8_t*>(buffer), chars * 2);
        return Success();
      default:
        return status;
    }
  }

  void Fill(std::uint8_t* bytes, std::size_t size) noexcept {
    const std::size_t count = std::min<std::size_t>(size, m_input.Byte());
    for (std::size_t i = 0; i < count; ++i) bytes[i] = m_input.Byte();
  }

  Input& m_input;
  const std::function<void(std::uint8_t)> m_change;
  Lies m_lied = kNone;
};

}  // namespace fuzz
