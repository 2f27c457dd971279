// Interfaces that the component's own objects use among themselves. They stand in no type library,
// have no marshaller and are only called inside the multithreaded apartment.
#pragma once

#include "platform/com.h"
#include "records/device_lists.h"

// Implemented by the tree object. Callers serialise all three, and the use of a list, by the
// notification lock.
struct IBuildUsbTree : IUnknown {
  static constexpr IID kIid{
      0xD3A5B9E2, 0x4C71, 0x4F0A, {0x9E, 0x26, 0x81, 0xB7, 0xC0, 0x5F, 0x3A, 0x94}};
  // S_OK when a new tree was published, S_FALSE when nothing had changed.
  virtual HRESULT STDMETHODCALLTYPE BuildTree() = 0;
  virtual HRESULT STDMETHODCALLTYPE ResetDeviceCache() = 0;
  // The builder's own list of an event kind, valid until the next build; null for a number that is
  // none. Always S_OK, also for a null `ppList`, which gets nothing.
  virtual HRESULT STDMETHODCALLTYPE GetDeviceList(LONG nList,
                                                  const KelvoUHW::DeviceList** ppList) = 0;
};

// Implemented by the event notifier, called by its event threads.
struct IZKUMPrivateNotifier : IUnknown {
  static constexpr IID kIid{
      0x6E0F2C8B, 0x93D4, 0x4B57, {0xA1, 0xE8, 0x5C, 0x2D, 0x7B, 0x90, 0xF4, 0x16}};
  // Builds, and fires the lists when `bFire` is not 0. E_FAIL when the notifier holds no tree.
  virtual HRESULT STDMETHODCALLTYPE NotifyDeviceChange(ULONG nDelay, BYTE bFire) = 0;
};
