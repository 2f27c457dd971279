// The interfaces of ZKUsbMonitor for C++ programs, C++11 and later. Made from zkusb_monitor.idl: do not edit.
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

// clang-format off
#ifndef ZKUSB_MONITOR_H
#define ZKUSB_MONITOR_H

#ifndef __cplusplus
#error "C programs include zkusb_monitor_c.h"
#endif

#include <windows.h>
#include <ocidl.h>

// Constants that every file of a program may define, and the linker keeps once.
#define ZKUM_ID(name, ...) extern "C" const GUID DECLSPEC_SELECTANY name = {__VA_ARGS__};
ZKUM_ID(LIBID_ZKUsbMonitorLib, 0xA2AC77FD, 0x36C6, 0x4C2A, {0xB2, 0x38, 0xF8, 0x9B, 0x35, 0xDA, 0xA5, 0x70})
ZKUM_ID(CLSID_ZKUMEventNotifier, 0x1D7E7A5B, 0x648D, 0x4236, {0x86, 0x04, 0x8F, 0x5F, 0x3C, 0x82, 0x43, 0x3A})
ZKUM_ID(CLSID_ZKUMUsbTree, 0x34349D2D, 0x14C6, 0x414B, {0x97, 0x71, 0xA7, 0xBD, 0x2A, 0x7C, 0x71, 0x80})
ZKUM_ID(DIID_IZKDeviceEventCallBack, 0x8C4D3DF5, 0x889F, 0x434C, {0xBA, 0x1C, 0x22, 0xF2, 0x3F, 0xD7, 0xCB, 0x1B})
ZKUM_ID(IID_IZKUMEventNotifier, 0x565B8FB4, 0xEE30, 0x4EE3, {0x9B, 0x5B, 0xE2, 0x85, 0x67, 0x8F, 0x1F, 0x9D})
ZKUM_ID(IID_IZKUMDeviceEvent, 0x931F33F5, 0x525B, 0x4613, {0xA5, 0xA7, 0xD0, 0xE2, 0x81, 0x15, 0xDD, 0x9A})
ZKUM_ID(IID_IZKUMUsbTreeNode, 0x8080AF8D, 0x857A, 0x45C4, {0x82, 0x96, 0xAB, 0x13, 0x01, 0xAD, 0xFA, 0x28})
ZKUM_ID(IID_IZKUMUsbTreeNodeEnumerator, 0x904023D8, 0x3EB6, 0x4079, {0xB0, 0x62, 0x45, 0xC6, 0x80, 0x95, 0x68, 0x2E})
ZKUM_ID(IID_IZKUMUsbDevice, 0x5B584C94, 0x8FB4, 0x4647, {0xAF, 0xE6, 0x87, 0x90, 0x85, 0x60, 0x0D, 0xBF})
ZKUM_ID(IID_IZKUMHostController, 0xDFDABA17, 0xD518, 0x42A6, {0x81, 0xDE, 0xC9, 0x0C, 0x8E, 0xC3, 0x2B, 0xCF})
ZKUM_ID(IID_IZKUMHubDevice, 0x92A25D95, 0x3963, 0x45EF, {0x89, 0x5F, 0xEA, 0x42, 0xB4, 0xDD, 0x37, 0xAA})
ZKUM_ID(IID_IZKUMHubPort, 0xA49B9696, 0x751E, 0x4402, {0xA7, 0x33, 0x3A, 0xD4, 0x6F, 0x48, 0xA5, 0xA0})
ZKUM_ID(IID_IZKUMPortDevice, 0xE5E8F6BE, 0x7753, 0x4041, {0x88, 0x0B, 0x16, 0xD3, 0x1F, 0x61, 0x39, 0x7E})
ZKUM_ID(IID_IZKUMInterfaceDescr, 0xD107033F, 0x3A53, 0x4406, {0xAF, 0x19, 0x13, 0x54, 0x34, 0x70, 0xDD, 0xB2})
ZKUM_ID(IID_IZKUMInfoDevice, 0xF089A5D3, 0x01B2, 0x4B44, {0x81, 0x7B, 0x20, 0x0F, 0x94, 0x48, 0x9B, 0xBD})
ZKUM_ID(IID_IZKUMInterfaceDevice, 0xB67689B6, 0x7C60, 0x465C, {0xA5, 0x41, 0x98, 0x78, 0x36, 0x8A, 0x6A, 0xE5})
ZKUM_ID(IID_IZKUMUsbTree, 0x236C9B37, 0xB991, 0x48C2, {0xB1, 0x4A, 0x34, 0x0A, 0x28, 0x63, 0x82, 0x82})
#undef ZKUM_ID

