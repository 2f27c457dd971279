#include "simulation/machine/steps.h"

#include <algorithm>
#include <optional>
#include <utility>

#include "platform/text.h"
#include "simulation/machine/machine_index.h"

namespace platform::simulated {
namespace {

Volume* FindVolume(Machine& machine, const Text& name) {
  for (Volume& volume : machine.volumes) {
    if (EqualIgnoringCase(volume.name, name)) return &volume;
  }
  return nullptr;
}

// The volume in which a folder stands and the rest of the folder's path, or null.
std::pair<Volume*, Text> FindAround(Machine& machine, const Text& folder) {
  std::pair<Volume*, Text> around{nullptr, {}};
  std::size_t longest = 0;
  for (Volume& volume : machine.volumes) {
    for (const Text& path : volume.paths) {
      if (path.size() >= folder.size() || path.size() <= longest) continue;
      if (!EqualIgnoringCase(path, folder.substr(0, path.size()))) continue;
      longest = path.size();
      around = {&volume, folder.substr(path.size())};
    }
  }
  return around;
}

bool HasLetter(const Drive& drive, const Text& root) {
  return ToLower(drive.letter) == ToLower(root[0]);
}

// The drive letter that a volume gets of its own: its device stands behind it.
Drive DriveOf(const Machine& machine, const Volume& volume, const Text& root) {
  Drive drive{ToUpper(root[0]), volume.driveType, std::nullopt, volume.device};
  for (const Device& device : machine.devices) {
    if (EqualIgnoringCase(device.id, volume.device)) drive.dosDevice = device.physicalName;
  }
  return drive;
}

}  // namespace

Text CarryOut(Machine& machine, const Mount& mount) {
  Volume* volume = FindVolume(machine, mount.volume);
  if (volume == nullptr) return u"volume " + mount.volume + u" is missing";
  const Text& path = mount.path;
  if (path.size() < 3 || !IsDriveRoot(path.substr(0, 3)) || !path.ends_with(u'\\')) {
    return u"path " + path + u" is neither a drive's root nor a folder that ends with \\";
  }
  for (const Volume& other : machine.volumes) {
    for (const Text& taken : other.paths) {
      if (EqualIgnoringCase(taken, path)) return u"path " + path + u" is taken";
    }
  }
  if (IsDriveRoot(path)) {
    const bool there = std::any_of(machine.drives.begin(), machine.drives.end(),
                                   [&](const Drive& drive) { return HasLetter(drive, path); });
    if (!there) machine.drives.push_back(DriveOf(machine, *volume, path));
  } else if (const auto [around, folder] = FindAround(machine, path); around != nullptr) {
    around->folderMounts.push_back({folder, volume->name});
  }
  volume->paths.push_back(path);
  return {};
}

// A letter that only leads to the volume goes with its path; one that belongs to a disk stays, as
// that of a card reader's empty slot.
Text CarryOut(Machine& machine, const Dismount& dismount) {
  Volume* volume = FindVolume(machine, dismount.volume);
  if (volume == nullptr) return u"volume " + dismount.volume + u" is missing";
  const auto removed = std::erase_if(
      volume->paths, [&](const Text& path) { return EqualIgnoringCase(path, dismount.path); });
  if (removed == 0) return u"volume " + dismount.volume + u" has no path " + dismount.path;
  if (IsDriveRoot(dismount.path)) {
    std::erase_if(machine.drives, [&](const Drive& drive) {
      return HasLetter(drive, dismount.path) && !drive.device.empty() &&
             EqualIgnoringCase(drive.device, volume->device);
    });
  } else if (const auto around = FindAround(machine, dismount.path); around.first != nullptr) {
    std::erase_if(around.first->folderMounts, [&](const FolderMount& mount) {
      return EqualIgnoringCase(mount.folder, around.second) &&
             EqualIgnoringCase(mount.volume, volume->name);
    });
  }
  return {};
}

}  // namespace platform::simulated
