// A sink that counts what it is told.
#pragma once

#include <atomic>
#include <cstddef>

#include "com/zkusb_monitor.h"
#include "platform/com.h"

namespace testing_support {

// Stands on the stack of a test, which has to give every reference back or end the process.
class CountingSink final : public IDispatch {
 public:
  std::size_t Events() const { return m_events; }
  LONG References() const { return m_references; }

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    const bool known =
        iid == IUnknown::kIid || iid == IDispatch::kIid || iid == platform::FromSystemGuid(DIID_IZKDeviceEventCallBack);
    *out = known ? this : nullptr;
    if (known) AddRef();
    return known ? S_OK : E_NOINTERFACE;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(++m_references); }
  ULONG STDMETHODCALLTYPE Release() override { return static_cast<ULONG>(--m_references); }
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT*) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT, LCID, ITypeInfo**) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE Invoke(DISPID, REFIID, LCID, WORD, DISPPARAMS*, VARIANT*, EXCEPINFO*, UINT*) override {
    ++m_events;
    return S_OK;
  }

 private:
  std::atomic<std::size_t> m_events = 0;
  std::atomic<LONG> m_references = 1;
};

}  // namespace testing_support
