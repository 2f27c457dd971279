// Variant: a VARIANT that frees what it holds.
#pragma once

#include <utility>
#include <vector>

#include "platform/com.h"

namespace KelvoUHW {

class Variant : public VARIANT {
 public:
  Variant() noexcept { VariantInit(this); }
  Variant(Variant&& other) noexcept : VARIANT(other) { VariantInit(&other); }
  Variant& operator=(Variant&& other) noexcept {
    std::swap(static_cast<VARIANT&>(*this), static_cast<VARIANT&>(other));
    return *this;
  }
  ~Variant() { VariantClear(this); }

  // Takes over the reference, which may be null.
  static Variant OfUnknown(IUnknown* owned) noexcept {
    Variant result;
    result.vt = VT_UNKNOWN;
    result.punkVal = owned;
    return result;
  }
  // Takes over the text, which may be null.
  static Variant OfBstr(BSTR owned) noexcept {
    Variant result;
    result.vt = VT_BSTR;
    result.bstrVal = owned;
    return result;
  }
  static Variant OfLong(LONG value) noexcept {
    Variant result;
    result.vt = VT_I4;
    result.lVal = value;
    return result;
  }
};
static_assert(sizeof(Variant) == sizeof(VARIANT));

using VariantVector = std::vector<Variant>;

}  // namespace KelvoUHW
