// The tree object: the queries over the tree that was built last.
#pragma once

#include <memory>

#include "com/object.h"
#include "com/private_interfaces.h"
#include "com/zkusb_monitor.h"
#include "tree/tree_builder.h"

namespace KelvoUHW {

// The queries may be called by any thread at any time, also while a build runs: they answer from
// the tree that is current when they begin. They never build. The methods of IBuildUsbTree are
// serialised by their callers.
class CZKUMUsbTree : public ObjectRoot, public IZKUMUsbTree, public IBuildUsbTree {
 public:
  using Interfaces = InterfaceMap<IZKUMUsbTree, IBuildUsbTree>;

  // Makes the builder over the current system's host; E_FAIL when that cannot be done.
  HRESULT FinalConstruct() noexcept;
  void FinalRelease() noexcept;

  HRESULT STDMETHODCALLTYPE get_RootNode(IZKUMUsbTreeNode** ppIUsbTreeNode) noexcept override;
  HRESULT STDMETHODCALLTYPE get_PortDevicesWithVendorId(
      ULONG nVendorId, IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) noexcept override;
  HRESULT STDMETHODCALLTYPE
  get_VendorProductDevices(ULONG nVendorId, ULONG nProductId,
                           IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) noexcept override;
  HRESULT STDMETHODCALLTYPE
  get_PortDevicesWithVolume(IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) noexcept override;

  virtual ~CZKUMUsbTree();

  HRESULT STDMETHODCALLTYPE BuildTree() noexcept override;
  HRESULT STDMETHODCALLTYPE ResetDeviceCache() noexcept override;
  HRESULT STDMETHODCALLTYPE GetDeviceList(LONG nList, const DeviceList** ppList) noexcept override;

 private:
  template <class Collect>
  HRESULT Query(IZKUMUsbTreeNodeEnumerator** out, Collect collect) noexcept;

  std::unique_ptr<CZKUMUsbTreeBuilder> m_pBuilder;
};

}  // namespace KelvoUHW
