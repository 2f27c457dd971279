// The properties of IZKUMInfoDevice, for the two classes that offer it.
#pragma once

#include "com/text_property.h"
#include "com/zkusb_monitor.h"
#include "records/info_device.h"

namespace KelvoUHW {

// Adds the interface to `Bases`. `Derived` has InfoRecord(), called with the record lock held; null
// there makes every property E_FAIL.
template <class Derived, class... Bases>
class InfoDeviceProperties : public Bases..., public IZKUMInfoDevice {
 public:
  HRESULT STDMETHODCALLTYPE get_Service(BSTR* pVal) override {
    return Text(pVal, &CZKUMInfoDeviceImpl::Service);
  }
  HRESULT STDMETHODCALLTYPE get_FriendlyName(BSTR* pVal) override {
    return Text(pVal, &CZKUMInfoDeviceImpl::FriendlyName);
  }
  HRESULT STDMETHODCALLTYPE get_Location(BSTR* pVal) override {
    return Text(pVal, &CZKUMInfoDeviceImpl::Location);
  }
  HRESULT STDMETHODCALLTYPE get_Manufacturer(BSTR* pVal) override {
    return Text(pVal, &CZKUMInfoDeviceImpl::Manufacturer);
  }
  HRESULT STDMETHODCALLTYPE get_HardwareId(BSTR* pVal) override {
    return Text(pVal, &CZKUMInfoDeviceImpl::HardwareId);
  }
  HRESULT STDMETHODCALLTYPE get_PhysicalName(BSTR* pVal) override {
    return Text(pVal, &CZKUMInfoDeviceImpl::PhysicalName);
  }
  HRESULT STDMETHODCALLTYPE get_DevClass(BSTR* pVal) override {
    return Text(pVal, &CZKUMInfoDeviceImpl::DevClass);
  }
  HRESULT STDMETHODCALLTYPE get_EnumName(BSTR* pVal) override {
    return Text(pVal, &CZKUMInfoDeviceImpl::EnumName);
  }
  HRESULT STDMETHODCALLTYPE get_ClassGuid(GUID* pVal) noexcept override {
    if (pVal) *pVal = GUID{};
    const RecordReadLock lock;
    const CZKUMInfoDeviceImpl* record = Record();
    if (record == nullptr) return E_FAIL;
    if (pVal == nullptr) return E_INVALIDARG;
    *pVal = platform::ToSystemGuid(record->ClassGuid);
    return S_OK;
  }

 private:
  const CZKUMInfoDeviceImpl* Record() const noexcept {
    return static_cast<const Derived*>(this)->InfoRecord();
  }
  template <class AnyText>
  HRESULT Text(BSTR* pVal, AnyText CZKUMInfoDeviceImpl::*field) const {
    if (pVal) *pVal = nullptr;
    const RecordReadLock lock;
    const CZKUMInfoDeviceImpl* record = Record();
    if (record == nullptr) return E_FAIL;
    return ReadText(pVal, [&] { return std::u16string_view(record->*field); });
  }
};

}  // namespace KelvoUHW
