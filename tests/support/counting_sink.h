// A sink that counts what it is told.
#pragma once

#include <gtest/gtest.h>

#include <atomic>
#include <cstddef>

#include "com/zkusb_monitor.h"
#include "platform/com.h"

namespace testing_support {

// Whoever fires an event knows the member and calls nothing but Invoke. Counts references, and deletes nothing.
class Callable : public IDispatch {
 public:
  LONG References() const { return m_references; }

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) override {
    const bool known =
        iid == platform::IidOf<IUnknown>() || iid == platform::IidOf<IDispatch>() || iid == DIID_IZKDeviceEventCallBack;
    *out = known ? this : nullptr;
    if (known) AddRef();
    return known ? S_OK : E_NOINTERFACE;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(++m_references); }
  ULONG STDMETHODCALLTYPE Release() override { return static_cast<ULONG>(--m_references); }
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT*) override { return Unexpected(); }
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT, LCID, ITypeInfo**) override { return Unexpected(); }
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) override { return Unexpected(); }

 private:
  static HRESULT Unexpected() {
    ADD_FAILURE() << "asked for types or names";
    return E_NOTIMPL;
  }

  std::atomic<LONG> m_references = 1;
};

// Stands on the stack of a test, which has to give every reference back or end the process.
class CountingSink final : public Callable {
 public:
  std::size_t Events() const { return m_events; }

  HRESULT STDMETHODCALLTYPE Invoke(DISPID, REFIID, LCID, WORD, DISPPARAMS*, VARIANT*, EXCEPINFO*, UINT*) override {
    ++m_events;
    return S_OK;
  }

 private:
  std::atomic<std::size_t> m_events = 0;
};

}  // namespace testing_support
