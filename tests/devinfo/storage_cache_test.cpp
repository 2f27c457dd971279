// Whole passes over simulated PCs: which volumes and disks are found, what a pass reports and
// leaves open, and drive letters by device number.
#include "devinfo/storage_cache.h"

#include <gmock/gmock.h>

#include <set>

#include "devinfo/info_device_cache.h"
#include "platform/text.h"
#include "platform/wrappers/counting_host.h"
#include "platform/wrappers/intercepting_host.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/devinfo/storage_machine.h"

namespace KelvoUHW {
namespace {

using platform::Status, platform::simulated::OpenCounts, platform::simulated::SimulatedPc;
using platform::wrappers::Operation;
using testing::_, testing::Contains, testing::Each, testing::ElementsAre, testing::FieldsAre, testing::Pair;

// What the diagnostics say of a volume that is queried, of one that answers, and of a disk.
const std::u16string kSeparator = u"++++++++++++++++++++++++++++++++++++++++++++++\r\n";
const std::u16string kAnswers =
    u"IOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER error = \r\n"
    u"              The request is not supported for this device.\r\n";
const std::u16string kDiskLine = u"IOCTL failed with error code 6.\r\n\r\n";

// Answers oddly where told so, and remembers what files and sets are opened with.
struct OddStorage final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  Status DeviceControl(platform::FileHandle handle, std::uint32_t code, const void* in, std::uint32_t inBytes,
                       void* out, std::uint32_t outBytes, std::uint32_t& returned) noexcept override {
    EXPECT_EQ(in == nullptr, inBytes == 0) << code;
    if (closedFilesAnswer && handle == platform::kInvalidHandle) return Status::Success();
    const Status status = InterceptingHost::DeviceControl(handle, code, in, inBytes, out, outBytes, returned);
    if (shortNumbers && code == platform::kIOCTL_STORAGE_GET_DEVICE_NUMBER) returned = 11;
    return status;
  }
  Status OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                    platform::FileHandle& handle) noexcept override {
    opened.insert({path, access, share});
    return InterceptingHost::OpenDevice(path, access, share, handle);
  }
  Status GetClassDevs(const platform::Guid* guid, std::uint32_t flags,
                      platform::DeviceSetHandle& set) noexcept override {
    sets.emplace_back(guid ? *guid : platform::kNullGuid, flags);
    return InterceptingHost::GetClassDevs(guid, flags, set);
  }
  bool closedFilesAnswer = false, shortNumbers = false;
  std::u16string closedPath;
  int detailsUntilFailure = 0;
  std::uint32_t detailError = platform::kERROR_INVALID_DATA;
  std::set<std::tuple<std::u16string, std::uint32_t, std::uint32_t>> opened;
  std::vector<std::pair<platform::Guid, std::uint32_t>> sets;
  Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override {
    if (call.operation == Operation::OpenDevice && call.path == closedPath) return Status::Failure(2);
    const bool readsDetail = call.operation == Operation::GetDeviceInterfaceDetail && call.outSize > 0;
    return readsDetail && --detailsUntilFailure == 0 ? Status::Failure(detailError) : Status::Success();
  }
};

// A PC, made from `machine`, and a cache over it, both made by Start.
class StorageCacheTest : public testing::Test {
 protected:
  void Start() {
    pc.emplace(machine);
    odd.emplace(*pc);
    cache.emplace(*odd);
  }
  bool Pass() {
    diagnostics.clear();
    return cache->CollectStorage(diagnostics);
  }
  static Texts Ids(const std::vector<NodePtr>& nodes) {
    Texts ids;
    for (const NodePtr& node : nodes) ids.push_back(node->m_strDevInstId);
    return ids;
  }
  const CZKUMInterfaceDeviceImpl& Volume(std::size_t index) const {
    return static_cast<const CZKUMInterfaceDeviceImpl&>(*cache->Volumes().at(index));
  }
  Machine machine = EmptyPc();
  std::optional<SimulatedPc> pc;
  std::optional<OddStorage> odd;
  std::optional<StorageCache> cache;
  std::u16string diagnostics;
};

