// The node object of a disk or volume.
#pragma once

#include "com/node_object.h"
#include "com/variant.h"
#include "records/interface_device.h"

namespace KelvoUHW {

// Without its record it answers as those of typed_nodes.h do.
class CZKUMInterfaceDevice : public CZKUMUsbTreeNode, public IZKUMInterfaceDevice {
 public:
  using Interfaces = InterfaceMap<IZKUMUsbTreeNode, IZKUMUsbDevice, IZKUMInterfaceDevice>;

  ~CZKUMInterfaceDevice() override;
  void SetImpl(const NodePtr& node) noexcept override;

  using CZKUMUsbTreeNode::get_ProductId;
  using CZKUMUsbTreeNode::get_VendorId;
  HRESULT STDMETHODCALLTYPE get_VolumeName(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_VendorId(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_ProductId(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_ProductRev(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_DevicePath(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_MountPoint(BSTR* pVal) override;
  // Refills the one collection of this object, also for a null pointer, and raises E_OUTOFMEMORY
  // when a text cannot be copied. The enumerator keeps the record, but the object must be kept for
  // as long as the enumerator is used: it owns the collection. All of this is deliberate.
  HRESULT STDMETHODCALLTYPE get_MountPoints(IEnumVARIANT** ppIUsbTreeNode) override;

 private:
  RingPtr<CZKUMInterfaceDeviceImpl> m_device;
  VariantVector m_mountPoints;
};

}  // namespace KelvoUHW
