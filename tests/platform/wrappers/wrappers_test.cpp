// What stands between a component and its host: each operation once through all of them.
#include <gtest/gtest.h>

#include <cstring>
#include <fstream>

#include "platform/wrappers/counting_host.h"
#include "platform/wrappers/failing_host.h"
#include "platform/wrappers/logging_host.h"
#include "tests/simulation/stick_pc.h"

namespace platform::wrappers {
namespace {

using simulated::Error;
using Counts = std::pair<std::uint64_t, std::uint64_t>;

// Each operation in the order of their numbers, but for those that give something back, which come last. The errors
// of all, 0 for a success.
std::vector<std::uint32_t> AskEverything(Host& host) {
  FileHandle file = 7;
  DeviceSetHandle set = 7, volumes = 7, images = 7;
  FindHandle search = 7, mounts = 7;
  DevInst node = 1;
  SP_DEVINFO_DATA device{.cbSize = sizeof device};
  SP_DEVICE_INTERFACE_DATA entry{.cbSize = sizeof entry};
  Guid volumeClass = GUID_DEVINTERFACE_VOLUME;
  std::uint32_t number = 0, room = 600;
  std::int32_t index = 0;
  std::vector<char16_t> buffer(300);
  char16_t* const out = buffer.data();
  const auto detail = [&] {
    std::memcpy(out, &kInterfaceDetailSize, 4);
    return host.GetDeviceInterfaceDetail(volumes, entry, out, 600, &number, nullptr);
  };
  std::vector<std::uint32_t> errors = {
      Error(host.OpenDevice(u"\\\\.\\HCD0", 1, 2, file)),
      Error(host.DeviceControl(file, 0x220424, out, 1, out, 600, number)),
      Error(host.GetClassDevs(nullptr, 2, set)),
      Error(host.GetClassDevs(&volumeClass, 0x12, volumes)),
      Error(host.EnumDeviceInfo(set, 4, device)),
      Error(host.EnumDeviceInterfaces(volumes, volumeClass, 1, entry)),
      Error(detail()),
      Error(host.GetDeviceInstanceId(set, device, out, 300, &number)),
      Error(host.GetDeviceRegistryProperty(set, device, 12, &number, out, 600, &number)),
      Error(host.GetClassImageList(images)),
      Error(host.GetClassImageIndex(images, GUID_DEVCLASS_DISKDRIVE, index)),
      Error(host.GetClassDescription(GUID_DEVCLASS_DISKDRIVE, out, 299, &number)),
      Error(host.LocateRootDevNode(node)),
      Error(host.GetParent(2, node)),
      Error(host.GetChild(2, node)),
      Error(host.GetSibling(3, node)),
      Error(host.GetDeviceId(5, out, 200)),
      Error(host.GetDevNodeRegistryProperty(5, 13, &number, out, room)),
      Error(host.FirstVolume(out, 60, search)),
      Error(host.NextVolume(search, out, 61)),
      Error(host.VolumePathNames(simulated::kStickVolumeName, out, 62, number)),
      Error(host.VolumeNameForMountPoint(u"E:\\", out, 63)),
      host.LogicalDriveStrings(64, out) == 8 ? 0u : 1u,
      host.DriveType(u"E:\\") == kDRIVE_REMOVABLE ? 0u : 1u,
      Error(host.VolumeInformation(u"E:\\", out, 65, number, number, nullptr, 0)),
      Error(host.FirstMountPoint(u"\\\\?\\Volume{09931f21}\\", out, 66, mounts)),
      Error(host.NextMountPoint(mounts, out, 67)),
      Error(host.DosDeviceTarget(u"E:", out, 68)),
      Error(host.CloseDevice(file)),
      Error(host.DestroyDeviceInfoList(set)),
      Error(host.DestroyDeviceInfoList(volumes)),
      Error(host.DestroyClassImageList(images)),
      Error(host.CloseVolumeSearch(search)),
      Error(host.CloseMountPointSearch(mounts))};
  host.WriteDebugText(u"text");
  return errors;
}
constexpr std::size_t kAsked = 34, kNodes = 12, kVolumes = 18, kGivenBack = 28;  // where those calls begin

TEST(Wrappers, PassEveryCallOnCountItAndWriteItDown) {
  simulated::SimulatedPc pc(simulated::StickMachine());
  CountingHost counting(pc);
  LoggingHost logging(counting);
  std::vector<std::uint32_t> errors(kAsked, 0);
  errors[26] = kERROR_NO_MORE_FILES;
  EXPECT_EQ(AskEverything(logging), errors);
  EXPECT_EQ(pc.Open(), simulated::OpenCounts());
  EXPECT_EQ(pc.DebugText(), u"text");
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/platform/wrappers/calls.txt");
  std::vector<std::string> lines, log;
  for (std::string line; std::getline(file, line);) lines.push_back(line);
  for (const std::u16string& line : logging.Log()) log.push_back(ToUtf8(line));
  EXPECT_EQ(log, lines);
  EXPECT_EQ(counting.Total(), kAsked);
  for (std::size_t i = 0; i < kOperations; ++i) {
    const auto operation = static_cast<Operation>(i);
    const bool twice = operation == Operation::GetClassDevs || operation == Operation::DestroyDeviceInfoList;
    EXPECT_EQ(counting.Count(operation), twice ? 2u : 1u) << ToUtf8(NameOf(operation));
  }
  EXPECT_EQ(Counts(counting.CountOfCode(0x220424), counting.CountOfCode(0x12)), Counts(1, 0));
  logging.Clear();
  counting.Reset();
  EXPECT_EQ(logging.Log().size() + counting.Total() + counting.CountOfCode(0x220424), 0u);
}

TEST(Wrappers, FailWhatThePlanSays) {
  simulated::SimulatedPc pc(simulated::StickMachine());
  FailingHost host(pc);
  EXPECT_EQ(AskEverything(host), AskEverything(pc));
  EXPECT_EQ(Counts(host.Calls(), host.Failures()), Counts(kGivenBack, 0));
  // Whatever was asked for is not there, so what gives it back is refused by the PC.
  host.SetPlan({.call = 1, .onwards = true, .error = 5, .configurationManagerError = 9});
  std::vector<std::uint32_t> all(kAsked, 5);
  std::fill(all.begin() + kNodes, all.begin() + kVolumes, 9);
  all[22] = all[23] = 1;
  std::fill(all.begin() + kGivenBack, all.end(), kERROR_INVALID_HANDLE);
  EXPECT_EQ(AskEverything(host), all);
  EXPECT_EQ(host.Failures(), kGivenBack);
  EXPECT_EQ(pc.DebugText(), u"texttexttext");
  // The call, whether all behind it fail, the operation, the request; the calls counted and failed.
  const std::tuple<std::uint64_t, bool, std::optional<Operation>, std::optional<std::uint32_t>, int, int> kPlans[] = {
      {1, false, Operation::GetClassDevs, {}, 2, 1},
      {2, true, Operation::GetClassDevs, {}, 2, 1},
      {1, true, Operation::GetClassDevs, {}, 2, 2},
      {3, true, Operation::GetClassDevs, {}, 2, 0},
      {1, true, Operation::CloseDevice, {}, 0, 0},
      {1, true, {}, 0x220424, 1, 1},
      {1, true, {}, 12, 0, 0},
      {1, true, Operation::GetChild, 0x220424, 0, 0},
      {28, true, {}, {}, 28, 1},
      {29, false, {}, {}, 28, 0}};
  for (const auto& [call, onwards, operation, code, calls, failures] : kPlans) {
    host.SetPlan({.call = call, .onwards = onwards, .operation = operation, .code = code});
    AskEverything(host);
    EXPECT_EQ(Counts(host.Calls(), host.Failures()), Counts(calls, failures));
  }
}

}  // namespace
}  // namespace platform::wrappers
