// Node objects: what clients hold of a record. They keep no copy: each property read goes to the
// record, which they keep alive.
#pragma once

#include "com/object.h"
#include "com/variant.h"
#include "com/zkusb_monitor.h"
#include "records/node.h"

namespace KelvoUHW {

// A new node object of the class that belongs to the record's kind; the caller owns the reference.
// E_POINTER for an empty `node` or a null `out`, E_OUTOFMEMORY. Callable from every thread.
HRESULT CreateNodeObject(const NodePtr& node, IZKUMUsbTreeNode** out) noexcept;

// The root, nodes without a class of their own, and the base of all node objects. Any thread may
// call; reads of one record overlap freely, and wait only while a build joins device records.
class CZKUMUsbTreeNode : public ObjectRoot, public IZKUMUsbTreeNode, public IZKUMUsbDevice {
 public:
  using Interfaces = InterfaceMap<IZKUMUsbTreeNode, IZKUMUsbDevice>;

  HRESULT STDMETHODCALLTYPE get_InstanceId(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_Type(TUsbDeviceType* pType) noexcept override;
  HRESULT STDMETHODCALLTYPE get_Parent(IZKUMUsbTreeNode** ppIUsbTreeNode) noexcept override;
  HRESULT STDMETHODCALLTYPE get_Childs(IZKUMUsbTreeNodeEnumerator** ppNodeEnum) noexcept override;
  HRESULT STDMETHODCALLTYPE get_InSubtreeDevicesOfType(
      TUsbDeviceType nType, IZKUMUsbTreeNodeEnumerator** ppDevicesOfTypeEnum) noexcept override;

  // In this order behind the interface's methods.
  virtual ~CZKUMUsbTreeNode();
  // Assigns the record, once, before the object is handed out.
  virtual void SetImpl(const NodePtr& node) noexcept;

  HRESULT STDMETHODCALLTYPE get_Description(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_SerialNumber(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_VendorId(LONG* pVal) noexcept override;
  HRESULT STDMETHODCALLTYPE get_ProductId(LONG* pVal) noexcept override;
  HRESULT STDMETHODCALLTYPE get_DriverKeyName(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_ToString(BSTR* pVal) override;
  HRESULT STDMETHODCALLTYPE get_Vendor(BSTR* pVal) noexcept override;
  HRESULT STDMETHODCALLTYPE get_Product(BSTR* pVal) override;

 protected:
  // An enumerator over a collection that this object owns; `*out` is null already where given.
  HRESULT MakeCollection(IEnumVARIANT** out, const VariantVector& items) const noexcept;

 private:
  NodePtr m_node;
};

}  // namespace KelvoUHW
