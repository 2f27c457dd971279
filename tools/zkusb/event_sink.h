// The sink that the client advises.
#pragma once

#include <atomic>
#include <functional>

#include "com/com_ptr.h"
#include "com/zkusb_monitor.h"

namespace zkusb {

// Answers for the event interface with an IDispatch whose member 1 hands the event on, on the
// thread that fires. What the handler throws ends the call with E_FAIL: the sink of a client must
// not throw into the component.
class EventSink final : public IDispatch {
 public:
  using Handler = std::function<void(TDeviceEventType, IZKUMUsbTreeNode&)>;

  static KelvoUHW::ComPtr<IUnknown> Create(Handler handler);

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID riid, void** out) noexcept override;
  ULONG STDMETHODCALLTYPE AddRef() noexcept override { return ++m_references; }
  ULONG STDMETHODCALLTYPE Release() noexcept override;
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT* pctinfo) noexcept override;
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT, LCID, ITypeInfo**) noexcept override;
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) noexcept override;
  HRESULT STDMETHODCALLTYPE Invoke(DISPID member, REFIID, LCID, WORD, DISPPARAMS* parameters,
                                   VARIANT*, EXCEPINFO*, UINT*) noexcept override;

 private:
  explicit EventSink(Handler handler) : m_handler(std::move(handler)) {}
  virtual ~EventSink() = default;

  std::atomic<ULONG> m_references = 1;
  const Handler m_handler;
};

}  // namespace zkusb
