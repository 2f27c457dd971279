// Volumes, drive letters and mount points.
#include "simulation/abi/state.h"

namespace abi_pc {
namespace {

constexpr DWORD kReparsePoints = 0x80;

// A place lowered. One without the backslash at the end is a device, and a breach.
std::u16string PlaceOf(const Call& call, const wchar_t* path) {
  const std::u16string place = Lowered(Units(path));
  call.Want(place.ends_with(u'\\'), "no backslash at the end");
  return place;
}

// The volume of its name, a root, a mount folder or its device interface's path.
const sim::Volume* VolumeAt(const Call& call, const std::u16string& place) {
  const auto& [machine, index] = call.Machine();
  if (!place.ends_with(u'\\')) return nullptr;
  Position found = index.Volume(place);
  if (found == kNone) found = index.VolumeByPath(place);
  if (found == kNone) {
    const Position entry = index.Interface(place.substr(0, place.size() - 1));
    constexpr GUID kVolumes = {
        0x53F5630D, 0xB6BF, 0x11D0, {0x94, 0xF2, 0x00, 0xA0, 0xC9, 0x1E, 0xFB, 0x8B}};
    if (entry != kNone && machine.interfaces[entry].interfaceClass == AsKey(kVolumes)) {
      found = index.VolumeByDevice(Lowered(machine.interfaces[entry].device));
    }
  }
  return found == kNone ? nullptr : &machine.volumes[found];
}

const sim::Drive* DriveOf(const Call& call, std::u16string_view place) {
  if (place.size() < 3 || !sim::IsDriveRoot(place.substr(0, 3))) return nullptr;
  const Position drive = call.Machine().index.Drive(place[0]);
  return drive == kNone ? nullptr : &call.Machine().machine.drives[drive];
}

HANDLE FirstOf(const Call& call, Search search, wchar_t* buffer, DWORD chars) {
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  const auto refuse = [&](DWORD code) { return call.Refuse(code), INVALID_HANDLE_VALUE; };
  if (call.Fails()) return refuse(ERROR_GEN_FAILURE);
  if (search.names.empty()) return refuse(ERROR_NO_MORE_FILES);
  if (!GiveText(search.names[search.next++], buffer, chars))
    return refuse(ERROR_FILENAME_EXCED_RANGE);
  return call.Opened(std::move(search));
}

BOOL NextOf(const Call& call, bool volumes, HANDLE handle, wchar_t* buffer, DWORD chars) {
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  Search* const search = call.Find<Search>(handle);
  if (search == nullptr || search->volumes != volumes)
    return call.Misused(ERROR_INVALID_HANDLE, "another search");
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  if (search->next == search->names.size()) return call.Refuse(ERROR_NO_MORE_FILES);
  if (!GiveText(search->names[search->next], buffer, chars))
    return call.Refuse(ERROR_FILENAME_EXCED_RANGE);
  ++search->next;
  return call.Done();
}

BOOL CloseOf(const Call& call, bool volumes, HANDLE handle) {
  const Search* const search = call.Find<Search>(handle);
  if (search == nullptr || search->volumes != volumes)
    return call.Misused(ERROR_INVALID_HANDLE, "another search");
  return call.Close<Search>(handle);
}

HANDLE WINAPI FirstVolume(LPWSTR buffer, DWORD chars) {
  const Call call("FindFirstVolumeW");
  Search search{true, {}};
  for (const sim::Volume& volume : call.Machine().machine.volumes)
    search.names.push_back(volume.name);
  return FirstOf(call, std::move(search), buffer, chars);
}
BOOL WINAPI NextVolume(HANDLE handle, LPWSTR buffer, DWORD chars) {
  return NextOf(Call("FindNextVolumeW"), true, handle, buffer, chars);
}
BOOL WINAPI CloseVolumes(HANDLE handle) { return CloseOf(Call("FindVolumeClose"), true, handle); }

HANDLE WINAPI FirstMountPoint(LPCWSTR name, LPWSTR buffer, DWORD chars) {
  const Call call("FindFirstVolumeMountPointW");
  const Position volume = call.Machine().index.Volume(PlaceOf(call, name));
  if (volume == kNone) return call.Refuse(ERROR_FILE_NOT_FOUND), INVALID_HANDLE_VALUE;
  Search search{false, {}};
  for (const auto& mount : call.Machine().machine.volumes[volume].folderMounts)
    search.names.push_back(mount.folder);
  return FirstOf(call, std::move(search), buffer, chars);
}
BOOL WINAPI NextMountPoint(HANDLE handle, LPWSTR buffer, DWORD chars) {
  return NextOf(Call("FindNextVolumeMountPointW"), false, handle, buffer, chars);
}
BOOL WINAPI CloseMountPoints(HANDLE handle) {
  return CloseOf(Call("FindVolumeMountPointClose"), false, handle);
}

BOOL WINAPI PathNames(LPCWSTR name, LPWCH buffer, DWORD chars, PDWORD required) {
  const Call call("GetVolumePathNamesForVolumeNameW");
  Spoil(required);
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  const Position volume = call.Machine().index.Volume(PlaceOf(call, name));
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  if (volume == kNone) return call.Refuse(ERROR_FILE_NOT_FOUND);
  std::u16string list;
  for (const std::u16string& path : call.Machine().machine.volumes[volume].paths)
    list += path + u'\0';
  *required = static_cast<DWORD>(list.size() + 1);
  return GiveText(list, buffer, chars) ? call.Done() : call.Refuse(ERROR_MORE_DATA);
}

BOOL WINAPI NameOf(LPCWSTR place, LPWSTR buffer, DWORD chars) {
  const Call call("GetVolumeNameForVolumeMountPointW");
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  const sim::Volume* const volume = VolumeAt(call, PlaceOf(call, place));
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  if (volume == nullptr) return call.Refuse(ERROR_FILE_NOT_FOUND);
  // The documentation's "reasonable size" is 50 characters.
  return GiveText(volume->name, buffer, chars) ? call.Done()
                                               : call.Refuse(ERROR_FILENAME_EXCED_RANGE);
}

DWORD WINAPI DriveStrings(DWORD chars, LPWSTR buffer) {
  const Call call("GetLogicalDriveStringsW");
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE), 0;
  std::u16string list;
  for (char16_t letter = u'A'; letter <= u'Z'; ++letter) {
    if (call.Machine().index.Drive(letter) != kNone)
      list += std::u16string(1, letter) + u":\\" + u'\0';
  }
  call.Done();
  // Without the last zero where it fits, with it where it does not.
  return static_cast<DWORD>(GiveText(list, buffer, chars) ? list.size() : list.size() + 1);
}

UINT WINAPI DriveType(LPCWSTR path) {
  const Call call("GetDriveTypeW");
  const std::u16string place = PlaceOf(call, path);
  call.Done();
  if (call.Fails()) return DRIVE_UNKNOWN;
  if (place.size() == 3) {
    if (const sim::Drive* const drive = DriveOf(call, place)) return drive->type;
  }
  if (const sim::Volume* const volume = VolumeAt(call, place)) return volume->driveType;
  // A folder: of the volume in which it stands.
  for (std::u16string above = place; above.size() > 3;) {
    above.pop_back();
    above.resize(above.rfind(u'\\') + 1);
    const Position volume = call.Machine().index.VolumeByPath(above);
    if (volume != kNone && above.size() > 3)
      return call.Machine().machine.volumes[volume].driveType;
    if (const sim::Drive* const drive = above.size() == 3 ? DriveOf(call, above) : nullptr)
      return drive->type;
  }
  return DRIVE_NO_ROOT_DIR;
}

BOOL WINAPI Information(LPCWSTR path, LPWSTR label, DWORD labelChars, LPDWORD serial,
                        LPDWORD longest, LPDWORD flags, LPWSTR kind, DWORD kindChars) {
  const Call call("GetVolumeInformationW");
  Spoil(serial, longest, flags);
  call.SpoilBytes(label, labelChars * sizeof(wchar_t));
  call.SpoilBytes(kind, kindChars * sizeof(wchar_t));
  // The component asks with the path of a volume's device interface as it is. That is published,
  // and deliberate: the serial number stays unknown.
  const std::u16string place = Lowered(Units(path));
  if (!place.ends_with(u'\\')) {
    call.Want(place.starts_with(u"\\\\?\\"), "no backslash at the end");
    return call.Refuse(ERROR_INVALID_NAME);
  }
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  const sim::Volume* const volume = VolumeAt(call, place);
  if (volume == nullptr) {
    return call.Refuse(DriveOf(call, place) == nullptr ? ERROR_PATH_NOT_FOUND
                       : place.size() == 3             ? ERROR_NOT_READY
                                                       : ERROR_DIR_NOT_ROOT);
  }
  if (!volume->serial) return call.Refuse(ERROR_NOT_READY);
  if ((label != nullptr && !GiveText(u"", label, labelChars)) ||
      (kind != nullptr && !GiveText(volume->reparsePoints ? u"NTFS" : u"FAT32", kind, kindChars))) {
    return call.Refuse(ERROR_MORE_DATA);
  }
  if (serial != nullptr) *serial = *volume->serial;
  if (longest != nullptr) *longest = 255;
  if (flags != nullptr) *flags = volume->reparsePoints ? kReparsePoints : 0;
  return call.Done();
}

DWORD WINAPI DosDevice(LPCWSTR name, LPWSTR buffer, DWORD chars) {
  const Call call("QueryDosDeviceW");
  call.SpoilBytes(buffer, chars * sizeof(wchar_t));
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE), 0;
  std::u16string place = Units(name);
  call.Want(place.size() == 2, "not a drive's name");
  const sim::Drive* const drive = DriveOf(call, place + u"\\");
  if (drive == nullptr || !drive->dosDevice) return call.Refuse(ERROR_FILE_NOT_FOUND), 0;
  const std::u16string list = *drive->dosDevice + u'\0';
  if (!GiveText(list, buffer, chars)) return call.Refuse(ERROR_INSUFFICIENT_BUFFER), 0;
  call.Done();
  return static_cast<DWORD>(list.size() + 1);
}

}  // namespace

Functions VolumeFunctions() {
  return {{"FindFirstVolumeW", Address(FirstVolume)},
          {"FindNextVolumeW", Address(NextVolume)},
          {"FindVolumeClose", Address(CloseVolumes)},
          {"FindFirstVolumeMountPointW", Address(FirstMountPoint)},
          {"FindNextVolumeMountPointW", Address(NextMountPoint)},
          {"FindVolumeMountPointClose", Address(CloseMountPoints)},
          {"GetVolumePathNamesForVolumeNameW", Address(PathNames)},
          {"GetVolumeNameForVolumeMountPointW", Address(NameOf)},
          {"GetLogicalDriveStringsW", Address(DriveStrings)},
          {"GetDriveTypeW", Address(DriveType)},
          {"GetVolumeInformationW", Address(Information)},
          {"QueryDosDeviceW", Address(DosDevice)}};
}

}  // namespace abi_pc
