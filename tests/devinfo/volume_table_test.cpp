// Volumes, their path names and mount points, from systems that answer, refuse or answer strangely.
#include "devinfo/volume_table.h"

#include <gtest/gtest.h>

#include <algorithm>

#include "platform/wrappers/counting_host.h"
#include "platform/wrappers/failing_host.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/devinfo/storage_machine.h"

namespace KelvoUHW {
namespace {

using platform::Status, platform::simulated::SimulatedPc;
using namespace std::string_view_literals;

// Wants `more` characters for path names than it is given (above 1: always that many), and has any
// drives.
struct GreedyVolumes final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  Status VolumePathNames(const char16_t*, char16_t*, std::uint32_t chars, std::uint32_t& required) noexcept override {
    ++calls;
    required = more > 1 ? more : chars + more;
    return Status::Failure(platform::kERROR_MORE_DATA);
  }
  std::uint32_t LogicalDriveStrings(std::uint32_t chars, char16_t* buffer) noexcept override {
    if (drives.empty()) return InterceptingHost::LogicalDriveStrings(chars, buffer);
    const auto length = static_cast<std::uint32_t>(drives.size());
    if (length >= chars) return length + 1;
    drives.copy(buffer, length);
    return length;
  }
  std::uint32_t more = 0;
  std::u16string drives;
  int calls = 0;
  Status BeforeCall(const platform::wrappers::HostCall&) noexcept override { return {}; }
};

// C: is fixed and has volume 1, E: is a stick with volume 2, also in a folder. Volume 3 is
// removable and mounted in folders of C: only, volume 4 likewise but fixed.
Machine SomePc() {
  Machine machine = EmptyPc();
  AddDrive(machine, u'C', 1, platform::kDRIVE_FIXED);
  AddDrive(machine, u'E', 2);
  AddVolume(machine, 1, {u"C:\\"}, platform::kDRIVE_FIXED);
  AddVolume(machine, 2, {u"C:\\Stick\\", u"E:\\"});
  AddVolume(machine, 3, {u"C:\\B\\", u"C:\\A\\"});
  AddVolume(machine, 4, {u"C:\\Fixed\\"}, platform::kDRIVE_FIXED);
  return machine;
}

Texts MountPointsOf(platform::VolumeManager& volumes, const std::u16string& volumeName) {
  Texts mountPoints = {u"from before"};
  MountPointFinder(volumes).FindMountPoints(volumeName, mountPoints);
  return mountPoints;
}

// Drive roots come before other path names, each text once.
TEST(VolumeTable, MountPointsOfRemovableDrivesOnly) {
  SimulatedPc pc(SomePc());
  const VolumeTable table = BuildVolumeTable(pc);
  EXPECT_EQ(table.Paths, (Texts{u"C:\\", u"C:\\Stick\\", u"E:\\", u"C:\\B\\", u"C:\\A\\", u"C:\\Fixed\\"}));
  EXPECT_EQ(table.VolumeOfPath.at(u"C:\\B\\"), u"\\\\?\\Volume{3}\\");
  for (const auto name : {u"\\\\?\\Volume{2}\\", u"\\\\?\\VOLUME{2}\\"})
    EXPECT_EQ(MountPointsOf(pc, name), (Texts{u"E:\\", u"C:\\Stick\\"}));
  EXPECT_EQ(MountPointsOf(pc, u"\\\\?\\Volume{3}\\"), (Texts{u"C:\\B\\", u"C:\\A\\"}));
  for (const auto name : {u"\\\\?\\Volume{1}\\", u"\\\\?\\Volume{4}\\", u"\\\\?\\Volume{2}"})
    EXPECT_EQ(MountPointsOf(pc, name), Texts{});
  EXPECT_EQ(pc.Open(), platform::simulated::OpenCounts{});
}

// Without path names only folders of fixed volumes with reparse points are found. All folders but
// Lost\ lead to volume 9.
TEST(VolumeTable, TheOlderWay) {
  struct Case {
    Texts folders, expected;
    std::uint32_t type = platform::kDRIVE_FIXED;
    bool letter = true, reparsePoints = true, information = true;
  };
  std::vector<Case> cases = {{{u"Here\\", u"There\\"}, {u"C:\\Here\\", u"C:\\There\\"}},
                             {{u"Here\\"}, {u"\\\\?\\Volume{1}\\Here\\"}, 3, false},
                             // A folder that is unknown, or has a long name, ends the search.
                             {{u"Here\\", u"Lost\\", u"There\\"}, {u"C:\\Here\\"}},
                             {{u"Here\\", std::u16string(260, u'x'), u"There\\"}, {u"C:\\Here\\"}},
                             {{u"Here\\"}, {}, 3, true, false},
                             {{u"Here\\"}, {}, 3, true, true, false}};
  for (const std::uint32_t type : {0u, 1u, 2u, 4u, 5u, 6u}) cases.push_back({{u"Here\\"}, {}, type});
  for (const Case& c : cases) {
    SCOPED_TRACE(&c - cases.data());
    Machine machine = EmptyPc();
    AddDrive(machine, u'C', 1, c.type);
    auto& holder = AddVolume(machine, 1, c.letter ? Texts{u"C:\\"} : Texts{}, c.type);
    holder.reparsePoints = c.reparsePoints;
    if (c.information) holder.serial = 1;
    for (const auto& folder : c.folders) holder.folderMounts.push_back({folder, u""});
    AddVolume(machine, 9, {u"C:\\Here\\", u"C:\\There\\", u"\\\\?\\Volume{1}\\Here\\"});
    SimulatedPc pc(machine);
    constexpr auto kFails = platform::wrappers::Operation::VolumePathNames;
    platform::wrappers::FailingHost host(pc, {.call = 1, .onwards = true, .error = 1, .operation = kFails});
    const VolumeTable table = BuildVolumeTable(host);
    EXPECT_EQ(table.Paths, c.expected);
    for (const auto& path : c.expected) EXPECT_EQ(table.VolumeOfPath.at(path), u"\\\\?\\Volume{9}\\");
    EXPECT_EQ(pc.Open(), platform::simulated::OpenCounts{});
  }
}

// Which letter each volume has is asked for once, however many have folders.
TEST(VolumeTable, TheOlderWayReadsTheLettersOnce) {
  Machine machine = EmptyPc();
  for (const unsigned number : {1u, 2u}) {
    AddDrive(machine, static_cast<char16_t>(u'B' + number), number, platform::kDRIVE_FIXED);
    auto& holder = AddVolume(machine, number, {number == 1 ? u"C:\\" : u"D:\\"}, platform::kDRIVE_FIXED);
    holder.reparsePoints = true;
    holder.serial = 1;
    holder.folderMounts.push_back({u"Here\\", u""});
  }
  AddVolume(machine, 9, {u"C:\\Here\\", u"D:\\Here\\"});
  SimulatedPc pc(machine);
  platform::wrappers::CountingHost counting(pc);
  platform::wrappers::FailingHost host(
      counting, {.call = 1, .onwards = true, .error = 1, .operation = platform::wrappers::Operation::VolumePathNames});
  EXPECT_EQ(BuildVolumeTable(host).Paths, (Texts{u"C:\\Here\\", u"D:\\Here\\"}));
  EXPECT_EQ(counting.Count(platform::wrappers::Operation::LogicalDriveStrings), 1u);
}

// A list that does not fit is asked for again, and a system that never has enough is left after a
// few calls; the stick's root is still found.
TEST(VolumeTable, ListsThatDoNotFit) {
  Machine machine = SomePc();
  Texts longPaths(100);
  for (unsigned i = 0; i < 100; ++i) longPaths[i] = Numbered(u"C:\\", i) + std::u16string(200, u'x') + u"\\";
  AddVolume(machine, 6, longPaths);
  SimulatedPc pc(machine);
  EXPECT_EQ(MountPointsOf(pc, u"\\\\?\\Volume{6}\\"), longPaths);
  // What is wanted, and the calls for five volumes; with a buffer that has grown to it one does for each.
  for (const auto& [more, calls] : {std::pair{0u, 5}, {1, 5 * 8}, {1U << 20, 6}, {(1U << 20) + 1, 5}, {~0U, 5}}) {
    GreedyVolumes greedy(pc);
    greedy.more = more;
    EXPECT_EQ(MountPointsOf(greedy, u"\\\\?\\Volume{2}\\"), Texts{u"E:\\"});
    EXPECT_EQ(greedy.calls, calls) << more;
  }
  GreedyVolumes greedy(pc);
  for (const std::size_t count : {90u, 8'000u, 10'000u}) {
    greedy.drives.clear();
    for (std::size_t i = 0; i < count; ++i) greedy.drives += std::u16string(u"E:\\\0", 4);
    EXPECT_EQ(ReadDriveRoots(greedy), Texts(count > 8'000 ? 0 : count, u"E:\\"));
  }
  for (const std::u16string_view unended : {u"E:\\\0F:\\"sv, u"E:\\\0\0F:\\\0"sv}) {
    greedy.drives = unended;
    EXPECT_EQ(ReadDriveRoots(greedy), Texts{u"E:\\"});
  }
}

// Has another volume after each, or another folder, or path names without end.
struct EndlessVolumes final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  enum Kind { kVolumes, kFolders, kNames, kLongNames, kUnended } kind = kVolumes;
  int calls = 0;
  Status BeforeCall(const platform::wrappers::HostCall&) noexcept override { return {}; }
  Status FirstVolume(char16_t* name, std::uint32_t chars, platform::FindHandle& search) noexcept override {
    return search = 1, NextVolume(search, name, chars);
  }
  Status NextVolume(platform::FindHandle, char16_t* name, std::uint32_t chars) noexcept override {
    if (++calls > 1 && kind == kFolders) return Status::Failure(18);
    if (kind == kUnended) std::fill_n(name, chars, u'V');
    return name[0] = u'V', Status::Success();
  }
  Status CloseVolumeSearch(platform::FindHandle) noexcept override { return Status::Success(); }
  Status VolumePathNames(const char16_t*, char16_t* names, std::uint32_t chars,
                         std::uint32_t& required) noexcept override {
    if (kind == kFolders) return Status::Failure(1);
    required = kind == kNames ? 1U << 20 : chars;
    if (required > chars) return Status::Failure(platform::kERROR_MORE_DATA);
    std::fill_n(names, required, u'\0');
    std::fill_n(names, required - 4, u'x');
    for (std::uint32_t i = 3; kind != kLongNames && i < required; i += 4) names[i] = u'\0';
    return Status::Success();
  }
  std::uint32_t DriveType(const char16_t*) noexcept override { return platform::kDRIVE_FIXED; }
  Status VolumeInformation(const char16_t*, char16_t*, std::uint32_t, std::uint32_t&, std::uint32_t& flags, char16_t*,
                           std::uint32_t) noexcept override {
    return flags = platform::kFILE_SUPPORTS_REPARSE_POINTS, Status::Success();
  }
  Status FirstMountPoint(const char16_t*, char16_t* folder, std::uint32_t chars,
                         platform::FindHandle& search) noexcept override {
    return search = 1, NextMountPoint(search, folder, chars);
  }
  Status NextMountPoint(platform::FindHandle, char16_t* folder, std::uint32_t) noexcept override {
    return ++calls, folder[0] = u'F', Status::Success();
  }
  Status CloseMountPointSearch(platform::FindHandle) noexcept override { return Status::Success(); }
  Status VolumeNameForMountPoint(const char16_t*, char16_t* name, std::uint32_t) noexcept override {
    return name[0] = u'V', Status::Success();
  }
};

TEST(VolumeTable, ListsWithoutEndAreLeft) {
  SimulatedPc pc(EmptyPc());
  for (const auto kind : {EndlessVolumes::kVolumes, EndlessVolumes::kFolders, EndlessVolumes::kNames}) {
    EndlessVolumes endless(pc);
    endless.kind = kind;
    const VolumeTable table = BuildVolumeTable(endless);
    EXPECT_LE(endless.calls, 200'002) << kind;
    EXPECT_LE(table.Paths.size(), 200'000u);
    EXPECT_GT(table.Paths.size(), 100'000u);
  }
  // A name without its zero ends the list at once, and names of 7796 characters end it when there are 16 Mi of them.
  for (const auto& [kind, volumes] : {std::pair{EndlessVolumes::kUnended, 0u}, {EndlessVolumes::kLongNames, 2151}}) {
    EndlessVolumes endless(pc);
    endless.kind = kind;
    EXPECT_EQ(BuildVolumeTable(endless).Paths.size(), volumes);
    EXPECT_LE(endless.calls, static_cast<int>(volumes) + 2);
  }
}

}  // namespace
}  // namespace KelvoUHW
