#include "devinfo/volume_table.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>

#include "platform/setup_api.h"
#include "platform/text.h"
#include "records/device_set.h"
#include "records/received_text.h"

namespace KelvoUHW {
namespace {

using platform::Status;

constexpr std::uint32_t kNameChars = 260;
using VolumeNameBuffer = std::array<char16_t, kNameChars>;

constexpr std::uint32_t kPathNamesChars = 7800;
// Bounds for a system that never stops asking for more: characters of a list, and calls for it.
constexpr std::uint32_t kPathNamesCharsLimit = 1U << 20;
constexpr int kPathNamesCallsLimit = 8;
constexpr std::uint32_t kDriveStringsCharsLimit = 1U << 16;
// Of all lists together. A table is filled with a lock held that the whole process waits for.
constexpr std::size_t kTableCharsLimit = std::size_t{1} << 24;

// Texts one behind the other; an empty one or one without its zero ends the list.
std::vector<std::u16string> SplitTexts(std::span<const char16_t> buffer) {
  std::vector<std::u16string> texts;
  std::u16string_view rest(buffer.data(), buffer.size());
  for (;;) {
    const std::u16string_view text = platform::UpToZero(rest);
    if (text.empty() || text.size() == rest.size()) return texts;
    texts.emplace_back(text);
    rest.remove_prefix(text.size() + 1);
  }
}

std::optional<std::u16string> VolumeNameOf(platform::VolumeManager& volumes,
                                           const std::u16string& mountPoint) {
  VolumeNameBuffer name{};
  if (!volumes.VolumeNameForMountPoint(mountPoint.c_str(), name.data(), kNameChars)) return {};
  return ReceivedText(name);
}

class VolumeTableBuilder {
 public:
  explicit VolumeTableBuilder(platform::VolumeManager& volumes) : m_volumes(volumes) {}

  VolumeTable Build() {
    VolumeNameBuffer name{};
    VolumeSearch search(m_volumes);
    for (Status found = search.First(name.data(), kNameChars); found && TakeStep();
         found = search.Next(name.data(), kNameChars)) {
      const auto text = ReceivedText(name);
      if (!text) break;
      EnterVolume(*text);
      name.fill(u'\0');
    }
    return std::move(m_table);
  }

 private:
  // A volume or a path more: those of a system that always has another are left at kMostElements.
  bool TakeStep() noexcept { return m_steps++ < kMostElements && m_chars < kTableCharsLimit; }

  bool Enter(const std::u16string& path, const std::u16string& volumeName) {
    m_chars += path.size() + volumeName.size();
    if (!TakeStep()) return false;
    m_table.Enter(path, volumeName);
    return true;
  }

  void EnterVolume(const std::u16string& volumeName) {
    if (const auto paths = ReadPathNames(volumeName)) {
      for (const std::u16string& path : *paths) {
        if (!Enter(path, volumeName)) return;
      }
    } else {
      EnterFolders(volumeName);
    }
  }

  std::optional<std::vector<std::u16string>> ReadPathNames(const std::u16string& volumeName) {
    for (int call = 0; call < kPathNamesCallsLimit; ++call) {
      const auto size = static_cast<std::uint32_t>(m_pathNames.size());
      std::uint32_t required = 0;
      const Status status =
          m_volumes.VolumePathNames(volumeName.c_str(), m_pathNames.data(), size, required);
      if (status) return SplitTexts(std::span(m_pathNames).first(std::min(required, size)));
      if (status.error != platform::kERROR_MORE_DATA || required <= size ||
          required > kPathNamesCharsLimit) {
        return {};
      }
      m_pathNames.resize(required);
    }
    return {};
  }

  // The older way, for a system that does not tell path names: the folders of this volume in which
  // others are mounted. Only fixed drives have such folders.
  void EnterFolders(const std::u16string& volumeName) {
    if (m_volumes.DriveType(volumeName.c_str()) != platform::kDRIVE_FIXED) return;
    if (!SupportsReparsePoints(volumeName)) return;

    const std::u16string root = RootOf(volumeName);
    VolumeNameBuffer folder{};
    MountPointSearch search(m_volumes);
    for (Status found = search.First(volumeName, folder.data(), kNameChars); found;
         found = search.Next(folder.data(), kNameChars)) {
      const auto text = ReceivedText(folder);
      if (!text) return;
      const std::u16string path = root + *text;
      const auto mounted = VolumeNameOf(m_volumes, path);
      // Deliberate: a folder whose volume is not known ends the search of this volume.
      if (!mounted) return;
      if (!Enter(path, *mounted)) return;
      folder.fill(u'\0');
    }
  }

