#include "devinfo/info_device_set.h"

namespace KelvoUHW {

bool InfoDeviceSet::Insert(const InfoDevicePtr& record) {
  const auto [slot, added] = m_places.try_emplace(
      record.Get(),
      Places{m_records.end(), m_byHandle.end(), m_byInstanceId.end(), m_byParentId.end()});
  if (!added) return false;
  Places& places = slot->second;
  try {
    places.Record = m_records.insert(m_records.end(), record);
    const InfoDevicePtr* held = &*places.Record;
    places.Handle = m_byHandle.emplace(record->m_devInstHandle, held);
    places.InstanceId = m_byInstanceId.emplace(record->m_strDevInstId, held);
    places.ParentId = m_byParentId.emplace(record->m_strDevInstIdParent, held);
  } catch (...) {
    Remove(places);
    m_places.erase(slot);
    throw;
  }
  return true;
}

bool InfoDeviceSet::Erase(const CZKUMUsbTreeNodeImpl* record) {
  const auto slot = m_places.find(record);
  if (slot == m_places.end()) return false;
  const Places places = slot->second;
  m_places.erase(slot);
  Remove(places);
  return true;
}

// The record goes last: the indexes name its texts.
void InfoDeviceSet::Remove(const Places& places) noexcept {
  if (places.ParentId != m_byParentId.end()) m_byParentId.erase(places.ParentId);
  if (places.InstanceId != m_byInstanceId.end()) m_byInstanceId.erase(places.InstanceId);
  if (places.Handle != m_byHandle.end()) m_byHandle.erase(places.Handle);
  if (places.Record != m_records.end()) m_records.erase(places.Record);
}

void InfoDeviceSet::Clear() noexcept {
  m_places.clear();
  m_byParentId.clear();
  m_byInstanceId.clear();
  m_byHandle.clear();
  m_records.clear();
}

bool InfoDeviceSet::HasRecord(const CZKUMUsbTreeNodeImpl* record) const noexcept {
  return m_places.contains(record);
}

InfoDevicePtr InfoDeviceSet::FindByHandle(platform::DevInst handle) const {
  const auto found = m_byHandle.lower_bound(handle);
  if (found == m_byHandle.end() || found->first != handle) return {};
  return *found->second;
}

InfoDevicePtr InfoDeviceSet::FindByInstanceId(std::u16string_view id) const {
  const auto found = m_byInstanceId.lower_bound(id);
  if (found == m_byInstanceId.end() || found->first != id) return {};
  return *found->second;
}

std::vector<InfoDevicePtr> InfoDeviceSet::AllByInstanceId(std::u16string_view id) const {
  std::vector<InfoDevicePtr> all;
  const auto [first, last] = m_byInstanceId.equal_range(id);
  for (auto place = first; place != last; ++place) all.push_back(*place->second);
  return all;
}

InfoDevicePtr InfoDeviceSet::FindByParentId(std::u16string_view id,
                                            const CZKUMUsbTreeNodeImpl* except) const {
  for (auto place = m_byParentId.lower_bound(id); place != m_byParentId.end() && place->first == id;
       ++place) {
    if (place->second->Get() != except) return *place->second;
  }
  return {};
}

}  // namespace KelvoUHW
