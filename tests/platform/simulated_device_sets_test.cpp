#include <gtest/gtest.h>

#include <cstring>
#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "tests/platform/stick_pc.h"

namespace platform::simulated {
namespace {

constexpr std::uint32_t kERROR_NO_SUCH_DEVINST = 0xE000020B;
constexpr std::uint32_t kPresentInterfaces = kDIGCF_PRESENT | kDIGCF_DEVICEINTERFACE;

SP_DEVINFO_DATA NewElement() { return {.cbSize = sizeof(SP_DEVINFO_DATA)}; }
SP_DEVICE_INTERFACE_DATA NewInterface() { return {.cbSize = sizeof(SP_DEVICE_INTERFACE_DATA)}; }

class DeviceSetsTest : public testing::Test {
 protected:
  DeviceSetHandle Take(const Guid* guid, std::uint32_t flags) {
    DeviceSetHandle set = kInvalidHandle;
    EXPECT_TRUE(pc.GetClassDevs(guid, flags, set));
    return set;
  }

  std::vector<DevInst> Devices(DeviceSetHandle set) {
    std::vector<DevInst> numbers;
    SP_DEVINFO_DATA data = NewElement();
    for (std::uint32_t i = 0; pc.EnumDeviceInfo(set, i, data); ++i) numbers.push_back(data.DevInst);
    return numbers;
  }

  std::vector<Text> Paths(DeviceSetHandle set, const Guid& interfaceClass) {
    std::vector<Text> paths;
    SP_DEVICE_INTERFACE_DATA data = NewInterface();
    for (std::uint32_t i = 0; pc.EnumDeviceInterfaces(set, interfaceClass, i, data); ++i) {
      alignas(4) std::array<std::uint8_t, 512> detail{};
      std::memcpy(detail.data(), &kInterfaceDetailSize, sizeof(kInterfaceDetailSize));
      EXPECT_TRUE(
          pc.GetDeviceInterfaceDetail(set, data, detail.data(), detail.size(), nullptr, nullptr));
      Text path(200, u'\0');
      std::memcpy(path.data(), detail.data() + kInterfaceDetailPathOffset, 400);
      paths.emplace_back(UpToZero(path));
    }
    return paths;
  }

  // The disk of the stick in a set of all devices.
  SP_DEVINFO_DATA Disk(DeviceSetHandle set) {
    SP_DEVINFO_DATA data = NewElement();
    EXPECT_TRUE(pc.EnumDeviceInfo(set, 4, data));
    return data;
  }