  bool SupportsReparsePoints(const std::u16string& volumeName) {
    std::uint32_t serialNumber = 0;
    std::uint32_t flags = 0;
    return m_volumes.VolumeInformation(volumeName.c_str(), nullptr, 0, serialNumber, flags, nullptr,
                                       0) &&
           (flags & platform::kFILE_SUPPORTS_REPARSE_POINTS) != 0;
  }

  // What a path into the volume starts with: its drive root, or its name where it has no letter.
  std::u16string RootOf(const std::u16string& volumeName) {
    if (!m_rootsRead) {
      m_rootsRead = true;
      for (const std::u16string& root : ReadDriveRoots(m_volumes)) {
        if (const auto name = VolumeNameOf(m_volumes, root)) {
          m_rootOfVolume.emplace(platform::ToLower(*name), root);
        }
      }
    }
    const auto found = m_rootOfVolume.find(platform::ToLower(volumeName));
    return found != m_rootOfVolume.end() ? found->second : volumeName;
  }

  platform::VolumeManager& m_volumes;
  VolumeTable m_table;
  std::vector<char16_t> m_pathNames = std::vector<char16_t>(kPathNamesChars);
  std::unordered_map<std::u16string, std::u16string> m_rootOfVolume;  // lower-cased key
  bool m_rootsRead = false;
  std::uint32_t m_steps = 0;
  std::size_t m_chars = 0;
};

}  // namespace

void VolumeTable::Enter(const std::u16string& path, const std::u16string& volumeName) {
  VolumeOfPath.insert_or_assign(path, volumeName);
  Paths.push_back(path);
}

VolumeTable BuildVolumeTable(platform::VolumeManager& volumes) {
  return VolumeTableBuilder(volumes).Build();
}

std::vector<std::u16string> ReadDriveRoots(platform::VolumeManager& volumes) {
  std::vector<char16_t> buffer(kNameChars);
  while (buffer.size() <= kDriveStringsCharsLimit) {
    const auto size = static_cast<std::uint32_t>(buffer.size());
    const std::uint32_t written = volumes.LogicalDriveStrings(size, buffer.data());
    if (written < size) return SplitTexts(std::span(buffer).first(written));
    buffer.resize(buffer.size() * 2);
  }
  return {};
}

void MountPointFinder::FindMountPoints(const std::u16string& volumeName,
                                       std::vector<std::u16string>& mountPoints) {
  if (!m_filled) Fill();
  mountPoints.clear();
  const auto found = m_mountPoints.find(platform::ToLower(volumeName));
  if (found != m_mountPoints.end()) mountPoints = found->second;
}

void MountPointFinder::Fill() {
  m_mountPoints.clear();
  EnterDriveRoots();
  EnterPathNames(BuildVolumeTable(m_volumes));
  m_filled = true;
}

void MountPointFinder::EnterDriveRoots() {
  for (const std::u16string& root : ReadDriveRoots(m_volumes)) {
    // This is deliberate, here and for path names: volumes on drives that call themselves fixed,
    // USB hard disks among them, get no mount points.
    if (m_volumes.DriveType(root.c_str()) != platform::kDRIVE_REMOVABLE) continue;
    if (const auto name = VolumeNameOf(m_volumes, root)) {
      m_mountPoints[platform::ToLower(*name)].push_back(root);
    }
  }
}

void MountPointFinder::EnterPathNames(const VolumeTable& table) {
  for (const std::u16string& path : table.Paths) {
    if (m_volumes.DriveType(path.c_str()) != platform::kDRIVE_REMOVABLE) continue;
    auto& mountPoints = m_mountPoints[platform::ToLower(table.VolumeOfPath.at(path))];
    if (std::find(mountPoints.begin(), mountPoints.end(), path) == mountPoints.end()) {
      mountPoints.push_back(path);
    }
  }
}

}  // namespace KelvoUHW
