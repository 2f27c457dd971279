// What a hub or a port device keeps of the answers about its port: the connection record, the
// configuration descriptor and the string descriptors.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "platform/usb_ioctl.h"

namespace KelvoUHW {

// The connection record of one port: the fixed 365 bytes of every connection request, all zero at
// first. Records are counted, since one of their owners deliberately never frees them.
class ConnectionRecord : public platform::ConnectionInformationEx {
 public:
  ConnectionRecord() noexcept;
  ~ConnectionRecord();
  ConnectionRecord(const ConnectionRecord&) = delete;
  ConnectionRecord& operator=(const ConnectionRecord&) = delete;

  // Leaves the record allocated for the life of the process, where the count of kept ones shows it.
  static void KeepForProcessLife(std::unique_ptr<ConnectionRecord> record) noexcept;

  static std::size_t LiveCount() noexcept;  // the kept ones among them
  static std::size_t KeptCount() noexcept;

 private:
  ConnectionRecord* m_pNextKept = nullptr;
};

// A configuration descriptor as it was asked for and received. `Data` holds the bytes received,
// which may be fewer than the descriptor's own wTotalLength says.
struct DescriptorRequest {
  platform::USB_DESCRIPTOR_REQUEST_HEAD Head{};
  std::vector<std::uint8_t> Data;
};

// One string descriptor of a device; the list is owned from its head.
struct StringDescriptorNode {
  std::unique_ptr<StringDescriptorNode> Next;
  std::uint8_t DescriptorIndex = 0;
  std::uint16_t LanguageID = 0;
  // bLength, bDescriptorType and UTF-16 characters, as received.
  std::vector<std::uint8_t> StringDescriptor;

  StringDescriptorNode() = default;
  ~StringDescriptorNode();  // takes the list apart in a loop: a device decides how long it is
  StringDescriptorNode(const StringDescriptorNode&) = delete;
  StringDescriptorNode& operator=(const StringDescriptorNode&) = delete;

  // (bLength / 2) - 1 characters, or fewer where fewer were received.
  std::u16string Text() const;
};

// The first entry of the list with this index; null for index 0, an empty list and no match.
const StringDescriptorNode* FindStringDescriptor(const StringDescriptorNode* head,
                                                 std::uint8_t index) noexcept;

struct UsbPortInfo {
  std::unique_ptr<ConnectionRecord> ConnectionInfo;
  std::unique_ptr<DescriptorRequest> ConfigDesc;
  std::unique_ptr<StringDescriptorNode> StringDescs;
};

}  // namespace KelvoUHW
