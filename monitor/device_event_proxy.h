// The connection point of the event interface: its sinks, and how they are called.
#pragma once

#include "com/object.h"
#include "com/zkusb_monitor.h"
#include "monitor/sink_slots.h"

namespace KelvoUHW {

// Makes the enumerator over the occupied slots; E_POINTER for null.
HRESULT EnumerateConnections(const SinkSlots& sinks, IEnumConnections** out) noexcept;
// Makes the enumerator with the one connection point; E_POINTER for null.
HRESULT EnumerateConnectionPoint(IConnectionPoint* point, IEnumConnectionPoints** out) noexcept;

// Calls OnDeviceChanged of every sink in slot order through IDispatch::Invoke with the dispatch
// identifier 1, or only of the one whose slot holds `filter`. The slots are counted once, at the
// start: sinks in slots added meanwhile are not called, sinks removed meanwhile are skipped. A sink
// that fails keeps nobody else from being called. The code of the last call, S_OK when there was
// none; what a sink throws goes on to the caller.
HRESULT FireToSinks(const SinkSlots& sinks, TDeviceEventType kind, IUnknown* data,
                    const IUnknown* filter);

// Part of the notifier `T`, which has Advise(IUnknown*, DWORD*) and IConnectionPointContainer. The
// connection point is an object of its own identity, with the life of the notifier: it knows
// IUnknown and IConnectionPoint, and its references count on the notifier.
template <class T>
class CProxy_IZKUMDeviceEvent {
 public:
  HRESULT Fire_OnDeviceChanged(TDeviceEventType kind, IUnknown* data, const IUnknown* filter) {
    return FireToSinks(m_sinks, kind, data, filter);
  }

  IConnectionPoint* ConnectionPoint() noexcept { return &m_point; }

 protected:
  explicit CProxy_IZKUMDeviceEvent(platform::CriticalSection& lock) noexcept
      : m_sinks(lock), m_point(*this) {}
  ~CProxy_IZKUMDeviceEvent() = default;

  // The plain advise: `sink` is asked for the event interface, and what it answers is kept. `slot`
  // is the pointer in the slot, not referenced for the caller. What the sink throws goes on to the
  // caller.
  HRESULT AdviseSink(IUnknown* sink, DWORD* pdwCookie, IUnknown*& slot) {
    ComPtr<IUnknown> callback;
    const HRESULT result = sink->QueryInterface(DIID_IZKDeviceEventCallBack, callback.PutVoid());
    if (FAILED(result)) return result == E_NOINTERFACE ? CONNECT_E_CANNOTCONNECT : result;
    slot = callback.Get();
    return m_sinks.Add(callback, *pdwCookie);
  }

 private:
  class Point final : public IConnectionPoint {
   public:
    explicit Point(CProxy_IZKUMDeviceEvent& proxy) noexcept : m_proxy(proxy) {}

    HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) noexcept override {
      if (out == nullptr) return E_POINTER;
      *out = InterfaceMap<IConnectionPoint>::Find(this, iid);
      if (*out == nullptr) return E_NOINTERFACE;
      AddRef();
      return S_OK;
    }
    ULONG STDMETHODCALLTYPE AddRef() noexcept override { return Container().AddRef(); }
    ULONG STDMETHODCALLTYPE Release() noexcept override { return Container().Release(); }

    HRESULT STDMETHODCALLTYPE GetConnectionInterface(IID* pIID) noexcept override {
      if (pIID == nullptr) return E_POINTER;
      *pIID = DIID_IZKDeviceEventCallBack;
      return S_OK;
    }
    HRESULT STDMETHODCALLTYPE
    GetConnectionPointContainer(IConnectionPointContainer** ppCPC) noexcept override {
      if (ppCPC == nullptr) return E_POINTER;
      *ppCPC = &Container();
      (*ppCPC)->AddRef();
      return S_OK;
    }
    HRESULT STDMETHODCALLTYPE Advise(IUnknown* pUnkSink, DWORD* pdwCookie) noexcept override {
      return Guarded([&] { return Owner().AdviseAndTell(pUnkSink, pdwCookie); });
    }
    HRESULT STDMETHODCALLTYPE Unadvise(DWORD dwCookie) noexcept override {
      return m_proxy.m_sinks.Take(dwCookie) ? S_OK : CONNECT_E_NOCONNECTION;
    }
    HRESULT STDMETHODCALLTYPE EnumConnections(IEnumConnections** ppEnum) noexcept override {
      return EnumerateConnections(m_proxy.m_sinks, ppEnum);
    }

   private:
    T& Owner() const noexcept { return static_cast<T&>(m_proxy); }
    IConnectionPointContainer& Container() const noexcept { return Owner(); }

    CProxy_IZKUMDeviceEvent& m_proxy;
  };

  SinkSlots m_sinks;
  Point m_point;
};

}  // namespace KelvoUHW
