#include "devinfo/info_device_set.h"

#include <algorithm>
#include <cstdint>
#include <type_traits>

#include "platform/text.h"

namespace KelvoUHW {

using platform::FlatIndex;
using platform::HashOf;

namespace {

bool SameKey(std::u16string_view a, std::u16string_view b) noexcept {
  return platform::SameText(a, b);
}
template <class Number>
bool SameKey(Number a, Number b) noexcept requires std::is_integral_v<Number> {
  return a == b;
}

}  // namespace

struct InfoDeviceSet::ByRecord {
  static std::uint64_t Of(const CZKUMUsbTreeNodeImpl& record) noexcept {
    return reinterpret_cast<std::uintptr_t>(&record);
  }
};
struct InfoDeviceSet::ByHandle {
  static platform::DevInst Of(const CZKUMUsbTreeNodeImpl& record) noexcept {
    return record.m_devInstHandle;
  }
};
struct InfoDeviceSet::ByInstanceId {
  static std::u16string_view Of(const CZKUMUsbTreeNodeImpl& record) noexcept {
    return record.m_strDevInstId;
  }
};
struct InfoDeviceSet::ByParentId {
  static std::u16string_view Of(const CZKUMUsbTreeNodeImpl& record) noexcept {
    return record.m_strDevInstIdParent;
  }
};

template <class Key>
void InfoDeviceSet::Enter(Index<Key>& index, Entry entry) const {
  const auto value = Key::Of(RecordAt(entry));
  index.entries.Add(HashOf(value), entry,
                    [&](Entry other) { return SameKey(Key::Of(RecordAt(other)), value); });
}

template <class Key>
void InfoDeviceSet::Leave(Index<Key>& index, Entry entry) const noexcept {
  const auto value = Key::Of(RecordAt(entry));
  index.entries.Remove(HashOf(value), entry,
                       [&](Entry other) { return SameKey(Key::Of(RecordAt(other)), value); });
}

template <class Key, class Value>
InfoDeviceSet::Entry InfoDeviceSet::First(const Value& value) const {
  auto& index = std::get<Index<Key>>(m_indexes);
  if (!index.filled) {
    index.entries.Clear();  // what a filling that ran out of memory left
    index.entries.Reserve(m_records.size());
    for (Entry entry = 0; entry < m_places.size(); ++entry) {
      if (!m_places[entry].erased) Enter(index, entry);
    }
    index.filled = true;
  }
  return index.entries.First(HashOf(value),
                             [&](Entry entry) { return SameKey(Key::Of(RecordAt(entry)), value); });
}

const InfoDevicePtr& InfoDeviceSet::Found(Entry entry) const noexcept {
  return entry == FlatIndex::kNone ? m_none : *m_places[entry].record;
}

bool InfoDeviceSet::Insert(const InfoDevicePtr& record) {
  if (HasRecord(record.Get())) return false;
  Append(record);
  return true;
}

void InfoDeviceSet::Append(const InfoDevicePtr& record) {
  constexpr std::size_t kFewErased = 16;
  if (m_places.size() > 2 * m_records.size() + kFewErased) Renumber();
  const auto entry = static_cast<Entry>(m_places.size());
  const auto place = m_records.insert(m_records.end(), record);
  try {
    m_places.push_back({place});
    const auto enter = [&](auto& index) {
      if (index.filled) Enter(index, entry);
    };
    std::apply([&](auto&... index) { (enter(index), ...); }, m_indexes);
  } catch (...) {
    // Which of the indexes have the record already does not matter: all are filled anew.
    m_indexes = {};
    m_places.resize(entry);
    m_records.erase(place);
    throw;
  }
}

bool InfoDeviceSet::Erase(const CZKUMUsbTreeNodeImpl* record) {
  const Entry entry = First<ByRecord>(ByRecord::Of(*record));
  if (entry == FlatIndex::kNone) return false;
  const auto leave = [&](auto& index) {
    if (index.filled) Leave(index, entry);
  };
  std::apply([&](auto&... index) { (leave(index), ...); }, m_indexes);
  m_places[entry].erased = true;
  m_records.erase(m_places[entry].record);
  return true;
}

// A set that records come to and leave for years must not grow by every one that left.
void InfoDeviceSet::Renumber() {
  m_indexes = {};
  std::erase_if(m_places, [](const Place& place) { return place.erased; });
}

void InfoDeviceSet::Clear() noexcept {
  m_indexes = {};
  m_places.clear();
  m_records.clear();
}

void InfoDeviceSet::DropDestroyed() noexcept {
  const auto holdsNothing = [](const InfoDevicePtr& record) { return !record; };
  if (std::ranges::none_of(m_records, holdsNothing)) return;
  m_indexes = {};
  std::erase_if(m_places, [](const Place& place) { return place.erased || !*place.record; });
  m_records.remove_if(holdsNothing);
}

bool InfoDeviceSet::HasRecord(const CZKUMUsbTreeNodeImpl* record) const {
  return First<ByRecord>(ByRecord::Of(*record)) != FlatIndex::kNone;
}

const InfoDevicePtr& InfoDeviceSet::FindByHandle(platform::DevInst handle) const {
  return Found(First<ByHandle>(handle));
}

const InfoDevicePtr& InfoDeviceSet::FindByInstanceId(std::u16string_view id) const {
  return Found(First<ByInstanceId>(id));
}

InfoDeviceSet::Number InfoDeviceSet::NumberByInstanceId(std::u16string_view id) const {
  return First<ByInstanceId>(id);
}

std::vector<InfoDevicePtr> InfoDeviceSet::AllByInstanceId(std::u16string_view id) const {
  std::vector<InfoDevicePtr> all;
  const auto& index = std::get<Index<ByInstanceId>>(m_indexes).entries;
  for (Entry entry = First<ByInstanceId>(id); entry != FlatIndex::kNone;
       entry = index.Next(entry)) {
    all.push_back(Found(entry));
  }
  return all;
}

const InfoDevicePtr& InfoDeviceSet::FindByParentId(std::u16string_view id,
                                                   const CZKUMUsbTreeNodeImpl* except) const {
  const auto& index = std::get<Index<ByParentId>>(m_indexes).entries;
  for (Entry entry = First<ByParentId>(id); entry != FlatIndex::kNone; entry = index.Next(entry)) {
    if (&RecordAt(entry) != except) return Found(entry);
  }
  return Found(FlatIndex::kNone);
}

}  // namespace KelvoUHW
