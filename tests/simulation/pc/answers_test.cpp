// What a simulated PC answers to each question about its device manager, its device sets and its volumes, asked with
// buffers of every size, with wrong arguments and about what has gone.
#include <gmock/gmock.h>

#include <cstring>
#include <fstream>
#include <functional>

#include "tests/simulation/stick_pc.h"

namespace platform::simulated {
namespace {

constexpr std::uint32_t kTooLong = 206;
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

// What is answered is written down, an error as its number, and compared with the file of all that the tests say.
class AnswersTest : public testing::Test {
 protected:
  ~AnswersTest() override {
    std::ifstream file(ZKUSB_SOURCE_DIR "/tests/simulation/pc/answers.txt");
    std::string expected;
    const std::string head = std::string("== ") + testing::UnitTest::GetInstance()->current_test_info()->name();
    for (std::string line; std::getline(file, line) && line != head;) continue;
    for (std::string line; std::getline(file, line) && !line.starts_with("== ");) expected += line + "\n";
    EXPECT_EQ(said, expected);
  }
  struct Word {
    Word(const Status& status) : text(status.ok ? "ok" : "!" + std::to_string(status.error)) {}
    Word(const Text& shown) : text(ToUtf8(shown)) {}
    Word(std::uint64_t number) : text(std::to_string(number)) {}
    std::string text;
  };
  // In braces words are made in their order: one that shows what a call has written stands behind the call.
  void Say(std::initializer_list<Word> words) {
    for (const Word& word : words) said += word.text + " ";
    said.back() = '\n';
  }
  DeviceSetHandle Set(const Guid* guid, std::uint32_t flags) {
    DeviceSetHandle set = 0;
    EXPECT_TRUE(pc.GetClassDevs(guid, flags, set));
    return set;
  }
  SimulatedPc pc{AskedMachine()};
  std::string said;
};

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
  constexpr DevInst kRoot = kRootDeviceNumber;
  const auto ask = [this](DevInst node) {
    DevInst parent = 77, child = 77, sibling = 77;
    std::uint32_t bytes = 600;
    char16_t buffer[300];
    Say({node, pc.GetParent(node, parent), pc.GetChild(node, child), pc.GetSibling(node, sibling),
         pc.GetDeviceId(node, buffer, 300), pc.GetDevNodeRegistryProperty(node, 10, nullptr, buffer, bytes)});
    Say({parent, child, sibling, bytes});
  };
  DevInst root = 0;
  EXPECT_TRUE(pc.LocateRootDevNode(root));
  EXPECT_EQ(root, kRoot);
  for (const DevInst node : {1u, 2u, 3u, 4u, 5u, 6u, 7u, 8u, kRoot}) {
    ask(node);
    ExpectText(node == kRoot ? Text(kRootDeviceId) : AskedMachine().devices[node - 1].id, kCR_BUFFER_SMALL,
               [&](char16_t* out, std::uint32_t size) { return pc.GetDeviceId(node, out, size); });
  }
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  for (const DevInst node : {0u, 4u, 5u, 6u, 9u, kRoot - 1}) ask(node);
}

// Both ways to a property; the configuration manager's counts from one.
TEST_F(AnswersTest, PropertiesAtEverySize) {
  const DeviceSetHandle set = Set(nullptr, kDIGCF_ALLCLASSES);
  SP_DEVINFO_DATA disk{.cbSize = sizeof disk}, bare = disk;
  ASSERT_TRUE(pc.EnumDeviceInfo(set, 4, disk) && pc.EnumDeviceInfo(set, 6, bare));
  std::u16string values;
  for (const std::uint32_t property : {0u, 1u, 4u, 7u, 8u, 9u, 10u, 12u, 14u, 16u, 20u, 22u, 23u, ~0u}) {
    std::uint32_t whole = 0;
    const Status small = pc.GetDeviceRegistryProperty(set, disk, property, nullptr, nullptr, 0, &whole);
    for (std::uint32_t size = 0; size < whole + 2; ++size) {
      std::string buffers[] = {std::string(whole + 2, '?'), std::string(whole + 2, '?')};
      std::uint32_t types[] = {9, 9}, needed[] = {size, size};
      const Status statuses[] = {
          pc.GetDeviceRegistryProperty(set, disk, property, &types[0], buffers[0].data(), size, &needed[0]),
          pc.GetDevNodeRegistryProperty(disk.DevInst, property + 1, &types[1], buffers[1].data(), needed[1])};
      EXPECT_EQ(std::tuple(buffers[0], types[0], needed[0]), std::tuple(buffers[1], types[1], needed[1]));
      EXPECT_EQ(buffers[0].substr(std::min(size, whole)).find_first_not_of('?'), std::string::npos);
      EXPECT_TRUE(size < whole || whole == 0 || buffers[0][0] != '?');
      if (size + 2 < whole) continue;
      Say({property, size, statuses[0], statuses[1], types[0], needed[0]});
      values.resize(buffers[0].size() / 2);
      std::memcpy(values.data(), buffers[0].data(), values.size() * 2);
    }
    Say({small, whole, Replaced(values, u'\0', u'|')});
  }
  std::uint32_t bytes = 500;
  char16_t buffer[250];
  Say({pc.GetDevNodeRegistryProperty(5, 1, nullptr, nullptr, bytes),
       pc.GetDevNodeRegistryProperty(kRootDeviceNumber, 1, nullptr, buffer, bytes),
       pc.GetDeviceRegistryProperty(set, disk, 0, nullptr, nullptr, 1, nullptr),
       pc.GetDeviceRegistryProperty(set, disk, 0, nullptr, buffer, 500, nullptr),
       pc.GetDeviceRegistryProperty(set, bare, 0, nullptr, buffer, 500, nullptr),
       pc.GetDeviceRegistryProperty(set + 4, disk, 0, nullptr, buffer, 500, nullptr)});
}

TEST_F(AnswersTest, SetsHoldWhatWasAskedFor) {
  const Guid disk = GUID_DEVCLASS_DISKDRIVE, volumes = GUID_DEVINTERFACE_VOLUME, disks = GUID_DEVINTERFACE_DISK;
  const std::pair<const Guid*, std::uint32_t> kSets[] = {{nullptr, 0},   {&disk, 2},   {&disk, 4},
                                                         {&volumes, 16}, {&disks, 16}, {&disk, 16},
                                                         {&disk, 20},    {&disks, 16}, {&disk, 2}};
  SP_DEVINFO_DATA data{.cbSize = sizeof data}, wrong{.cbSize = sizeof wrong - 1};
  SP_DEVICE_INTERFACE_DATA entry{.cbSize = sizeof entry}, wrongEntry{.cbSize = sizeof entry - 1};
  for (const auto& [guid, flags] : kSets) {
    const DeviceSetHandle set = Set(guid, flags);
    Say({pc.OpenNames().back(), flags});
    std::uint32_t index = 0;
    for (; pc.EnumDeviceInfo(set, index, data); ++index) Say({data.DevInst, GuidText(data.ClassGuid), data.Reserved});
    Say({pc.EnumDeviceInfo(set, index, data), pc.EnumDeviceInfo(set, 0, wrong), pc.EnumDeviceInfo(set + 4, 0, data)});
    for (const Guid& asked : {volumes, disks}) {
      for (index = 0; pc.EnumDeviceInterfaces(set, asked, index, entry); ++index) {
        Say({GuidText(entry.InterfaceClassGuid), entry.Flags, entry.Reserved});
      }
      Say({pc.EnumDeviceInterfaces(set, asked, index, entry), pc.EnumDeviceInterfaces(set, asked, 0, wrongEntry),
           pc.EnumDeviceInterfaces(set + 4, asked, 0, entry)});
    }
    EXPECT_TRUE(pc.DestroyDeviceInfoList(set));
  }
  // Ids of an element, of what only looks like one, and of one that has gone.
  const DeviceSetHandle all = Set(nullptr, 0), interfaces = Set(&volumes, kDIGCF_DEVICEINTERFACE);
  ASSERT_TRUE(pc.EnumDeviceInfo(all, 4, data));
  std::uint32_t required = 0;
  ExpectText(kDisk, kERROR_INSUFFICIENT_BUFFER, [&](char16_t* out, std::uint32_t size) {
    return pc.GetDeviceInstanceId(all, data, out, size, size == 1 ? nullptr : &required);
  });
  const auto ask = [&](DeviceSetHandle set, std::uint32_t size, std::uint32_t reserved, DevInst number) {
    const SP_DEVINFO_DATA asked{size, data.ClassGuid, number, reserved};
    char16_t id[300], property[300];
    Say({pc.GetDeviceInstanceId(set, asked, id, 300, nullptr),
         pc.GetDeviceRegistryProperty(set, asked, 9, nullptr, property, 600, nullptr), required});
  };
  const std::uint32_t size = data.cbSize;
  ask(all, size, 5, 5), ask(all, size, 8, 8), ask(all + 100, size, 5, 5), ask(interfaces, size, 5, 5);
  ask(all, size - 1, 5, 5), ask(all, size, 0, 5), ask(all, size, 9, 5), ask(all, size, 5, 4);
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  ask(all, size, 5, 5), ask(all, size, 6, 6);
}

TEST_F(AnswersTest, DetailsOfInterfaces) {
  const Guid volumes = GUID_DEVINTERFACE_VOLUME;
  const DeviceSetHandle set = Set(&volumes, kDIGCF_DEVICEINTERFACE);
  SP_DEVICE_INTERFACE_DATA entry{.cbSize = sizeof entry};
  ASSERT_TRUE(pc.EnumDeviceInterfaces(set, volumes, 1, entry));
  const auto ask = [&](SP_DEVICE_INTERFACE_DATA data, std::uint32_t size, std::uint32_t fixed = kInterfaceDetailSize,
                       std::uint32_t deviceSize = sizeof(SP_DEVINFO_DATA), DeviceSetHandle moved = 0) {
    std::vector<char16_t> detail(300, u'?');
    std::memcpy(detail.data(), &fixed, 4);
    std::uint32_t required = 0;
    SP_DEVINFO_DATA device{.cbSize = deviceSize};
    Say({pc.GetDeviceInterfaceDetail(set + moved, data, fixed == 0 ? nullptr : detail.data(), size, &required,
                                     deviceSize == 0 ? nullptr : &device),
         required, device.DevInst, Replaced(Text(detail.begin() + 2, detail.begin() + 50), u'\0', u'|')});
  };
  constexpr std::uint32_t kFixed = kInterfaceDetailSize, kDevice = sizeof(SP_DEVINFO_DATA);
  const auto whole = static_cast<std::uint32_t>(4 + (AskedMachine().interfaces[3].path.size() + 1) * 2);
  for (const std::uint32_t size : {0u, kFixed - 1, kFixed, whole - 1, whole, 600u}) ask(entry, size);
  ask(entry, 0, 0), ask(entry, 1, 0), ask(entry, 600, kFixed + 1), ask(entry, 600, kFixed, 0);
  ask(entry, 600, kFixed, kDevice - 1), ask(entry, 600, kFixed, kDevice, 100);
  const Guid disks = GUID_DEVINTERFACE_DISK;
  const auto& [size, guid, flags, reserved] = entry;
  for (const SP_DEVICE_INTERFACE_DATA& odd : {SP_DEVICE_INTERFACE_DATA{size + 1, guid, flags, reserved},
                                              {size, guid, flags, 0},
                                              {size, guid, flags, 3},
                                              {size, disks, flags, 1}}) {
    ask(odd, 600);
  }
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  ask({size, guid, flags, 1}, 600), ask(entry, 600);
}

TEST_F(AnswersTest, ClassesHaveImagesAndDescriptions) {
  DeviceSetHandle images = 0;
  ASSERT_TRUE(pc.GetClassImageList(images));
  EXPECT_EQ(pc.Open(), (OpenCounts{0, 0, 1, 0}));
  std::int32_t index = -7;
  for (const Guid& guid : {kNetClass, GUID_DEVCLASS_IMAGE, GUID_DEVCLASS_USB, kOwnClass, GUID_DEVCLASS_DISKDRIVE}) {
    char16_t text[50] = u"";
    std::uint32_t required = 0;
    Say({GuidText(guid), pc.GetClassImageIndex(images, guid, index), static_cast<std::uint32_t>(index + 7),
         pc.GetClassDescription(guid, text, 50, &required), required, Text(text)});
  }
  Say({pc.GetClassImageIndex(images + 4, kOwnClass, index), pc.DestroyClassImageList(images),
       pc.DestroyClassImageList(images)});
}

TEST_F(AnswersTest, PlacesOnVolumesAndDrives) {
  for (const Text& path : {Text(), Text(u"C:"), Text(u"c:\\"), Text(u"C:\\Windows\\"), Text(u"C:\\Mount\\stick\\"),
                           Text(u"C:\\Mount\\Stick\\below\\it\\"), Text(u"D:\\"), Text(u"D:\\deep\\"), Text(u"z:\\"),
                           Text(u"A:\\x\\"), Text(u"Q:\\"), Text(u"Q:\\x\\"), Text(u"\\\\?\\Volume{3869C27A}\\"),
                           Text(u"\\\\?\\volume{09931f21}\\"), Text(u"\\\\?\\Volume{no}\\"),
                           Text(kStickVolumePath) + u"\\", Text(kDiskPath) + u"\\", Text(u"\\"), Text(u"abcde\\")}) {
    const char16_t* asked = path.empty() ? nullptr : path.c_str();
    char16_t name[60] = u"", kind[9] = u"";
    std::uint32_t serial = 1, flags = 1;
    Say({path, pc.VolumeNameForMountPoint(asked, name, 60), Text(name), pc.DriveType(asked),
         pc.VolumeInformation(asked, nullptr, 0, serial, flags, kind, 9), serial, flags, Text(kind)});
  }
  std::uint32_t unused = 0;
  char16_t label[2] = u"?";
  Say({pc.VolumeInformation(u"C:\\", label, 0, unused, unused, nullptr, 0),
       pc.VolumeInformation(u"C:\\", label, 1, unused, unused, nullptr, 0), label[0],
       pc.VolumeInformation(u"C:\\", nullptr, 0, unused, unused, label, 2)});
}

TEST_F(AnswersTest, ListsOfVolumesPathsAndDrives) {
  using namespace std::string_view_literals;
  FindHandle volumes = 7, mounts = 7;
  char16_t name[60] = u"";
  const Text system = u"\\\\?\\Volume{09931F21}\\";
  ExpectText(u"\\\\?\\Volume{09931f21}\\", kTooLong, [&](char16_t* out, std::uint32_t size) {
    const Status status = pc.FirstVolume(out, size, volumes);
    EXPECT_TRUE(status ? pc.CloseVolumeSearch(volumes).ok : volumes == kInvalidHandle);
    return status;
  });
  ExpectText(u"Mount\\Stick\\", kTooLong, [&](char16_t* out, std::uint32_t size) {
    const Status status = pc.FirstMountPoint(system.c_str(), out, size, mounts);
    EXPECT_TRUE(status ? pc.CloseMountPointSearch(mounts).ok : mounts == kInvalidHandle);
    return status;
  });
  for (const char16_t* volume : {kStickVolumeName, u"\\\\?\\Volume{6}\\", u"C:", system.c_str()}) {
    Say({pc.FirstMountPoint(volume, name, 60, mounts), mounts == kInvalidHandle ? 0u : 1u});
  }
  ASSERT_TRUE(pc.FirstVolume(name, 60, volumes));
  Say({pc.OpenNames()[0], pc.OpenNames()[1], pc.NextVolume(mounts, name, 60), pc.NextMountPoint(volumes, name, 60)});
  // What does not fit is there to be asked for again.
  for (int times = 0; times < 3; ++times) {
    Say({pc.NextVolume(volumes, name, 3), pc.NextVolume(volumes, name, 60), Text(name)});
    Say({pc.NextMountPoint(mounts, name, 3), pc.NextMountPoint(mounts, name, 60), Text(name)});
  }
  EXPECT_TRUE(pc.CloseVolumeSearch(volumes) && pc.CloseMountPointSearch(mounts));
  std::uint32_t required = 0;
  ExpectText(u"E:\\\0C:\\Mount\\Stick\\\0"sv, kERROR_MORE_DATA, [&](char16_t* out, std::uint32_t chars) {
    const Status status = pc.VolumePathNames(kStickVolumeName, out, chars, required);
    EXPECT_EQ(required, 21u);
    return status;
  });
  Say({pc.VolumePathNames(u"E:\\", name, 60, required), pc.VolumePathNames(nullptr, name, 60, required)});
  ExpectText(u"A:\\\0C:\\\0D:\\\0E:\\\0Z:\\\0"sv, 21, [this](char16_t* out, std::uint32_t size) {
    const std::uint32_t told = pc.LogicalDriveStrings(size, out);
    return told == 20 ? Status::Success() : Status::Failure(told);
  });
  ExpectText(u"\\Device\\HarddiskVolume5\0"sv, kERROR_INSUFFICIENT_BUFFER,
             [&](char16_t* out, std::uint32_t size) { return pc.DosDeviceTarget(u"e:", out, size); });
  for (const char16_t* drive :
       {u"E:", u"A:", u"Z:", u"E", u"E:\\", u"E;", u"D:", u"Q:", u"@:", u"[:", u"`:", u"{:", u""}) {
    Say({Text(drive), pc.DosDeviceTarget(drive, name, 60)});
  }
  SimulatedPc bare{Machine{}};
  Say({pc.DosDeviceTarget(nullptr, name, 60), bare.FirstVolume(name, 60, volumes), bare.LogicalDriveStrings(60, name)});
  for (const char16_t* text : {u"one ", static_cast<const char16_t*>(nullptr), u"two"}) bare.WriteDebugText(text);
  Say({bare.DebugText()});
}

}  // namespace
}  // namespace platform::simulated
