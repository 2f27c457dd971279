#include "tools/zkusb/event_sink.h"

#include <utility>

namespace zkusb {

using KelvoUHW::ComPtr;

ComPtr<IUnknown> EventSink::Create(Handler handler) {
  return ComPtr<IUnknown>::Attach(new EventSink(std::move(handler)));
}

HRESULT EventSink::QueryInterface(REFIID riid, void** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  if (riid != platform::IidOf<IUnknown>() && riid != platform::IidOf<IDispatch>() &&
      riid != DIID_IZKDeviceEventCallBack) {
    return E_NOINTERFACE;
  }
  *out = static_cast<IDispatch*>(this);
  AddRef();
  return S_OK;
}

ULONG EventSink::Release() noexcept {
  const ULONG left = --m_references;
  if (left == 0) delete this;
  return left;
}

HRESULT EventSink::GetTypeInfoCount(UINT* pctinfo) noexcept {
  if (pctinfo == nullptr) return E_POINTER;
  *pctinfo = 0;
  return S_OK;
}

HRESULT EventSink::GetTypeInfo(UINT, LCID, ITypeInfo** out) noexcept {
  if (out) *out = nullptr;
  return E_NOTIMPL;
}

HRESULT EventSink::GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) noexcept {
  return E_NOTIMPL;
}

HRESULT EventSink::Invoke(DISPID member, REFIID, LCID, WORD, DISPPARAMS* parameters, VARIANT*,
                          EXCEPINFO*, UINT*) noexcept {
  constexpr DISPID kOnDeviceChanged = 1;
  if (member != kOnDeviceChanged) return DISP_E_MEMBERNOTFOUND;
  if (parameters == nullptr || parameters->cArgs != 2) return DISP_E_BADPARAMCOUNT;
  // The last argument stands first.
  const VARIANT& device = parameters->rgvarg[0];
  const VARIANT& kind = parameters->rgvarg[1];
  if (device.vt != VT_UNKNOWN || device.punkVal == nullptr || kind.vt != VT_I4) {
    return DISP_E_TYPEMISMATCH;
  }
  try {
    const auto node = ComPtr<IUnknown>(device.punkVal).As<IZKUMUsbTreeNode>();
    if (!node) return E_NOINTERFACE;
    m_handler(static_cast<TDeviceEventType>(kind.lVal), *node.Get());
    return S_OK;
  } catch (...) {
    return E_FAIL;
  }
}

}  // namespace zkusb
