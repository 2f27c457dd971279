// Names of hubs and driver keys, volume lists and mount points, from a system that answers with the
// bytes of the input: what is read stays within what was received, and every list ends.
#include <algorithm>
#include <vector>

#include "devinfo/disk_letters.h"
#include "devinfo/property_reader.h"
#include "devinfo/volume_table.h"
#include "fuzz/lying_host.h"
#include "records/device_set.h"
#include "records/devnode.h"
#include "simulation/machine/built_in_machine.h"
#include "simulation/machine/machine_file.h"
#include "simulation/pc/simulated_pc.h"
#include "tree/hub_queries.h"

namespace {

using namespace KelvoUHW;
using fuzz::Require;
using platform::simulated::SimulatedPc;

const platform::simulated::Machine& BuiltIn() {
  static const auto machine = platform::simulated::ParseMachine(
      platform::simulated::BuiltInMachine(), platform::simulated::kBuiltInMachineName);
  return machine;
}

void CheckName(const std::u16string& name) {
  Require(name.size() <= 1U << 16 && name.find(u'\0') == name.npos, "a name");
}

void AskForNames(platform::Host& host) {
  DeviceFile controller(host);
  if (!controller.Open(u"\\\\.\\HCD0", platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE))
    return;
  CheckName(GetHcdDriverKeyName(host, controller.Get()));
  const std::u16string root = GetRootHubName(host, controller.Get());
  CheckName(root);
  DeviceFile hub(host);
  if (!hub.Open(u"\\\\.\\" + root, platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE)) return;
  for (std::uint32_t port = 1; port <= 4; ++port) {
    CheckName(GetConnectionName(host, hub.Get(), port));
    CheckName(GetConnectionDriverKeyName(host, hub.Get(), port));
  }
}

void AskForVolumes(platform::Host& host) {
  const VolumeTable table = BuildVolumeTable(host);
  for (const std::u16string& path : table.Paths) {
    Require(!path.empty() && table.VolumeOfPath.contains(path), "every path has its volume");
  }
  MountPointFinder finder(host);
  for (const auto& [path, volume] : table.VolumeOfPath) {
    std::vector<std::u16string> mountPoints;
    finder.FindMountPoints(volume, mountPoints);
    Require(std::ranges::count(mountPoints, path) <= 26 + 1, "each text once, or a drive root");
  }
  CZKUMInterfaceDeviceImpl disk;
  std::vector<std::u16string> roots;
  DiskLetterFinder(host).FindDriveLettersForDisk(disk, roots);
  Require(roots.size() <= 26, "letters");
}

void AskForNodes(platform::Host& host) {
  DriverKeyIndex index(host);
  for (const char16_t* key : {u"{36fc9e60-c465-11cf-8056-444553540000}\\0001", u"", u"none"}) {
    index.Find(key);
    FindDevNodeByDriverKey(host, key);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  SimulatedPc pc(BuiltIn());
  fuzz::LyingHost host(pc, input, [](std::uint8_t) {});
  const std::uint8_t what = input.Byte();
  if (what % 4 == 0) AskForNames(host);
  if (what % 4 == 1 || what % 4 == 2) AskForVolumes(host);
  if (what % 4 == 3) AskForNodes(host);
  Require(pc.Open() == platform::simulated::OpenCounts{} && pc.Misuses().empty(), "closed once");
  return 0;
}
