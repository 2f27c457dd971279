// Enumerators over a list that was copied when they were made.
#pragma once

#include <memory>
#include <utility>
#include <vector>

#include "com/object.h"

namespace KelvoUHW {

// `Interface` is an enumeration interface of `Item`s. `Held` keeps one item alive and has
// CopyTo(Item&), which hands out a reference. Used by one thread at a time; clones share the list.
template <class Interface, class Item, class Held>
class SnapshotEnumerator : public ObjectRoot, public Interface {
 public:
  using Interfaces = InterfaceMap<Interface>;
  using List = std::shared_ptr<const std::vector<Held>>;

  // E_POINTER for a null `out`.
  static HRESULT Make(List list, std::size_t position, Interface** out) noexcept {
    if (out == nullptr) return E_POINTER;
    *out = nullptr;
    ComObject<SnapshotEnumerator>* created = nullptr;
    const HRESULT result = ComObject<SnapshotEnumerator>::Create(created);
    if (FAILED(result)) return result;
    created->m_list = std::move(list);
    created->m_position = position;
    *out = created;
    return S_OK;
  }

  // E_POINTER for null items, and for no `pcFetched` where more than one is asked for.
  HRESULT STDMETHODCALLTYPE Next(ULONG count, Item* items, ULONG* pcFetched) noexcept override {
    if (pcFetched) *pcFetched = 0;
    if (items == nullptr || (count > 1 && pcFetched == nullptr)) return E_POINTER;
    ULONG fetched = 0;
    for (; fetched < count && m_position < m_list->size(); ++fetched) {
      (*m_list)[m_position++].CopyTo(items[fetched]);
    }
    if (pcFetched) *pcFetched = fetched;
    return fetched == count ? S_OK : S_FALSE;
  }
  HRESULT STDMETHODCALLTYPE Skip(ULONG count) noexcept override {
    const std::size_t left = m_list->size() - m_position;
    m_position += count < left ? count : left;
    return count <= left ? S_OK : S_FALSE;
  }
  HRESULT STDMETHODCALLTYPE Reset() noexcept override {
    m_position = 0;
    return S_OK;
  }
  HRESULT STDMETHODCALLTYPE Clone(Interface** ppEnum) noexcept override {
    return Make(m_list, m_position, ppEnum);
  }

  virtual ~SnapshotEnumerator() = default;

 private:
  List m_list;
  std::size_t m_position = 0;
};

}  // namespace KelvoUHW