  SimulatedPc pc{StickMachine()};
};

TEST_F(DeviceSetsTest, WhatASetHolds) {
  const Guid diskClass = GUID_DEVCLASS_DISKDRIVE;
  using Numbers = std::vector<DevInst>;
  EXPECT_EQ(Devices(Take(nullptr, kDIGCF_PRESENT | kDIGCF_ALLCLASSES)),
            (Numbers{1, 2, 3, 4, 5, 6, 7, 8}));
  EXPECT_EQ(Devices(Take(&diskClass, kDIGCF_PRESENT)), Numbers{5});
  EXPECT_EQ(Devices(Take(&diskClass, kDIGCF_PRESENT | kDIGCF_ALLCLASSES)).size(), 8u);
  EXPECT_EQ(Devices(Take(&GUID_DEVCLASS_IMAGE, kDIGCF_PRESENT)), Numbers{});
  EXPECT_EQ(Devices(Take(&GUID_DEVINTERFACE_VOLUME, kPresentInterfaces)), (Numbers{7, 8}))
      << "the devices that the interfaces belong to";

  using Texts = std::vector<Text>;
  const Texts volumes = {kStickVolumePath, u"\\\\?\\STORAGE#Volume#{5c31}#01#{53f5630d}"};
  EXPECT_EQ(Paths(Take(&GUID_DEVINTERFACE_VOLUME, kPresentInterfaces), GUID_DEVINTERFACE_VOLUME),
            volumes);
  EXPECT_EQ(Paths(Take(nullptr, kPresentInterfaces), GUID_DEVINTERFACE_VOLUME), volumes);
  EXPECT_EQ(Paths(Take(&GUID_DEVINTERFACE_VOLUME, kPresentInterfaces), GUID_DEVINTERFACE_DISK),
            Texts{});
  EXPECT_EQ(Paths(Take(&kNullGuid, kPresentInterfaces), kNullGuid), Texts{});
  EXPECT_EQ(Paths(Take(nullptr, kDIGCF_PRESENT), GUID_DEVINTERFACE_DISK), Texts{})
      << "a set of devices has no interfaces";
}

TEST_F(DeviceSetsTest, ASetIsASnapshot) {
  const DeviceSetHandle before = Take(nullptr, kDIGCF_PRESENT);
  const DeviceSetHandle interfaces = Take(&GUID_DEVINTERFACE_DISK, kPresentInterfaces);
  const SP_DEVINFO_DATA disk = Disk(before);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  EXPECT_EQ(Devices(before).size(), 8u);
  EXPECT_EQ(Devices(Take(nullptr, kDIGCF_PRESENT)), (std::vector<DevInst>{1, 2, 3, 6, 8}));

  char16_t text[200];
  EXPECT_EQ(pc.GetDeviceInstanceId(before, disk, text, 200, nullptr).error, kERROR_NO_SUCH_DEVINST);
  EXPECT_EQ(
      pc.GetDeviceRegistryProperty(before, disk, kSPDRP_CLASS, nullptr, text, 400, nullptr).error,
      kERROR_NO_SUCH_DEVINST);
  SP_DEVICE_INTERFACE_DATA data = NewInterface();
  ASSERT_TRUE(pc.EnumDeviceInterfaces(interfaces, GUID_DEVINTERFACE_DISK, 0, data));
  EXPECT_EQ(pc.GetDeviceInterfaceDetail(interfaces, data, nullptr, 0, nullptr, nullptr).error,
            kERROR_NO_SUCH_DEVINST);
}

TEST_F(DeviceSetsTest, SizesAndHandlesAreChecked) {
  const DeviceSetHandle set = Take(nullptr, kDIGCF_PRESENT);
  SP_DEVINFO_DATA element = NewElement();
  EXPECT_EQ(pc.EnumDeviceInfo(set, 8, element).error, kERROR_NO_MORE_ITEMS);
  EXPECT_EQ(pc.EnumDeviceInfo(set + 4, 0, element).error, kERROR_INVALID_HANDLE);
  SP_DEVICE_INTERFACE_DATA entry = NewInterface();
  for (const std::uint32_t size : {0u, 24u, 27u, 29u, 32u}) {
    element.cbSize = size;
    EXPECT_EQ(pc.EnumDeviceInfo(set, 0, element).error, kERROR_INVALID_USER_BUFFER) << size;
    EXPECT_EQ(pc.GetDeviceInstanceId(set, element, nullptr, 0, nullptr).error,
              kERROR_INVALID_USER_BUFFER);
    entry.cbSize = size;
    EXPECT_EQ(pc.EnumDeviceInterfaces(set, GUID_DEVINTERFACE_DISK, 0, entry).error,
              kERROR_INVALID_USER_BUFFER);
  }
  SP_DEVINFO_DATA foreign = Disk(set);
  foreign.DevInst = 4;
  EXPECT_EQ(pc.GetDeviceInstanceId(set, foreign, nullptr, 0, nullptr).error,
            kERROR_NO_SUCH_DEVINST);
  EXPECT_TRUE(pc.DestroyDeviceInfoList(set));
  EXPECT_EQ(pc.EnumDeviceInfo(set, 0, foreign).error, kERROR_INVALID_HANDLE);
}

TEST_F(DeviceSetsTest, InterfaceDetailAtEverySize) {
  const DeviceSetHandle set = Take(&GUID_DEVINTERFACE_DISK, kPresentInterfaces);
  SP_DEVICE_INTERFACE_DATA data = NewInterface();
  ASSERT_TRUE(pc.EnumDeviceInterfaces(set, GUID_DEVINTERFACE_DISK, 0, data));
  const auto whole = static_cast<std::uint32_t>(4 + (Text(kDiskPath).size() + 1) * 2);
  for (std::uint32_t size = 0; size <= whole + 2; ++size) {
    std::vector<std::uint8_t> detail(size, 0xEE);
    if (size >= 4) std::memcpy(detail.data(), &kInterfaceDetailSize, 4);
    std::uint32_t required = 0;
    SP_DEVINFO_DATA device = NewElement();
    const Status status = pc.GetDeviceInterfaceDetail(
        set, data, size == 0 ? nullptr : detail.data(), size, &required, &device);
    if (size > 0 && size < kInterfaceDetailSize) {
      EXPECT_EQ(status.error, kERROR_INVALID_USER_BUFFER) << size;
      continue;
    }
    EXPECT_EQ(required, whole);
    EXPECT_EQ(device.DevInst, 5u);
    EXPECT_EQ(device.ClassGuid, GUID_DEVCLASS_DISKDRIVE);
    EXPECT_EQ(status.ok, size >= whole) << size;
    if (!status) {
      EXPECT_EQ(status.error, kERROR_INSUFFICIENT_BUFFER) << size;
    }
    if (status) {
      EXPECT_EQ(std::memcmp(detail.data() + 4, kDiskPath, whole - 4), 0);
    }
    char16_t id[64];
    ASSERT_TRUE(pc.GetDeviceInstanceId(set, device, id, 64, nullptr)) << "the element can be used";
    EXPECT_STREQ(ToUtf8(UpToZero(id)).c_str(), ToUtf8(kDisk).c_str());
  }
  std::array<std::uint32_t, 100> detail{5};  // a wrong size field
  EXPECT_EQ(pc.GetDeviceInterfaceDetail(set, data, detail.data(), 400, nullptr, nullptr).error,
            kERROR_INVALID_USER_BUFFER);
  EXPECT_EQ(pc.GetDeviceInterfaceDetail(set, data, nullptr, 400, nullptr, nullptr).error,
            kERROR_INVALID_USER_BUFFER);
  SP_DEVINFO_DATA unsized{};
  EXPECT_EQ(pc.GetDeviceInterfaceDetail(set, data, nullptr, 0, nullptr, &unsized).error,
            kERROR_INVALID_USER_BUFFER);
  data.Reserved = 0;
  EXPECT_FALSE(pc.GetDeviceInterfaceDetail(set, data, nullptr, 0, nullptr, nullptr));
}

TEST_F(DeviceSetsTest, InstanceIdAtEverySize) {
  const DeviceSetHandle set = Take(nullptr, kDIGCF_PRESENT);
  const SP_DEVINFO_DATA disk = Disk(set);
  const Text id = kDisk;
  std::uint32_t required = 0;
  EXPECT_EQ(pc.GetDeviceInstanceId(set, disk, nullptr, 0, &required).error,
            kERROR_INSUFFICIENT_BUFFER);
  EXPECT_EQ(required, id.size() + 1);
  for (std::uint32_t size = 1; size <= id.size() + 2; ++size) {
    Text buffer(size, u'?');
    const Status status = pc.GetDeviceInstanceId(set, disk, buffer.data(), size, nullptr);
    EXPECT_EQ(status.ok, size > id.size());
    EXPECT_EQ(UpToZero(buffer), status ? id : Text(size, u'?'));
  }
}

TEST_F(DeviceSetsTest, RegistryProperties) {
  const DeviceSetHandle set = Take(nullptr, kDIGCF_PRESENT);
  const SP_DEVINFO_DATA disk = Disk(set);
  const auto bytesOf = [](const Text& text) {
    std::vector<std::uint8_t> bytes(text.size() * 2);
    std::memcpy(bytes.data(), text.data(), bytes.size());
    return bytes;
  };
  const struct {
    std::uint32_t property;
    std::uint32_t type;
    std::vector<std::uint8_t> bytes;
  } kCases[] = {
      {kSPDRP_DEVICEDESC, kREG_SZ, bytesOf({u"Disk drive\0", 11})},
      {kSPDRP_CLASS, kREG_SZ, bytesOf({u"DiskDrive\0", 10})},
      {kSPDRP_CLASSGUID, kREG_SZ, bytesOf(Text(kDiskClass) + u'\0')},
      {kSPDRP_DRIVER, kREG_SZ, bytesOf({u"{disk}\\0001\0", 12})},
      {kSPDRP_FRIENDLYNAME, kREG_SZ, bytesOf({u"SanDisk Extreme USB Device\0", 27})},
      {kSPDRP_HARDWAREID, kREG_MULTI_SZ, bytesOf({u"USBSTOR\\DiskSanDisk\0GenDisk\0\0", 29})},
      {kSPDRP_LEGACYBUSTYPE, kREG_DWORD, {0xFF, 0xFF, 0xFF, 0xFF}},
      {kSPDRP_UI_NUMBER, kREG_DWORD, {7, 0, 0, 0}},
  };
  for (const auto& [property, type, bytes] : kCases) {
    SCOPED_TRACE(property);
    const auto whole = static_cast<std::uint32_t>(bytes.size());
    for (const std::uint32_t size : {0u, whole - 1, whole, whole + 1}) {
      std::vector<std::uint8_t> buffer(size, 0xEE);
      std::uint32_t readType = 0;
      std::uint32_t required = 0;
      const Status status = pc.GetDeviceRegistryProperty(
          set, disk, property, &readType, size == 0 ? nullptr : buffer.data(), size, &required);
      EXPECT_EQ(status.ok, size >= whole);
      if (!status) {
        EXPECT_EQ(status.error, kERROR_INSUFFICIENT_BUFFER);
      }
      EXPECT_EQ(readType, type);
      EXPECT_EQ(required, whole);
      if (status) buffer.resize(whole);
      EXPECT_EQ(buffer, status ? bytes : std::vector<std::uint8_t>(size, 0xEE));
    }
  }
  std::uint8_t buffer[8];
  for (const std::uint32_t property : {kSPDRP_MFG, kSPDRP_LOCATION_INFORMATION, 0x02u, 0xFFFFu}) {
    EXPECT_EQ(pc.GetDeviceRegistryProperty(set, disk, property, nullptr, buffer, 8, nullptr).error,
              kERROR_INVALID_DATA);
  }
}

TEST(DeviceClasses, ImagesAndDescriptions) {
  const Guid plain = {0x11111111, 0, 0, {}};
  const Guid flagged = {0x22222222, 0, 0, {}};
  Machine machine = StickMachine();
  machine.devices[0].classGuid = GuidText(plain);
  machine.devices[1].classGuid = GuidText(flagged);
  machine.devices[1].noClassImage = true;
  machine.devices[1].noClassDescription = true;
  SimulatedPc pc(machine);
  DeviceSetHandle images = kInvalidHandle;
  ASSERT_TRUE(pc.GetClassImageList(images));
  const struct {
    Guid guid;
    bool known;
    const char16_t* description;
  } kCases[] = {
      {plain, true, u"USB"},  // the class name of its device
      {flagged, false, u""},
      {GUID_DEVCLASS_DISKDRIVE, true, u"Disk drives"},
      {GUID_DEVCLASS_IMAGE, false, u""},  // well known, but no device is of it
  };
  for (const auto& [guid, known, description] : kCases) {
    SCOPED_TRACE(ToUtf8(GuidText(guid)));
    std::int32_t index = -5;
    EXPECT_EQ(pc.GetClassImageIndex(images, guid, index).ok, known);
    char16_t text[260] = u"?";
    std::uint32_t required = 0;
    EXPECT_EQ(pc.GetClassDescription(guid, text, 260, &required).ok, known);
    if (!known) continue;
    EXPECT_EQ(UpToZero(std::u16string_view(text, 260)), description);
    EXPECT_EQ(required, Text(description).size() + 1);
    EXPECT_EQ(pc.GetClassDescription(guid, text, required - 1, nullptr).error,
              kERROR_INSUFFICIENT_BUFFER);
  }
  EXPECT_EQ(pc.Open().imageLists, 1u);
  EXPECT_TRUE(pc.DestroyClassImageList(images));
  std::int32_t index = 0;
  EXPECT_EQ(pc.GetClassImageIndex(images, plain, index).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.DestroyClassImageList(images).error, kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Misuses(), std::vector<Text>{u"second close of image list"});
}

}  // namespace
}  // namespace platform::simulated