// One set from the start and two more for each pass stay open, also when the cache is gone.
TEST_F(StorageCacheTest, AStickIsItsVolumeAndLeavesTheSetsOpen) {
  AddStick(machine, 1, u'E');
  Start();
  EXPECT_TRUE(Pass());
  EXPECT_EQ(diagnostics, kSeparator + kAnswers + kDiskLine);
  ASSERT_EQ(Ids(cache->Volumes()), Texts{StickVolumeId(1)});
  EXPECT_EQ(Ids(cache->Disks()), Texts{StickDiskId(1)});
  const auto& volume = Volume(0);
  EXPECT_EQ(
      (Texts{volume.m_strDevInstIdParent, volume.VolumeName, volume.DevicePath(), volume.m_strDeviceDescr,
             volume.StorageVendorId, volume.m_strSerialNumber}),
      (Texts{StickDiskId(1), u"\\\\?\\Volume{1}\\", u"\\\\?\\vol1", u"Direct Access Device", u"SanDisk ", u"4C53"}));
  EXPECT_EQ(volume.MountPoints, Texts{u"E:\\"});
  EXPECT_FALSE(volume.DeviceHandle);
  for (std::size_t passes = 1; passes < 4; ++passes, Pass()) {
    EXPECT_EQ(pc->Open(), (OpenCounts{0, 1 + 2 * passes, 0, 0}));
  }
  cache.reset();
  EXPECT_EQ(pc->Open(), (OpenCounts{0, 9, 0, 0}));
  EXPECT_EQ(pc->Misuses(), Texts{});
}

TEST_F(StorageCacheTest, SetsAndFilesAreOpenedWithTheseFlags) {
  AddStick(machine, 1, u'E');
  Start();
  Pass();
  using Set = std::pair<platform::Guid, std::uint32_t>;
  EXPECT_THAT(odd->sets, Each(Pair(_, 0x12)));
  EXPECT_EQ(odd->sets[1].first, platform::GUID_DEVINTERFACE_VOLUME);
  EXPECT_THAT(odd->sets, Contains(Set{platform::GUID_DEVINTERFACE_DISK, 0x12}));
  EXPECT_THAT(odd->opened, Each(FieldsAre(_, 0, 3)));
  for (const auto path : {u"\\\\?\\vol1", u"\\\\?\\disk1", u"\\\\.\\E:"})
    EXPECT_TRUE(odd->opened.contains({path, 0, 3}));
  // Names of classes count exactly; every other name stands for all.
  const std::u16string kNoClass = platform::GuidText(platform::kNullGuid);
  const std::pair<const char16_t*, std::u16string> classes[] = {
      {u"usb", u"{36FC9E60-C465-11CF-8056-444553540000}"},
      {u"volume", u"{71A27CDD-812A-11D0-BEC7-08002BE2092F}"},
      {u"image", u"{6BDD1FC6-810F-11D0-BEC7-08002BE2092F}"},
      {u"wceusbs", u"{25DBCE51-6C8F-4A72-8A6D-B54C2B4FC835}"},
      {u"unknown", u"{4D36E97E-E325-11CE-BFC1-08002BE10318}"},
      {u"diskdrive", u"{4D36E967-E325-11CE-BFC1-08002BE10318}"},
      {u"USB", kNoClass},
      {u"", kNoClass}};
  DeviceAnswers answers(*odd);
  InfoDeviceCache devices(*odd, answers);
  for (const auto& [name, guid] : classes) {
    odd->sets.clear();
    EXPECT_EQ(devices.EnumerateDeviceNodes(name), 0u);
    EXPECT_THAT(odd->sets, ElementsAre(Pair(testing::ResultOf(platform::GuidText, guid), guid == kNoClass ? 6 : 2)));
  }
}

TEST_F(StorageCacheTest, ReportsWhenTheVolumesDiffer) {
  AddStick(machine, 1, u'E');
  AddDisk(machine, u"USBSTOR\\SLOT", kVolumeManager, 7);
  AddDrive(machine, u'F', 7);
  AddDevice(machine, u"PCI\\VEN_8086", u"");
  AddDisk(machine, u"IDE\\DISK", u"PCI\\VEN_8086", 8);
  Start();
  const auto change = [&](std::initializer_list<unsigned> gone, unsigned came) {
    for (const unsigned number : gone) {
      EXPECT_EQ(pc->Apply({0, u"", platform::simulated::Unplug{StickId(number)}}), u"");
    }
    platform::simulated::Plug stick;
    if (came != 0) AddStick(stick.fragment, came, 0);
    EXPECT_EQ(pc->Apply({0, u"", stick}), u"");
    return Pass();
  };
  EXPECT_TRUE(Pass());
  // The empty slot and the internal disk stand behind the volume in each pass and are no change.
  EXPECT_FALSE(Pass());
  EXPECT_EQ(Ids(cache->Volumes()), (Texts{StickVolumeId(1), u"USBSTOR\\SLOT", u"IDE\\DISK"}));
  EXPECT_EQ(Volume(1).MountPoints, Texts{u"F:\\"});
  EXPECT_EQ(std::tuple(Volume(1).m_strDeviceDescr, Volume(1).Descriptor.size()), std::tuple(u"", 0u));
  EXPECT_EQ(Volume(2).MountPoints, Texts{});
  EXPECT_TRUE(change({}, 2));
  EXPECT_TRUE(change({2}, 3));  // as many as before, but another
  EXPECT_TRUE(change({1, 3}, 0));
  EXPECT_EQ(Ids(cache->Volumes()), (Texts{u"USBSTOR\\SLOT", u"IDE\\DISK"}));
  EXPECT_FALSE(Pass());
}

