#include "tree/tree_builder.h"

#include "tree/device_forest.h"
#include "tree/publication.h"

namespace KelvoUHW {

CZKUMUsbTreeBuilder::CZKUMUsbTreeBuilder(platform::Host& host)
    : m_walker(host), m_deviceInfo(host, host), m_storage(host), m_host(host) {}

bool CZKUMUsbTreeBuilder::Build() {
  m_walker.StartWalk();
  m_deviceInfo.SetDiskDrives(DiskDriveRecords(m_walker.m_deviceRecords));
  // Both caches are asked in every build: each compares with its own last pass.
  const bool devicesChanged = m_deviceInfo.Collect(m_walker.m_building);
  std::u16string diagnostics;  // nobody reads them
  const bool volumesChanged = m_storage.CollectStorage(diagnostics);
  if (!devicesChanged && !volumesChanged) {
    m_walker.Abort();
    return false;
  }
  Publication(m_host, m_deviceInfo, m_storage.Volumes(), m_walker.m_building, m_walker.m_current)
      .Run(m_deviceLists);
  m_walker.Commit();
  return true;
}

const DeviceList* CZKUMUsbTreeBuilder::GetDeviceList(std::size_t kind) const noexcept {
  return kind <= kModifiedList ? &m_deviceLists[kind] : nullptr;
}

}  // namespace KelvoUHW