// Compilers without a uuid of their own for a type get it from the system's headers.
#ifdef __CRT_UUID_DECL
#define ZKUM_UUID(type, ...) __CRT_UUID_DECL(type, __VA_ARGS__)
#else
#define ZKUM_UUID(type, ...)
#endif

struct IZKUMEventNotifier;
struct IZKUMDeviceEvent;
struct IZKUMUsbTreeNode;
struct IZKUMUsbTreeNodeEnumerator;
struct IZKUMUsbDevice;
struct IZKUMHostController;
struct IZKUMHubDevice;
struct IZKUMHubPort;
struct IZKUMPortDevice;
struct IZKUMInterfaceDescr;
struct IZKUMInfoDevice;
struct IZKUMInterfaceDevice;
struct IZKUMUsbTree;

// The notifier class's own interface, without methods: all traffic goes through the connection
// point of DIID_IZKDeviceEventCallBack.
MIDL_INTERFACE("565B8FB4-EE30-4EE3-9B5B-E285678F1F9D") IZKUMEventNotifier : public IUnknown {
};
ZKUM_UUID(IZKUMEventNotifier, 0x565B8FB4, 0xEE30, 0x4EE3, 0x9B, 0x5B, 0xE2, 0x85, 0x67, 0x8F, 0x1F, 0x9D)

// What happened to a device.
enum TDeviceEventType : int {
  KDeviceConnected = 0,
  KDeviceAttached = 1,
  KDeviceRemoved = 2,
  KDeviceModified = 3,
};

// What a sink's dispatch members are: OnDeviceChanged has the dispatch identifier 1, UnAdvise 2.
// The component calls the first through IDispatch::Invoke, and never the second. `pDeviceData` is a
// node object.
MIDL_INTERFACE("931F33F5-525B-4613-A5A7-D0E28115DD9A") IZKUMDeviceEvent : public IUnknown {
  virtual HRESULT STDMETHODCALLTYPE OnDeviceChanged(TDeviceEventType changeStatus,
      IUnknown* pDeviceData) = 0;
  virtual HRESULT STDMETHODCALLTYPE UnAdvise() = 0;
};
ZKUM_UUID(IZKUMDeviceEvent, 0x931F33F5, 0x525B, 0x4613, 0xA5, 0xA7, 0xD0, 0xE2, 0x81, 0x15, 0xDD, 0x9A)

// Kinds of nodes.
enum _TUsbDeviceType : int {
  KUDTUnknown = 0,
  KUDTRoot = 1,
  KUDTHostController = 2,
  KUDTHub = 3,
  KUDTHubPort = 4,
  KUDTPortDevice = 5,
  KUDTInfoDevice = 6,
  KUDTInterfaceDevice = 7,
};
typedef _TUsbDeviceType TUsbDeviceType;