// Each volume takes one disk from the list, the first of its parent's id; case counts.
TEST_F(StorageCacheTest, DisksBehindVolumes) {
  AddDisk(machine, u"USBSTOR\\D\\1", kVolumeManager, 1);
  AddDisk(machine, u"usbstor\\USB\\2", kVolumeManager, 2);
  machine.interfaces.push_back({platform::GUID_DEVINTERFACE_DISK, u"\\\\?\\again", u"USBSTOR\\D\\1"});
  AddVolumeDevice(machine, u"V", u"USBSTOR\\D\\1", 1);
  AddVolumeDevice(machine, u"W\\_??_USBSTOR#USB#2#{x}", kVolumeManager, 2);
  Start();
  Pass();
  EXPECT_EQ(Ids(cache->Volumes()), (Texts{u"V", u"W\\_??_USBSTOR#USB#2#{x}", u"usbstor\\USB\\2", u"USBSTOR\\D\\1"}));
}

// The parent's first letters decide, else USB anywhere in the own id; case counts.
TEST_F(StorageCacheTest, Admission) {
  const Texts parents = {u"USBSTOR\\X", u"IUSB3\\X", u"SD\\X", u"PCI\\X", u"SCSI\\X", u"usb\\Y", u"IDE\\USB"};
  Texts volumes, disks;
  for (unsigned i = 0; i < 2 * parents.size(); ++i) {
    const std::u16string parent = parents[i / 2], id = Numbered(i % 2 ? u"X_usb_X" : u"X_USB_X", i);
    if (i % 2 == 0) AddDevice(machine, parent, u"");
    AddVolumeDevice(machine, id, parent, i);
    AddDisk(machine, id + u"D", parent, i);
    if (i / 2 >= 5 && i % 2) continue;
    volumes.push_back(id);
    disks.push_back(id + u"D");
  }
  Start();
  Pass();
  EXPECT_EQ(Ids(cache->Disks()), disks);
  volumes.insert(volumes.end(), disks.begin(), disks.end());
  EXPECT_EQ(Ids(cache->Volumes()), volumes);
}

// V1 is a CD drive, the query of V2 fails, V3 does not open; none of them has a name.
TEST_F(StorageCacheTest, OutcomesOfVolumes) {
  AddDevice(machine, u"USB\\A", u"");
  for (unsigned i = 0; i < 5; ++i) AddVolumeDevice(machine, Numbered(u"V", i), u"USB\\A", i);
  machine.storage[1].deviceType = 5;
  machine.storage[2].deviceType.reset();
  Start();
  odd->closedPath = u"\\\\?\\vol3";
  EXPECT_TRUE(Pass());
  EXPECT_EQ(Ids(cache->Volumes()), (Texts{u"V0", u"V4"}));
  EXPECT_EQ(Volume(0).VolumeName, u"");
  EXPECT_EQ(diagnostics, kSeparator + kAnswers + kSeparator + kSeparator + u"IOCTL failed with error code 1.\r\n\r\n" +
                             kSeparator + kAnswers);
}

// It ends that of volumes, and that of disks. Only one error is told to the debugger.
TEST_F(StorageCacheTest, AnUnreadableDetailEndsTheEnumeration) {
  for (unsigned i = 1; i <= 3; ++i) AddStick(machine, i, 0);
  Start();
  odd->detailsUntilFailure = 2;
  EXPECT_TRUE(Pass());
  EXPECT_EQ(Ids(cache->Volumes()), (Texts{StickVolumeId(1), StickDiskId(2), StickDiskId(3)}));
  EXPECT_EQ(pc->DebugText(), u"");
  odd->detailsUntilFailure = 5;
  odd->detailError = platform::kERROR_INVALID_USER_BUFFER;
  EXPECT_TRUE(Pass());
  EXPECT_EQ(cache->Volumes().size(), 3u);
  EXPECT_EQ(Ids(cache->Disks()), Texts{StickDiskId(1)});
  EXPECT_EQ(pc->DebugText(), u"ERROR_INVALID_USER_BUFFER\r\n");
  // A disk is kept because its query fails: where a closed file answers, it is not.
  odd->closedFilesAnswer = true;
  Pass();
  EXPECT_EQ(cache->Volumes().size(), 3u);
  EXPECT_EQ(Ids(cache->Disks()), Texts{});
}

