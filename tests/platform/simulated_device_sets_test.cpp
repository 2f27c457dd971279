#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "tests/platform/stick_pc.h"

namespace platform::simulated {
namespace {

constexpr std::uint32_t kERROR_NO_SUCH_DEVINST = 0xE000020B;
constexpr std::uint32_t kPresentInterfaces = kDIGCF_PRESENT | kDIGCF_DEVICEINTERFACE;
using Numbers = std::vector<DevInst>;
using Texts = std::vector<Text>;

class DeviceSetsTest : public testing::Test {
 protected:
  DeviceSetHandle Take(const Guid* guid, std::uint32_t flags) {
    DeviceSetHandle set = kInvalidHandle;
    EXPECT_TRUE(pc.GetClassDevs(guid, flags, set));
    return set;
  }

  Numbers Devices(DeviceSetHandle set) {
    Numbers numbers;
    SP_DEVINFO_DATA data{.cbSize = sizeof(data)};
    for (std::uint32_t i = 0; pc.EnumDeviceInfo(set, i, data); ++i) numbers.push_back(data.DevInst);
    return numbers;
  }

  Texts Paths(DeviceSetHandle set, const Guid& interfaceClass) {
    Texts paths;
    SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof(data)};
    for (std::uint32_t i = 0; pc.EnumDeviceInterfaces(set, interfaceClass, i, data); ++i) {
      alignas(4) std::array<std::uint8_t, 512> detail{};
      std::memcpy(detail.data(), &kInterfaceDetailSize, sizeof(kInterfaceDetailSize));
      EXPECT_TRUE(pc.GetDeviceInterfaceDetail(set, data, detail.data(), detail.size(), nullptr, nullptr));
      Text path(200, u'\0');
      std::memcpy(path.data(), detail.data() + kInterfaceDetailPathOffset, 400);
      paths.emplace_back(UpToZero(path));
    }
    return paths;
  }

  // The disk of the stick in a set of all devices.
  SP_DEVINFO_DATA Disk(DeviceSetHandle set) {
    SP_DEVINFO_DATA data{.cbSize = sizeof(data)};
    EXPECT_TRUE(pc.EnumDeviceInfo(set, 4, data));
    return data;
  }

  SimulatedPc pc{StickMachine()};
};

TEST_F(DeviceSetsTest, WhatASetHolds) {
  const Guid disks = GUID_DEVCLASS_DISKDRIVE;
  const Guid volumes = GUID_DEVINTERFACE_VOLUME;
  const Numbers all = {1, 2, 3, 4, 5, 6, 7, 8};
  EXPECT_EQ(Devices(Take(nullptr, kDIGCF_PRESENT | kDIGCF_ALLCLASSES)), all);
  EXPECT_EQ(Devices(Take(&disks, kDIGCF_PRESENT)), Numbers{5});
  EXPECT_EQ(Devices(Take(&disks, kDIGCF_PRESENT | kDIGCF_ALLCLASSES)), all);
  EXPECT_EQ(Devices(Take(&GUID_DEVCLASS_IMAGE, kDIGCF_PRESENT)), Numbers{});
  EXPECT_EQ(Devices(Take(&volumes, kPresentInterfaces)), (Numbers{7, 8})) << "whose interfaces they are";
  const Texts paths = {kStickVolumePath, kSystemVolumePath};
  EXPECT_EQ(Paths(Take(&volumes, kPresentInterfaces), volumes), paths);
  EXPECT_EQ(Paths(Take(nullptr, kPresentInterfaces), volumes), paths);
  EXPECT_EQ(Paths(Take(&volumes, kPresentInterfaces), GUID_DEVINTERFACE_DISK), Texts{});
  EXPECT_EQ(Paths(Take(nullptr, kDIGCF_PRESENT), GUID_DEVINTERFACE_DISK), Texts{}) << "a set of devices has none";
}

TEST_F(DeviceSetsTest, ASetIsASnapshot) {
  const DeviceSetHandle before = Take(nullptr, kDIGCF_PRESENT);
  const DeviceSetHandle interfaces = Take(&GUID_DEVINTERFACE_DISK, kPresentInterfaces);
  const SP_DEVINFO_DATA disk = Disk(before);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  EXPECT_EQ(Devices(before).size(), 8u);
  EXPECT_EQ(Devices(Take(nullptr, kDIGCF_PRESENT)), (Numbers{1, 2, 3, 6, 8}));
  char16_t text[200];
  EXPECT_EQ(Error(pc.GetDeviceInstanceId(before, disk, text, 200, nullptr)), kERROR_NO_SUCH_DEVINST);
  EXPECT_EQ(Error(pc.GetDeviceRegistryProperty(before, disk, kSPDRP_CLASS, nullptr, text, 400, nullptr)),
            kERROR_NO_SUCH_DEVINST);
  SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof(data)};
  ASSERT_TRUE(pc.EnumDeviceInterfaces(interfaces, GUID_DEVINTERFACE_DISK, 0, data));
  EXPECT_EQ(Error(pc.GetDeviceInterfaceDetail(interfaces, data, nullptr, 0, nullptr, nullptr)), kERROR_NO_SUCH_DEVINST);
}

