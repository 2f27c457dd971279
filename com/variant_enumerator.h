// Collections of values: IEnumVARIANT over a vector that a node object owns.
#pragma once

#include "com/com_ptr.h"
#include "com/object.h"
#include "com/variant.h"

namespace KelvoUHW {

// An enumerator at the first element of `items`. It keeps `owner` alive, but not `items`: they must
// outlive it. They may be refilled meanwhile; it then walks the new contents. E_POINTER for a null
// `out`.
HRESULT MakeVariantEnum(IEnumVARIANT** out, IUnknown* owner, const VariantVector* items) noexcept;

// Used from one thread, with the object that owns the vector.
class VariantEnumerator : public SingleThreadObjectRoot, public IEnumVARIANT {
 public:
  using Interfaces = InterfaceMap<IEnumVARIANT>;

  HRESULT STDMETHODCALLTYPE Next(ULONG celt, VARIANT* rgVar, ULONG* pCeltFetched) noexcept override;
  HRESULT STDMETHODCALLTYPE Skip(ULONG celt) noexcept override;
  HRESULT STDMETHODCALLTYPE Reset() noexcept override;
  HRESULT STDMETHODCALLTYPE Clone(IEnumVARIANT** ppEnum) noexcept override;

  virtual ~VariantEnumerator();
  void SetItems(ComPtr<IUnknown> owner, const VariantVector* items, std::size_t position) noexcept;

 private:
  bool AtEnd() const noexcept { return m_position >= m_items->size(); }

  ComPtr<IUnknown> m_owner;
  const VariantVector* m_items = nullptr;
  // An index, compared with the size at each step: the vector may shrink and move.
  std::size_t m_position = 0;
};

}  // namespace KelvoUHW
