#include "com/variant_enumerator.h"

#include <utility>

namespace KelvoUHW {

namespace {

HRESULT MakeAt(IEnumVARIANT** out, IUnknown* owner, const VariantVector* items,
               std::size_t position) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  ComObject<VariantEnumerator>* created = nullptr;
  const HRESULT result = ComObject<VariantEnumerator>::Create(created);
  if (FAILED(result)) return result;
  created->SetItems(ComPtr<IUnknown>(owner), items, position);
  *out = created;
  return S_OK;
}

}  // namespace

HRESULT MakeVariantEnum(IEnumVARIANT** out, IUnknown* owner, const VariantVector* items) noexcept {
  return MakeAt(out, owner, items, 0);
}

VariantEnumerator::~VariantEnumerator() = default;

void VariantEnumerator::SetItems(ComPtr<IUnknown> owner, const VariantVector* items,
                                 std::size_t position) noexcept {
  m_owner = std::move(owner);
  m_items = items;
  m_position = position;
}

HRESULT VariantEnumerator::Next(ULONG celt, VARIANT* rgVar, ULONG* pCeltFetched) noexcept {
  if (pCeltFetched) *pCeltFetched = 0;
  if (rgVar == nullptr || (celt > 1 && pCeltFetched == nullptr)) return E_POINTER;
  if (m_items == nullptr) return E_FAIL;
  ULONG copied = 0;
  for (; copied < celt && !AtEnd(); ++copied) {
    VARIANT& target = rgVar[copied];
    // What the caller's array held is not ours to clear.
    VariantInit(&target);
    // Some of the system's headers take the source by a pointer that may write.
    const VARIANT& source = (*m_items)[m_position];
    const HRESULT result = VariantCopy(&target, const_cast<VARIANT*>(&source));
    if (FAILED(result)) {
      for (ULONG written = 0; written < copied; ++written) VariantClear(&rgVar[written]);
      return result;
    }
    ++m_position;
  }
  if (pCeltFetched) *pCeltFetched = copied;
  return copied == celt ? S_OK : S_FALSE;
}

HRESULT VariantEnumerator::Skip(ULONG celt) noexcept {
  if (celt == 0) return S_OK;
  if (m_items == nullptr) return E_FAIL;
  const std::size_t left = AtEnd() ? 0 : m_items->size() - m_position;
  m_position += celt < left ? celt : left;
  return celt <= left ? S_OK : S_FALSE;
}

HRESULT VariantEnumerator::Reset() noexcept {
  if (m_items == nullptr) return E_FAIL;
  m_position = 0;
  return S_OK;
}

HRESULT VariantEnumerator::Clone(IEnumVARIANT** ppEnum) noexcept {
  return MakeAt(ppEnum, m_owner.Get(), m_items, m_position);
}

}  // namespace KelvoUHW
