#include "tree/port_device.h"

#include <gtest/gtest.h>

#include "platform/text.h"
#include "tests/support/port_records.h"

namespace KelvoUHW {
namespace {

// A configuration of one interface with its string and an endpoint.
std::unique_ptr<DescriptorRequest> Configuration() {
  auto request = std::make_unique<DescriptorRequest>();
  request->Data = {
      9, 2, 25,   0, 1, 1, 4, 0xA0, 0x32,  // configuration
      9, 4, 0,    0, 2, 8, 6, 0x50, 4,     // interface
      7, 5, 0x81, 2, 0, 2, 0,              // bulk in
  };
  return request;
}

std::string Dump(const CZKUMPortDeviceImpl& device, const char16_t* indent) {
  std::u16string out;
  device.ToString(out, indent);
  return platform::ToUtf8(out);
}

TEST(PortDevice, TakesItsIdentityFromRecordAndStrings) {
  struct Case {
    const char* what;
    bool record, strings;
    const char16_t* id;
    std::uint32_t vendor, product;
    const char16_t *serial, *manufacturer;
  };
  const Case cases[] = {
      {"nothing", false, false, u"", kUnknownId, kUnknownId, u"", u""},
      {"the id alone", false, true, u"USB\\VID_046D&PID_C52B\\7", 0x46D, 0xC52B, u"7", u""},
      {"the record over the id", true, false, u"USB\\VID_046D&PID_C52B\\7", 0x781, 0x5580, u"7", u""},
      {"the strings over the id", true, true, u"USB\\VID_046D&PID_C52B\\7", 0x781, 0x5580, u"AA01", u"SanDisk"},
  };
  for (const Case& c : cases) {
    const auto device = MakeRecord<CZKUMPortDeviceImpl>(5u, c.record ? Connection(1) : nullptr, nullptr,
                                                        c.strings ? Strings() : nullptr, u"key", u"descr", c.id);
    EXPECT_EQ(device->m_devInstHandle, 5u) << c.what;
    EXPECT_EQ(device->m_nVendorId, c.vendor) << c.what;
    EXPECT_EQ(device->m_nProductId, c.product) << c.what;
    EXPECT_EQ(device->m_strSerialNumber, c.serial) << c.what;
    EXPECT_EQ(device->m_strUsbManufacturer, c.manufacturer) << c.what;
    EXPECT_EQ(device->Speed(), c.record ? 2 : 0) << c.what;
    EXPECT_EQ(device->NumberInterfaces(), 0) << c.what;
    EXPECT_TRUE(device->AcceptNode(device)) << c.what;
  }
}

TEST(PortDevice, WithoutConnectionOnlyItsNeighboursAreDumped) {
  const auto info = MakeRecord<CZKUMUsbTreeNodeImpl>();
  info->SetInstanceId(u"info");
  const std::string rest =
      "x DevInstId            : info\r\n"
      "childvector size0\r\nChildsToString End\r\n"
      "childvector size0\r\nChildsToString End\r\n";
  for (auto* record : {static_cast<ConnectionRecord*>(nullptr), Connection(0).release()}) {
    const auto device = MakeRecord<CZKUMPortDeviceImpl>(1u, std::unique_ptr<ConnectionRecord>(record), nullptr, nullptr,
                                                        u"k", u"d", u"i");
    device->m_infoDevice = info;
    EXPECT_EQ(Dump(*device, u"x "), rest);
  }
  auto record = Connection(1);
  record->Info.DeviceDescriptor.idVendor = 0xFFFF;
  const auto nameless = MakeRecord<CZKUMPortDeviceImpl>(0u, std::move(record), nullptr, nullptr, u"", u"", u"");
  EXPECT_NE(Dump(*nameless, u"").find("idVendor      : 0xFFFF (null)\r\n"), std::string::npos);
}

TEST(PortDevice, AFullDeviceIsDumpedByteForByte) {
  const auto device = MakeRecord<CZKUMPortDeviceImpl>(6u, Connection(1), Configuration(), Strings(), u"key",
                                                      u"USB Mass Storage Device", u"USB\\VID_0781&PID_5580\\AA01");
  EXPECT_EQ(device->NumberInterfaces(), 1);
  ASSERT_EQ(device->m_interfaceDescrs.size(), 1u);
  EXPECT_EQ(Dump(*device, u"> "),
            "> PortDevice: ==================================================\r\n"
            "> DevInstId            : USB\\VID_0781&PID_5580\\AA01\r\n> driverKeyName : key\r\n"
            "> deviceDescr : USB Mass Storage Device\r\n> serial number        : AA01\r\n"
            "> VendorId; productId: 0x781; 0x5580\r\n> devInstHandle        : 6\r\n> manufacturer  : SanDisk\r\n"
            "> product       : Extreme\r\n> idVendor      : 0x0781 SanDisk Corporation\r\n"
            "> ConnectionInfo :::\r\n"
            "> Device Descriptor:\r\n> bcdUSB:                 0x0000\r\n> bDeviceClass:           0x00\r\n"
            "> bDeviceSubClass:        0x00\r\n> bDeviceProtocol:        0x00\r\n"
            "> bMaxPacketSize0:        0x00 (0)\r\n> bcdDevice:              0x0000\r\n"
            "> bNumConfigurations:     0x00\r\n> ConnectionStatus: DeviceConnected\r\n"
            "> Current Config Value: 0x01\r\n> Device Bus Speed:     High\r\n> DeviceIsHub: no\r\n"
            "> Device Address:       0x09\r\n> Open Pipes:              0\r\n> End ConnectionInfo ---\r\n"
            "> ConfigDesc :::\r\n"
            "> \r\nConfiguration Descriptor:\r\n> wTotalLength:       0x0019\r\n> bNumInterfaces:       0x01\r\n"
            "> bConfigurationValue:  0x01\r\n> iConfiguration:       0x04\r\n> (LanguageID=0x0409):    \"Stick\"\r\n"
            "> bmAttributes:         0xA0 (> Bus Powered > Remote Wakeup)\r\n"
            "> MaxPower:             0x32 (100 Ma)\r\n"
            "> \r\n> Endpoint Descriptor:\r\n> bEndpointAddress:     0x81  IN\r\n> Transfer Type:        Bulk\r\n"
            "> wMaxPacketSize:       0x0200 (512)\r\n> bInterval:            0x00\r\n"
            "> End ConfigDesc ...\r\n"
            "> . \r\nInterface Descriptor:\r\n> . bInterfaceNumber:     0x00\r\n> . bAlternateSetting:    0x00\r\n"
            "> . bNumEndpoints:        0x02\r\n> . bInterfaceClass:      0x08 (Interface: Mass Storage)\r\n"
            "> . bInterfaceSubClass:   0x06 (SCSI transparent)\r\n"
            "> . bInterfaceProtocol:   0x50 (Bulk-Only Transport)\r\n> . iInterface:           0x04\r\n"
            "> . (LanguageID=0x0409):    \"Stick\"\r\n> End device -------------------------------------------\r\n"
            "childvector size0\r\nChildsToString End\r\n");
}

}  // namespace
}  // namespace KelvoUHW
