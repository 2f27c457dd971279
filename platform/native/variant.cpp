#include "platform/native/com_functions.h"

void VariantInit(VARIANT* variant) noexcept { *variant = VARIANT{}; }

HRESULT VariantClear(VARIANT* variant) noexcept {
  switch (variant->vt) {
    case VT_BSTR:
      SysFreeString(variant->bstrVal);
      break;
    case VT_UNKNOWN:
    case VT_DISPATCH:
      if (variant->punkVal != nullptr) variant->punkVal->Release();
      break;
    case VT_EMPTY:
    case VT_I2:
    case VT_I4:
    case VT_BOOL:
    case VT_UI1:
    case VT_UI4:
      break;
    default:
      return DISP_E_BADVARTYPE;
  }
  *variant = VARIANT{};
  return S_OK;
}

HRESULT VariantCopy(VARIANT* target, const VARIANT* source) noexcept {
  if (target == source) return S_OK;
  if (const HRESULT cleared = VariantClear(target); FAILED(cleared)) return cleared;
  switch (source->vt) {
    case VT_BSTR:
      if (source->bstrVal != nullptr) {
        const BSTR copy = SysAllocStringLen(source->bstrVal, SysStringLen(source->bstrVal));
        if (copy == nullptr) return E_OUTOFMEMORY;
        target->bstrVal = copy;
      }
      target->vt = VT_BSTR;
      return S_OK;
    case VT_UNKNOWN:
    case VT_DISPATCH:
      if (source->punkVal != nullptr) source->punkVal->AddRef();
      break;
    case VT_EMPTY:
    case VT_I2:
    case VT_I4:
    case VT_BOOL:
    case VT_UI1:
    case VT_UI4:
      break;
    default:
      return DISP_E_BADVARTYPE;
  }
  *target = *source;
  return S_OK;
}
