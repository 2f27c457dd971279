// The interfaces of ZKUsbMonitor, for its clients: what zkusb_monitor.idl says, in C++.
//
// Rules that hold for every method unless its comment says otherwise:
// - The result is an HRESULT; a failed call returns nothing to release.
// - A null out pointer gives E_POINTER (for some numbers: E_INVALIDARG).
// - The caller frees a BSTR with SysFreeString, and releases an interface.
// - Text properties return E_OUTOFMEMORY when memory runs out, or throw an exception that derives
//   from std::exception.
// - Nodes are snapshots: a node answers from the tree it was taken from, also after that tree has
//   been replaced by a newer one.
// - Call from the multithreaded apartment. The type library gives no parameter directions for three
//   methods (InSubtreeDevicesOfType, FirstChildOfType, PortDevicesWithVolume): through a proxy they
//   return S_OK but no result.
#pragma once

#include "platform/com.h"
#include "records/device_types.h"

struct IZKUMUsbTreeNode;
struct IZKUMUsbTreeNodeEnumerator;

inline constexpr GUID LIBID_ZKUsbMonitorLib{
    0xA2AC77FD, 0x36C6, 0x4C2A, {0xB2, 0x38, 0xF8, 0x9B, 0x35, 0xDA, 0xA5, 0x70}};
inline constexpr CLSID CLSID_ZKUMEventNotifier{
    0x1D7E7A5B, 0x648D, 0x4236, {0x86, 0x04, 0x8F, 0x5F, 0x3C, 0x82, 0x43, 0x3A}};
inline constexpr CLSID CLSID_ZKUMUsbTree{
    0x34349D2D, 0x14C6, 0x414B, {0x97, 0x71, 0xA7, 0xBD, 0x2A, 0x7C, 0x71, 0x80}};
// The outgoing interface of the notifier: sinks answer QueryInterface for it with an IDispatch.
inline constexpr IID DIID_IZKDeviceEventCallBack{
    0x8C4D3DF5, 0x889F, 0x434C, {0xBA, 0x1C, 0x22, 0xF2, 0x3F, 0xD7, 0xCB, 0x1B}};

// The notifier class's own interface, without methods: all traffic goes through the connection
// point of DIID_IZKDeviceEventCallBack.
struct IZKUMEventNotifier : IUnknown {
  static constexpr IID kIid{
      0x565B8FB4, 0xEE30, 0x4EE3, {0x9B, 0x5B, 0xE2, 0x85, 0x67, 0x8F, 0x1F, 0x9D}};
};

// What a sink's dispatch members are: OnDeviceChanged has the dispatch identifier 1, UnAdvise 2.
// The component calls the first through IDispatch::Invoke, and never the second. `pDeviceData` is a
// node object.
struct IZKUMDeviceEvent : IUnknown {
  static constexpr IID kIid{
      0x931F33F5, 0x525B, 0x4613, {0xA5, 0xA7, 0xD0, 0xE2, 0x81, 0x15, 0xDD, 0x9A}};
  virtual HRESULT STDMETHODCALLTYPE OnDeviceChanged(TDeviceEventType changeStatus,
                                                    IUnknown* pDeviceData) = 0;
  virtual HRESULT STDMETHODCALLTYPE UnAdvise() = 0;
};

