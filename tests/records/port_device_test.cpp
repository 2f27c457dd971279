#include "records/port_device.h"

#include <gtest/gtest.h>

#include "tests/support/outline.h"
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

TEST(PortDevice, TakesItsIdentityFromRecordAndStrings) {
  using Text = const char16_t*;
  const std::tuple<const char*, bool, bool, Text, std::uint32_t, std::uint32_t, Text, Text> cases[] = {
      {"nothing", false, false, u"", kUnknownId, kUnknownId, u"", u""},
      {"the id alone", false, true, u"USB\\VID_046D&PID_C52B\\7", 0x46D, 0xC52B, u"7", u""},
      {"the record over the id", true, false, u"USB\\VID_046D&PID_C52B\\7", 0x781, 0x5580, u"7", u""},
      {"the strings over the id", true, true, u"USB\\VID_046D&PID_C52B\\7", 0x781, 0x5580, u"AA01", u"SanDisk"}};
  for (const auto& [what, record, strings, id, vendor, product, serial, manufacturer] : cases) {
    const auto device = MakeRecord<CZKUMPortDeviceImpl>(5u, record ? Connection(1) : nullptr, nullptr,
                                                        strings ? Strings() : nullptr, u"key", u"descr", id);
    EXPECT_EQ(
        std::tie(device->m_nVendorId, device->m_nProductId, device->m_strSerialNumber, device->m_strUsbManufacturer),
        std::tie(vendor, product, serial, manufacturer))
        << what;
    EXPECT_EQ(std::tuple(device->m_devInstHandle, device->Speed(), device->NumberInterfaces()),
              std::tuple(5u, record ? 2 : 0, 0))
        << what;
    EXPECT_TRUE(device->AcceptNode(device)) << what;
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
    EXPECT_EQ(DumpOf(*device, u"x "), rest);
  }
  auto record = Connection(1);
  record->Info.DeviceDescriptor.idVendor = 0xFFFF;
  const auto nameless = MakeRecord<CZKUMPortDeviceImpl>(0u, std::move(record), nullptr, nullptr, u"", u"", u"");
  EXPECT_NE(DumpOf(*nameless, u"").find("idVendor      : 0xFFFF (null)\r\n"), std::string::npos);
}

TEST(PortDevice, AFullDeviceIsDumpedByteForByte) {
  const auto device = MakeRecord<CZKUMPortDeviceImpl>(6u, Connection(1), Configuration(), Strings(), u"key",
                                                      u"USB Mass Storage Device", u"USB\\VID_0781&PID_5580\\AA01");
  EXPECT_EQ(device->NumberInterfaces(), 1);
  ASSERT_EQ(device->m_interfaceDescrs.size(), 1u);
  EXPECT_EQ(DumpOf(*device, u"> "), Golden("port-device"));
}

// The first configuration tells it, wherever it stands and as far as it was received.
TEST(PortDevice, NumberOfInterfaces) {
  using Bytes = std::vector<std::uint8_t>;
  const std::pair<Bytes, int> cases[] = {{{9, 2, 9, 0, 3, 1, 0, 0, 0}, 3},
                                         {{9, 2, 5, 0, 3}, 3},
                                         {{9, 2, 4, 0, 3}, 0},
                                         {{7, 5, 0x81, 2, 9, 2, 0, 9, 2, 18, 0, 3, 1, 0, 0, 0, 9, 2, 9, 0, 4}, 3},
                                         {{7, 5, 0x81, 2, 9, 2, 0}, 0}};
  for (const auto& [bytes, number] : cases) {
    auto request = std::make_unique<DescriptorRequest>();
    request->Data = bytes;
    request->Data.shrink_to_fit();  // where a sanitizer sees a read behind them
    const CZKUMPortDeviceImpl device(0, nullptr, std::move(request), nullptr, u"", u"", u"");
    EXPECT_EQ(device.NumberInterfaces(), number) << testing::PrintToString(bytes);
  }
}

}  // namespace
}  // namespace KelvoUHW
