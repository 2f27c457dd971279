// Device-manager nodes that the system keeps, read back through the seam.
#include <gmock/gmock.h>

#include <array>

#include "devinfo/property_reader.h"
#include "platform/text.h"
#include "platform/windows/windows_host.h"
#include "records/device_set.h"
#include "records/devnode.h"
#include "tests/windows/registered_device.h"
#include "tree/tree_builder.h"

namespace platform::windows {
namespace {

using KelvoUHW::DeviceSet;

constexpr char16_t kStickId[] = u"USB\\VID_0781&PID_5406\\0774611B";

// An identifier without a zero byte, so that a byte that is lost shows.
constexpr Guid kInterfaceClass{0x7A5B1CDE, 0x4F21, 0x4D3E, {0x91, 0x22, 0x33, 0x44, 0x55, 0x66, 0x77, 0x88}};

bool ReadProperties(Host& host, DeviceSetHandle set, const SP_DEVINFO_DATA& element,
                    KelvoUHW::CZKUMInfoDeviceImpl& record) {
  KelvoUHW::DeviceAnswers answers(host);
  KelvoUHW::ElementReader reader(host, set, answers);
  KelvoUHW::PassedElements none;
  const bool accepted = ReadClass(reader, element, record) && ReadService(reader, element, record);
  ReadOtherProperties(reader, element, none, record);
  return accepted;
}

class DeviceNodes : public testing::Test {
 protected:
  void SetUp() override {
    m_device.SetText(kSPDRP_DEVICEDESC, u"USB Mass Storage Device");
    m_device.SetText(kSPDRP_HARDWAREID,
                     std::u16string(u"USB\\Vid_0781&Pid_5406&Rev_0100\0USB\\Vid_0781&Pid_5406\0", 52));
    m_device.SetText(kSPDRP_SERVICE, u"USBSTOR");
    m_device.SetText(kSPDRP_DRIVER, u"{36FC9E60-C465-11CF-8056-444553540000}\\0007");
    m_device.SetText(kSPDRP_MFG, u"Compatible \u00DCSB storage device");
    m_device.SetText(kSPDRP_FRIENDLYNAME, u"Cruzer");
    m_device.SetText(kSPDRP_LOCATION_INFORMATION, u"Port_#0003.Hub_#0001");
    m_device.SetNumber(kSPDRP_UI_NUMBER, 0x01020304);
    m_device.AddInterface(kInterfaceClass);
    ASSERT_EQ(m_device.Error(), 0u);
    ASSERT_TRUE(m_set.Open(nullptr, kDIGCF_ALLCLASSES));
    for (std::uint32_t index = 0; index < 10'000 && m_host.EnumDeviceInfo(m_set.Get(), index, m_stick); ++index) {
      if (EqualIgnoringCase(KelvoUHW::GetInstanceId(m_host, m_set.Get(), m_stick), kStickId)) return;
    }
    FAIL() << "the stick is not in the set of all classes";
  }

