// Whole passes over simulated PCs: which volumes and disks are found, what a pass reports and
// leaves open, and drive letters by device number.
#include "devinfo/storage_cache.h"

#include <gtest/gtest.h>

#include <cstring>

#include "platform/simulated/simulated_pc.h"
#include "platform/text.h"
#include "platform/wrappers/counting_host.h"
#include "platform/wrappers/failing_host.h"
#include "platform/wrappers/intercepting_host.h"
#include "tests/devinfo/storage_machine.h"

namespace KelvoUHW {
namespace {

using platform::Status;
using platform::ToUtf8;
using platform::simulated::SimulatedPc;
using platform::wrappers::Operation;
using Texts = std::vector<std::u16string>;

constexpr char kSeparator[] = "++++++++++++++++++++++++++++++++++++++++++++++\r\n";
constexpr char kNoMediaSerial[] =
    "IOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER error = \r\n"
    "              The request is not supported for this device.\r\n";
constexpr char kDiskLine[] = "IOCTL failed with error code 6.\r\n\r\n";

const CZKUMInterfaceDeviceImpl& RecordOf(const NodePtr& node) {
  return static_cast<const CZKUMInterfaceDeviceImpl&>(*node);
}

Texts IdsOf(const std::vector<NodePtr>& nodes) {
  Texts ids;
  for (const NodePtr& node : nodes) ids.push_back(node->m_strDevInstId);
  return ids;
}

TEST(StorageCache, AStickIsItsVolume) {
  Machine machine = EmptyPc();
  AddStick(machine, 1, u'E');
  SimulatedPc pc(machine);
  StorageCache cache(pc);
  std::u16string diagnostics;
  EXPECT_TRUE(cache.CollectStorage(diagnostics));
  EXPECT_EQ(ToUtf8(diagnostics), std::string(kSeparator) + kNoMediaSerial + kDiskLine);
  ASSERT_EQ(IdsOf(cache.Volumes()), Texts{StickVolumeId(1)});
  const auto& volume = RecordOf(cache.Volumes()[0]);
  EXPECT_EQ(volume.m_strDevInstIdParent, StickDiskId(1));
  EXPECT_EQ(volume.VolumeName, u"\\\\?\\Volume{1}\\");
  EXPECT_EQ(volume.MountPoints, Texts{u"E:\\"});
  EXPECT_EQ(volume.DevicePath(), u"\\\\?\\vol1");
  EXPECT_EQ(volume.m_strDeviceDescr, u"Direct Access Device");
  EXPECT_EQ(volume.StorageVendorId, u"SanDisk ");
  EXPECT_EQ(volume.StorageProductId, u"Cruzer          ");
  EXPECT_EQ(volume.m_strSerialNumber, u"4C53");
  EXPECT_EQ(volume.VolumeSerialNumber, kUnknownVolumeSerialNumber);
  EXPECT_FALSE(volume.DeviceHandle);

  ASSERT_EQ(IdsOf(cache.Disks()), Texts{StickDiskId(1)});
  const auto& disk = RecordOf(cache.Disks()[0]);
  EXPECT_EQ(disk.MountPoints, Texts{u"E:\\"});
  EXPECT_EQ(disk.m_strDeviceDescr, u"");
  EXPECT_EQ(disk.DescriptorLength, 0u);
}

// Sets are never destroyed: one from the start, two more for each pass, and after the cache is
// gone.
TEST(StorageCache, LeavesItsSetsOpenAndNothingElse) {
  Machine machine = EmptyPc();
  AddStick(machine, 1, u'E');
  SimulatedPc pc(machine);
  {
    StorageCache cache(pc);
    EXPECT_EQ(pc.Open(), (platform::simulated::OpenCounts{0, 1, 0, 0}));
    std::u16string diagnostics;
    for (std::size_t pass = 1; pass <= 3; ++pass) {
      cache.CollectStorage(diagnostics);
      EXPECT_EQ(pc.Open(), (platform::simulated::OpenCounts{0, 1 + 2 * pass, 0, 0}));
    }
  }
  EXPECT_EQ(pc.Open().sets, 7u);
  EXPECT_EQ(pc.Misuses(), Texts{});
}

TEST(StorageCache, ReportsWhenTheSetOfVolumesDiffers) {
  Machine machine = EmptyPc();
  AddStick(machine, 1, u'E');
  AddDevice(machine, u"USB\\VID_1&PID_2\\READER", u"");
  AddDisk(machine, u"USBSTOR\\DISK&SLOT\\0", u"USB\\VID_1&PID_2\\READER", 7);
  AddDisk(machine, u"IDE\\DISK\\0", u"PCI\\VEN_8086\\0", 8);
  AddDevice(machine, u"PCI\\VEN_8086\\0", u"");
  AddDrive(machine, u'F', 7);
  SimulatedPc pc(machine);
  StorageCache cache(pc);
  std::u16string diagnostics;
  const auto plug = [&](unsigned number) {
    Machine fragment;
    AddStick(fragment, number, 0);
    EXPECT_EQ(pc.Apply({0, u"", platform::simulated::Plug{fragment, {}}}), u"");
  };
  const auto unplug = [&](unsigned number) {
    const std::u16string usb = Numbered(u"USB\\VID_0781&PID_5567\\S", number);
    EXPECT_EQ(pc.Apply({0, u"", platform::simulated::Unplug{usb}}), u"");
  };
  const auto pass = [&] { return cache.CollectStorage(diagnostics); };

  EXPECT_TRUE(pass());
  // The empty slot and the internal disk stand behind the volume in each pass and are no change.
  const Texts disks = {u"USBSTOR\\DISK&SLOT\\0", u"IDE\\DISK\\0"};
  EXPECT_FALSE(pass());
  EXPECT_EQ(IdsOf(cache.Volumes()), (Texts{StickVolumeId(1), disks[0], disks[1]}));
  EXPECT_EQ(RecordOf(cache.Volumes()[1]).MountPoints, Texts{u"F:\\"});
  EXPECT_EQ(RecordOf(cache.Volumes()[1]).m_strDeviceDescr, u"");
  EXPECT_EQ(RecordOf(cache.Volumes()[2]).MountPoints, Texts{});
  plug(2);
  EXPECT_TRUE(pass());
  EXPECT_FALSE(pass());
  unplug(2);
  plug(3);
  EXPECT_TRUE(pass());  // as many as before, but another
  unplug(1);
  EXPECT_TRUE(pass());
  unplug(3);
  EXPECT_TRUE(pass());
  EXPECT_EQ(IdsOf(cache.Volumes()), disks);
  EXPECT_FALSE(pass());
}

// Each volume takes one disk from the list, the first of its parent's id.
TEST(StorageCache, DisksBehindVolumes) {
  Machine machine = EmptyPc();
  AddDevice(machine, u"USB\\A", u"");
  AddDisk(machine, u"USBSTOR\\D\\1", u"USB\\A", 1);
  AddDisk(machine, u"usbstor\\d\\2", u"USB\\A", 2);
  machine.interfaces.push_back(
      {platform::GUID_DEVINTERFACE_DISK, u"\\\\?\\disk1again", u"USBSTOR\\D\\1"});
  AddVolumeDevice(machine, u"V\\1", u"USBSTOR\\D\\1", 1);
  AddVolumeDevice(machine, u"STORAGE\\_??_USBSTOR#D#2#{x}", kVolumeManager, 2);
  SimulatedPc pc(machine);
  StorageCache cache(pc);
  std::u16string diagnostics;
  cache.CollectStorage(diagnostics);
  EXPECT_EQ(IdsOf(cache.Volumes()),
            (Texts{u"V\\1", u"STORAGE\\_??_USBSTOR#D#2#{x}", u"usbstor\\d\\2", u"USBSTOR\\D\\1"}));
}

// The parent's first letters decide, then USB anywhere in the own id; case counts.
TEST(StorageCache, Admission) {
  const std::vector<std::tuple<std::u16string, std::u16string, bool>> cases = {
      {u"V", u"USBSTOR\\X", true},      {u"V", u"IUSB3\\X", true},  {u"V", u"SD\\X", true},
      {u"V", u"PCI\\X", true},          {u"V", u"SCSI\\X", true},   {u"V", u"usb\\X", false},
      {u"V", u"IDE\\USB", false},       {u"X_USB_X", u"IDE", true}, {u"X_usb_X", u"IDE", false},
      {u"V", u"ROOT\\VOLMGR\\0", false}};
  for (const auto& [id, parent, admitted] : cases) {
    Machine machine;
    AddDevice(machine, parent, u"");
    AddVolumeDevice(machine, id, parent, 1);
    AddDisk(machine, id + u"D", parent, 2);
    SimulatedPc pc(machine);
    StorageCache cache(pc);
    std::u16string diagnostics;
    EXPECT_EQ(cache.CollectStorage(diagnostics), admitted) << ToUtf8(id + u" " + parent);
    EXPECT_EQ(cache.Disks().size(), admitted ? 1u : 0u) << ToUtf8(id + u" " + parent);
  }
}

class OddStorage final : public platform::wrappers::InterceptingHost {
 public:
  using InterceptingHost::InterceptingHost;
  Status DeviceControl(platform::FileHandle handle, std::uint32_t code, const void* in,
                       std::uint32_t inBytes, void* out, std::uint32_t outBytes,
                       std::uint32_t& returned) noexcept override {
    if (closedFilesAnswer && handle == platform::kInvalidHandle) return Status::Success();
    const Status status =
        InterceptingHost::DeviceControl(handle, code, in, inBytes, out, outBytes, returned);
    if (shortNumbers && code == platform::kIOCTL_STORAGE_GET_DEVICE_NUMBER) returned = 11;
    return status;
  }

