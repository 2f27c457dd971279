// The node object of a device on a hub port.
#pragma once

#include "com/info_device_properties.h"
#include "com/node_object.h"
#include "com/variant.h"
#include "records/port_device.h"

namespace KelvoUHW {

// Without its record it answers as those of typed_nodes.h do.
class CZKUMPortDevice
    : public InfoDeviceProperties<CZKUMPortDevice, CZKUMUsbTreeNode, IZKUMPortDevice> {
 public:
  using Interfaces =
      InterfaceMap<IZKUMUsbTreeNode, IZKUMUsbDevice, IZKUMPortDevice, IZKUMInfoDevice>;

  ~CZKUMPortDevice() override;
  void SetImpl(const NodePtr& node) noexcept override;

  // The text the device gave, under both interfaces that have the property.
  HRESULT STDMETHODCALLTYPE get_Product(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_Manufacturer1(BSTR* pVal) override;
  // E_INVALIDARG for a null pointer.
  HRESULT STDMETHODCALLTYPE get_Speed(ULONG* pVal) noexcept override;
  HRESULT STDMETHODCALLTYPE get_NumberInterfaces(BYTE* pVal) noexcept override;
  // Refills the one collection of this object, also for a null pointer. The enumerator keeps the
  // record, but the object must be kept for as long as the enumerator is used: it owns the
  // collection. All of this is deliberate.
  HRESULT STDMETHODCALLTYPE
  get_InterfaceDescriptors(IEnumVARIANT** ppIIiterfaceDescr) noexcept override;
  HRESULT STDMETHODCALLTYPE get_FirstChildOfType(IZKUMUsbTreeNode* pNode, TUsbDeviceType nType,
                                                 IZKUMUsbTreeNode** ppNodeOfType) noexcept override;

  const CZKUMInfoDeviceImpl* InfoRecord() const noexcept;

 private:
  RingPtr<CZKUMPortDeviceImpl> m_device;
  VariantVector m_interfaceDescriptors;
};

}  // namespace KelvoUHW
