// Which volume is mounted where: the table of all volumes and the mount points of one.
//
// Used by one thread at a time. Failed calls leave out what they would have told; only
// std::bad_alloc is thrown. Roots, path names and volume names end with a backslash.
#pragma once

#include <string>
#include <unordered_map>
#include <vector>

#include "platform/host.h"

namespace KelvoUHW {

// All volumes with their path names (drive roots and folders).
struct VolumeTable {
  std::unordered_map<std::u16string, std::u16string> VolumeOfPath;
  std::vector<std::u16string> Paths;  // in the order in which they were told

  void Enter(const std::u16string& path, const std::u16string& volumeName);
};

// Volumes and folders are left at 200,000, and at 16 million characters, on a system that never
// ends its lists.
VolumeTable BuildVolumeTable(platform::VolumeManager& volumes);

// The roots of all drive letters, such as E:\.
std::vector<std::u16string> ReadDriveRoots(platform::VolumeManager& volumes);

// The mount points of volumes on removable drives. The system is asked at the first question, and
// all further answers come from memory: one object serves one pass and does not notice what changes
// afterwards.
class MountPointFinder {
 public:
  explicit MountPointFinder(platform::VolumeManager& volumes) noexcept : m_volumes(volumes) {}

  // Replaces `mountPoints` by the drive roots of the volume, then its other path names, each text
  // once. Volume names are compared ignoring case. What the system does not call removable is left
  // out, so the list of a volume on a fixed drive is empty.
  void FindMountPoints(const std::u16string& volumeName, std::vector<std::u16string>& mountPoints);

 private:
  void Fill();
  void EnterDriveRoots();
  void EnterPathNames(const VolumeTable& table);

  platform::VolumeManager& m_volumes;
  std::unordered_map<std::u16string, std::vector<std::u16string>> m_mountPoints;  // lower-cased key
  bool m_filled = false;
};

}  // namespace KelvoUHW