TEST_F(StorageCacheTest, DevicesByDeviceNumber) {
  const auto add = [&](const char16_t* id, const platform::Guid& interfaceClass, unsigned number, std::size_t chars) {
    std::u16string path = std::u16string(u"\\\\?\\") + id;
    path.resize(std::max(path.size(), chars), u'x');
    AddStorageDevice(machine, id, kVolumeManager, interfaceClass, path, number);
  };
  add(u"D2", platform::GUID_DEVINTERFACE_DISK, 7, 0);
  add(u"D3", platform::GUID_DEVINTERFACE_DISK, 7, 0);
  add(u"D4", platform::GUID_DEVINTERFACE_DISK, 9, 510);  // its detail takes 1026 bytes
  add(u"D5", platform::GUID_DEVINTERFACE_DISK, 10, 509);
  add(u"F6", platform::GUID_DEVINTERFACE_FLOPPY, 11, 0);
  add(u"C7", platform::GUID_DEVINTERFACE_CDROM, 12, 0);
  EXPECT_EQ(platform::GuidText(platform::GUID_DEVINTERFACE_FLOPPY), u"{53F56311-B6BF-11D0-94F2-00A0C91EFB8B}");
  EXPECT_EQ(platform::GuidText(platform::GUID_DEVINTERFACE_CDROM), u"{53F56308-B6BF-11D0-94F2-00A0C91EFB8B}");
  machine.storage[0].deviceNumber->type = 2;
  machine.storage[0].deviceNumber->partition = 5;
  Start();
  DiskLetterFinder finder(*odd);
  const auto find = [&](std::uint32_t number, std::uint32_t driveType, const char16_t* dosName = u"") {
    return finder.FindStorageDevInstByDeviceNumber(number, driveType, dosName);
  };
  const auto floppy = u"\\Device\\Floppy0";
  EXPECT_THAT((std::vector{find(7, 2, u"\\Device\\Harddisk0"), find(7, 3, floppy), find(10, 3), find(11, 2, floppy),
                           find(12, 5)}),
              ElementsAre(2, 2, 5, 6, 7));
  EXPECT_THAT((std::vector{find(7, 2, floppy), find(11, 2, u"\\Device\\floppy0"), find(11, 2, u"Floppy0"), find(8, 2),
                           find(9, 3), find(12, 3), find(7, 0), find(7, 1), find(7, 4), find(7, 6)}),
              Each(0));
  EXPECT_THAT(odd->opened, testing::Not(Contains(FieldsAre(u"", _, _))));  // nothing for a path that is not told
  odd->shortNumbers = true;
  EXPECT_EQ(DiskLetterFinder(*odd).FindStorageDevInstByDeviceNumber(7, 3, u""), 0u);
  EXPECT_EQ(pc->Open(), (OpenCounts{0, 1, 0, 0}));
}

TEST_F(StorageCacheTest, DriveLettersOfDisks) {
  AddDisk(machine, u"Disk\\a", kVolumeManager, 1);
  AddDrive(machine, u'Z', 1);
  AddDrive(machine, u'A', 1, platform::kDRIVE_FIXED);
  AddDrive(machine, u'C', 2);
  AddDrive(machine, u'D', 1);
  machine.drives.back().dosDevice.reset();
  AddDrive(machine, u'E', 1);
  machine.storage.back().deviceNumber.reset();
  AddDrive(machine, u'F', 1, platform::kDRIVE_REMOTE);
  Start();
  DiskLetterFinder finder(*pc);
  // A letter of no disk is neither a disk's without id nor the first device's.
  for (const auto id : {u"Disk\\a", u"DISK\\A", u"Disk\\b", u"", kVolumeManager}) {
    CZKUMInterfaceDeviceImpl disk;
    disk.m_strDevInstId = id;
    Texts roots;
    finder.FindDriveLettersForDisk(disk, roots);
    EXPECT_EQ(roots, platform::EqualIgnoringCase(id, u"disk\\a") ? (Texts{u"A:\\", u"Z:\\"}) : Texts{});
  }
}

TEST_F(StorageCacheTest, AsksForTheWholePcOnceInAPass) {
  constexpr unsigned kSticks = 20;
  for (unsigned i = 0; i < kSticks; ++i) AddStick(machine, i, i < 3 ? static_cast<char16_t>(u'E' + i) : u'\0');
  Start();
  platform::wrappers::CountingHost host(*pc);
  cache.emplace(host);
  Pass();
  EXPECT_EQ(cache->Volumes().size(), kSticks);
  EXPECT_EQ(host.Count(Operation::OpenDevice), 2 * kSticks + 3);  // volumes, disks, letters
  EXPECT_EQ(host.Count(Operation::FirstVolume), 1u);
  EXPECT_EQ(host.Count(Operation::VolumePathNames), kSticks);
  EXPECT_EQ(host.Count(Operation::VolumeNameForMountPoint), kSticks + 3);
  EXPECT_EQ(host.Count(Operation::DriveType), 3u + 3u + 3u);  // roots, path names, letters
}

}  // namespace
}  // namespace KelvoUHW