TEST_F(DeviceSetsTest, SizesAndHandlesAreChecked) {
  const DeviceSetHandle set = Take(nullptr, kDIGCF_PRESENT);
  SP_DEVINFO_DATA element = Disk(set);
  EXPECT_EQ(Error(pc.EnumDeviceInfo(set, 8, element)), kERROR_NO_MORE_ITEMS);
  EXPECT_EQ(Error(pc.EnumDeviceInfo(set + 4, 0, element)), kERROR_INVALID_HANDLE);
  SP_DEVINFO_DATA foreign = element;
  foreign.DevInst = 4;
  EXPECT_EQ(Error(pc.GetDeviceInstanceId(set, foreign, nullptr, 0, nullptr)), kERROR_NO_SUCH_DEVINST);
  SP_DEVICE_INTERFACE_DATA entry{};
  for (const std::uint32_t size : {0u, 24u, 27u, 29u, 32u}) {
    element.cbSize = entry.cbSize = size;
    for (const Status& status :
         {pc.EnumDeviceInfo(set, 0, element), pc.GetDeviceInstanceId(set, element, nullptr, 0, nullptr),
          pc.EnumDeviceInterfaces(set, GUID_DEVINTERFACE_DISK, 0, entry)}) {
      EXPECT_EQ(Error(status), kERROR_INVALID_USER_BUFFER) << size;
    }
  }
  EXPECT_TRUE(pc.DestroyDeviceInfoList(set));
  EXPECT_EQ(Error(pc.EnumDeviceInfo(set, 0, foreign)), kERROR_INVALID_HANDLE);
}

TEST_F(DeviceSetsTest, InterfaceDetailAtEverySize) {
  const DeviceSetHandle set = Take(&GUID_DEVINTERFACE_DISK, kPresentInterfaces);
  SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof(data)};
  ASSERT_TRUE(pc.EnumDeviceInterfaces(set, GUID_DEVINTERFACE_DISK, 0, data));
  const auto whole = static_cast<std::uint32_t>(4 + (Text(kDiskPath).size() + 1) * 2);
  for (std::uint32_t size = 0; size <= whole + 2; ++size) {
    SCOPED_TRACE(size);
    std::vector<std::uint8_t> detail(size, 0xEE);
    if (size >= 4) std::memcpy(detail.data(), &kInterfaceDetailSize, 4);
    std::uint32_t required = 0;
    SP_DEVINFO_DATA device{.cbSize = sizeof(device)};
    const Status status =
        pc.GetDeviceInterfaceDetail(set, data, size == 0 ? nullptr : detail.data(), size, &required, &device);
    if (size > 0 && size < kInterfaceDetailSize) {
      EXPECT_EQ(Error(status), kERROR_INVALID_USER_BUFFER);
      continue;
    }
    EXPECT_EQ(Error(status), size >= whole ? 0 : kERROR_INSUFFICIENT_BUFFER);
    EXPECT_EQ(required, whole);
    EXPECT_TRUE(!status || std::memcmp(detail.data() + 4, kDiskPath, whole - 4) == 0);
    EXPECT_EQ(device.ClassGuid, GUID_DEVCLASS_DISKDRIVE);
    char16_t id[64];
    ASSERT_TRUE(pc.GetDeviceInstanceId(set, device, id, 64, nullptr)) << "the element can be used";
    EXPECT_EQ(Text(id), kDisk);
  }
  std::array<std::uint32_t, 100> detail{5};  // a wrong size field
  SP_DEVINFO_DATA unsized{};
  for (const Status& status : {pc.GetDeviceInterfaceDetail(set, data, detail.data(), 400, nullptr, nullptr),
                               pc.GetDeviceInterfaceDetail(set, data, nullptr, 400, nullptr, nullptr),
                               pc.GetDeviceInterfaceDetail(set, data, nullptr, 0, nullptr, &unsized)}) {
    EXPECT_EQ(Error(status), kERROR_INVALID_USER_BUFFER);
  }
  data.Reserved = 0;
  EXPECT_FALSE(pc.GetDeviceInterfaceDetail(set, data, nullptr, 0, nullptr, nullptr));
}

