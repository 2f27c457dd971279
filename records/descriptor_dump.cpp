#include "records/descriptor_dump.h"

#include <algorithm>
#include <cstddef>
#include <optional>

#include "platform/text.h"
#include "records/usb_names.h"

namespace KelvoUHW {

namespace {

using platform::Decimal;
using platform::Hex;

constexpr std::u16string_view kEnd = u"\r\n";

class LineWriter {
 public:
  LineWriter(std::u16string_view prefix, std::u16string& out) noexcept
      : m_strPrefix(prefix), m_strOut(out) {}

  template <class... Parts>
  void Line(const Parts&... parts) {
    m_strOut += m_strPrefix;
    Rest(parts...);
  }
  // Without the prefix: the end of a line begun before.
  template <class... Parts>
  void Rest(const Parts&... parts) {
    (m_strOut.append(parts), ...);
  }

 private:
  std::u16string_view m_strPrefix;
  std::u16string& m_strOut;
};

// The lines of one descriptor, in the order of their offsets: where one is
// missing, so are all others.
class DescriptorWriter : public LineWriter {
 public:
  DescriptorWriter(RawDescriptor bytes, std::u16string_view prefix, std::u16string& out) noexcept
      : LineWriter(prefix, out), m_bytes(bytes) {}

  std::optional<std::uint8_t> Byte(std::size_t offset) const noexcept {
    if (offset >= m_bytes.size()) return std::nullopt;
    return m_bytes[offset];
  }
  std::optional<std::uint16_t> Word(std::size_t offset) const noexcept {
    if (offset + 1 >= m_bytes.size()) return std::nullopt;
    return static_cast<std::uint16_t>(m_bytes[offset] | m_bytes[offset + 1] << 8);
  }

  // "<label>0x%02X\r\n" and "<label>0x%04X\r\n".
  void ByteLine(std::u16string_view label, std::size_t offset) {
    if (const auto value = Byte(offset)) Line(label, u"0x", Hex(*value, 2), kEnd);
  }
  void WordLine(std::u16string_view label, std::size_t offset) {
    if (const auto value = Word(offset)) Line(label, u"0x", Hex(*value, 4), kEnd);
  }

