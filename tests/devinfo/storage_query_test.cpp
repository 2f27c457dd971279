// The storage queries over a device that answers anything, honest or not.
#include "devinfo/storage_query.h"

#include <gtest/gtest.h>

#include <cstring>

#include "platform/wrappers/intercepting_host.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/devinfo/storage_machine.h"

namespace KelvoUHW {
namespace {

using platform::Status, platform::simulated::SimulatedPc;

// Answers storage requests with given bytes, whatever the buffer's size, and any returned length.
struct AnsweringHost final : platform::wrappers::InterceptingHost {
  struct Answer {
    Status status;
    std::vector<std::uint8_t> bytes;
    std::uint32_t returned = 0;
  };
  using InterceptingHost::InterceptingHost;
  Status DeviceControl(platform::FileHandle handle, std::uint32_t code, const void* in, std::uint32_t inBytes,
                       void* out, std::uint32_t outBytes, std::uint32_t& returnedBytes) noexcept override {
    const bool property = code == platform::kIOCTL_STORAGE_QUERY_PROPERTY;
    EXPECT_TRUE(property || code == platform::kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER);
    EXPECT_EQ(outBytes, property ? 512u : 4u);
    EXPECT_EQ(inBytes, property ? 12u : 0u);
    const std::vector<std::uint8_t> zeros(inBytes);
    EXPECT_TRUE(inBytes == 0 || std::memcmp(in, zeros.data(), inBytes) == 0);
    handles.push_back(handle);
    const Answer& answer = property ? descriptor : mediaSerial;
    if (!answer.bytes.empty()) std::memcpy(out, answer.bytes.data(), answer.bytes.size());
    returnedBytes = answer.returned;
    return answer.status;
  }
  Answer descriptor;
  Answer mediaSerial{Status::Failure(platform::kERROR_NOT_SUPPORTED), {}, 0};
  std::vector<platform::FileHandle> handles;
  Status BeforeCall(const platform::wrappers::HostCall&) noexcept override { return Status::Success(); }
};

// 512 bytes: the head with the offsets of the four texts, `texts` from byte 36 on, then only x.
AnsweringHost::Answer DescriptorAnswer(std::uint8_t deviceType, const std::array<std::uint32_t, 4>& offsets,
                                       std::string_view texts, std::uint32_t returned) {
  const platform::STORAGE_DEVICE_DESCRIPTOR head{0,          0,          deviceType, 0,          0, 0,
                                                 offsets[0], offsets[1], offsets[2], offsets[3], 0, 0};
  std::vector<std::uint8_t> bytes(512, 'x');
  std::memcpy(bytes.data(), &head, sizeof head);
  std::memcpy(bytes.data() + sizeof head, texts.data(), texts.size());
  return {Status::Success(), bytes, returned};
}

const std::u16string kErrorLine = u"IOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER error = ";
constexpr char16_t kNotSupported[] = u"\r\n              The request is not supported for this device.\r\n";

class StorageQuery : public testing::Test {
 protected:
  StorageOutcome Query() { return QueryStorageProperties(host, host, record, diagnostics); }
  SimulatedPc pc{EmptyPc()};
  AnsweringHost host{pc};
  CZKUMInterfaceDeviceImpl record;
  std::u16string diagnostics;
};

TEST_F(StorageQuery, TextsOfTheDescriptor) {
  using namespace std::string_view_literals;
  const auto answer = DescriptorAnswer;
  const std::tuple<const char*, AnsweringHost::Answer, std::uint8_t, std::u16string> cases[] = {
      {"a stick", answer(0, {36, 45, 49, 52}, "SanDisk \0Cru\0.1\0S1\0"sv, 55), 0, u"SanDisk |Cru|.1|S1"},
      {"no text", answer(3, {}, ""sv, 36), 3, u"|||old"},
      {"empty texts", answer(0, {36, 36, 36, 36}, "\0"sv, 37), 0, u"|||old"},
      {"one character a byte", answer(14, {36}, "\xE9\xFF\x01\0"sv, 40), 14, u"\xE9\xFF\x01|||old"},
      {"texts end with the received bytes", answer(0, {36, 38, 40, 41}, "abcd"sv, 40), 0, u"abcd|cd||old"},
      {"offsets past everything", answer(0, {512, 600, ~0u, 511}, ""sv, 512), 0, u"|||x"},
      {"a length above the buffer", answer(0, {500}, ""sv, ~0u), 0, u"xxxxxxxxxxxx|||old"},
      {"an offset into the head", answer(65, {8}, ""sv, 36), 15, u"A|||old"},
      {"offsets not received", answer(4, {12, 36, 36, 36}, "abc\0"sv, 16), 4, u"\x0C|||old"},
      {"nothing received", answer(5, {36, 0, 0, 36}, "abc\0"sv, 0), 0, u"|||old"}};
  for (const auto& [name, answer, type, texts] : cases) {
    SCOPED_TRACE(name);
    CZKUMInterfaceDeviceImpl fresh;
    fresh.m_strSerialNumber = u"old";
    diagnostics.clear();
    host.descriptor = answer;
    EXPECT_EQ(QueryStorageProperties(host, host, fresh, diagnostics), KStorageAccepted);
    EXPECT_EQ(fresh.StorageVendorId + u"|" + fresh.StorageProductId + u"|" + fresh.ProductRev + u"|" +
                  fresh.m_strSerialNumber,
              texts);
    EXPECT_EQ(fresh.m_strDeviceDescr, StorageDeviceTypeName(type));
    EXPECT_EQ(fresh.Descriptor.size(), std::min(answer.returned, 512u));
    EXPECT_EQ(diagnostics, kErrorLine + kNotSupported);
  }
}

TEST_F(StorageQuery, TextsAreAppendedAndCdDrivesAndFailedQueriesRejected) {
  host.descriptor = DescriptorAnswer(0, {36, 0, 0, 36}, "ab", 38);
  for (int i = 0; i < 2; ++i) EXPECT_EQ(Query(), KStorageAccepted);
  EXPECT_EQ(record.StorageVendorId + u"|" + record.m_strSerialNumber, u"abab|ab");
  host.descriptor = DescriptorAnswer(5, {36}, "HL", 38);
  diagnostics.clear();
  EXPECT_EQ(Query(), KStorageRejected);
  EXPECT_EQ(record.m_strDeviceDescr + u"|" + record.StorageVendorId + u"|" + diagnostics, u"CDROM Device|ababHL|");
  host.descriptor = {Status::Failure(0xFFFFFFFE), {}, 0};
  EXPECT_EQ(Query(), KStorageRejected);
  EXPECT_EQ(diagnostics, u"IOCTL failed with error code -2.\r\n\r\n");
  EXPECT_EQ(host.handles, std::vector<platform::FileHandle>(6, platform::kInvalidHandle));
}

TEST_F(StorageQuery, SerialNumbers) {
  std::vector<std::uint8_t> text(20), full(800, 'm');
  text[16] = 'M';
  const std::u16string found = u"IOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER found\r\n";
  const std::u16string notValid = u"\r\n              The request is not valid for this device.\r\n";
  const std::tuple<AnsweringHost::Answer, std::u16string, std::u16string> cases[] = {
      // Four bytes carry no text: so it is with every driver that keeps to the buffer's size.
      {{Status::Success(), {6, 0, 0, 0}, 4}, u"", found},
      {{Status::Success(), text, 20}, u"M", found},
      {{Status::Success(), full, 800}, std::u16string(392, u'\u6D6D'), found},
      {{Status::Failure(1), text, 20}, u"", kErrorLine + notValid},
      {{Status::Failure(50), text, 20}, u"", kErrorLine + kNotSupported},
      {{Status::Failure(21), {}, 0}, u"", kErrorLine + u"21\r\n"}};
  for (const auto& [answer, text, line] : cases) {
    host.mediaSerial = answer;
    diagnostics = u"|";
    EXPECT_EQ(QueryMediaSerialNumber(host, 77, diagnostics), text);
    EXPECT_EQ(diagnostics, u"|" + line);
    EXPECT_EQ(host.handles.back(), 77);
  }
  // For the volume's the system wants a backslash at the end, and a device path has none.
  Machine machine = EmptyPc();
  AddVolume(machine, 1, {}).serial = 0x1234ABCD;
  AddVolume(machine, 2, {});
  SimulatedPc serials(machine);
  EXPECT_EQ(QueryVolumeSerialNumber(serials, u"\\\\?\\Volume{1}\\"), 0x1234ABCDu);
  EXPECT_EQ(QueryVolumeSerialNumber(serials, u"\\\\?\\Volume{1}"), kUnknownVolumeSerialNumber);
  EXPECT_EQ(QueryVolumeSerialNumber(serials, u"\\\\?\\Volume{2}\\"), kUnknownVolumeSerialNumber);
}

}  // namespace
}  // namespace KelvoUHW
