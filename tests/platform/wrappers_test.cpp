#include <gmock/gmock.h>

#include <thread>
#include <vector>

#include "platform/usb_ioctl.h"
#include "platform/wrappers/counting_host.h"
#include "platform/wrappers/failing_host.h"
#include "platform/wrappers/logging_host.h"
#include "tests/platform/stick_pc.h"

namespace platform::wrappers {
namespace {

using simulated::kStickVolumeName;
using simulated::kSystemVolumeName;
using simulated::SimulatedPc;
using simulated::StickMachine;
using simulated::Text;
using testing::ElementsAre;

// One use of each operation that can fail, in the order of the enumeration; what each leaves in
// `trace` shows that its out values are those of the base, or of a failure.
struct Round {
  explicit Round(Host& host) : m_host(host) {}

  std::vector<Text> Run() {
    char16_t text[300] = {};
    std::uint32_t number = 7;
    FileHandle file = 7;
    Add({m_host.OpenDevice(u"\\\\.\\HCD0", 0, 0, file), file == kInvalidHandle ? u"-" : u"file"});
    std::uint32_t returned = 7;
    std::uint8_t name[64] = {};
    Add({m_host.DeviceControl(file, kIOCTL_GET_HCD_DRIVERKEY_NAME, nullptr, 0, name, 64, returned),
         Decimal(static_cast<std::int32_t>(returned))});
    DeviceSetHandle set = 7;
    Add({m_host.GetClassDevs(&GUID_DEVINTERFACE_DISK, kDIGCF_DEVICEINTERFACE, set),
         set == kInvalidHandle ? u"-" : u"set"});
    SP_DEVINFO_DATA device{.cbSize = sizeof(SP_DEVINFO_DATA)};
    Add({m_host.EnumDeviceInfo(set, 0, device), Hex(device.DevInst)});
    SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof(SP_DEVICE_INTERFACE_DATA)};
    Add({m_host.EnumDeviceInterfaces(set, GUID_DEVINTERFACE_DISK, 0, data), Hex(data.Flags)});
    Add({m_host.GetDeviceInterfaceDetail(set, data, nullptr, 0, &number, &device), Hex(number)});
    Add({m_host.GetDeviceInstanceId(set, device, text, 300, nullptr), text});
    std::uint32_t type = 7;
    Add({m_host.GetDeviceRegistryProperty(set, device, kSPDRP_CLASS, &type, text, 600, nullptr), Hex(type) + text});
    DeviceSetHandle images = 7;
    Add({m_host.GetClassImageList(images), images == kInvalidHandle ? u"-" : u"images"});
    std::int32_t index = 7;
    Add({m_host.GetClassImageIndex(images, GUID_DEVCLASS_DISKDRIVE, index), Decimal(index)});
    Add({m_host.GetClassDescription(GUID_DEVCLASS_DISKDRIVE, text, 300, nullptr), text});
    DevInst node = 7;
    Add({m_host.LocateRootDevNode(node), Hex(node)});
    Add({m_host.GetParent(5, node), Hex(node)});
    Add({m_host.GetChild(1, node), Hex(node)});
    Add({m_host.GetSibling(3, node), Hex(node)});
    Add({m_host.GetDeviceId(1, text, 300), text});
    number = 600;
    Add({m_host.GetDevNodeRegistryProperty(1, kCM_DRP_DRIVER, &type, text, number), Hex(number)});
    FindHandle volumes = 7;
    Add({m_host.FirstVolume(text, 300, volumes), volumes == kInvalidHandle ? u"-" : text});
    Add({m_host.NextVolume(volumes, text, 300), text});
    Add({m_host.VolumePathNames(kStickVolumeName, text, 300, number), Hex(number)});
    Add({m_host.VolumeNameForMountPoint(u"C:\\", text, 300), text});
    Add({Status::Success(), Hex(m_host.LogicalDriveStrings(300, text))});
    Add({Status::Success(), Hex(m_host.DriveType(u"E:\\"))});
    std::uint32_t flags = 7;
    Add({m_host.VolumeInformation(u"C:\\", nullptr, 0, number, flags, nullptr, 0), Hex(flags)});
    FindHandle folders = 7;
    Add({m_host.FirstMountPoint(kSystemVolumeName, text, 300, folders), folders == kInvalidHandle ? u"-" : text});
    Add({m_host.NextMountPoint(folders, text, 300), text});
    Add({m_host.DosDeviceTarget(u"E:", text, 300), text});
    m_host.WriteDebugText(u"round.");
    for (const Status& closed :
         {m_host.CloseDevice(file), m_host.DestroyDeviceInfoList(set), m_host.DestroyClassImageList(images),
          m_host.CloseVolumeSearch(volumes), m_host.CloseMountPointSearch(folders)}) {
      closes += closed ? 1 : 0;
    }
    return trace;
  }