  bool closedFilesAnswer = false;
  bool shortNumbers = false;
  std::u16string closedPath;
  int details = 0;
  int failingDetail = 0;
  std::uint32_t detailError = platform::kERROR_INVALID_DATA;

 private:
  Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override {
    if (call.operation == Operation::OpenDevice && call.path == closedPath) {
      return Status::Failure(platform::kERROR_FILE_NOT_FOUND);
    }
    const bool readsDetail =
        call.operation == Operation::GetDeviceInterfaceDetail && call.outSize > 0;
    if (readsDetail && ++details == failingDetail) return Status::Failure(detailError);
    return Status::Success();
  }
};

// Volumes 1 to 4: whole, a CD drive, one whose query fails, one that does not open; then whole
// again.
TEST(StorageCache, OutcomesOfVolumes) {
  Machine machine = EmptyPc();
  AddDevice(machine, u"USB\\A", u"");
  const std::vector<StorageOutcome> expected = {
      KStorageAccepted, KStorageRejected, KStorageRejected, KStorageCannotOpen, KStorageAccepted};
  for (unsigned i = 0; i < 5; ++i) AddVolumeDevice(machine, Numbered(u"V", i), u"USB\\A", i);
  machine.storage[1].deviceType = 5;
  machine.storage[2].deviceType.reset();
  SimulatedPc pc(machine);
  OddStorage odd(pc);
  odd.closedPath = u"\\\\?\\vol3";
  std::u16string diagnostics;
  for (unsigned i = 0; i < 5; ++i) {
    DeviceSet set(pc);
    ASSERT_TRUE(set.Open(&platform::GUID_DEVINTERFACE_VOLUME, 0x12));
    CZKUMInterfaceDeviceImpl record;
    ASSERT_TRUE(pc.EnumDeviceInterfaces(set.Get(), platform::GUID_DEVINTERFACE_VOLUME, i,
                                        record.InterfaceData));
    record.Detail =
        GetInterfaceDetail(pc, pc, set.Get(), &record.InterfaceData, &record.DeviceData);
    EXPECT_EQ(StoragePass(odd, diagnostics).OpenAndQueryVolume(record), expected[i]) << i;
    EXPECT_EQ(record.VolumeName, u"");
    EXPECT_EQ(pc.Open().files, 0u);
  }
  StorageCache cache(odd);
  diagnostics.clear();
  cache.CollectStorage(diagnostics);
  EXPECT_EQ(IdsOf(cache.Volumes()), (Texts{u"V0", u"V4"}));
  const std::string whole = std::string(kSeparator) + kNoMediaSerial;
  EXPECT_EQ(ToUtf8(diagnostics),
            whole + kSeparator + kSeparator + "IOCTL failed with error code 1.\r\n\r\n" + whole);
}

// An unreadable detail ends the volumes, or the disks, of the pass. Only one error is told.
TEST(StorageCache, AnUnreadableDetailEndsTheEnumeration) {
  Machine machine = EmptyPc();
  for (unsigned i = 1; i <= 3; ++i) AddStick(machine, i, 0);
  SimulatedPc pc(machine);
  OddStorage odd(pc);
  odd.failingDetail = 2;
  StorageCache cache(odd);
  std::u16string diagnostics;
  EXPECT_TRUE(cache.CollectStorage(diagnostics));
  EXPECT_EQ(IdsOf(cache.Volumes()), (Texts{StickVolumeId(1), StickDiskId(2), StickDiskId(3)}));
  EXPECT_EQ(pc.DebugText(), u"");

  odd.details = 0;
  odd.failingDetail = 5;
  odd.detailError = platform::kERROR_INVALID_USER_BUFFER;
  EXPECT_TRUE(cache.CollectStorage(diagnostics));
  EXPECT_EQ(cache.Volumes().size(), 3u);
  EXPECT_EQ(IdsOf(cache.Disks()), Texts{StickDiskId(1)});
  EXPECT_EQ(pc.DebugText(), u"ERROR_INVALID_USER_BUFFER\r\n");
}

// A disk is kept because its query fails: where a closed file answers, it is not.
TEST(StorageCache, ADiskWhoseQuerySucceedsIsDropped) {
  Machine machine = EmptyPc();
  AddStick(machine, 1, 0);
  SimulatedPc pc(machine);
  OddStorage odd(pc);
  odd.closedFilesAnswer = true;
  StorageCache cache(odd);
  std::u16string diagnostics;
  cache.CollectStorage(diagnostics);
  EXPECT_EQ(cache.Volumes().size(), 1u);
  EXPECT_TRUE(cache.Disks().empty());
}

// Every call fails once in turn, then from each on: no file or search stays open, and the next
// clean pass finds what the first found.
TEST(StorageCache, EveryCallMayFail) {
  Machine machine = EmptyPc();
  AddStick(machine, 1, u'E');
  AddStick(machine, 2, 0);
  AddDisk(machine, u"USB\\SLOT", kVolumeManager, 3);
  SimulatedPc pc(machine);
  for (const bool onwards : {false, true}) {
    platform::wrappers::FailingHost host(pc);
    StorageCache cache(host);
    std::u16string diagnostics;
    cache.CollectStorage(diagnostics);
    const Texts whole = {StickVolumeId(1), StickVolumeId(2), u"USB\\SLOT"};
    ASSERT_EQ(IdsOf(cache.Volumes()), whole);
    platform::wrappers::FailurePlan plan{};
    plan.onwards = onwards;
    for (plan.call = 1;; ++plan.call) {
      SCOPED_TRACE(plan.call);
      host.SetPlan(plan);
      cache.CollectStorage(diagnostics);
      EXPECT_EQ(pc.Open().files, 0u);
      EXPECT_EQ(pc.Open().searches, 0u);
      if (host.Failures() == 0) break;
      host.SetPlan({});
      cache.CollectStorage(diagnostics);
      ASSERT_EQ(IdsOf(cache.Volumes()), whole);
      EXPECT_EQ(RecordOf(cache.Volumes()[0]).MountPoints, Texts{u"E:\\"});
    }
    EXPECT_GT(plan.call, 60u);  // a pass that asks little would prove little
  }
  EXPECT_EQ(pc.Misuses(), Texts{});
}

// What concerns the whole PC is asked once in a pass: the number of calls grows with the number of
// sticks alone.
TEST(StorageCache, CallsGrowWithTheNumberOfVolumes) {
  std::vector<std::uint64_t> calls;
  for (const unsigned sticks : {10u, 20u, 30u}) {
    Machine machine = EmptyPc();
    for (unsigned i = 0; i < sticks; ++i) AddStick(machine, i, i == 0 ? u'E' : u'\0');
    SimulatedPc pc(machine);
    platform::wrappers::CountingHost host(pc);
    StorageCache cache(host);
    host.Reset();
    std::u16string diagnostics;
    cache.CollectStorage(diagnostics);
    ASSERT_EQ(cache.Volumes().size(), sticks);
    calls.push_back(host.Total());
  }
  EXPECT_EQ(calls[2] - calls[1], calls[1] - calls[0]);
}

TEST(StorageCache, DevicesByDeviceNumber) {
  Machine machine = EmptyPc();  // device 1
  AddDevice(machine, u"USB\\A", u"");
  AddDisk(machine, u"D3", u"USB\\A", 7);
  AddDisk(machine, u"D4", u"USB\\A", 8);
  machine.storage.back().deviceNumber = platform::simulated::DeviceNumber{2, 7, 5};
  AddDisk(machine, u"D5", u"USB\\A", 9);
  machine.interfaces.back().path = u"\\\\?\\" + std::u16string(510, u'x');
  machine.storage.back().path = machine.interfaces.back().path;
  AddDisk(machine, u"D6", u"USB\\A", 10);
  machine.interfaces.back().path = u"\\\\?\\" + std::u16string(505, u'y');
  machine.storage.back().path = machine.interfaces.back().path;
  AddDisk(machine, u"F7", u"USB\\A", 11);
  machine.interfaces.back().interfaceClass = platform::GUID_DEVINTERFACE_FLOPPY;
  AddDisk(machine, u"C8", u"USB\\A", 12);
  machine.interfaces.back().interfaceClass = platform::GUID_DEVINTERFACE_CDROM;
  SimulatedPc pc(machine);
  DiskLetterFinder finder(pc);
  struct Case {
    std::uint32_t number, driveType;
    const char16_t* dosName;
    platform::DevInst expected;
  };
  const std::vector<Case> cases = {
      {7, 2, u"\\Device\\Harddisk0", 3},  // two disks of that number: the first
      {7, 3, u"\\Device\\Floppy0", 3},    // the name counts for removable drives only
      {8, 2, u"", 0},
      {9, 3, u"", 0},   // its detail needs more than 1024 bytes
      {10, 3, u"", 6},  // 1024 exactly
      {11, 2, u"\\Device\\Floppy0", 7},
      {11, 2, u"\\Device\\floppy0", 0},
      {7, 2, u"\\Device\\Floppy0", 0},
      {12, 5, u"", 8},
      {12, 3, u"", 0},
      {7, 0, u"", 0},
      {7, 1, u"", 0},
      {7, 4, u"", 0},
      {7, 6, u"", 0}};
  for (const Case& c : cases) {
    EXPECT_EQ(finder.FindStorageDevInstByDeviceNumber(c.number, c.driveType, c.dosName), c.expected)
        << c.number << " " << c.driveType;
  }
  EXPECT_EQ(pc.Open(), platform::simulated::OpenCounts{});

  OddStorage odd(pc);
  odd.shortNumbers = true;
  EXPECT_EQ(DiskLetterFinder(odd).FindStorageDevInstByDeviceNumber(7, 3, u""), 0u);
}

TEST(StorageCache, DriveLettersOfDisks) {
  Machine machine = EmptyPc();
  AddDevice(machine, u"USB\\A", u"");
  AddDisk(machine, u"Disk\\a", u"USB\\A", 1);
  AddDrive(machine, u'Z', 1);
  AddDrive(machine, u'A', 1, platform::kDRIVE_FIXED);
  AddDrive(machine, u'C', 2);
  AddDrive(machine, u'D', 1);
  machine.drives.back().dosDevice.reset();
  AddDrive(machine, u'E', 1);
  machine.storage.back().deviceNumber.reset();
  AddDrive(machine, u'F', 1, platform::kDRIVE_REMOTE);
  SimulatedPc pc(machine);
  DiskLetterFinder finder(pc);
  const std::vector<std::pair<std::u16string, Texts>> cases = {{u"Disk\\a", {u"A:\\", u"Z:\\"}},
                                                               {u"DISK\\A", {u"A:\\", u"Z:\\"}},
                                                               {u"Disk\\b", {}},
                                                               {u"", {}}};
  for (const auto& [id, expected] : cases) {
    CZKUMInterfaceDeviceImpl disk;
    disk.m_strDevInstId = id;
    Texts roots;
    finder.FindDriveLettersForDisk(disk, roots);
    EXPECT_EQ(roots, expected) << ToUtf8(id);
  }
}

}  // namespace
}  // namespace KelvoUHW