// Every node of the tree.
MIDL_INTERFACE("8080AF8D-857A-45C4-8296-AB1301ADFA28") IZKUMUsbTreeNode : public IUnknown {
  virtual HRESULT STDMETHODCALLTYPE get_InstanceId(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Type(TUsbDeviceType* pType) = 0;
  // The node that comes back owns its record: its last Release takes the record out of the tree,
  // until a build finds the next change. Walk down from the root instead. E_POINTER for the root.
  virtual HRESULT STDMETHODCALLTYPE get_Parent(IZKUMUsbTreeNode** ppIUsbTreeNode) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Childs(IZKUMUsbTreeNodeEnumerator** ppNodeEnum) = 0;
  // The nodes of a kind in the subtree, this node among them, parents before their children.
  virtual HRESULT STDMETHODCALLTYPE get_InSubtreeDevicesOfType(TUsbDeviceType nType,
      IZKUMUsbTreeNodeEnumerator** ppDevicesOfTypeEnum) = 0;
};
ZKUM_UUID(IZKUMUsbTreeNode, 0x8080AF8D, 0x857A, 0x45C4, 0x82, 0x96, 0xAB, 0x13, 0x01, 0xAD, 0xFA, 0x28)

// MoveNext goes before each GetCurrent. `pbSuccess` is not tested for null; it is set to
// VARIANT_FALSE behind the last node.
MIDL_INTERFACE("904023D8-3EB6-4079-B062-45C68095682E") IZKUMUsbTreeNodeEnumerator : public IUnknown {
  virtual HRESULT STDMETHODCALLTYPE MoveNext(VARIANT_BOOL* pbSuccess) = 0;
  virtual HRESULT STDMETHODCALLTYPE GetCurrent(IZKUMUsbTreeNode** ppIUsbTreeNode) = 0;
};
ZKUM_UUID(IZKUMUsbTreeNodeEnumerator, 0x904023D8, 0x3EB6, 0x4079, 0xB0, 0x62, 0x45, 0xC6, 0x80, 0x95, 0x68, 0x2E)

// Every node offers it. What a node does not have is an empty text, and -1 for the two numbers.
MIDL_INTERFACE("5B584C94-8FB4-4647-AFE6-879085600DBF") IZKUMUsbDevice : public IUnknown {
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
ZKUM_UUID(IZKUMUsbDevice, 0x5B584C94, 0x8FB4, 0x4647, 0xAF, 0xE6, 0x87, 0x90, 0x85, 0x60, 0x0D, 0xBF)

MIDL_INTERFACE("DFDABA17-D518-42A6-81DE-C90C8EC32BCF") IZKUMHostController : public IUnknown {
  // The name under which the controller was opened.
  virtual HRESULT STDMETHODCALLTYPE get_LeafName(BSTR* pVal) = 0;
};
ZKUM_UUID(IZKUMHostController, 0xDFDABA17, 0xD518, 0x42A6, 0x81, 0xDE, 0xC9, 0x0C, 0x8E, 0xC3, 0x2B, 0xCF)

MIDL_INTERFACE("92A25D95-3963-45EF-895F-EA42B4DD37AA") IZKUMHubDevice : public IUnknown {
  virtual HRESULT STDMETHODCALLTYPE get_PathName(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_ConnectionName(BSTR* pVal) = 0;
};
ZKUM_UUID(IZKUMHubDevice, 0x92A25D95, 0x3963, 0x45EF, 0x89, 0x5F, 0xEA, 0x42, 0xB4, 0xDD, 0x37, 0xAA)

MIDL_INTERFACE("A49B9696-751E-4402-A733-3AD46F48A5A0") IZKUMHubPort : public IUnknown {
  // 1 is the first port of a hub.
  virtual HRESULT STDMETHODCALLTYPE get_PortIndex(LONG* pVal) = 0;
};
ZKUM_UUID(IZKUMHubPort, 0xA49B9696, 0x751E, 0x4402, 0xA7, 0x33, 0x3A, 0xD4, 0x6F, 0x48, 0xA5, 0xA0)

MIDL_INTERFACE("E5E8F6BE-7753-4041-880B-16D31F61397E") IZKUMPortDevice : public IUnknown {
  virtual HRESULT STDMETHODCALLTYPE get_Product(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Manufacturer1(BSTR* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_Speed(ULONG* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_NumberInterfaces(BYTE* pVal) = 0;
  // One IZKUMInterfaceDescr for each interface descriptor. Keep the port device as long as the
  // collection is in use, and ask again only when done with it.
  virtual HRESULT STDMETHODCALLTYPE get_InterfaceDescriptors(
      IEnumVARIANT** ppIIiterfaceDescr) = 0;
  // Searches below `pNode`, that node first. S_FALSE when there is none: `ppNodeOfType` is then
  // left as it was. When `pNode` is itself of that kind it is handed back without a new reference.
  virtual HRESULT STDMETHODCALLTYPE get_FirstChildOfType(IZKUMUsbTreeNode* pNode,
      TUsbDeviceType nType, IZKUMUsbTreeNode** ppNodeOfType) = 0;
};
ZKUM_UUID(IZKUMPortDevice, 0xE5E8F6BE, 0x7753, 0x4041, 0x88, 0x0B, 0x16, 0xD3, 0x1F, 0x61, 0x39, 0x7E)

MIDL_INTERFACE("D107033F-3A53-4406-AF19-13543470DDB2") IZKUMInterfaceDescr : public IUnknown {
  virtual HRESULT STDMETHODCALLTYPE get_InterfaceClass(BYTE* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_InterfaceSubClass(BYTE* pVal) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_InterfaceProtocol(BYTE* pVal) = 0;
};
ZKUM_UUID(IZKUMInterfaceDescr, 0xD107033F, 0x3A53, 0x4406, 0xAF, 0x19, 0x13, 0x54, 0x34, 0x70, 0xDD, 0xB2)

// Device-manager data. A port device offers that of its own device node, and answers E_FAIL when it
// has none.
MIDL_INTERFACE("F089A5D3-01B2-4B44-817B-200F94489BBD") IZKUMInfoDevice : public IUnknown {
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
ZKUM_UUID(IZKUMInfoDevice, 0xF089A5D3, 0x01B2, 0x4B44, 0x81, 0x7B, 0x20, 0x0F, 0x94, 0x48, 0x9B, 0xBD)

// A disk or volume below a USB device. VendorId and ProductId are the texts of its storage
// descriptor here, not numbers.
MIDL_INTERFACE("B67689B6-7C60-465C-A541-9878368A6AE5") IZKUMInterfaceDevice : public IUnknown {
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
ZKUM_UUID(IZKUMInterfaceDevice, 0xB67689B6, 0x7C60, 0x465C, 0xA5, 0x41, 0x98, 0x78, 0x36, 0x8A, 0x6A, 0xE5)

// The tree. The queries never build: without an event notifier in the process the tree is empty and
// RootNode answers E_POINTER.
MIDL_INTERFACE("236C9B37-B991-48C2-B14A-340A28638282") IZKUMUsbTree : public IUnknown {
  virtual HRESULT STDMETHODCALLTYPE get_RootNode(IZKUMUsbTreeNode** ppIUsbTreeNode) = 0;
  // 0xFFFFFFFF finds the devices whose id is not known.
  virtual HRESULT STDMETHODCALLTYPE get_PortDevicesWithVendorId(ULONG nVendorId,
      IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_VendorProductDevices(ULONG nVendorId, ULONG nProductId,
      IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) = 0;
  virtual HRESULT STDMETHODCALLTYPE get_PortDevicesWithVolume(
      IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) = 0;
};
ZKUM_UUID(IZKUMUsbTree, 0x236C9B37, 0xB991, 0x48C2, 0xB1, 0x4A, 0x34, 0x0A, 0x28, 0x63, 0x82, 0x82)

// The classes and the interface for events, for __uuidof alone.
class DECLSPEC_UUID("1D7E7A5B-648D-4236-8604-8F5F3C82433A") ZKUMEventNotifier;
ZKUM_UUID(ZKUMEventNotifier, 0x1D7E7A5B, 0x648D, 0x4236, 0x86, 0x04, 0x8F, 0x5F, 0x3C, 0x82, 0x43, 0x3A)
class DECLSPEC_UUID("34349D2D-14C6-414B-9771-A7BD2A7C7180") ZKUMUsbTree;
ZKUM_UUID(ZKUMUsbTree, 0x34349D2D, 0x14C6, 0x414B, 0x97, 0x71, 0xA7, 0xBD, 0x2A, 0x7C, 0x71, 0x80)
struct DECLSPEC_UUID("8C4D3DF5-889F-434C-BA1C-22F23FD7CB1B") IZKDeviceEventCallBack;
ZKUM_UUID(IZKDeviceEventCallBack, 0x8C4D3DF5, 0x889F, 0x434C, 0xBA, 0x1C, 0x22, 0xF2, 0x3F, 0xD7, 0xCB, 0x1B)

#undef ZKUM_UUID

#endif