  std::vector<Text> trace;
  std::vector<Status> statuses;
  int closes = 0;

 private:
  // Braces around both: the call comes before what it left is read.
  struct Outcome {
    Status status;
    Text out;
  };
  void Add(const Outcome& outcome) {
    const Status& status = outcome.status;
    statuses.push_back(status);
    trace.push_back((status ? Text(u"ok ") : Hex(status.error) + u" ") + outcome.out);
  }

  Host& m_host;
};

constexpr std::size_t kFallible = kOperations - 6;  // five close, one writes debug texts

TEST(CountingHostTest, EachOperationIsForwardedAndCounted) {
  SimulatedPc bare(StickMachine());
  SimulatedPc pc(StickMachine());
  CountingHost counting(pc);
  const std::vector<Text> expected = Round(bare).Run();
  EXPECT_EQ(expected.size(), kFallible);
  Round round(counting);
  EXPECT_EQ(round.Run(), expected);
  EXPECT_EQ(round.closes, 5);
  for (std::size_t i = 0; i < kOperations; ++i) {
    EXPECT_EQ(counting.Count(static_cast<Operation>(i)), 1u) << ToUtf8(NameOf(static_cast<Operation>(i)));
  }
  EXPECT_EQ(counting.Total(), kOperations - 1);
  EXPECT_EQ(counting.CountOfCode(kIOCTL_GET_HCD_DRIVERKEY_NAME), 1u);
  EXPECT_EQ(counting.CountOfCode(kIOCTL_USB_GET_ROOT_HUB_NAME), 0u);
  EXPECT_EQ(pc.DebugText(), u"round.");
  EXPECT_EQ(pc.Open(), bare.Open());
  counting.Reset();
  EXPECT_EQ(counting.Total(), 0u);
  EXPECT_EQ(counting.CountOfCode(kIOCTL_GET_HCD_DRIVERKEY_NAME), 0u);

  const auto work = [&counting, node = DevInst{0}]() mutable {
    for (int i = 0; i < 5000; ++i) counting.GetChild(1, node);
  };
  std::thread other(work);
  std::thread(work).join();
  other.join();
  EXPECT_EQ(counting.Count(Operation::GetChild), 10000u) << "exact across threads";
}

TEST(FailingHostTest, FailsTheNthCallForEveryN) {
  SimulatedPc bare(StickMachine());
  const std::vector<Text> clean = Round(bare).Run();
  for (std::uint64_t n = 1; n <= kFallible; ++n) {
    SCOPED_TRACE(n);
    SimulatedPc pc(StickMachine());
    FailingHost failing(pc, {.call = n});
    Round round(failing);
    const std::vector<Text> trace = round.Run();
    EXPECT_EQ(failing.Calls(), kFallible);
    EXPECT_EQ(failing.Failures(), 1u);
    const Text& failed = trace[n - 1];
    EXPECT_NE(failed, clean[n - 1]);
    for (std::size_t i = 0; i + 1 < n; ++i) EXPECT_EQ(trace[i], clean[i]);
    // Two operations have no error to give; those of the configuration manager give their own.
    if (failed.substr(0, 3) != u"ok ") {
      const std::uint32_t error = round.statuses[n - 1].error;
      EXPECT_EQ(error, n >= 12 && n <= 17 ? 0x13u : 31u) << ToUtf8(failed);
    }
    EXPECT_EQ(pc.Open(), simulated::OpenCounts{}) << "closes reach the base";
  }
}

TEST(FailingHostTest, OutValuesOfFailuresFromTheFirstCallOn) {
  SimulatedPc pc(StickMachine());
  FailingHost failing(pc, {.call = 1, .onwards = true, .error = 5, .configurationManagerError = 13});
  EXPECT_THAT(Round(failing).Run(),
              ElementsAre(u"5 -", u"5 0", u"5 -", u"5 0", u"5 0", u"5 7", u"5 ", u"5 7", u"5 -", u"5 7", u"5 ", u"D 7",
                          u"D 7", u"D 7", u"D 7", u"D ", u"D 258", u"5 -", u"5 ", u"5 258", u"5 ", u"ok 0", u"ok 0",
                          u"5 7", u"5 -", u"5 ", u"5 "));
  EXPECT_EQ(failing.Failures(), kFallible);
}

// A wrapper around wrappers: what reaches the PC is counted apart from what is asked.
TEST(FailingHostTest, OnlyTheChosenCalls) {
  SimulatedPc pc(StickMachine());
  CountingHost reached(pc);
  FailingHost failing(reached, {.call = 2, .operation = Operation::GetChild});
  CountingHost asked(failing);
  DevInst node = 0;
  EXPECT_TRUE(asked.GetChild(1, node));
  EXPECT_TRUE(asked.GetParent(1, node));
  EXPECT_FALSE(asked.GetChild(1, node));
  EXPECT_TRUE(asked.GetChild(1, node));
  EXPECT_EQ(asked.Total(), 4u);
  EXPECT_EQ(reached.Total(), 3u);
  failing.SetPlan({.call = 1, .onwards = true, .code = kIOCTL_USB_GET_ROOT_HUB_NAME});
  FileHandle file = kInvalidHandle;
  ASSERT_TRUE(asked.OpenDevice(u"\\\\.\\HCD0", 0, 0, file));
  std::uint8_t out[64];
  std::uint32_t returned = 0;
  EXPECT_TRUE(asked.DeviceControl(file, kIOCTL_GET_HCD_DRIVERKEY_NAME, nullptr, 0, out, 64, returned));
  const Status failed = asked.DeviceControl(file, kIOCTL_USB_GET_ROOT_HUB_NAME, nullptr, 0, out, 64, returned);
  EXPECT_EQ(simulated::Error(failed), 31u);
  EXPECT_EQ(returned, 0u);
  EXPECT_EQ(failing.Calls(), 1u);
  EXPECT_TRUE(asked.CloseDevice(file));
}

TEST(LoggingHostTest, WritesCallsDown) {
  SimulatedPc pc(StickMachine());
  LoggingHost logging(pc);
  std::uint32_t returned = 0;
  FileHandle file = kInvalidHandle;
  DeviceSetHandle set = kInvalidHandle;
  std::uint8_t buffer[6];
  SP_DEVINFO_DATA device{.cbSize = sizeof(SP_DEVINFO_DATA)};
  DevInst node = 0;
  logging.OpenDevice(u"\\\\.\\HCD9", 0, 0, file);
  logging.OpenDevice(u"\\\\.\\HCD0", 0, 0, file);
  logging.GetClassDevs(nullptr, kDIGCF_PRESENT | kDIGCF_ALLCLASSES, set);
  logging.DeviceControl(file, kIOCTL_GET_HCD_DRIVERKEY_NAME, buffer, 6, buffer, 6, returned);
  logging.EnumDeviceInfo(set, 3, device);
  logging.GetDeviceRegistryProperty(set, device, kSPDRP_MFG, nullptr, buffer, 6, nullptr);
  logging.GetParent(2, node);
  logging.DriveType(u"E:\\");
  logging.CloseDevice(file);
  logging.CloseDevice(file);
  logging.CloseDevice(5);
  EXPECT_THAT(logging.Log(),
              ElementsAre(u"OpenDevice \\\\.\\HCD9 ! 2", u"OpenDevice \\\\.\\HCD0 = #1", u"GetClassDevs 0x6 = #2",
                          u"DeviceControl #1 0x220424 in 6 out 6", u"EnumDeviceInfo #2 [3]",
                          u"GetDeviceRegistryProperty #2 0xB out 6 ! 13", u"GetParent 2", u"DriveType E:\\",
                          u"CloseDevice #1", u"CloseDevice #1 ! 6", u"CloseDevice 5 ! 6"));
  logging.Clear();
  EXPECT_TRUE(logging.Log().empty());
}

}  // namespace
}  // namespace platform::wrappers