  WindowsHost m_host;
  RegisteredDevice m_device{kStickId, GUID_DEVCLASS_USB};
  DeviceSet m_set{m_host};
  SP_DEVINFO_DATA m_stick{.cbSize = sizeof m_stick};
};

TEST_F(DeviceNodes, ShowTheirProperties) {
  EXPECT_EQ(m_stick.ClassGuid, GUID_DEVCLASS_USB);

  const auto record = KelvoUHW::MakeRecord<KelvoUHW::CZKUMInfoDeviceImpl>();
  EXPECT_TRUE(ReadProperties(m_host, m_set.Get(), m_stick, *record.Get()));
  EXPECT_EQ(record->Service, u"USBSTOR");
  EXPECT_EQ(record->m_strDeviceDescr, u"USB Mass Storage Device");
  EXPECT_EQ(record->HardwareId, u"USB\\Vid_0781&Pid_5406&Rev_0100");
  EXPECT_EQ(record->m_strDriverKeyName, u"{36FC9E60-C465-11CF-8056-444553540000}\\0007");
  EXPECT_EQ(record->Manufacturer, u"Compatible \u00DCSB storage device");
  EXPECT_EQ(record->FriendlyName, u"Cruzer");
  EXPECT_EQ(record->Location, u"Port_#0003.Hub_#0001");
  EXPECT_EQ(record->ClassGuid, GUID_DEVCLASS_USB);
  // The number's registry data type, not its value.
  EXPECT_EQ(record->UiNumber, static_cast<std::int32_t>(kREG_DWORD));
}

TEST_F(DeviceNodes, TellSizesBeforeValues) {
  constexpr std::u16string_view kFriendly = u"Cruzer";
  constexpr std::uint32_t kBytes = (kFriendly.size() + 1) * sizeof(char16_t);
  std::array<char16_t, 64> text{};
  for (const std::uint32_t offered : {0u, 4u, kBytes - 2, kBytes, 128u}) {
    SCOPED_TRACE(offered);
    std::uint32_t type = 77;
    std::uint32_t required = 77;
    const Status status = m_host.GetDeviceRegistryProperty(m_set.Get(), m_stick, kSPDRP_FRIENDLYNAME, &type,
                                                           text.data(), offered, &required);
    EXPECT_EQ(status.ok, offered >= kBytes);
    EXPECT_EQ(required, kBytes);
    EXPECT_EQ(status ? type : status.error, status ? kREG_SZ : kERROR_INSUFFICIENT_BUFFER);
    EXPECT_TRUE(!status || UpToZero({text.data(), text.size()}) == kFriendly);
  }
  std::uint32_t value = 0;
  EXPECT_TRUE(
      m_host.GetDeviceRegistryProperty(m_set.Get(), m_stick, kSPDRP_UI_NUMBER, nullptr, &value, sizeof value, nullptr));
  EXPECT_EQ(value, 0x01020304u);

  std::uint32_t length = 0;
  EXPECT_FALSE(m_host.GetDeviceInstanceId(m_set.Get(), m_stick, nullptr, 0, &length));
  EXPECT_EQ(length, std::size(kStickId));
  EXPECT_FALSE(m_host.GetDeviceInstanceId(m_set.Get(), m_stick, text.data(), length - 1, nullptr));
}

// Some systems fail without a reason here: a reader must end all the same, and keep what it had.
TEST_F(DeviceNodes, EndReadingWhatTheyLack) {
  const RegisteredDevice bare(u"USB\\VID_0001&PID_0002\\BARE", GUID_DEVCLASS_UNKNOWN);
  ASSERT_EQ(bare.Error(), 0u);
  DeviceSet set(m_host);
  ASSERT_TRUE(set.Open(&GUID_DEVCLASS_UNKNOWN, 0));
  SP_DEVINFO_DATA element{.cbSize = sizeof element};
  ASSERT_TRUE(m_host.EnumDeviceInfo(set.Get(), 0, element));
  KelvoUHW::PropertyBuffer buffer;
  int failures = 0;
  for (std::uint32_t property = 0; property <= kSPDRP_ENUMERATOR_NAME; ++property) {
    std::uint32_t type = 0;
    const Status status = KelvoUHW::ReadDeviceProperty(m_host, set.Get(), element, property, type, buffer);
    failures += status.ok ? 0 : 1;
    EXPECT_NE(status.error, kERROR_INSUFFICIENT_BUFFER) << property;
  }
  EXPECT_GE(failures, 10);
  const auto record = KelvoUHW::MakeRecord<KelvoUHW::CZKUMInfoDeviceImpl>();
  record->Location = u"kept";
  ReadProperties(m_host, set.Get(), element, *record.Get());
  EXPECT_EQ(record->Location, u"kept");
  EXPECT_EQ(record->LegacyBusType, -1);
}

TEST_F(DeviceNodes, HaveInterfacesWithPathsAndOwners) {
  DeviceSet set(m_host);
  ASSERT_TRUE(set.Open(&kInterfaceClass, kDIGCF_DEVICEINTERFACE));
  SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof data};
  ASSERT_TRUE(m_host.EnumDeviceInterfaces(set.Get(), kInterfaceClass, 0, data));
  EXPECT_EQ(data.InterfaceClassGuid, kInterfaceClass);