TEST_F(DeviceSetsTest, TextsAndNumbersAtEverySize) {
  const DeviceSetHandle set = Take(nullptr, kDIGCF_PRESENT);
  const SP_DEVINFO_DATA disk = Disk(set);
  const Text id = kDisk;
  for (std::uint32_t size = 0; size <= id.size() + 2; ++size) {
    Text buffer(size, u'?');
    std::uint32_t required = 0;
    const Status status = pc.GetDeviceInstanceId(set, disk, size == 0 ? nullptr : buffer.data(), size, &required);
    EXPECT_EQ(Error(status), size > id.size() ? 0 : kERROR_INSUFFICIENT_BUFFER);
    EXPECT_EQ(required, id.size() + 1);
    EXPECT_EQ(UpToZero(buffer), status ? id : Text(size, u'?'));
  }
  const struct {
    std::uint32_t property, type;
    Text value;
  } kCases[] = {{kSPDRP_DEVICEDESC, kREG_SZ, {u"Disk drive\0", 11}},
                {kSPDRP_CLASS, kREG_SZ, {u"DiskDrive\0", 10}},
                {kSPDRP_CLASSGUID, kREG_SZ, Text(kDiskClass) + u'\0'},
                {kSPDRP_DRIVER, kREG_SZ, {u"{disk}\\0001\0", 12}},
                {kSPDRP_FRIENDLYNAME, kREG_SZ, {u"SanDisk Extreme USB Device\0", 27}},
                {kSPDRP_HARDWAREID, kREG_MULTI_SZ, {u"USBSTOR\\DiskSanDisk\0GenDisk\0\0", 29}},
                {kSPDRP_LEGACYBUSTYPE, kREG_DWORD, u"\xFFFF\xFFFF"},
                {kSPDRP_UI_NUMBER, kREG_DWORD, {u"\x7\0", 2}}};
  for (const auto& [property, type, value] : kCases) {
    SCOPED_TRACE(property);
    const auto whole = static_cast<std::uint32_t>(value.size() * 2);
    for (const std::uint32_t size : {0u, whole - 1, whole, whole + 1}) {
      Text buffer(value.size() + 1, u'?');
      std::uint32_t readType = 0, required = 0;
      const Status status = pc.GetDeviceRegistryProperty(set, disk, property, &readType,
                                                         size == 0 ? nullptr : buffer.data(), size, &required);
      EXPECT_EQ(Error(status), size >= whole ? 0 : kERROR_INSUFFICIENT_BUFFER);
      EXPECT_EQ(readType, type);
      EXPECT_EQ(required, whole);
      EXPECT_EQ(buffer, status ? value + u'?' : Text(buffer.size(), u'?'));
    }
  }
  std::uint8_t buffer[8];
  for (const std::uint32_t property : {kSPDRP_MFG, kSPDRP_LOCATION_INFORMATION, 0x02u, 0xFFFFu}) {
    EXPECT_EQ(Error(pc.GetDeviceRegistryProperty(set, disk, property, nullptr, buffer, 8, nullptr)),
              kERROR_INVALID_DATA);
  }
}

TEST(DeviceClasses, ImagesAndDescriptions) {
  const Guid plain = {0x11111111, 0, 0, {}};
  const Guid flagged = {0x22222222, 0, 0, {}};
  Machine machine = StickMachine();
  machine.devices[0].classGuid = GuidText(plain);
  machine.devices[1].classGuid = GuidText(flagged);
  machine.devices[1].noClassImage = machine.devices[1].noClassDescription = true;
  SimulatedPc pc(machine);
  DeviceSetHandle images = kInvalidHandle;
  ASSERT_TRUE(pc.GetClassImageList(images));
  std::int32_t index = -5;
  const struct {
    Guid guid;
    bool known;
    Text description;
  } kCases[] = {{plain, true, u"USB"},  // the class name of its device
                {flagged, false, u""},
                {GUID_DEVCLASS_DISKDRIVE, true, u"Disk drives"},
                {GUID_DEVCLASS_IMAGE, false, u""}};  // well known, but no device is of it
  for (const auto& [guid, known, description] : kCases) {
    SCOPED_TRACE(ToUtf8(GuidText(guid)));
    EXPECT_EQ(pc.GetClassImageIndex(images, guid, index).ok, known);
    char16_t text[260] = {};
    std::uint32_t required = 1;
    EXPECT_EQ(pc.GetClassDescription(guid, text, 260, &required).ok, known);
    EXPECT_EQ(Text(text), description);
    EXPECT_EQ(required, description.size() + 1);
    EXPECT_FALSE(pc.GetClassDescription(guid, text, required - 1, nullptr));
  }
  EXPECT_EQ(pc.Open().imageLists, 1u);
  EXPECT_TRUE(pc.DestroyClassImageList(images));
  EXPECT_EQ(Error(pc.GetClassImageIndex(images, plain, index)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(Error(pc.DestroyClassImageList(images)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(pc.Misuses(), Texts{u"second close of image list"});
}

}  // namespace
}  // namespace platform::simulated
