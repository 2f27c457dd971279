// The node objects of controllers, hubs, hub ports and device-manager nodes.
#pragma once

#include "com/info_device_properties.h"
#include "com/node_object.h"
#include "records/info_device.h"
#include "records/records.h"

namespace KelvoUHW {

// Every object that CreateNodeObject makes has its typed record. Where that was destroyed later, by
// the object of a `Parent`, the properties of the class's own interface answer E_POINTER.

class CZKUMHostController : public CZKUMUsbTreeNode, public IZKUMHostController {
 public:
  using Interfaces = InterfaceMap<IZKUMUsbTreeNode, IZKUMUsbDevice, IZKUMHostController>;

  ~CZKUMHostController() override;
  void SetImpl(const NodePtr& node) noexcept override;
  HRESULT STDMETHODCALLTYPE get_LeafName(BSTR* pVal) override;

 private:
  RingPtr<CZKUMHostControllerImpl> m_controller;
};

class CZKUMHubDevice : public CZKUMUsbTreeNode, public IZKUMHubDevice {
 public:
  using Interfaces = InterfaceMap<IZKUMUsbTreeNode, IZKUMUsbDevice, IZKUMHubDevice>;

  ~CZKUMHubDevice() override;
  void SetImpl(const NodePtr& node) noexcept override;
  HRESULT STDMETHODCALLTYPE get_PathName(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_ConnectionName(BSTR* pVal) override;

 private:
  RingPtr<CZKUMHubDeviceImpl> m_hub;
};

class CZKUMHubPort : public CZKUMUsbTreeNode, public IZKUMHubPort {
 public:
  using Interfaces = InterfaceMap<IZKUMUsbTreeNode, IZKUMUsbDevice, IZKUMHubPort>;

  ~CZKUMHubPort() override;
  void SetImpl(const NodePtr& node) noexcept override;
  // E_INVALIDARG for a null pointer.
  HRESULT STDMETHODCALLTYPE get_PortIndex(LONG* pVal) noexcept override;

 private:
  RingPtr<CZKUMHubPortImpl> m_port;
};

class CZKUMInfoDevice : public InfoDeviceProperties<CZKUMInfoDevice, CZKUMUsbTreeNode> {
 public:
  using Interfaces = InterfaceMap<IZKUMUsbTreeNode, IZKUMUsbDevice, IZKUMInfoDevice>;

  ~CZKUMInfoDevice() override;
  void SetImpl(const NodePtr& node) noexcept override;
  const CZKUMInfoDeviceImpl* InfoRecord() const noexcept { return m_info.Get(); }

 private:
  InfoDevicePtr m_info;
};

}  // namespace KelvoUHW