  SP_DEVINFO_DATA owner{.cbSize = sizeof owner};
  Status status;
  const auto detail = KelvoUHW::ReadInterfaceDetail(m_host, set.Get(), data, &owner, status);
  EXPECT_TRUE(status);
  EXPECT_EQ(ToLower(detail.DevicePath()),
            u"\\\\?\\usb#vid_0781&pid_5406#0774611b#{7a5b1cde-4f21-4d3e-9122-334455667788}");
  EXPECT_EQ(ToUpper(KelvoUHW::GetInstanceId(m_host, set.Get(), owner)), kStickId);

  const Status end = m_host.EnumDeviceInterfaces(set.Get(), kInterfaceClass, 1, data);
  EXPECT_FALSE(end);
  EXPECT_EQ(end.error, kERROR_NO_MORE_ITEMS);
}

TEST_F(DeviceNodes, AnswerByTheirHandle) {
  std::array<char16_t, 64> id{};
  ASSERT_TRUE(m_host.GetDeviceId(m_stick.DevInst, id.data(), id.size()));
  EXPECT_EQ(ToUpper(UpToZero({id.data(), id.size()})), kStickId);
  // Some systems cut an id that does not fit; none may write behind the buffer.
  id.fill(u'#');
  m_host.GetDeviceId(m_stick.DevInst, id.data(), 5);
  EXPECT_EQ(id[5], u'#');
}

// However little the system knows of its tree, no walk over it goes on for ever and no failure
// spoils what the caller had.
TEST_F(DeviceNodes, WalksEnd) {
  constexpr DevInst kMark = 0x5EA1;
  constexpr DevInst kNoNode = 0xFFFFFFF0;
  for (const auto ask : {&DeviceManager::GetParent, &DeviceManager::GetChild, &DeviceManager::GetSibling}) {
    for (const DevInst node : {kNoNode, static_cast<DevInst>(m_device.Node())}) {
      DevInst answer = kMark;
      const Status status = (m_host.*ask)(node, answer);
      EXPECT_TRUE(status || (answer == kMark && status.error != kCR_SUCCESS));
    }
  }
  EXPECT_EQ(KelvoUHW::GetDeviceDescription(m_host, kNoNode), u"");

  KelvoUHW::CZKUMUsbTreeBuilder builder(m_host);
  builder.Build();
  builder.CommitDeviceCache();
  EXPECT_FALSE(builder.Build()) << "nothing has changed since";
}

TEST(DeviceSets, RefuseWhatIsNotOpen) {
  WindowsHost host;
  SP_DEVINFO_DATA element{.cbSize = sizeof element};
  SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof data};
  std::int32_t index = 77;
  std::array<char16_t, 8> text{};
  EXPECT_FALSE(host.EnumDeviceInfo(kInvalidHandle, 0, element));
  EXPECT_FALSE(host.EnumDeviceInterfaces(kInvalidHandle, kInterfaceClass, 0, data));
  EXPECT_FALSE(host.GetDeviceInterfaceDetail(kInvalidHandle, data, nullptr, 0, nullptr, nullptr));
  EXPECT_FALSE(host.GetDeviceInstanceId(kInvalidHandle, element, text.data(), 8, nullptr));
  EXPECT_FALSE(
      host.GetDeviceRegistryProperty(kInvalidHandle, element, kSPDRP_CLASS, nullptr, text.data(), 16, nullptr));
  EXPECT_EQ(host.DestroyDeviceInfoList(kInvalidHandle).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(host.GetClassImageIndex(kInvalidHandle, GUID_DEVCLASS_USB, index).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(host.DestroyClassImageList(kInvalidHandle).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(index, 77);
}

}  // namespace
}  // namespace platform::windows