 private:
  RawDescriptor m_bytes;
};

void DumpString(LineWriter& writer, std::uint16_t languageId, std::u16string_view text) {
  writer.Line(u"(LanguageID=0x", Hex(languageId, 4), u"):    \"", text, u"\"\r\n");
}

void DumpConfigurationDescriptor(DescriptorWriter writer, const StringDescriptorNode* strings) {
  writer.Line(u"\r\nConfiguration Descriptor:\r\n");
  writer.WordLine(u"wTotalLength:       ", 2);
  writer.ByteLine(u"bNumInterfaces:       ", 4);
  writer.ByteLine(u"bConfigurationValue:  ", 5);
  writer.ByteLine(u"iConfiguration:       ", 6);
  if (const auto index = writer.Byte(6)) {
    if (const StringDescriptorNode* found = FindStringDescriptor(strings, *index)) {
      DumpString(writer, found->LanguageID, found->Text());
    }
  }
  if (const auto attributes = writer.Byte(7)) {
    writer.Line(u"bmAttributes:         0x", Hex(*attributes, 2), u" (");
    // Each word carries the prefix although it stands within the line: by design, since readers of
    // dumps know the line in this form.
    if (*attributes & 0x80) writer.Line(u"Bus Powered ");
    if (*attributes & 0x40) writer.Line(u"Self Powered ");
    if (*attributes & 0x20) writer.Line(u"Remote Wakeup");
    writer.Rest(u")\r\n");
  }
  if (const auto power = writer.Byte(8)) {
    writer.Line(u"MaxPower:             0x", Hex(*power, 2), u" (", Decimal(*power * 2),
                u" Ma)\r\n");
  }
}

void DumpEndpoint(DescriptorWriter writer) {
  static constexpr std::u16string_view kTypes[] = {u"Control", u"Isochronous", u"Bulk",
                                                   u"Interrupt"};
  writer.Line(kEnd);
  writer.Line(u"Endpoint Descriptor:\r\n");
  if (const auto address = writer.Byte(2)) {
    writer.Line(u"bEndpointAddress:     0x", Hex(*address, 2),
                *address & 0x80 ? u"  IN\r\n" : u"  OUT\r\n");
  }
  if (const auto attributes = writer.Byte(3)) {
    writer.Line(u"Transfer Type:        ", kTypes[*attributes & 3], kEnd);
  }
  if (const auto size = writer.Word(4)) {
    writer.Line(u"wMaxPacketSize:       0x", Hex(*size, 4), u" (", Decimal(*size), u")\r\n");
  }
  if (writer.Byte(0) == sizeof(platform::USB_ENDPOINT_DESCRIPTOR)) {
    writer.ByteLine(u"bInterval:            ", 6);
  } else {
    writer.WordLine(u"wInterval:          ", 6);
    writer.ByteLine(u"bSyncAddress:         ", 8);
  }
}

void DumpHid(DescriptorWriter writer) {
  writer.Line(u"\r\nHID Descriptor:\r\n");
  writer.WordLine(u"bcdHID:             ", 2);
  writer.ByteLine(u"bCountryCode:         ", 4);
  writer.ByteLine(u"bNumDescriptors:      ", 5);
  const std::size_t count = writer.Byte(5).value_or(0);
  for (std::size_t i = 0, offset = 6; i < count && writer.Byte(offset); ++i, offset += 3) {
    writer.ByteLine(u"bDescriptorType:      ", offset);
    writer.WordLine(u"wDescriptorLength:  ", offset + 1);
  }
}

void DumpUnknown(DescriptorWriter writer) {
  writer.Line(u"\r\nUnknown Descriptor:\r\n");
  writer.ByteLine(u"bDescriptorType:      ", 1);
  writer.ByteLine(u"bLength:              ", 0);
  const std::size_t length = writer.Byte(0).value_or(0);
  std::size_t count = 0;
  for (; count < length && writer.Byte(count); ++count) {
    if (count != 0 && count % 16 == 0) writer.Rest(kEnd);
    writer.Rest(Hex(*writer.Byte(count), 2), u" ");
  }
  if (count != 0) writer.Rest(kEnd);
}

void DumpDescriptor(RawDescriptor bytes, const StringDescriptorNode* strings,
                    std::u16string_view prefix, std::u16string& out) {
  if (bytes.size() < 2) return;
  const std::uint8_t length = bytes[0];
  const DescriptorWriter writer(bytes, prefix, out);
  switch (bytes[1]) {
    case platform::kUSB_CONFIGURATION_DESCRIPTOR_TYPE:
      if (length == 9) return DumpConfigurationDescriptor(writer, strings);
      break;
    case platform::kUSB_INTERFACE_DESCRIPTOR_TYPE:
      if (length == 9 || length == 11) return;
      break;
    case platform::kUSB_ENDPOINT_DESCRIPTOR_TYPE:
      if (length == 7 || length == 9) return DumpEndpoint(writer);
      break;
    case platform::kUSB_HID_DESCRIPTOR_TYPE:
      if (length > 8) return DumpHid(writer);
      break;
    default:
      break;
  }
  DumpUnknown(writer);
}

std::u16string_view SpeedName(std::uint8_t speed) noexcept {
  switch (speed) {
    case platform::UsbLowSpeed:
      return u"Low";
    case platform::UsbFullSpeed:
      return u"Full";
    case platform::UsbHighSpeed:
      return u"High";
    default:
      return u"Unknown";
  }
}

}  // namespace

void DumpConnectionInformation(const platform::ConnectionInformationEx& record,
                               std::u16string_view prefix, std::u16string& out) {
  const auto& info = record.Info;
  const auto& device = info.DeviceDescriptor;
  LineWriter writer(prefix, out);
  const std::u16string_view status = ConnectionStatusName(info.ConnectionStatus);
  if (info.ConnectionStatus == platform::NoDeviceConnected) {
    writer.Line(u"ConnectionStatus: ", status, kEnd);
    return;
  }

  writer.Line(u"ConnectionInfo :::\r\n");
  writer.Line(u"Device Descriptor:\r\n");
  writer.Line(u"bcdUSB:                 0x", Hex(device.bcdUSB, 4), kEnd);
  writer.Line(u"bDeviceClass:           0x", Hex(device.bDeviceClass, 2), kEnd);
  writer.Line(u"bDeviceSubClass:        0x", Hex(device.bDeviceSubClass, 2), kEnd);
  writer.Line(u"bDeviceProtocol:        0x", Hex(device.bDeviceProtocol, 2), kEnd);
  writer.Line(u"bMaxPacketSize0:        0x", Hex(device.bMaxPacketSize0, 2), u" (",
              Decimal(device.bMaxPacketSize0), u")\r\n");
  writer.Line(u"bcdDevice:              0x", Hex(device.bcdDevice, 4), kEnd);
  writer.Line(u"bNumConfigurations:     0x", Hex(device.bNumConfigurations, 2), kEnd);
  writer.Line(u"ConnectionStatus: ", status, kEnd);
  writer.Line(u"Current Config Value: 0x", Hex(info.CurrentConfigurationValue, 2), kEnd);
  writer.Line(u"Device Bus Speed:     ", SpeedName(info.Speed), kEnd);
  writer.Line(u"DeviceIsHub: ", info.DeviceIsHub ? u"yes" : u"no", kEnd);
  writer.Line(u"Device Address:       0x", Hex(info.DeviceAddress, 2), kEnd);
  const std::uint32_t pipes = info.NumberOfOpenPipes;
  writer.Line(u"Open Pipes:             ", Decimal(static_cast<std::int32_t>(pipes), 2), kEnd);

  const RawDescriptor bytes(reinterpret_cast<const std::uint8_t*>(&record), sizeof(record));
  for (std::size_t i = 0; i < std::min<std::size_t>(pipes, platform::kConnectionPipes); ++i) {
    // A pipe's descriptor may say that it is longer than its place in the list:
    // what follows is then shown as the rest of it, up to the end of the
    // record.
    const std::size_t offset = sizeof(record.Info) + i * sizeof(platform::USB_PIPE_INFO);
    DumpEndpoint({bytes.subspan(offset), prefix, out});
  }
  writer.Line(u"End ConnectionInfo ---\r\n");
}

void DumpConfiguration(std::span<const RawDescriptor> descriptors,
                       const StringDescriptorNode* strings, std::u16string_view prefix,
                       std::u16string& out) {
  LineWriter writer(prefix, out);
  writer.Line(u"ConfigDesc :::\r\n");
  for (const RawDescriptor& descriptor : descriptors) {
    DumpDescriptor(descriptor, strings, prefix, out);
  }
  writer.Line(u"End ConfigDesc ...\r\n");
}

void DumpInterface(const InterfaceEntry& entry, std::u16string_view prefix, std::u16string& out) {
  DescriptorWriter writer(entry.Descriptor, prefix, out);
  writer.Line(u"\r\nInterface Descriptor:\r\n");
  writer.ByteLine(u"bInterfaceNumber:     ", 2);
  writer.ByteLine(u"bAlternateSetting:    ", 3);
  writer.ByteLine(u"bNumEndpoints:        ", 4);
  const std::uint8_t classCode = writer.Byte(5).value_or(0);
  const std::uint8_t subClass = writer.Byte(6).value_or(0);
  const auto named = [&writer](std::u16string_view label, std::size_t offset, auto name) {
    const auto value = writer.Byte(offset);
    if (value) writer.Line(label, u"0x", Hex(*value, 2), u" (", name(*value), u")\r\n");
  };
  named(u"bInterfaceClass:      ", 5, UsbClassName);
  named(u"bInterfaceSubClass:   ", 6,
        [=](auto value) { return UsbSubClassName(classCode, value); });
  named(u"bInterfaceProtocol:   ", 7,
        [=](auto value) { return UsbProtocolName(classCode, subClass, value); });
  writer.ByteLine(u"iInterface:           ", 8);
  if (writer.Byte(8) && entry.String) {
    DumpString(writer, entry.String->LanguageID, entry.String->Value);
  }
  if (writer.Byte(0) == 11) writer.WordLine(u"wNumClasses:        ", 9);
}

}  // namespace KelvoUHW
