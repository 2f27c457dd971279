#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "platform/storage_ioctl.h"
#include "platform/usb_ioctl.h"
#include "tests/platform/stick_pc.h"

namespace platform::simulated {
namespace {

constexpr std::uint8_t kMark = 0xEE;

// The outcome of a request with a marked buffer of `out` bytes.
struct Reply {
  Status status;
  std::uint32_t returned = 99;
  std::vector<std::uint8_t> bytes;

  // The bytes behind those returned are as the caller left them.
  bool RestUntouched() const {
    return std::all_of(bytes.begin() + returned, bytes.end(),
                       [](std::uint8_t byte) { return byte == kMark; });
  }
  template <class Record>
  Record As() const {
    Record record{};
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

  Reply Ask(FileHandle handle, std::uint32_t code, std::vector<std::uint8_t> in,
            std::uint32_t out) {
    Reply reply{{}, 99, std::vector<std::uint8_t>(out, kMark)};
    reply.status = pc.DeviceControl(handle, code, in.data(), static_cast<std::uint32_t>(in.size()),
                                    reply.bytes.data(), out, reply.returned);
    return reply;
  }

  Reply AskPort(FileHandle handle, std::uint32_t code, std::uint8_t port, std::uint32_t out) {
    return Ask(handle, code, {port, 0, 0, 0}, out);
  }

  SimulatedPc pc{StickMachine()};
};

TEST_F(DeviceIoTest, Names) {
  const struct {
    Text path;
    bool opens;
  } kCases[] = {
      {u"\\\\.\\HCD0", true},
      {u"\\\\.\\hcd0", true},
      {kControllerPath, true},
      {Text(u"\\\\.\\") + kRootHubName, true},
      {Text(u"\\\\?\\") + ToUpper(std::u16string_view(kHubName)), true},
      {kDiskPath, true},
      {u"\\\\.\\e:", true},
      {u"\\\\.\\C:", true},  // a drive without storage answers
      {u"\\\\.\\HCD1", false},
      {kRootHubName, false},
      {u"\\\\.\\D:", false},
      {u"\\\\.\\E:\\", false},
      {u"", false},
  };
  for (const auto& [path, opens] : kCases) {
    FileHandle handle = 77;
    const Status status = pc.OpenDevice(path.c_str(), 0, 3, handle);
    EXPECT_EQ(status.ok, opens) << ToUtf8(path);
    EXPECT_EQ(handle != kInvalidHandle, opens) << ToUtf8(path);
    if (!opens) {
      EXPECT_EQ(status.error, kERROR_FILE_NOT_FOUND) << ToUtf8(path);
    }
    if (opens) {
      EXPECT_TRUE(pc.CloseDevice(handle)) << ToUtf8(path);
    }
  }
  EXPECT_EQ(pc.Open(), OpenCounts{});
  EXPECT_TRUE(pc.Misuses().empty());
}

TEST_F(DeviceIoTest, WrongClosesAreRefusedAndRemembered) {
  const FileHandle file = Open(u"\\\\.\\HCD0");
  DeviceSetHandle set = 0;
  ASSERT_TRUE(pc.GetClassDevs(nullptr, kDIGCF_PRESENT | kDIGCF_ALLCLASSES, set));
  EXPECT_EQ(pc.OpenNames(), (std::vector<Text>{u"file \\\\.\\HCD0", u"set devices"}));
  EXPECT_EQ(pc.CloseDevice(set).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.DestroyDeviceInfoList(file).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Open(), (OpenCounts{1, 1, 0, 0})) << "a refused close closes nothing";
  EXPECT_TRUE(pc.CloseDevice(file));
  EXPECT_EQ(pc.CloseDevice(file).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.CloseDevice(kInvalidHandle).error, kERROR_INVALID_HANDLE);
  EXPECT_TRUE(pc.DestroyDeviceInfoList(set));
  EXPECT_NE(Open(u"\\\\.\\HCD0"), file) << "handles are never used again";
  EXPECT_EQ(Ask(file, kIOCTL_USB_GET_ROOT_HUB_NAME, {}, 6).status.error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Misuses(),
            (std::vector<Text>{u"close of set devices as file", u"close of file \\\\.\\HCD0 as set",
                               u"second close of file \\\\.\\HCD0",
                               u"close of what never was a handle, as file"}));
}

TEST_F(DeviceIoTest, NameRequestsAtEverySize) {
  const FileHandle controller = Open(kControllerPath);
  const FileHandle hub = Open(Text(u"\\\\.\\") + kRootHubName);
  const struct {
    FileHandle handle;
    std::uint32_t code;
    std::uint8_t port;
    std::uint32_t head;
    Text name;
  } kCases[] = {
      {controller, kIOCTL_GET_HCD_DRIVERKEY_NAME, 0, 4, u"{usb}\\0000"},
      {controller, kIOCTL_USB_GET_ROOT_HUB_NAME, 0, 4, kRootHubName},
      {hub, kIOCTL_USB_GET_NODE_CONNECTION_NAME, 2, 8, kHubName},
      {hub, kIOCTL_USB_GET_NODE_CONNECTION_NAME, 1, 8, u""},  // no hub there
      {hub, kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME, 1, 8, u"{usb}\\0003"},
  };
  for (const auto& [handle, code, port, head, name] : kCases) {
    const auto whole = static_cast<std::uint32_t>(head + (name.size() + 1) * 2);
    for (std::uint32_t out = 0; out <= whole + 3; ++out) {
      SCOPED_TRACE(ToUtf8(name) + " into " + std::to_string(out));
      const Reply reply = AskPort(handle, code, port, out);
      if (out < head + 2) {
        EXPECT_EQ(reply.status.error, kERROR_INSUFFICIENT_BUFFER);
        EXPECT_EQ(reply.returned, 0u);
      } else {
        ASSERT_TRUE(reply.status);
        EXPECT_EQ(reply.returned, out < whole ? head + 2 : whole);
        if (head == 4) {
          EXPECT_EQ(+reply.As<UsbNameHead>().ActualLength, whole);
        } else {
          EXPECT_EQ(+reply.As<UsbConnectionNameHead>().ActualLength, whole);
          EXPECT_EQ(+reply.As<UsbConnectionNameHead>().ConnectionIndex, port);
        }
        EXPECT_EQ(reply.TextAt(head), out < whole ? u"" : name);
      }
      EXPECT_TRUE(reply.RestUntouched());
    }
  }
}

TEST_F(DeviceIoTest, RefusedRequests) {
  const FileHandle controller = Open(u"\\\\.\\HCD0");
  const FileHandle hub = Open(Text(u"\\\\.\\") + kRootHubName);
  const FileHandle disk = Open(kDiskPath);
  const FileHandle drive = Open(u"\\\\.\\E:");
  const FileHandle bare = Open(u"\\\\.\\C:");
  const std::vector<std::uint8_t> query(12, 0);
  const std::vector<std::uint8_t> otherQuery = {1, 0, 0, 0, 0, 0, 0, 0};
  constexpr std::uint32_t kConnection = kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION;
  constexpr std::uint32_t kConnectionEx = kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX;
  constexpr std::uint32_t kHubOnPort = kIOCTL_USB_GET_NODE_CONNECTION_NAME;
  constexpr std::uint32_t kKeyOnPort = kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME;
  using Bytes = std::vector<std::uint8_t>;
  const struct {
    FileHandle handle;
    std::uint32_t code;
    std::vector<std::uint8_t> in;
    std::uint32_t out;
    std::uint32_t error;
  } kCases[] = {
      {controller, kHubOnPort, Bytes{1, 0, 0, 0}, 100, kERROR_INVALID_FUNCTION},
      {hub, kIOCTL_GET_HCD_DRIVERKEY_NAME, {}, 100, kERROR_INVALID_FUNCTION},
      {hub, 0, {}, 0, kERROR_INVALID_FUNCTION},
      {hub, kIOCTL_USB_GET_NODE_INFORMATION, {}, 75, kERROR_INSUFFICIENT_BUFFER},
      {hub, kHubOnPort, Bytes{1, 0, 0}, 100, kERROR_INSUFFICIENT_BUFFER},
      {hub, kHubOnPort, Bytes{0, 0, 0, 0}, 100, kERROR_INVALID_PARAMETER},
      {hub, kConnection, Bytes{4, 0, 0, 0}, 365, kERROR_INVALID_PARAMETER},
      {hub, kConnection, Bytes{1, 0, 0, 1}, 365, kERROR_INVALID_PARAMETER},
      {hub, kConnectionEx, Bytes{1, 0, 0, 0}, 34, kERROR_INSUFFICIENT_BUFFER},
      {hub, kKeyOnPort, Bytes{3, 0, 0, 0}, 100, kERROR_INVALID_PARAMETER},
      {disk, kIOCTL_STORAGE_QUERY_PROPERTY, Bytes{0, 0, 0, 0, 0, 0, 0}, 512, 24},
      {disk, kIOCTL_STORAGE_QUERY_PROPERTY, otherQuery, 512, kERROR_INVALID_PARAMETER},
      {disk, kIOCTL_STORAGE_QUERY_PROPERTY, query, 7, kERROR_INSUFFICIENT_BUFFER},
      {disk, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 11, kERROR_INSUFFICIENT_BUFFER},
      {disk, kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, {}, 3, kERROR_INSUFFICIENT_BUFFER},
      {disk, kIOCTL_USB_GET_NODE_INFORMATION, {}, 100, kERROR_INVALID_FUNCTION},
      {drive, kIOCTL_STORAGE_QUERY_PROPERTY, query, 512, kERROR_INVALID_FUNCTION},
      {drive, kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, {}, 4, kERROR_NOT_SUPPORTED},
      {bare, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12, kERROR_INVALID_FUNCTION},
      {0x1002, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12, kERROR_INVALID_HANDLE},
  };
  for (const auto& entry : kCases) {
    const Reply reply = Ask(entry.handle, entry.code, entry.in, entry.out);
    SCOPED_TRACE(testing::Message() << std::hex << entry.code << " into " << entry.out);
    EXPECT_FALSE(reply.status);
    EXPECT_EQ(reply.status.error, entry.error);
    EXPECT_EQ(reply.returned, 0u);
    EXPECT_TRUE(reply.RestUntouched());
  }
  std::uint32_t returned = 99;
  EXPECT_FALSE(
      pc.DeviceControl(hub, kIOCTL_USB_GET_NODE_INFORMATION, nullptr, 0, nullptr, 76, returned));
  EXPECT_FALSE(
      pc.DeviceControl(hub, kIOCTL_USB_GET_NODE_INFORMATION, nullptr, 4, nullptr, 0, returned));
  EXPECT_EQ(returned, 0u);
}

TEST_F(DeviceIoTest, NodeInformation) {
  const auto root =
      Ask(Open(Text(u"\\\\.\\") + kRootHubName), kIOCTL_USB_GET_NODE_INFORMATION, {}, 80);
  EXPECT_EQ(root.returned, 76u);
  EXPECT_TRUE(root.RestUntouched());
  EXPECT_EQ(+root.As<USB_NODE_INFORMATION>().NodeType, 0u);
  EXPECT_EQ(+root.As<USB_NODE_INFORMATION>().HubDescriptor.bNumberOfPorts, 3);
  EXPECT_EQ(+root.As<USB_NODE_INFORMATION>().HubIsBusPowered, 0);
  const auto hub = Ask(Open(Text(u"\\\\.\\") + kHubName), kIOCTL_USB_GET_NODE_INFORMATION, {}, 76);
  EXPECT_EQ(+hub.As<USB_NODE_INFORMATION>().HubDescriptor.bNumberOfPorts, 2);
  EXPECT_EQ(+hub.As<USB_NODE_INFORMATION>().HubIsBusPowered, 1);
}

TEST_F(DeviceIoTest, ConnectionInformationInOneBuffer) {
  const FileHandle hub = Open(Text(u"\\\\.\\") + kRootHubName);
  // One buffer for both directions: its four bytes in are copied before the answer overwrites them.
  ConnectionInformationEx record;
  std::memset(&record, kMark, sizeof(record));
  record.Info.ConnectionIndex = 1;
  std::uint32_t returned = 0;
  ASSERT_TRUE(pc.DeviceControl(hub, kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX, &record,
                               sizeof(record), &record, sizeof(record), returned));
  EXPECT_EQ(returned, 35u + 2 * 11u);
  EXPECT_EQ(+record.Info.ConnectionIndex, 1u);
  EXPECT_EQ(+record.Info.DeviceDescriptor.bLength, 18);
  EXPECT_EQ(+record.Info.DeviceDescriptor.bDescriptorType, 1);
  EXPECT_EQ(+record.Info.DeviceDescriptor.idVendor, 0x0781);
  EXPECT_EQ(+record.Info.CurrentConfigurationValue, 1);
  EXPECT_EQ(+record.Info.Speed, 3);
  EXPECT_EQ(+record.Info.DeviceIsHub, 0);
  EXPECT_EQ(+record.Info.DeviceAddress, 5);
  EXPECT_EQ(+record.Info.NumberOfOpenPipes, 2u);
  EXPECT_EQ(+record.Info.ConnectionStatus, DeviceConnected);
  EXPECT_EQ(+record.PipeList[1].EndpointDescriptor.bEndpointAddress, 0x02);
  EXPECT_EQ(+record.PipeList[2].EndpointDescriptor.bLength, kMark);
}

TEST_F(DeviceIoTest, ConnectionInformationPortByPort) {
  const FileHandle hub = Open(Text(u"\\\\.\\") + kRootHubName);
  for (const std::uint32_t out : {35u, 45u, 46u, 57u}) {
    const Reply cut = AskPort(hub, kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, 1, out);
    EXPECT_EQ(cut.returned, 35 + (out - 35) / 11 * 11) << "only whole pipes";
    EXPECT_EQ(+cut.As<USB_NODE_CONNECTION_INFORMATION>().NumberOfOpenPipes, 2u);
    EXPECT_EQ(+cut.As<USB_NODE_CONNECTION_INFORMATION>().LowSpeed, 0);
    EXPECT_TRUE(cut.RestUntouched());
  }
  const auto onHub = AskPort(hub, kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, 2, 365)
                         .As<USB_NODE_CONNECTION_INFORMATION>();
  EXPECT_EQ(+onHub.DeviceIsHub, 1);
  const auto empty = AskPort(hub, kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX, 3, 365)
                         .As<USB_NODE_CONNECTION_INFORMATION_EX>();
  EXPECT_EQ(+empty.ConnectionStatus, NoDeviceConnected);
  EXPECT_EQ(+empty.DeviceDescriptor.bLength, 0);

  Machine slow = StickMachine();
  slow.hubs[0].ports[0].speed = Speed::Low;
  SimulatedPc other(slow);
  FileHandle handle = 0;
  ASSERT_TRUE(other.OpenDevice((Text(u"\\\\.\\") + kRootHubName).c_str(), 0, 0, handle));
  LegacyConnectionInformation record{};
  record.Info.ConnectionIndex = 1;
  std::uint32_t returned = 0;
  ASSERT_TRUE(other.DeviceControl(handle, kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION, &record, 365,
                                  &record, 365, returned));
  EXPECT_EQ(+record.Info.LowSpeed, 1);
}

TEST_F(DeviceIoTest, StorageAnswers) {
  const FileHandle disk = Open(kDiskPath);
  const std::vector<std::uint8_t> query(12, 0);
  const Reply property = Ask(disk, kIOCTL_STORAGE_QUERY_PROPERTY, query, 512);
  const auto head = property.As<STORAGE_DEVICE_DESCRIPTOR>();
  EXPECT_EQ(property.returned, 36u + 9u + 5u);
  EXPECT_EQ(head.Size, property.returned);
  EXPECT_EQ(head.RemovableMedia, 1);
  EXPECT_EQ(head.ProductIdOffset, 0u);
  EXPECT_EQ(head.ProductRevisionOffset, 0u);
  const char* texts = reinterpret_cast<const char*>(property.bytes.data());
  EXPECT_STREQ(texts + head.VendorIdOffset, "SanDisk ");
  EXPECT_STREQ(texts + head.SerialNumberOffset, "AA01");
  EXPECT_TRUE(property.RestUntouched());
  EXPECT_EQ(Ask(disk, kIOCTL_STORAGE_QUERY_PROPERTY, query, 35).returned, 8u) << "the two sizes";
  EXPECT_EQ(Ask(disk, kIOCTL_STORAGE_QUERY_PROPERTY, query, 40).returned, 40u) << "cut off";

  const auto number = Ask(disk, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12);
  EXPECT_EQ(number.As<STORAGE_DEVICE_NUMBER>().DeviceNumber, 1u);
  EXPECT_EQ(number.As<STORAGE_DEVICE_NUMBER>().DeviceType, 7u);

  for (const std::uint32_t out : {4u, 21u}) {
    const Reply length = Ask(disk, kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, {}, out);
    ASSERT_TRUE(length.status);
    EXPECT_EQ(length.returned, 4u);
    EXPECT_EQ(length.As<std::uint32_t>(), 6u);
    EXPECT_TRUE(length.RestUntouched());
  }
  const Reply serial = Ask(disk, kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, {}, 22);
  EXPECT_EQ(serial.returned, 22u);
  EXPECT_EQ(serial.TextAt(16), u"M1");
}

TEST_F(DeviceIoTest, AnUnpluggedDeviceStaysGoneForItsHandle) {
  const FileHandle disk = Open(kDiskPath);
  const FileHandle drive = Open(u"\\\\.\\E:");
  const FileHandle controller = Open(u"\\\\.\\HCD0");
  const Machine before = pc.Snapshot();
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  Plug back;
  back.fragment.devices = {before.devices[3], before.devices[4]};
  back.fragment.interfaces = {before.interfaces[1]};
  back.fragment.storage = {before.storage[0]};
  for (int round = 0; round < 2; ++round) {
    for (const FileHandle handle : {disk, drive}) {
      EXPECT_EQ(Ask(handle, kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12).status.error,
                kERROR_DEVICE_NOT_CONNECTED);
    }
    EXPECT_TRUE(Ask(controller, kIOCTL_USB_GET_ROOT_HUB_NAME, {}, 6).status);
    if (round == 0) {
      ASSERT_EQ(pc.Apply({0, u"", back}), u"");
    }
  }
  EXPECT_TRUE(Ask(Open(kDiskPath), kIOCTL_STORAGE_GET_DEVICE_NUMBER, {}, 12).status);
  EXPECT_TRUE(pc.CloseDevice(disk));
}

}  // namespace
}  // namespace platform::simulated
