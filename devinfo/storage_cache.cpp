#include "devinfo/storage_cache.h"

#include <algorithm>
#include <string_view>
#include <unordered_map>
#include <unordered_set>
#include <utility>

#include "platform/setup_api.h"

namespace KelvoUHW {
namespace {

// Each volume stands for its disk: it takes away the first disk whose id it names as its parent.
// The disks that are left go behind the volumes.
void MergeDisksWithoutVolumes(const std::vector<NodePtr>& disks, std::vector<NodePtr>& volumes) {
  std::unordered_map<std::u16string_view, std::size_t> volumesOnDisk;
  for (const NodePtr& volume : volumes) ++volumesOnDisk[volume->m_strDevInstIdParent];
  for (const NodePtr& disk : disks) {
    const auto found = volumesOnDisk.find(disk->m_strDevInstId);
    if (found != volumesOnDisk.end() && found->second > 0) {
      --found->second;
    } else {
      volumes.push_back(disk);
    }
  }
}

}  // namespace

StorageCache::StorageCache(platform::Host& host, platform::DeviceManager& nodes)
    : m_host(host), m_nodes(nodes) {
  m_volumeEnumeration.InterfaceClass = platform::GUID_DEVINTERFACE_VOLUME;
  m_diskEnumeration.InterfaceClass = platform::GUID_DEVINTERFACE_DISK;
  OpenEnumeration(m_volumeEnumeration);
}

void StorageCache::OpenEnumeration(InterfaceEnumeration& enumeration) {
  DeviceSet set(m_host);
  set.Open(&enumeration.InterfaceClass,
           platform::kDIGCF_PRESENT | platform::kDIGCF_DEVICEINTERFACE);
  // Deliberate: the earlier set is not destroyed, its handle is only overwritten.
  enumeration.Set = set.Release();
}

bool StorageCache::CollectStorage(std::u16string& diagnostics) {
  StoragePass pass(m_host, m_nodes, diagnostics);
  std::vector<NodePtr> volumes = CollectVolumes(pass);
  std::vector<NodePtr> disks = CollectDisks(pass);
  const bool changed = DiffersFromLastPass(volumes);
  const std::size_t acceptedVolumes = volumes.size();
  MergeDisksWithoutVolumes(disks, volumes);
  // Nothing throws from here on.
  m_volumes = std::move(volumes);
  m_acceptedVolumes = acceptedVolumes;
  m_disks = std::move(disks);
  return changed || !m_spare.empty();
}

// Empty at the end of the enumeration.
RingPtr<CZKUMInterfaceDeviceImpl> StorageCache::ReadInterface(
    const InterfaceEnumeration& enumeration, std::uint32_t index) {
  auto record = MakeRecord<CZKUMInterfaceDeviceImpl>();
  if (!m_host.EnumDeviceInterfaces(enumeration.Set, enumeration.InterfaceClass, index,
                                   record->InterfaceData)) {
    return {};
  }
  record->Detail = GetInterfaceDetail(m_host, m_host, enumeration.Set, &record->InterfaceData,
                                      &record->DeviceData);
  // Deliberate: an unreadable detail ends the enumeration, whatever would come behind it.
  if (!record->Detail) return {};
  return record;
}

std::vector<NodePtr> StorageCache::CollectVolumes(StoragePass& pass) {
  OpenEnumeration(m_volumeEnumeration);
  m_spare.clear();
  std::vector<NodePtr> accepted;
  for (std::uint32_t index = 0; index < kMostElements; ++index) {
    auto record = ReadInterface(m_volumeEnumeration, index);
    if (!record) break;
    if (pass.OpenAndQueryVolume(*record) == KStorageAccepted) accepted.push_back(std::move(record));
  }
  return accepted;
}

std::vector<NodePtr> StorageCache::CollectDisks(StoragePass& pass) {
  OpenEnumeration(m_diskEnumeration);
  m_diskSpare.clear();
  std::vector<NodePtr> kept;
  for (std::uint32_t index = 0; index < kMostElements; ++index) {
    auto record = ReadInterface(m_diskEnumeration, index);
    if (!record) break;
    if (pass.PrepareDiskRecord(*record) != KStorageAccepted) continue;
    if (pass.KeepsDisk(*record)) kept.push_back(std::move(record));
  }
  return kept;
}

// Volumes are compared with volumes only: with the disks that stand behind them in the list, a PC
// with an internal disk or an empty card slot would report a change at every pass.
bool StorageCache::DiffersFromLastPass(const std::vector<NodePtr>& accepted) const {
  if (accepted.size() != m_acceptedVolumes) return true;
  std::unordered_set<std::u16string_view> previousIds;
  for (std::size_t i = 0; i < m_acceptedVolumes; ++i) {
    previousIds.insert(m_volumes[i]->m_strDevInstId);
  }
  return std::any_of(accepted.begin(), accepted.end(), [&](const NodePtr& volume) {
    return !previousIds.contains(volume->m_strDevInstId);
  });
}

}  // namespace KelvoUHW
