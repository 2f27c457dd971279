// A set of info-device records that keeps the order in which they came.
#pragma once

#include <cstddef>
#include <list>
#include <map>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "devinfo/info_device.h"

namespace KelvoUHW {

// Holds each record (the object, whatever its fields) once. Iteration yields InfoDevicePtr in order
// of insertion, which events follow; so does every question that more than one record could answer.
//
// Handle, instance id and parent instance id of a record must not change while it is in a set: the
// set finds it by them. Questions take logarithmic time, insertion and removal too; erasing leaves
// iterators to other records valid. One thread at a time.
class InfoDeviceSet {
 public:
  InfoDeviceSet() = default;
  InfoDeviceSet(InfoDeviceSet&&) = default;
  InfoDeviceSet& operator=(InfoDeviceSet&&) = default;

  auto begin() const noexcept { return m_records.begin(); }
  auto end() const noexcept { return m_records.end(); }
  std::size_t size() const noexcept { return m_records.size(); }
  bool empty() const noexcept { return m_records.empty(); }

  // Appends a record; false, and its place stays, when that object is in the set already.
  bool Insert(const InfoDevicePtr& record);
  // False when that object is not in the set. `record` may be the one that the set itself holds.
  bool Erase(const CZKUMUsbTreeNodeImpl* record);
  void Clear() noexcept;

  // Membership by identity: this very object.
  bool HasRecord(const CZKUMUsbTreeNodeImpl* record) const noexcept;
  // Membership by handle: any record of the same device-manager node.
  bool HasHandle(platform::DevInst handle) const noexcept { return m_byHandle.contains(handle); }
  // The first record with this handle, or empty.
  InfoDevicePtr FindByHandle(platform::DevInst handle) const;

  // The first record with exactly this instance id, or empty.
  InfoDevicePtr FindByInstanceId(std::u16string_view id) const;
  // Every record with exactly this instance id.
  std::vector<InfoDevicePtr> AllByInstanceId(std::u16string_view id) const;
  // The first record that names exactly this parent and is not `except`, or empty.
  InfoDevicePtr FindByParentId(std::u16string_view id, const CZKUMUsbTreeNodeImpl* except) const;

 private:
  using Records = std::list<InfoDevicePtr>;
  // Equal keys stay in order of insertion. The texts are the records' own.
  using HandleIndex = std::multimap<platform::DevInst, const InfoDevicePtr*>;
  using TextIndex = std::multimap<std::u16string_view, const InfoDevicePtr*>;
  struct Places {
    Records::iterator Record;
    HandleIndex::iterator Handle;
    TextIndex::iterator InstanceId;
    TextIndex::iterator ParentId;
  };

  void Remove(const Places& places) noexcept;

  Records m_records;
  HandleIndex m_byHandle;
  TextIndex m_byInstanceId;
  TextIndex m_byParentId;
  std::unordered_map<const CZKUMUsbTreeNodeImpl*, Places> m_places;
};

}  // namespace KelvoUHW
