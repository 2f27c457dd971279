#include <algorithm>
#include <optional>
#include <utility>

#include "platform/text.h"
#include "simulation/pc/state.h"

namespace platform::simulated {
namespace {

using Position = MachineIndex::Position;
constexpr Position kNoPosition = MachineIndex::kNone;

constexpr std::uint32_t kERROR_PATH_NOT_FOUND = 3;
constexpr std::uint32_t kERROR_DIR_NOT_ROOT = 144;
constexpr std::uint32_t kERROR_FILENAME_EXCED_RANGE = 206;

// Writes the text and its terminator, or nothing.
bool GiveText(std::u16string_view text, char16_t* buffer, std::uint32_t bufferChars) {
  if (buffer == nullptr || text.size() >= bufferChars) return false;
  text.copy(buffer, text.size());
  buffer[text.size()] = u'\0';
  return true;
}

Status GiveName(std::u16string_view name, char16_t* buffer, std::uint32_t bufferChars) {
  if (GiveText(name, buffer, bufferChars)) return Status::Success();
  return Status::Failure(kERROR_FILENAME_EXCED_RANGE);
}

// The text lowered, or none where the pointer is null or no backslash stands at the end: what names
// a volume or a place on it must not be mistaken for a device.
std::optional<Text> PlaceKey(const char16_t* path) {
  if (path == nullptr) return std::nullopt;
  Text key = ToLower(std::u16string_view(path));
  if (!key.ends_with(u'\\')) return std::nullopt;
  return key;
}

// The volume of a root, a mount folder, a volume name or the path of a volume's device interface;
// each with the backslash at the end.
Position VolumeAt(const IndexedMachine& now, const Text& key) {
  if (const Position byName = now.index.Volume(key); byName != kNoPosition) return byName;
  if (const Position byPath = now.index.VolumeByPath(key); byPath != kNoPosition) return byPath;
  const Position interface = now.index.Interface(key.substr(0, key.size() - 1));
  if (interface == kNoPosition) return kNoPosition;
  const Interface& entry = now.machine.interfaces[interface];
  if (entry.interfaceClass != GUID_DEVINTERFACE_VOLUME) return kNoPosition;
  return now.index.VolumeByDevice(ToLower(entry.device));
}

// Whether the place is on a drive that stands, as a folder may be that no volume is mounted in.
bool IsOnDrive(const MachineIndex& index, std::u16string_view key) {
  return key.size() >= 3 && IsDriveRoot(key.substr(0, 3)) && index.Drive(key[0]) != kNoPosition;
}

}  // namespace

Status SimulatedPc::FirstVolume(char16_t* name, std::uint32_t nameChars,
                                FindHandle& search) noexcept {
  search = kInvalidHandle;
  const std::lock_guard lock(m_state->mutex);
  VolumeSearch found;
  for (const Volume& volume : m_state->now->machine.volumes) found.names.push_back(volume.name);
  if (found.names.empty()) return Status::Failure(kERROR_NO_MORE_FILES);
  if (const Status given = GiveName(found.names.front(), name, nameChars); !given) return given;
  found.next = 1;
  search = m_state->handles.Open(std::move(found), Text());
  return Status::Success();
}

Status SimulatedPc::NextVolume(FindHandle search, char16_t* name,
                               std::uint32_t nameChars) noexcept {
  const std::lock_guard lock(m_state->mutex);
  auto* open = m_state->handles.Find<VolumeSearch>(search);
  if (open == nullptr) return Status::Failure(kERROR_INVALID_HANDLE);
  if (open->next >= open->names.size()) return Status::Failure(kERROR_NO_MORE_FILES);
  const Status given = GiveName(open->names[open->next], name, nameChars);
  if (given) ++open->next;
  return given;
}

Status SimulatedPc::CloseVolumeSearch(FindHandle search) noexcept {
  const std::lock_guard lock(m_state->mutex);
  return m_state->handles.Close<VolumeSearch>(search);
}

Status SimulatedPc::VolumePathNames(const char16_t* volumeName, char16_t* names,
                                    std::uint32_t namesChars, std::uint32_t& required) noexcept {
  const std::optional<Text> key = PlaceKey(volumeName);
  if (!key) return Status::Failure(kERROR_INVALID_NAME);
  const std::lock_guard lock(m_state->mutex);
  const Position volume = m_state->now->index.Volume(*key);
  if (volume == kNoPosition) return Status::Failure(kERROR_FILE_NOT_FOUND);
  Text list;
  for (const Text& path : m_state->now->machine.volumes[volume].paths) list += path + u'\0';
  list += u'\0';
  required = static_cast<std::uint32_t>(list.size());
  if (names == nullptr || namesChars < list.size()) return Status::Failure(kERROR_MORE_DATA);
  list.copy(names, list.size());
  return Status::Success();
}

Status SimulatedPc::VolumeNameForMountPoint(const char16_t* mountPoint, char16_t* name,
                                            std::uint32_t nameChars) noexcept {
  const std::optional<Text> key = PlaceKey(mountPoint);
  if (!key) return Status::Failure(kERROR_INVALID_NAME);
  const std::lock_guard lock(m_state->mutex);
  const Position volume = VolumeAt(*m_state->now, *key);
  if (volume == kNoPosition) return Status::Failure(kERROR_FILE_NOT_FOUND);
  return GiveName(m_state->now->machine.volumes[volume].name, name, nameChars);
}

std::uint32_t SimulatedPc::LogicalDriveStrings(std::uint32_t bufferChars,
                                               char16_t* buffer) noexcept {
  const std::lock_guard lock(m_state->mutex);
  Text list;
  for (char16_t letter = u'A'; letter <= u'Z'; ++letter) {
    if (m_state->now->index.Drive(letter) != kNoPosition) list += Text(1, letter) + u":\\" + u'\0';
  }
  const auto written = static_cast<std::uint32_t>(list.size());
  if (buffer == nullptr || bufferChars <= written) return written + 1;
  list.copy(buffer, written);
  buffer[written] = u'\0';
  return written;
}

std::uint32_t SimulatedPc::DriveType(const char16_t* path) noexcept {
  const std::optional<Text> key = PlaceKey(path);
  if (!key) return kDRIVE_NO_ROOT_DIR;
  const std::lock_guard lock(m_state->mutex);
  const IndexedMachine& now = *m_state->now;
  const auto typeOfDrive = [&now](char16_t letter) {
    return now.machine.drives[now.index.Drive(letter)].type;
  };
  if (IsDriveRoot(*key) && IsOnDrive(now.index, *key)) return typeOfDrive(key->front());
  if (const Position volume = VolumeAt(now, *key); volume != kNoPosition) {
    return now.machine.volumes[volume].driveType;
  }
  // A folder below: that of the volume in which it stands, the one with the longest path.
  Text above = *key;
  while (above.size() > 3) {
    above.pop_back();
    above.resize(above.rfind(u'\\') + 1);  // no backslash left: empty
    const Position volume = now.index.VolumeByPath(above);
    if (volume != kNoPosition && !IsDriveRoot(above)) return now.machine.volumes[volume].driveType;
  }
  if (IsOnDrive(now.index, above)) return typeOfDrive(above.front());
  return kDRIVE_NO_ROOT_DIR;
}

Status SimulatedPc::VolumeInformation(const char16_t* path, char16_t* label,
                                      std::uint32_t labelChars, std::uint32_t& serial,
                                      std::uint32_t& fileSystemFlags, char16_t* fileSystem,
                                      std::uint32_t fileSystemChars) noexcept {
  const std::optional<Text> key = PlaceKey(path);
  if (!key) return Status::Failure(kERROR_INVALID_NAME);
  const std::lock_guard lock(m_state->mutex);
  const IndexedMachine& now = *m_state->now;
  const Position position = VolumeAt(now, *key);
  if (position == kNoPosition) {
    if (!IsOnDrive(now.index, *key)) return Status::Failure(kERROR_PATH_NOT_FOUND);
    return Status::Failure(IsDriveRoot(*key) ? kERROR_NOT_READY : kERROR_DIR_NOT_ROOT);
  }
  const Volume& volume = now.machine.volumes[position];
  if (!volume.serial) return Status::Failure(kERROR_NOT_READY);
  const std::u16string_view kind = volume.reparsePoints ? u"NTFS" : u"FAT32";
  const bool labelFits = label == nullptr || GiveText(u"", label, labelChars);
  const bool kindFits = fileSystem == nullptr || GiveText(kind, fileSystem, fileSystemChars);
  if (!labelFits || !kindFits) return Status::Failure(kERROR_MORE_DATA);
  serial = *volume.serial;
  fileSystemFlags = volume.reparsePoints ? kFILE_SUPPORTS_REPARSE_POINTS : 0;
  return Status::Success();
}

Status SimulatedPc::FirstMountPoint(const char16_t* volumeName, char16_t* mountPoint,
                                    std::uint32_t mountPointChars, FindHandle& search) noexcept {
  search = kInvalidHandle;
  const std::optional<Text> key = PlaceKey(volumeName);
  if (!key) return Status::Failure(kERROR_INVALID_NAME);
  const std::lock_guard lock(m_state->mutex);
  const Position volume = m_state->now->index.Volume(*key);
  if (volume == kNoPosition) return Status::Failure(kERROR_FILE_NOT_FOUND);
  MountPointSearch found;
  for (const FolderMount& mount : m_state->now->machine.volumes[volume].folderMounts) {
    found.folders.push_back(mount.folder);
  }
  if (found.folders.empty()) return Status::Failure(kERROR_NO_MORE_FILES);
  if (const Status given = GiveName(found.folders.front(), mountPoint, mountPointChars); !given) {
    return given;
  }
  found.next = 1;
  search = m_state->handles.Open(std::move(found), volumeName);
  return Status::Success();
}

Status SimulatedPc::NextMountPoint(FindHandle search, char16_t* mountPoint,
                                   std::uint32_t mountPointChars) noexcept {
  const std::lock_guard lock(m_state->mutex);
  auto* open = m_state->handles.Find<MountPointSearch>(search);
  if (open == nullptr) return Status::Failure(kERROR_INVALID_HANDLE);
  if (open->next >= open->folders.size()) return Status::Failure(kERROR_NO_MORE_FILES);
  const Status given = GiveName(open->folders[open->next], mountPoint, mountPointChars);
  if (given) ++open->next;
  return given;
}

Status SimulatedPc::CloseMountPointSearch(FindHandle search) noexcept {
  const std::lock_guard lock(m_state->mutex);
  return m_state->handles.Close<MountPointSearch>(search);
}

Status SimulatedPc::DosDeviceTarget(const char16_t* name, char16_t* target,
                                    std::uint32_t targetChars) noexcept {
  if (name == nullptr) return Status::Failure(kERROR_INVALID_PARAMETER);
  const std::u16string_view asked(name);
  const std::lock_guard lock(m_state->mutex);
  const IndexedMachine& now = *m_state->now;
  const Position drive =
      asked.size() == 2 && asked[1] == u':' ? now.index.Drive(asked[0]) : kNoPosition;
  if (drive == kNoPosition || !now.machine.drives[drive].dosDevice) {
    return Status::Failure(kERROR_FILE_NOT_FOUND);
  }
  // One target and the empty text that ends the list.
  const Text list = *now.machine.drives[drive].dosDevice + u'\0';
  if (!GiveText(list, target, targetChars)) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  return Status::Success();
}

}  // namespace platform::simulated
