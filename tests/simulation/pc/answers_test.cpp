// What a simulated PC answers to each question about its device manager, its device sets and its volumes, asked with
// buffers of every size, with wrong arguments and about what has gone.
#include <gmock/gmock.h>

#include <cstring>
#include <functional>

#include "tests/simulation/stick_pc.h"

namespace platform::simulated {
namespace {

using testing::ElementsAre, testing::ElementsAreArray;

constexpr std::uint32_t kNoInstance = 0xE000020B, kNoInterface = 0xE0000225, kNoClass = 0xE0000206;
constexpr std::uint32_t kNoPath = 3, kNotRoot = 144, kTooLong = 206;
constexpr Guid kNetClass{0x4D36E972, 0xE325, 0x11CE, {0xBF, 0xC1, 0x08, 0x00, 0x2B, 0xE1, 0x03, 0x18}};
constexpr Guid kOwnClass{1, 2, 3, {4, 5, 6, 7, 8, 9, 10, 11}};

// The stick's PC with drives that no volume stands behind, a volume that is not ready, and devices of some classes.
Machine AskedMachine() {
  Machine pc = StickMachine();
  pc.volumes.push_back({u"\\\\?\\Volume{5}\\", {}, {u"D:\\Deep\\"}, {}, kDRIVE_CDROM, false, {}});
  pc.volumes[0].folderMounts.push_back({u"Data\\", u"\\\\?\\Volume{5}\\"});
  pc.drives[1].type = kDRIVE_RAMDISK;  // unlike its volume's
  pc.drives.push_back({u'D', kDRIVE_CDROM, {}, {}});
  pc.drives.push_back({u'Z', kDRIVE_REMOTE, u"\\Device\\Net", {}});
  pc.drives.push_back({u'A', kDRIVE_UNKNOWN, u"\\Device\\Floppy0", {}});
  pc.devices[0].classGuid = pc.devices[5].classGuid = u"{4D36E972-E325-11CE-BFC1-08002BE10318}";
  pc.devices[5].noClassImage = true;
  pc.devices[1].classGuid = pc.devices[2].classGuid = u"{00000001-0002-0003-0405-060708090a0b}";
  pc.devices[2].deviceClass = u"Another";
  pc.devices[3].classGuid = u"{36FC9E60-C465-11CF-8056-444553540000}";
  pc.devices[3].noClassDescription = true;
  pc.devices[7].noParent = true;
  return pc;
}

class AnswersTest : public testing::Test {
 protected:
  DeviceSetHandle Set(const Guid* guid, std::uint32_t flags) {
    DeviceSetHandle set = 0;
    EXPECT_TRUE(pc.GetClassDevs(guid, flags, set));
    return set;
  }
  std::vector<SP_DEVINFO_DATA> Elements(DeviceSetHandle set) {
    std::vector<SP_DEVINFO_DATA> elements;
    SP_DEVINFO_DATA data{.cbSize = sizeof data};
    for (std::uint32_t index = 0; pc.EnumDeviceInfo(set, index, data); ++index) elements.push_back(data);
    return elements;
  }
  std::vector<DevInst> Numbers(DeviceSetHandle set) {
    std::vector<DevInst> numbers;
    for (const SP_DEVINFO_DATA& data : Elements(set)) numbers.push_back(data.DevInst);
    return numbers;
  }
  SimulatedPc pc{AskedMachine()};
};

// The text with its zero or nothing at all is written, and nothing behind it.
void ExpectText(std::u16string_view text, std::uint32_t tooSmall,
                const std::function<Status(char16_t*, std::uint32_t)>& ask) {
  SCOPED_TRACE(ToUtf8(text));
  for (std::uint32_t size = 0; size < text.size() + 3; ++size) {
    std::u16string buffer(text.size() + 3, u'?'), expected = buffer;
    const bool fits = size > text.size();
    if (fits) expected.replace(0, text.size() + 1, std::u16string(text) + u'\0');
    EXPECT_EQ(Error(ask(buffer.data(), size)), fits ? 0 : tooSmall) << size;
    EXPECT_EQ(buffer, expected) << size;
  }
  EXPECT_EQ(Error(ask(nullptr, 500)), tooSmall);
}

TEST_F(AnswersTest, NodesOfTheDeviceManager) {
  constexpr DevInst kRoot = kRootDeviceNumber, kNone = 77;
  constexpr std::uint32_t kNoNode = kCR_NO_SUCH_DEVNODE;
  DevInst root = 0;
  EXPECT_TRUE(pc.LocateRootDevNode(root));
  EXPECT_EQ(root, kRoot);
  const std::tuple<DevInst, DevInst, DevInst, DevInst> kNodes[] = {
      {kRoot, kNone, 1, kNone}, {1, kRoot, 2, 6},     {2, 1, 3, kNone}, {3, 2, kNone, 4},        {4, 2, 5, kNone},
      {5, 4, kNone, kNone},     {6, kRoot, 7, kNone}, {7, 6, kNone, 8}, {8, kNone, kNone, kNone}};
  for (const auto& [node, parent, child, sibling] : kNodes) {
    DevInst out[] = {kNone, kNone, kNone};
    const std::uint32_t errors[] = {Error(pc.GetParent(node, out[0])), Error(pc.GetChild(node, out[1])),
                                    Error(pc.GetSibling(node, out[2]))};
    const DevInst expected[] = {parent, child, sibling};
    EXPECT_THAT(out, ElementsAreArray(expected)) << node;
    for (int i = 0; i < 3; ++i) EXPECT_EQ(errors[i], expected[i] == kNone ? kNoNode : 0) << node;
    ExpectText(node == kRoot ? Text(kRootDeviceId) : AskedMachine().devices[node - 1].id, kCR_BUFFER_SMALL,
               [&, of = node](char16_t* out, std::uint32_t size) { return pc.GetDeviceId(of, out, size); });
  }
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  for (const DevInst node : {0u, 4u, 5u, 9u, kRoot - 1}) {
    DevInst out = kNone;
    std::uint32_t bytes = 0;
    char16_t id[300];
    const std::uint32_t errors[] = {Error(pc.GetParent(node, out)), Error(pc.GetChild(node, out)),
                                    Error(pc.GetSibling(node, out)), Error(pc.GetDeviceId(node, id, 300)),
                                    Error(pc.GetDevNodeRegistryProperty(node, 1, nullptr, id, bytes))};
    EXPECT_THAT(errors, testing::Each(kCR_INVALID_DEVNODE)) << node;
    EXPECT_EQ(out, kNone);
  }
}

// Both ways to a property; the configuration manager's counts from one.
TEST_F(AnswersTest, PropertiesAtEverySize) {
  using namespace std::string_view_literals;
  Machine pc = AskedMachine();
  Device& disk = pc.devices[4];
  disk.service = u"disk", disk.manufacturer = u"maker", disk.location = u"Bay 1", disk.enumerator = u"USBSTOR";
  disk.physicalName = u"";
  SimulatedPc asked(pc);
  const std::tuple<std::uint32_t, std::uint32_t, std::u16string_view> kProperties[] = {
      {0x00, kREG_SZ, u"Disk drive\0"sv},
      {0x01, kREG_MULTI_SZ, u"USBSTOR\\DiskSanDisk\0GenDisk\0\0"sv},
      {0x04, kREG_SZ, u"disk\0"sv},
      {0x07, kREG_SZ, u"DiskDrive\0"sv},
      {0x08, kREG_SZ, u"{4d36e967-e325-11ce-bfc1-08002be10318}\0"sv},
      {0x09, kREG_SZ, u"{disk}\\0001\0"sv},
      {0x0B, kREG_SZ, u"maker\0"sv},
      {0x0C, kREG_SZ, u"SanDisk Extreme USB Device\0"sv},
      {0x0D, kREG_SZ, u"Bay 1\0"sv},
      {0x0E, kREG_SZ, u"\0"sv},
      {0x10, kREG_DWORD, u"\x07\0"sv},
      {0x14, kREG_DWORD, u"\xFFFF\xFFFF"sv},
      {0x16, kREG_SZ, u"USBSTOR\0"sv},
      {0x0A, 0, u""sv},
      {0x17, 0, u""sv},
      {0xFFFFFFFF, 0, u""sv}};
  DeviceSetHandle set = 0;
  ASSERT_TRUE(asked.GetClassDevs(nullptr, kDIGCF_ALLCLASSES, set));
  SP_DEVINFO_DATA element{.cbSize = sizeof element}, bare = element;
  ASSERT_TRUE(asked.EnumDeviceInfo(set, 4, element) && asked.EnumDeviceInfo(set, 6, bare));
  for (const auto& [property, type, value] : kProperties) {
    const auto whole = static_cast<std::uint32_t>(value.size() * 2);
    for (std::uint32_t size = 0; size < whole + 2; ++size) {
      SCOPED_TRACE(std::to_string(property) + " into " + std::to_string(size));
      const bool fits = whole != 0 && size >= whole;
      std::string untouched(whole + 2, '?'), written = untouched;
      if (fits) std::memcpy(written.data(), value.data(), whole);
      for (const bool bySet : {true, false}) {
        std::string buffer = untouched;
        std::uint32_t told = 9, needed = size;
        const Status status =
            bySet ? asked.GetDeviceRegistryProperty(set, element, property, &told, buffer.data(), size, &needed)
                  : asked.GetDevNodeRegistryProperty(element.DevInst, property + 1, &told, buffer.data(), needed);
        const std::uint32_t none = bySet ? kERROR_INVALID_DATA : kCR_NO_SUCH_VALUE;
        const std::uint32_t small = bySet ? kERROR_INSUFFICIENT_BUFFER : kCR_BUFFER_SMALL;
        EXPECT_EQ(Error(status), fits ? 0 : whole == 0 ? none : small);
        EXPECT_EQ(buffer, written);
        EXPECT_EQ(std::pair(told, needed), whole == 0 ? std::pair(9u, size) : std::pair(type, whole));
      }
    }
  }
  std::uint32_t bytes = 500;
  char16_t buffer[250];
  EXPECT_EQ(Error(asked.GetDevNodeRegistryProperty(5, 1, nullptr, nullptr, bytes)), kCR_BUFFER_SMALL);
  EXPECT_EQ(Error(asked.GetDevNodeRegistryProperty(kRootDeviceNumber, 1, nullptr, buffer, bytes)), kCR_NO_SUCH_VALUE);
  EXPECT_EQ(Error(asked.GetDeviceRegistryProperty(set, element, 0, nullptr, nullptr, 1, nullptr)),
            kERROR_INVALID_PARAMETER);
  EXPECT_EQ(Error(asked.GetDeviceRegistryProperty(set, element, 0, nullptr, nullptr, 0, nullptr)),
            kERROR_INSUFFICIENT_BUFFER);
  EXPECT_TRUE(asked.GetDeviceRegistryProperty(set, element, 0, nullptr, buffer, 500, nullptr));
  EXPECT_EQ(Error(asked.GetDeviceRegistryProperty(set, bare, 0, nullptr, buffer, 500, nullptr)), kERROR_INVALID_DATA);
  EXPECT_EQ(Error(asked.GetDeviceRegistryProperty(set + 4, element, 0, nullptr, buffer, 500, nullptr)),
            kERROR_INVALID_HANDLE);
}

TEST_F(AnswersTest, SetsHoldWhatWasAskedFor) {
  const Guid disk = GUID_DEVCLASS_DISKDRIVE, volumes = GUID_DEVINTERFACE_VOLUME, disks = GUID_DEVINTERFACE_DISK;
  // The devices, and how many interfaces of volumes and of disks.
  const std::tuple<const Guid*, std::uint32_t, std::vector<DevInst>, std::size_t, std::size_t> kSets[] = {
      {nullptr, 0, {1, 2, 3, 4, 5, 6, 7, 8}, 0, 0},
      {&disk, kDIGCF_PRESENT, {5}, 0, 0},
      {&disk, kDIGCF_ALLCLASSES, {1, 2, 3, 4, 5, 6, 7, 8}, 0, 0},
      {&volumes, kDIGCF_DEVICEINTERFACE, {7, 8}, 2, 0},
      {&disks, kDIGCF_DEVICEINTERFACE, {5}, 0, 1},
      {&disk, kDIGCF_DEVICEINTERFACE, {}, 0, 0},
      {&disk, kDIGCF_DEVICEINTERFACE | kDIGCF_ALLCLASSES, {1, 5, 7, 8}, 2, 1}};
  for (int round = 0; round < 2; ++round) {
    for (const auto& [guid, flags, devices, volumesThere, disksThere] : kSets) {
      const DeviceSetHandle set = Set(guid, flags);
      EXPECT_EQ(Numbers(set), devices) << flags;
      for (const auto& [asked, there] : {std::pair(volumes, volumesThere), std::pair(disks, disksThere)}) {
        SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof data};
        std::uint32_t index = 0;
        while (pc.EnumDeviceInterfaces(set, asked, index, data)) ++index;
        EXPECT_EQ(index, there) << flags;
        EXPECT_EQ(Error(pc.EnumDeviceInterfaces(set, asked, index, data)), kERROR_NO_MORE_ITEMS);
        EXPECT_TRUE(there == 0 || (data.InterfaceClassGuid == asked && data.Flags == 1));
      }
      EXPECT_TRUE(pc.DestroyDeviceInfoList(set));
    }
  }
  const DeviceSetHandle all = Set(nullptr, 0), interfaces = Set(&volumes, kDIGCF_DEVICEINTERFACE);
  EXPECT_EQ(pc.OpenNames(), (std::vector<Text>{u"set devices", u"set interfaces " + GuidText(volumes)}));
  const std::vector<SP_DEVINFO_DATA> elements = Elements(all);
  EXPECT_EQ(elements[4].ClassGuid, disk);
  EXPECT_EQ(elements[6].ClassGuid, kNullGuid);
  SP_DEVINFO_DATA wrong{.cbSize = sizeof wrong - 1};
  EXPECT_EQ(Error(pc.EnumDeviceInfo(all, 0, wrong)), kERROR_INVALID_USER_BUFFER);
  EXPECT_EQ(Error(pc.EnumDeviceInfo(all + 100, 0, wrong)), kERROR_INVALID_HANDLE);
  SP_DEVICE_INTERFACE_DATA entry{.cbSize = sizeof entry - 1};
  EXPECT_EQ(Error(pc.EnumDeviceInterfaces(interfaces, volumes, 0, entry)), kERROR_INVALID_USER_BUFFER);
  EXPECT_EQ(Error(pc.EnumDeviceInterfaces(interfaces + 100, volumes, 0, entry)), kERROR_INVALID_HANDLE);
  // Ids of elements, of what only looks like one, and of one that has gone.
  for (const std::size_t position : {0u, 4u, 7u}) {
    const Text id = AskedMachine().devices[position].id;
    ExpectText(id, kERROR_INSUFFICIENT_BUFFER, [&](char16_t* out, std::uint32_t size) {
      std::uint32_t required = 0;
      const Status status = pc.GetDeviceInstanceId(all, elements[position], out, size, size == 1 ? nullptr : &required);
      EXPECT_TRUE(size == 1 || required == id.size() + 1);
      return status;
    });
  }
  const auto error = [&](const std::function<void(SP_DEVINFO_DATA&)>& change, DeviceSetHandle set) {
    SP_DEVINFO_DATA data = elements[4];
    change(data);
    char16_t id[300], property[300];
    const std::uint32_t first = Error(pc.GetDeviceInstanceId(set, data, id, 300, nullptr));
    EXPECT_EQ(Error(pc.GetDeviceRegistryProperty(set, data, 0, nullptr, property, 600, nullptr)), first);
    return first;
  };
  EXPECT_EQ(error([](auto&) {}, all), 0u);
  EXPECT_EQ(error([](auto&) {}, all + 100), kERROR_INVALID_HANDLE);
  EXPECT_EQ(error([](auto&) {}, interfaces), kNoInstance);
  EXPECT_EQ(error([](auto& data) { data.cbSize -= 1; }, all), kERROR_INVALID_USER_BUFFER);
  EXPECT_EQ(error([](auto& data) { data.Reserved = 0; }, all), kNoInstance);
  EXPECT_EQ(error([](auto& data) { data.Reserved = 9; }, all), kNoInstance);
  EXPECT_EQ(error([](auto& data) { data.DevInst = 4; }, all), kNoInstance);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  EXPECT_EQ(error([](auto&) {}, all), kNoInstance);
  EXPECT_EQ(Numbers(all).size(), 8u) << "a set stays as it was taken";
}

TEST_F(AnswersTest, DetailsOfInterfaces) {
  const Guid volumes = GUID_DEVINTERFACE_VOLUME;
  const DeviceSetHandle set = Set(&volumes, kDIGCF_DEVICEINTERFACE);
  SP_DEVICE_INTERFACE_DATA first{.cbSize = sizeof first}, second = first;
  ASSERT_TRUE(pc.EnumDeviceInterfaces(set, volumes, 0, first) && pc.EnumDeviceInterfaces(set, volumes, 1, second));
  const Text path = AskedMachine().interfaces[3].path;
  const auto whole = static_cast<std::uint32_t>(4 + (path.size() + 1) * 2);
  for (std::uint32_t size = 0; size <= whole + 1; ++size) {
    std::vector<char> detail(whole + 1, '?');
    std::memcpy(detail.data(), &kInterfaceDetailSize, 4);
    std::uint32_t required = 0;
    SP_DEVINFO_DATA device{.cbSize = sizeof device};
    const bool sized = size >= kInterfaceDetailSize, fits = size >= whole;
    EXPECT_EQ(Error(pc.GetDeviceInterfaceDetail(set, second, detail.data(), size, &required, &device)),
              !sized ? kERROR_INVALID_USER_BUFFER
              : fits ? 0
                     : kERROR_INSUFFICIENT_BUFFER)
        << size;
    EXPECT_EQ(std::pair(required, device.DevInst), sized ? std::pair(whole, DevInst{8}) : std::pair(0u, DevInst{0}));
    EXPECT_EQ(std::memcmp(detail.data() + 4, path.c_str(), whole - 4) == 0, fits);
    EXPECT_EQ(detail[whole], '?');
  }
  const auto ask = [&](SP_DEVICE_INTERFACE_DATA data, bool given, std::uint32_t size, std::uint32_t deviceSize,
                       DeviceSetHandle from) {
    std::vector<char> detail(600);
    const std::uint32_t fixed = kInterfaceDetailSize + (size == 599 ? 1 : 0);
    std::memcpy(detail.data(), &fixed, 4);
    SP_DEVINFO_DATA device{.cbSize = deviceSize};
    return Error(pc.GetDeviceInterfaceDetail(from, data, given ? detail.data() : nullptr, size, nullptr,
                                             deviceSize == 0 ? nullptr : &device));
  };
  constexpr std::uint32_t kDevice = sizeof(SP_DEVINFO_DATA), kUser = kERROR_INVALID_USER_BUFFER;
  EXPECT_EQ(ask(first, true, 600, kDevice, set), 0u);
  EXPECT_EQ(ask(first, true, 600, 0, set), 0u);
  EXPECT_EQ(ask(first, true, 599, 0, set), kUser) << "another fixed part";
  EXPECT_EQ(ask(first, false, 0, 0, set), kERROR_INSUFFICIENT_BUFFER);
  EXPECT_EQ(ask(first, false, 1, 0, set), kUser);
  EXPECT_EQ(ask(first, true, 600, kDevice - 1, set), kUser);
  EXPECT_EQ(ask(first, true, 600, 0, set + 100), kERROR_INVALID_HANDLE);
  const auto changed = [&](auto change) {
    SP_DEVICE_INTERFACE_DATA data = first;
    change(data);
    return ask(data, true, 600, 0, set);
  };
  EXPECT_EQ(changed([](auto& data) { data.cbSize += 1; }), kUser);
  EXPECT_EQ(changed([](auto& data) { data.Reserved = 0; }), kNoInterface);
  EXPECT_EQ(changed([](auto& data) { data.Reserved = 3; }), kNoInterface);
  EXPECT_EQ(changed([](auto& data) { data.InterfaceClassGuid = GUID_DEVINTERFACE_DISK; }), kNoInterface);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  EXPECT_EQ(ask(first, true, 600, 0, set), kNoInstance);
  EXPECT_EQ(ask(second, true, 600, 0, set), 0u);
}

TEST_F(AnswersTest, ClassesHaveImagesAndDescriptions) {
  DeviceSetHandle images = 0;
  ASSERT_TRUE(pc.GetClassImageList(images));
  EXPECT_EQ(pc.Open(), (OpenCounts{0, 0, 1, 0}));
  const std::tuple<Guid, std::uint32_t, Text> kClasses[] = {{GUID_DEVCLASS_DISKDRIVE, 0, u"Disk drives"},
                                                            {kNetClass, kNoClass, u"Network adapters"},
                                                            {kOwnClass, 0, u"USB"},  // the first device's name for it
                                                            {GUID_DEVCLASS_USB, 0, u""},
                                                            {GUID_DEVCLASS_IMAGE, kNoClass, u""}};  // nobody is of it
  for (const auto& [guid, imageError, description] : kClasses) {
    std::int32_t index = -7;
    EXPECT_EQ(Error(pc.GetClassImageIndex(images, guid, index)), imageError);
    EXPECT_EQ(index, imageError == 0 ? 0 : -7);
    const auto ask = [&, of = guid](char16_t* out, std::uint32_t size) {
      return pc.GetClassDescription(of, out, size, nullptr);
    };
    char16_t text[50];
    if (description.empty()) {
      EXPECT_EQ(Error(ask(text, 50)), kNoClass);
    } else {
      ExpectText(description, kERROR_INSUFFICIENT_BUFFER, ask);
    }
  }
  std::int32_t index = 0;
  EXPECT_EQ(Error(pc.GetClassImageIndex(images + 4, kOwnClass, index)), kERROR_INVALID_HANDLE);
  EXPECT_TRUE(pc.DestroyClassImageList(images));
  EXPECT_FALSE(pc.DestroyClassImageList(images));
}

TEST_F(AnswersTest, PlacesOnVolumesAndDrives) {
  constexpr std::uint32_t kName = kERROR_INVALID_NAME, kNoFile = kERROR_FILE_NOT_FOUND, kBusy = kERROR_NOT_READY;
  const std::vector<Text> names = {u"\\\\?\\Volume{09931f21}\\", kStickVolumeName, u"\\\\?\\Volume{5}\\"};
  // The volume, or the error of asking for it; the drive type; the error of asking for the volume's facts.
  const std::tuple<Text, std::size_t, std::uint32_t, std::uint32_t, std::uint32_t> kPlaces[] = {
      {u"", 9, kName, 1, kName},
      {u"C:", 9, kName, 1, kName},
      {u"c:\\", 0, 0, 6, 0},
      {u"C:\\Windows\\", 9, kNoFile, 6, kNotRoot},
      {u"C:\\Mount\\stick\\", 1, 0, 2, 0},
      {u"C:\\Mount\\Stick\\below\\it\\", 9, kNoFile, 2, kNotRoot},
      {u"D:\\", 9, kNoFile, 5, kBusy},
      {u"D:\\deep\\", 2, 0, 5, kBusy},
      {u"z:\\", 9, kNoFile, 4, kBusy},
      {u"A:\\x\\", 9, kNoFile, 0, kNotRoot},
      {u"Q:\\", 9, kNoFile, 1, kNoPath},
      {u"Q:\\x\\", 9, kNoFile, 1, kNoPath},
      {u"\\\\?\\Volume{3869C27A}\\", 1, 0, 2, 0},
      {u"\\\\?\\volume{09931f21}\\", 0, 0, 3, 0},
      {u"\\\\?\\Volume{no}\\", 9, kNoFile, 1, kNoPath},
      {Text(kStickVolumePath) + u"\\", 1, 0, 2, 0},
      {Text(kDiskPath) + u"\\", 9, kNoFile, 1, kNoPath},
      {u"\\", 9, kNoFile, 1, kNoPath},
      {u"abcde\\", 9, kNoFile, 1, kNoPath}};
  for (const auto& [path, position, nameError, type, factsError] : kPlaces) {
    SCOPED_TRACE(ToUtf8(path));
    const char16_t* asked = path.empty() ? nullptr : path.c_str();
    char16_t name[60] = u"?";
    EXPECT_EQ(Error(pc.VolumeNameForMountPoint(asked, name, 60)), nameError);
    EXPECT_EQ(Text(name), nameError == 0 ? names.at(position) : u"?");
    EXPECT_EQ(pc.DriveType(asked), type);
    std::uint32_t serial = 1, flags = 1;
    EXPECT_EQ(Error(pc.VolumeInformation(asked, nullptr, 0, serial, flags, nullptr, 0)), factsError);
    const std::pair<std::uint32_t, std::uint32_t> facts[] = {{0xB4D87E32, 0x80}, {0x3E9A61C7, 0}};
    EXPECT_EQ(std::pair(serial, flags), factsError == 0 ? facts[position] : std::pair(1u, 1u));
  }
  ExpectText(names[0], kTooLong,
             [&](char16_t* out, std::uint32_t size) { return pc.VolumeNameForMountPoint(u"C:\\", out, size); });
  std::uint32_t unused = 0;
  for (const auto& [path, kind] : {std::pair(u"C:\\", u"NTFS"), std::pair(u"E:\\", u"FAT32")}) {
    ExpectText(kind, kERROR_MORE_DATA, [&, of = path](char16_t* out, std::uint32_t size) {
      // A null pointer is no buffer that is too small.
      if (out == nullptr) return Status::Failure(kERROR_MORE_DATA);
      return pc.VolumeInformation(of, nullptr, 0, unused, unused, out, size);
    });
  }
  char16_t label[2] = u"?";
  EXPECT_FALSE(pc.VolumeInformation(u"C:\\", label, 0, unused, unused, nullptr, 0));
  EXPECT_TRUE(pc.VolumeInformation(u"C:\\", label, 1, unused, unused, nullptr, 0));
  EXPECT_EQ(label[0], u'\0');
}

TEST_F(AnswersTest, ListsOfVolumesPathsAndDrives) {
  using namespace std::string_view_literals;
  const auto first = [this](char16_t* out, std::uint32_t size) {
    FindHandle search = 0;
    const Status status = pc.FirstVolume(out, size, search);
    EXPECT_EQ(search != kInvalidHandle, status.ok);
    EXPECT_TRUE(!status || pc.CloseVolumeSearch(search));
    return status;
  };
  ExpectText(u"\\\\?\\Volume{09931f21}\\", kTooLong, first);
  FindHandle volumes = 0, mounts = 0;
  char16_t name[60];
  ASSERT_TRUE(pc.FirstVolume(name, 60, volumes));
  ASSERT_TRUE(pc.FirstMountPoint(u"\\\\?\\Volume{09931F21}\\", name, 60, mounts));
  EXPECT_EQ(pc.OpenNames().back(), u"mount-point search \\\\?\\Volume{09931F21}\\");
  EXPECT_EQ(Error(pc.NextVolume(mounts, name, 60)), kERROR_INVALID_HANDLE);
  EXPECT_EQ(Error(pc.NextMountPoint(volumes, name, 60)), kERROR_INVALID_HANDLE);
  std::vector<Text> found;
  // What does not fit is there to be asked for again.
  for (int times = 0; times < 3; ++times) {
    EXPECT_EQ(Error(pc.NextVolume(volumes, name, 3)), times < 2 ? kTooLong : kERROR_NO_MORE_FILES);
    if (pc.NextVolume(volumes, name, 60)) found.emplace_back(name);
    EXPECT_EQ(Error(pc.NextMountPoint(mounts, name, 3)), times < 1 ? kTooLong : kERROR_NO_MORE_FILES);
    if (pc.NextMountPoint(mounts, name, 60)) found.emplace_back(name);
  }
  EXPECT_THAT(found, ElementsAre(kStickVolumeName, u"Data\\", u"\\\\?\\Volume{5}\\"));
  EXPECT_TRUE(pc.CloseVolumeSearch(volumes) && pc.CloseMountPointSearch(mounts));
  ExpectText(u"Mount\\Stick\\", kTooLong, [this](char16_t* out, std::uint32_t size) {
    FindHandle search = 0;
    const Status status = pc.FirstMountPoint(u"\\\\?\\Volume{09931f21}\\", out, size, search);
    EXPECT_TRUE(!status || pc.CloseMountPointSearch(search));
    return status;
  });
  for (const auto& [volume, error] :
       {std::pair(kStickVolumeName, kERROR_NO_MORE_FILES), std::pair(u"\\\\?\\Volume{6}\\", kERROR_FILE_NOT_FOUND),
        std::pair(u"C:", kERROR_INVALID_NAME)}) {
    EXPECT_EQ(Error(pc.FirstMountPoint(volume, name, 60, mounts)), error);
    EXPECT_EQ(mounts, kInvalidHandle);
  }
  std::uint32_t required = 0;
  for (const auto& [volume, paths] : {std::pair(kStickVolumeName, u"E:\\\0C:\\Mount\\Stick\\\0"sv),
                                      std::pair(u"\\\\?\\Volume{5}\\", u"D:\\Deep\\\0"sv)}) {
    ExpectText(paths, kERROR_MORE_DATA, [&, of = volume, size = paths.size()](char16_t* out, std::uint32_t chars) {
      const Status status = pc.VolumePathNames(of, out, chars, required);
      EXPECT_EQ(required, size + 1);
      return status;
    });
  }
  EXPECT_EQ(Error(pc.VolumePathNames(u"E:\\", name, 60, required)), kERROR_FILE_NOT_FOUND);
  EXPECT_EQ(Error(pc.VolumePathNames(nullptr, name, 60, required)), kERROR_INVALID_NAME);
  ExpectText(u"A:\\\0C:\\\0D:\\\0E:\\\0Z:\\\0"sv, 21, [this](char16_t* out, std::uint32_t size) {
    const std::uint32_t told = pc.LogicalDriveStrings(size, out);
    return told == 20 ? Status::Success() : Status::Failure(told);
  });
  for (const char16_t* drive : {u"E:", u"e:"}) {
    ExpectText(u"\\Device\\HarddiskVolume5\0"sv, kERROR_INSUFFICIENT_BUFFER,
               [&](char16_t* out, std::uint32_t size) { return pc.DosDeviceTarget(drive, out, size); });
  }
  for (const char16_t* drive : {u"E", u"E:\\", u"E;", u"D:", u"Q:", u"@:", u"[:", u"`:", u"{:", u""}) {
    EXPECT_EQ(Error(pc.DosDeviceTarget(drive, name, 60)), kERROR_FILE_NOT_FOUND) << ToUtf8(drive);
  }
  EXPECT_EQ(Error(pc.DosDeviceTarget(nullptr, name, 60)), kERROR_INVALID_PARAMETER);
  EXPECT_TRUE(pc.DosDeviceTarget(u"A:", name, 60) && pc.DosDeviceTarget(u"Z:", name, 60));
  SimulatedPc bare{Machine{}};
  EXPECT_EQ(Error(bare.FirstVolume(name, 60, volumes)), kERROR_NO_MORE_FILES);
  EXPECT_EQ(volumes, kInvalidHandle);
  EXPECT_EQ(bare.LogicalDriveStrings(60, name), 0u);
  bare.WriteDebugText(nullptr);
  bare.WriteDebugText(u"one ");
  bare.WriteDebugText(u"two");
  EXPECT_EQ(bare.DebugText(), u"one two");
}

}  // namespace
}  // namespace platform::simulated
