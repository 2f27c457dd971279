// A set of info-device records that keeps the order in which they came.
#pragma once

#include <cstddef>
#include <list>
#include <string_view>
#include <tuple>
#include <vector>

#include "platform/flat_index.h"
#include "records/info_device.h"

namespace KelvoUHW {

// Holds each record (the object, whatever its fields) once. Iteration yields InfoDevicePtr in order
// of insertion, which events follow; so does every question that more than one record could answer.
//
// Handle, instance id and parent instance id of a record must not change while it is in a set: the
// set finds it by them. The first question of a kind takes time for every record, later ones do
// not, nor do insertion and removal; erasing leaves iterators to other records valid. Any of them
// may throw std::bad_alloc and leaves the set as it was then. One thread at a time, questions too.
class InfoDeviceSet {
 public:
  auto begin() const noexcept { return m_records.begin(); }
  auto end() const noexcept { return m_records.end(); }
  std::size_t size() const noexcept { return m_records.size(); }
  bool empty() const noexcept { return m_records.empty(); }

  // Appends a record; false, and its place stays, when that object is in the set already.
  bool Insert(const InfoDevicePtr& record);
  // The same for a record that is known not to be in the set: nothing is looked up.
  void Append(const InfoDevicePtr& record);
  // False when that object is not in the set. `record` may be the one that the set itself holds.
  bool Erase(const CZKUMUsbTreeNodeImpl* record);
  void Clear() noexcept;
  // Drops the pointers that hold nothing any more: their records were destroyed though they were in
  // the set. To be called before anything else where that may have happened.
  void DropDestroyed() noexcept;

  // Membership by identity: this very object.
  bool HasRecord(const CZKUMUsbTreeNodeImpl* record) const;
  // Membership by handle: any record of the same device-manager node.
  bool HasHandle(platform::DevInst handle) const { return static_cast<bool>(FindByHandle(handle)); }

  // What is found is the set's own pointer, which stays until that record is erased; or an empty
  // one, which stays for good.

  // The first record with this handle.
  const InfoDevicePtr& FindByHandle(platform::DevInst handle) const;
  // The first record with exactly this instance id.
  const InfoDevicePtr& FindByInstanceId(std::u16string_view id) const;
  // Numbers that tell the records from each other, in order of insertion. They are below
  // NumbersEnd() and stay until the next insertion.
  using Number = platform::FlatIndex::Entry;
  Number NumbersEnd() const noexcept { return static_cast<Number>(m_places.size()); }
  // Null where the record of that number was erased.
  const InfoDevicePtr* WithNumber(Number number) const noexcept {
    return m_places[number].erased ? nullptr : &*m_places[number].record;
  }
  // The number of what FindByInstanceId finds, or FlatIndex::kNone.
  Number NumberByInstanceId(std::u16string_view id) const;
  // Every record with exactly this instance id.
  std::vector<InfoDevicePtr> AllByInstanceId(std::u16string_view id) const;
  // The first record that names exactly this parent and is not `except`.
  const InfoDevicePtr& FindByParentId(std::u16string_view id,
                                      const CZKUMUsbTreeNodeImpl* except) const;

 private:
  using Entry = platform::FlatIndex::Entry;
  using Records = std::list<InfoDevicePtr>;
  struct Place {
    Records::iterator record;
    bool erased = false;
  };

  // By what a question asks. Most sets are never asked by every key, and texts are expensive to
  // read: an index is filled when it is first needed and kept up from then on.
  struct ByRecord;
  struct ByHandle;
  struct ByInstanceId;
  struct ByParentId;
  template <class Key>
  struct Index {
    platform::FlatIndex entries;
    bool filled = false;
  };
  using Indexes =
      std::tuple<Index<ByRecord>, Index<ByHandle>, Index<ByInstanceId>, Index<ByParentId>>;

  const CZKUMInfoDeviceImpl& RecordAt(Entry entry) const noexcept {
    return **m_places[entry].record;
  }
  template <class Key>
  void Enter(Index<Key>& index, Entry entry) const;
  template <class Key>
  void Leave(Index<Key>& index, Entry entry) const noexcept;
  template <class Key, class Value>
  Entry First(const Value& value) const;
  const InfoDevicePtr& Found(Entry entry) const noexcept;
  void Renumber();

  Records m_records;
  std::vector<Place> m_places;  // by entry, in the order of the records, erased ones between them
  InfoDevicePtr m_none;         // always empty: what a search that finds nothing refers to
  mutable Indexes m_indexes;
};

}  // namespace KelvoUHW
