// What a hub answers about one of its ports, for records of port devices.
#pragma once

#include <utility>

#include "records/usb_port_info.h"

namespace KelvoUHW {

inline std::unique_ptr<ConnectionRecord> Connection(std::uint32_t status) {
  auto record = std::make_unique<ConnectionRecord>();
  auto& info = record->Info;
  info.ConnectionIndex = 4;
  info.ConnectionStatus = status;
  info.Speed = platform::UsbHighSpeed;
  info.CurrentConfigurationValue = 1;
  info.DeviceAddress = 9;
  info.DeviceDescriptor.idVendor = 0x0781;
  info.DeviceDescriptor.idProduct = 0x5580;
  info.DeviceDescriptor.iManufacturer = 1;
  info.DeviceDescriptor.iProduct = 2;
  info.DeviceDescriptor.iSerialNumber = 3;
  return record;
}

inline void AddString(std::unique_ptr<StringDescriptorNode>& head, std::uint8_t index, const std::u16string& text) {
  auto node = std::make_unique<StringDescriptorNode>();
  node->DescriptorIndex = index;
  node->LanguageID = 0x0409;
  node->StringDescriptor = {static_cast<std::uint8_t>(2 + 2 * text.size()), 3};
  for (const char16_t unit : text) {
    node->StringDescriptor.push_back(static_cast<std::uint8_t>(unit & 0xFF));
    node->StringDescriptor.push_back(static_cast<std::uint8_t>(unit >> 8));
  }
  node->Next = std::move(head);
  head = std::move(node);
}

inline std::unique_ptr<StringDescriptorNode> Strings() {
  std::unique_ptr<StringDescriptorNode> head;
  std::uint8_t index = 0;
  for (const char16_t* text : {u"SanDisk", u"Extreme", u"AA01", u"Stick"}) AddString(head, ++index, text);
  return head;
}

}  // namespace KelvoUHW
