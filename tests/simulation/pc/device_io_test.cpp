#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <utility>

#include "platform/storage_ioctl.h"
#include "platform/usb_ioctl.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/simulation/stick_pc.h"

namespace platform::simulated {
namespace {

using Bytes = std::vector<std::uint8_t>;
constexpr std::uint8_t kMark = 0xEE;
const Text kRootHub = Text(u"\\\\.\\") + kRootHubName;

// The outcome of a request with a marked buffer.
struct Reply {
  Status status;
  Bytes bytes;
  std::uint32_t returned = 99;
  template <class Record>
  Record As(Record record = {}) const {
    std::memcpy(&record, bytes.data(), std::min(sizeof(record), bytes.size()));
    return record;
  }
  Text TextAt(std::size_t offset) const {
    Text text((bytes.size() - offset) / 2, u'\0');
    std::memcpy(text.data(), bytes.data() + offset, text.size() * 2);
    return Text(UpToZero(text));
  }
};

class DeviceIoTest : public testing::Test {
 protected:
  FileHandle Open(const Text& path) {
    FileHandle handle = 0;
    EXPECT_TRUE(pc.OpenDevice(path.c_str(), kGENERIC_WRITE, kFILE_SHARE_WRITE, handle));
    return handle;
  }
  // The bytes behind those returned stay as the caller left them.
  Reply Ask(FileHandle handle, std::uint32_t code, Bytes in, std::uint32_t out) {
    Reply reply{{}, Bytes(out, kMark)};
    reply.status = pc.DeviceControl(handle, code, in.data(), static_cast<std::uint32_t>(in.size()), reply.bytes.data(),
                                    out, reply.returned);
    EXPECT_EQ(std::count(reply.bytes.begin() + reply.returned, reply.bytes.end(), kMark), out - reply.returned);
    return reply;
  }
  SimulatedPc pc{StickMachine()};
};

TEST_F(DeviceIoTest, Names) {
  const std::pair<Text, bool> kCases[] = {{u"\\\\.\\hcd0", true},
                                          {kControllerPath, true},
                                          {kRootHub, true},
                                          {Text(u"\\\\?\\") + ToUpper(std::u16string_view(kHubName)), true},
                                          {kDiskPath, true},
                                          {u"\\\\.\\e:", true},
                                          {u"\\\\.\\C:", true},  // a drive without storage answers
                                          {u"\\\\.\\HCD1", false},
                                          {kRootHubName, false},
                                          {u"\\\\.\\D:", false},
                                          {u"\\\\.\\E:\\", false},
                                          {u"", false}};
  for (const auto& [path, opens] : kCases) {
    FileHandle handle = 77;
    EXPECT_EQ(Error(pc.OpenDevice(path.c_str(), 0, 3, handle)), opens ? 0 : kERROR_FILE_NOT_FOUND) << ToUtf8(path);
    EXPECT_EQ(handle != kInvalidHandle, opens) << ToUtf8(path);
    if (opens) pc.CloseDevice(handle);
  }
  EXPECT_EQ(pc.Open(), OpenCounts{});
  EXPECT_TRUE(pc.Misuses().empty());
}

TEST_F(DeviceIoTest, WrongClosesAreRefusedAndRemembered) {
  const FileHandle file = Open(u"\\\\.\\HCD0");
  DeviceSetHandle set = 0;
  ASSERT_TRUE(pc.GetClassDevs(nullptr, kDIGCF_PRESENT | kDIGCF_ALLCLASSES, set));
  EXPECT_EQ(pc.OpenNames(), (std::vector<Text>{u"file \\\\.\\HCD0", u"set devices"}));
  EXPECT_EQ(Error(pc.CloseDevice(set)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(Error(pc.DestroyDeviceInfoList(file)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Open(), (OpenCounts{1, 1, 0, 0})) << "a refused close closes nothing";
  EXPECT_TRUE(pc.CloseDevice(file));
  EXPECT_EQ(Error(pc.CloseDevice(file)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(Error(pc.CloseDevice(kInvalidHandle)), kERROR_INVALID_HANDLE);
  EXPECT_TRUE(pc.DestroyDeviceInfoList(set));
  EXPECT_NE(Open(u"\\\\.\\HCD0"), file) << "handles are never used again";
  EXPECT_EQ(pc.Misuses(),
            (std::vector<Text>{u"close of set devices as file", u"close of file \\\\.\\HCD0 as set",
                               u"second close of file \\\\.\\HCD0", u"close of what never was a handle, as file"}));
  // Names are kept of the latest 4,096 handles, or each broadcast of a long run would take memory for good.
  const FileHandle early = Open(u"\\\\.\\HCD0");
  FileHandle late = early;
  for (int i = 0; i < 4'096; ++i) EXPECT_TRUE(pc.CloseDevice(std::exchange(late, Open(u"\\\\.\\e:"))));
  EXPECT_EQ(Error(pc.CloseDevice(early)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Misuses().back(), u"second close of what was closed long ago");
  EXPECT_EQ(Error(pc.CloseDevice(early + 4)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Misuses().back(), u"second close of file \\\\.\\e:");
}

TEST_F(DeviceIoTest, NameRequestsAtEverySize) {
  const FileHandle controller = Open(kControllerPath), hub = Open(kRootHub);
  const std::tuple<FileHandle, std::uint32_t, std::uint8_t, std::uint32_t, Text> kCases[] = {
      {controller, kIOCTL_GET_HCD_DRIVERKEY_NAME, 0, 4, u"{usb}\\0000"},
      {controller, kIOCTL_USB_GET_ROOT_HUB_NAME, 0, 4, kRootHubName},
      {hub, kIOCTL_USB_GET_NODE_CONNECTION_NAME, 2, 8, kHubName},
      {hub, kIOCTL_USB_GET_NODE_CONNECTION_NAME, 1, 8, u""},  // no hub there
      {hub, kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME, 1, 8, u"{usb}\\0003"}};
  for (const auto& [handle, code, port, head, name] : kCases) {
    const auto whole = static_cast<std::uint32_t>(head + (name.size() + 1) * 2);
    for (std::uint32_t out = 0; out <= whole + 3; ++out) {
      SCOPED_TRACE(ToUtf8(name) + " into " + std::to_string(out));
      const Reply reply = Ask(handle, code, {port, 0, 0, 0}, out);
      EXPECT_EQ(Error(reply.status), out < head + 2 ? kERROR_INSUFFICIENT_BUFFER : 0);
      EXPECT_EQ(reply.returned, out < head + 2 ? 0 : out < whole ? head + 2 : whole);
      if (!reply.status) continue;
      const auto onPort = reply.As<UsbConnectionNameHead>();
      EXPECT_EQ(head == 4 ? reply.As<UsbNameHead>().ActualLength : onPort.ActualLength, whole);
      EXPECT_TRUE(head == 4 || onPort.ConnectionIndex == port);
      EXPECT_EQ(reply.TextAt(head), out < whole ? u"" : name);
    }
  }
}

TEST_F(DeviceIoTest, RefusedRequests) {
  const FileHandle controller = Open(u"\\\\.\\HCD0"), hub = Open(kRootHub), disk = Open(kDiskPath);
  const FileHandle drive = Open(u"\\\\.\\E:"), bare = Open(u"\\\\.\\C:");
  const Bytes query(12, 0);
  constexpr std::uint32_t kConnection = kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION;
  constexpr std::uint32_t kHubOnPort = kIOCTL_USB_GET_NODE_CONNECTION_NAME;
  const std::tuple<FileHandle, std::uint32_t, Bytes, std::uint32_t, std::uint32_t> kCases[] = {
      {controller, kHubOnPort, Bytes{1, 0, 0, 0}, 100, kERROR_INVALID_FUNCTION},
      {hub, kIOCTL_GET_HCD_DRIVERKEY_NAME, {}, 100, kERROR_INVALID_FUNCTION},
      {hub, kIOCTL_USB_GET_NODE_INFORMATION, {}, 75, kERROR_INSUFFICIENT_BUFFER},
      {hub, kHubOnPort, Bytes{1, 0, 0}, 100, kERROR_INSUFFICIENT_BUFFER},
      {hub, kHubOnPort, Bytes{0, 0, 0, 0}, 100, kERROR_INVALID_PARAMETER},
      {hub, kConnection, Bytes{4, 0, 0, 0}, 365, kERROR_INVALID_PARAMETER},
      {hub, kConnection, Bytes{1, 0, 0, 0}, 34, kERROR_INSUFFICIENT_BUFFER},
      {disk, kIOCTL_STORAGE_QUERY_PROPERTY, Bytes{0, 0, 0, 0, 0, 0, 0}, 512, 24},
      {disk, kIOCTL_STORAGE_QUERY_PROPERTY, Bytes{1, 0, 0, 0, 0, 0, 0, 0}, 512, kERROR_INVALID_PARAMETER},
      {disk, kIOCTL_STORAGE_QUERY_PROPERTY, query, 7, kERROR_INSUFFICIENT_BUFFER},
      {disk, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 11, kERROR_INSUFFICIENT_BUFFER},
      {disk, kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, {}, 3, kERROR_INSUFFICIENT_BUFFER},
      {drive, kIOCTL_STORAGE_QUERY_PROPERTY, query, 512, kERROR_INVALID_FUNCTION},
      {drive, kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, {}, 4, kERROR_NOT_SUPPORTED},
      {bare, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12, kERROR_INVALID_FUNCTION},
      {0x1002, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12, kERROR_INVALID_HANDLE}};
  for (const auto& [handle, code, in, out, error] : kCases) {
    const Reply reply = Ask(handle, code, in, out);
    EXPECT_EQ(Error(reply.status), error) << std::hex << code << " into " << out;
    EXPECT_EQ(reply.returned, 0u);
  }
  std::uint32_t returned = 99;
  EXPECT_FALSE(pc.DeviceControl(hub, kIOCTL_USB_GET_NODE_INFORMATION, nullptr, 0, nullptr, 76, returned));
  EXPECT_FALSE(pc.DeviceControl(hub, kIOCTL_USB_GET_NODE_INFORMATION, nullptr, 4, nullptr, 0, returned));
  EXPECT_EQ(returned, 0u);
}

TEST_F(DeviceIoTest, NodeInformation) {
  const std::tuple<Text, int, int> kCases[] = {{kRootHub, 3, 0}, {Text(u"\\\\.\\") + kHubName, 2, 1}};
  for (const auto& [path, ports, busPowered] : kCases) {
    const Reply reply = Ask(Open(path), kIOCTL_USB_GET_NODE_INFORMATION, {}, 80);
    const auto node = reply.As<USB_NODE_INFORMATION>();
    const auto& hub = node.HubDescriptor;
    EXPECT_EQ(std::tuple(reply.returned, +hub.bDescriptorLength, +hub.bNumberOfPorts, +node.HubIsBusPowered),
              std::tuple(76u, 9, ports, busPowered));
  }
}

TEST_F(DeviceIoTest, ConnectionInformation) {
  const FileHandle hub = Open(kRootHub);
  // One buffer for both directions: its four bytes in are copied before the answer overwrites them.
  Bytes record = {1, 0, 0, 0};
  record.resize(365, kMark);
  std::uint32_t code = kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX, returned = 0;
  ASSERT_TRUE(pc.DeviceControl(hub, code, record.data(), 365, record.data(), 365, returned));
  Bytes expected = {1, 0, 0, 0, 18, 1, 0, 0, 0, 0, 0, 0, 0x81, 0x07, 0x80, 0x55, 0, 0, 0,
                    0, 0, 0, 1, 3,  0, 5, 0, 2, 0, 0, 0, 1,    0,    0,    0,    7, 5, 0x81,
                    2, 0, 4, 0, 0,  0, 0, 0, 7, 5, 2, 2, 0,    4,    0,    0,    0, 0, 0};
  EXPECT_EQ(returned, expected.size());
  expected.resize(365, kMark);
  EXPECT_EQ(record, expected);
  for (const std::uint32_t out : {35u, 45u, 46u, 57u}) {
    const Reply cut = Ask(hub, kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, {1, 0, 0, 0}, out);
    EXPECT_EQ(cut.returned, 35 + (out - 35) / 11 * 11) << "only whole pipes";
    const auto info = cut.As<USB_NODE_CONNECTION_INFORMATION>();
    EXPECT_EQ(std::pair(+info.NumberOfOpenPipes, +info.LowSpeed), std::pair(2u, 0));
  }
  const auto port = [&](std::uint8_t index) {
    const Reply reply = Ask(hub, kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, {index, 0, 0, 0}, 365);
    return reply.As<USB_NODE_CONNECTION_INFORMATION>();
  };
  EXPECT_EQ(+port(2).DeviceIsHub, 1);
  EXPECT_EQ(+port(3).DeviceDescriptor.bLength, 0);
  Port slow = StickMachine().hubs[0].ports[0];
  slow.speed = Speed::Low;
  ASSERT_EQ(pc.Apply({0, u"", Plug{{}, {{kRootHubName, 3, slow}}}}), u"");
  EXPECT_EQ(+port(3).LowSpeed, 1);
}

TEST_F(DeviceIoTest, StorageAnswers) {
  const FileHandle disk = Open(kDiskPath);
  const Bytes query(12, 0);
  const Reply property = Ask(disk, kIOCTL_STORAGE_QUERY_PROPERTY, query, 512);
  const auto head = property.As<STORAGE_DEVICE_DESCRIPTOR>();
  constexpr std::uint32_t kSize = 36 + 9 + 5;
  EXPECT_EQ(std::tuple(property.returned, +head.Size, +head.RemovableMedia), std::tuple(kSize, kSize, 1));
  EXPECT_EQ(std::pair(+head.ProductIdOffset, +head.ProductRevisionOffset), std::pair(0u, 0u));
  const char* texts = reinterpret_cast<const char*>(property.bytes.data());
  EXPECT_STREQ(texts + head.VendorIdOffset, "SanDisk ");
  EXPECT_STREQ(texts + head.SerialNumberOffset, "AA01");
  EXPECT_EQ(Ask(disk, kIOCTL_STORAGE_QUERY_PROPERTY, query, 35).returned, 8u) << "the two sizes";
  EXPECT_EQ(Ask(disk, kIOCTL_STORAGE_QUERY_PROPERTY, query, 40).returned, 40u) << "cut off";
  EXPECT_EQ(Ask(disk, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12).bytes, (Bytes{7, 0, 0, 0, 1, 0, 0, 0, 0, 0, 0, 0}));
  for (const std::uint32_t out : {4u, 21u, 22u}) {
    const Reply serial = Ask(disk, kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, {}, out);
    EXPECT_EQ(serial.returned, out < 22 ? 4u : 22u);
    EXPECT_EQ(serial.As<std::uint32_t>(), 6u);
    EXPECT_TRUE(out < 22 || serial.TextAt(16) == u"M1");
  }
}

TEST_F(DeviceIoTest, AnUnpluggedDeviceStaysGoneForItsHandle) {
  const FileHandle disk = Open(kDiskPath), drive = Open(u"\\\\.\\E:"), controller = Open(u"\\\\.\\HCD0");
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  for (int round = 0; round < 2; ++round) {
    for (const FileHandle handle : {disk, drive}) {
      EXPECT_EQ(Error(Ask(handle, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12).status), kERROR_DEVICE_NOT_CONNECTED);
    }
    EXPECT_TRUE(Ask(controller, kIOCTL_USB_GET_ROOT_HUB_NAME, {}, 6).status);
    EXPECT_EQ(pc.Apply({0, u"", StickPlug()}).empty(), round == 0) << "the second time it is there already";
  }
  EXPECT_TRUE(Ask(Open(kDiskPath), kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12).status);
  EXPECT_TRUE(pc.CloseDevice(disk));
}

}  // namespace
}  // namespace platform::simulated