// Every node of the tree.
struct IZKUMUsbTreeNode : IUnknown {
  static constexpr IID kIid{
      0x8080AF8D, 0x857A, 0x45C4, {0x82, 0x96, 0xAB, 0x13, 0x01, 0xAD, 0xFA, 0x28}};
  virtual HRESULT STDMETHODCALLTYPE get_InstanceId(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Type(TUsbDeviceType* pType) = 0;
  // The node that comes back owns its record: its last Release takes the record out of the tree,
  // until a build finds the next change. Walk down from the root instead. E_POINTER for the root.
  virtual HRESULT STDMETHODCALLTYPE get_Parent(IZKUMUsbTreeNode** ppIUsbTreeNode) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Childs(IZKUMUsbTreeNodeEnumerator** ppNodeEnum) = 0;
  // The nodes of a kind in the subtree, this node among them, parents before their children.
  virtual HRESULT STDMETHODCALLTYPE get_InSubtreeDevicesOfType(
      TUsbDeviceType nType, IZKUMUsbTreeNodeEnumerator** ppDevicesOfTypeEnum) = 0;
};

// MoveNext goes before each GetCurrent. `pbSuccess` is not tested for null; it is set to
// VARIANT_FALSE behind the last node.
struct IZKUMUsbTreeNodeEnumerator : IUnknown {
  static constexpr IID kIid{
      0x904023D8, 0x3EB6, 0x4079, {0xB0, 0x62, 0x45, 0xC6, 0x80, 0x95, 0x68, 0x2E}};
  virtual HRESULT STDMETHODCALLTYPE MoveNext(VARIANT_BOOL* pbSuccess) = 0;
  virtual HRESULT STDMETHODCALLTYPE GetCurrent(IZKUMUsbTreeNode** ppIUsbTreeNode) = 0;
};

// Every node offers it. What a node does not have is an empty text, and -1 for the two numbers.
struct IZKUMUsbDevice : IUnknown {
  static constexpr IID kIid{
      0x5B584C94, 0x8FB4, 0x4647, {0xAF, 0xE6, 0x87, 0x90, 0x85, 0x60, 0x0D, 0xBF}};
  virtual HRESULT STDMETHODCALLTYPE get_Description(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_SerialNumber(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_VendorId(LONG* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_ProductId(LONG* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_DriverKeyName(BSTR* pVal) = 0;
  // The text dump of the node and all below it; lines end with "\r\n".
  virtual HRESULT STDMETHODCALLTYPE get_ToString(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Vendor(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Product(BSTR* pVal) = 0;
};

struct IZKUMHostController : IUnknown {
  static constexpr IID kIid{
      0xDFDABA17, 0xD518, 0x42A6, {0x81, 0xDE, 0xC9, 0x0C, 0x8E, 0xC3, 0x2B, 0xCF}};
  // The name under which the controller was opened.
  virtual HRESULT STDMETHODCALLTYPE get_LeafName(BSTR* pVal) = 0;
};

struct IZKUMHubDevice : IUnknown {
  static constexpr IID kIid{
      0x92A25D95, 0x3963, 0x45EF, {0x89, 0x5F, 0xEA, 0x42, 0xB4, 0xDD, 0x37, 0xAA}};
  virtual HRESULT STDMETHODCALLTYPE get_PathName(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_ConnectionName(BSTR* pVal) = 0;
};

struct IZKUMHubPort : IUnknown {
  static constexpr IID kIid{
      0xA49B9696, 0x751E, 0x4402, {0xA7, 0x33, 0x3A, 0xD4, 0x6F, 0x48, 0xA5, 0xA0}};
  // 1 is the first port of a hub.
  virtual HRESULT STDMETHODCALLTYPE get_PortIndex(LONG* pVal) = 0;
};

struct IZKUMPortDevice : IUnknown {
  static constexpr IID kIid{
      0xE5E8F6BE, 0x7753, 0x4041, {0x88, 0x0B, 0x16, 0xD3, 0x1F, 0x61, 0x39, 0x7E}};
  virtual HRESULT STDMETHODCALLTYPE get_Product(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Manufacturer1(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Speed(ULONG* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_NumberInterfaces(BYTE* pVal) = 0;
  // One IZKUMInterfaceDescr for each interface descriptor. Keep the port device as long as the
  // collection is in use, and ask again only when done with it.
  virtual HRESULT STDMETHODCALLTYPE get_InterfaceDescriptors(IEnumVARIANT** ppIIiterfaceDescr) = 0;
  // Searches below `pNode`, that node first. S_FALSE when there is none: `ppNodeOfType` is then
  // left as it was. When `pNode` is itself of that kind it is handed back without a new reference.
  virtual HRESULT STDMETHODCALLTYPE get_FirstChildOfType(IZKUMUsbTreeNode* pNode,
                                                         TUsbDeviceType nType,
                                                         IZKUMUsbTreeNode** ppNodeOfType) = 0;
};

struct IZKUMInterfaceDescr : IUnknown {
  static constexpr IID kIid{
      0xD107033F, 0x3A53, 0x4406, {0xAF, 0x19, 0x13, 0x54, 0x34, 0x70, 0xDD, 0xB2}};
  virtual HRESULT STDMETHODCALLTYPE get_InterfaceClass(BYTE* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_InterfaceSubClass(BYTE* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_InterfaceProtocol(BYTE* pVal) = 0;
};

// Device-manager data. A port device offers that of its own device node, and answers E_FAIL when it
// has none.
struct IZKUMInfoDevice : IUnknown {
  static constexpr IID kIid{
      0xF089A5D3, 0x01B2, 0x4B44, {0x81, 0x7B, 0x20, 0x0F, 0x94, 0x48, 0x9B, 0xBD}};
  virtual HRESULT STDMETHODCALLTYPE get_Service(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_FriendlyName(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Location(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Manufacturer(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_HardwareId(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_PhysicalName(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_DevClass(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_EnumName(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_ClassGuid(GUID* pVal) = 0;
};

// A disk or volume below a USB device. VendorId and ProductId are the texts of its storage
// descriptor here, not numbers.
struct IZKUMInterfaceDevice : IUnknown {
  static constexpr IID kIid{
      0xB67689B6, 0x7C60, 0x465C, {0xA5, 0x41, 0x98, 0x78, 0x36, 0x8A, 0x6A, 0xE5}};
  virtual HRESULT STDMETHODCALLTYPE get_VolumeName(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_VendorId(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_ProductId(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_ProductRev(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_DevicePath(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_MountPoint(BSTR* pVal) = 0;
  // One VT_BSTR for each mount point. Keep the node as long as the collection is in use, and ask
  // again only when done with it.
  virtual HRESULT STDMETHODCALLTYPE get_MountPoints(IEnumVARIANT** ppIUsbTreeNode) = 0;
};

// The tree. The queries never build: without an event notifier in the process the tree is empty and
// RootNode answers E_POINTER.
struct IZKUMUsbTree : IUnknown {
  static constexpr IID kIid{
      0x236C9B37, 0xB991, 0x48C2, {0xB1, 0x4A, 0x34, 0x0A, 0x28, 0x63, 0x82, 0x82}};
  virtual HRESULT STDMETHODCALLTYPE get_RootNode(IZKUMUsbTreeNode** ppIUsbTreeNode) = 0;
  // 0xFFFFFFFF finds the devices whose id is not known.
  virtual HRESULT STDMETHODCALLTYPE
  get_PortDevicesWithVendorId(ULONG nVendorId, IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_VendorProductDevices(
      ULONG nVendorId, ULONG nProductId, IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) = 0;
  virtual HRESULT STDMETHODCALLTYPE
  get_PortDevicesWithVolume(IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) = 0;
};
