#include "tree/tree_builder.h"

#include "records/record_lock.h"
#include "tree/device_forest.h"
#include "tree/publication.h"

namespace KelvoUHW {

CZKUMUsbTreeBuilder::CZKUMUsbTreeBuilder(platform::Host& host)
    : m_walker(host), m_deviceInfo(host, m_walker.Answers()), m_storage(host, m_walker.Answers()) {}

bool CZKUMUsbTreeBuilder::Build() {
  const RecordsInUse inUse;
  m_deviceInfo.DropDestroyed();
  m_walker.StartWalk();
  m_deviceInfo.SetDiskDrives(DiskDriveRecords(m_walker.m_deviceRecords));
  // Both caches are asked in every build: each compares with its own last pass, and reports a
  // change once. What a build that runs out of memory could not publish is owed until one does.
  if (m_deviceInfo.Collect(m_walker.m_building)) m_bOwesPublication = true;
  std::u16string diagnostics;  // nobody reads them
  if (m_storage.CollectStorage(diagnostics)) m_bOwesPublication = true;
  if (!m_bOwesPublication) {
    m_walker.Abort();
    m_walker.Answers().Forget();
    return false;
  }
  {
    const RecordWriteLock lock;
    Publication(m_walker.Answers(), m_deviceInfo, m_storage.Volumes(), m_walker.m_building,
                m_walker.m_current)
        .Run(m_deviceLists);
  }
  m_walker.Commit();
  m_walker.Answers().Forget();
  m_bOwesPublication = false;
  return true;
}

const DeviceList* CZKUMUsbTreeBuilder::GetDeviceList(std::size_t kind) const noexcept {
  return kind <= kModifiedList ? &m_deviceLists[kind] : nullptr;
}

}  // namespace KelvoUHW
