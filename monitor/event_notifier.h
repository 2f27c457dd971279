// The event notifier: the COM object that tells sinks (client objects that advised on its
// connection point) which USB devices have arrived or been removed. A device message starts an
// event thread (usb_event_receiver.h); that thread calls NotifyDeviceChange, which has the tree
// rebuilt and, when something changed, calls the sinks.
#pragma once

#include <vector>

#include "com/private_interfaces.h"
#include "monitor/device_event_proxy.h"
#include "monitor/usb_event_receiver.h"

// Client threads call Advise, Unadvise and the enumerations, event threads NotifyDeviceChange. Two
// locks: the notification lock around every build, reading of lists, firing and cache reset; inside
// it the object's own, for short operations on the slots.
//
// A sink is called with the notification lock held, on the thread that fires. It may advise,
// unadvise and ask whatever it likes from inside the call.
//
// From the end of its construction the notifier holds a reference to itself, through the receiver's
// target: it lives until the module is unloaded, whoever releases it. This is deliberate; it keeps
// the one window thread and its registrations alive.
class CZKUMEventNotifier : public KelvoUHW::ObjectRoot,
                           public ISupportErrorInfo,
                           public IConnectionPointContainer,
                           public KelvoUHW::CProxy_IZKUMDeviceEvent<CZKUMEventNotifier>,
                           public IZKUMEventNotifier,
                           public IZKUMPrivateNotifier {
 public:
  using Interfaces = KelvoUHW::InterfaceMap<IZKUMPrivateNotifier, IZKUMEventNotifier,
                                            ISupportErrorInfo, IConnectionPointContainer>;

  CZKUMEventNotifier();
  virtual ~CZKUMEventNotifier();

  // Creates the tree object through its class and starts the device monitor.
  HRESULT FinalConstruct() noexcept;
  void FinalRelease() noexcept;

  // S_OK for IZKUMEventNotifier alone, though no operation ever sets error information. This is
  // deliberate.
  HRESULT STDMETHODCALLTYPE InterfaceSupportsErrorInfo(REFIID riid) noexcept override;

  HRESULT STDMETHODCALLTYPE EnumConnectionPoints(IEnumConnectionPoints** ppEnum) noexcept override;
  HRESULT STDMETHODCALLTYPE FindConnectionPoint(REFIID riid,
                                                IConnectionPoint** ppCP) noexcept override;

  HRESULT STDMETHODCALLTYPE NotifyDeviceChange(ULONG nDelay, BYTE bFire) noexcept override;

  // What the connection point's Advise does: keeps the sink and tells it, and only it, which
  // devices are connected, before it returns. When the telling fails its code is returned although
  // the sink stays advised under the cookie written.
  HRESULT AdviseAndTell(IUnknown* sink, DWORD* pdwCookie);

 private:
  // A list as it was right after the build, and which of its devices sit on a hub port: sinks may
  // build anew from inside a call, which refills the lists and destroys the replaced tree.
  using FireList = std::vector<KelvoUHW::NodePtr>;

  HRESULT SendConnectedDevices(IUnknown* sink);
  FireList CopyDeviceList(LONG number, HRESULT& result) const;
  void FireDeviceList(TDeviceEventType kind, const FireList& devices, const IUnknown* filter);
  HRESULT FireDeviceEvent(TDeviceEventType kind, const KelvoUHW::NodePtr& device,
                          const IUnknown* filter) noexcept;

  KelvoUHW::ComPtr<IBuildUsbTree> m_pBuildTree;
  KelvoUHW::CZKUMUsbEventReceiver m_receiver;
};
