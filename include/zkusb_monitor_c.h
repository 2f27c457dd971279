/* The interfaces of ZKUsbMonitor for C programs. Made from zkusb_monitor.idl: do not edit.
 *
 * Rules that hold for every method unless its comment says otherwise:
 * - The result is an HRESULT; a failed call returns nothing to release.
 * - A null out pointer gives E_POINTER (for some numbers: E_INVALIDARG).
 * - The caller frees a BSTR with SysFreeString, and releases an interface.
 * - Text properties return E_OUTOFMEMORY when memory runs out, or throw an exception that derives
 *   from std::exception.
 * - Nodes are snapshots: a node answers from the tree it was taken from, also after that tree has
 *   been replaced by a newer one.
 * - Call from the multithreaded apartment. The type library gives no parameter directions for three
 *   methods (InSubtreeDevicesOfType, FirstChildOfType, PortDevicesWithVolume): through a proxy they
 *   return S_OK but no result. */

/* clang-format off */
#ifndef ZKUSB_MONITOR_C_H
#define ZKUSB_MONITOR_C_H

#if defined(__cplusplus) && !defined(CINTERFACE)
#error "C++ programs include zkusb_monitor.h"
#endif

#include <windows.h>
#include <ocidl.h>

/* Constants that every file of a program may define, and the linker keeps once. */
#define ZKUM_ID(name, ...) const GUID DECLSPEC_SELECTANY name = {__VA_ARGS__};
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

typedef struct IZKUMEventNotifier IZKUMEventNotifier;
typedef struct IZKUMDeviceEvent IZKUMDeviceEvent;
typedef struct IZKUMUsbTreeNode IZKUMUsbTreeNode;
typedef struct IZKUMUsbTreeNodeEnumerator IZKUMUsbTreeNodeEnumerator;
typedef struct IZKUMUsbDevice IZKUMUsbDevice;
typedef struct IZKUMHostController IZKUMHostController;
typedef struct IZKUMHubDevice IZKUMHubDevice;
typedef struct IZKUMHubPort IZKUMHubPort;
typedef struct IZKUMPortDevice IZKUMPortDevice;
typedef struct IZKUMInterfaceDescr IZKUMInterfaceDescr;
typedef struct IZKUMInfoDevice IZKUMInfoDevice;
typedef struct IZKUMInterfaceDevice IZKUMInterfaceDevice;
typedef struct IZKUMUsbTree IZKUMUsbTree;

/* The notifier class's own interface, without methods: all traffic goes through the connection
 * point of DIID_IZKDeviceEventCallBack. */
typedef struct IZKUMEventNotifierVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMEventNotifier* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMEventNotifier* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMEventNotifier* This);
} IZKUMEventNotifierVtbl;
struct IZKUMEventNotifier {
  CONST_VTBL IZKUMEventNotifierVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMEventNotifier_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMEventNotifier_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMEventNotifier_Release(This) ((This)->lpVtbl->Release(This))
#endif

/* What happened to a device. */
typedef enum TDeviceEventType {
  KDeviceConnected = 0,
  KDeviceAttached = 1,
  KDeviceRemoved = 2,
  KDeviceModified = 3
} TDeviceEventType;

/* What a sink's dispatch members are: OnDeviceChanged has the dispatch identifier 1, UnAdvise 2.
 * The component calls the first through IDispatch::Invoke, and never the second. `pDeviceData` is a
 * node object. */
typedef struct IZKUMDeviceEventVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMDeviceEvent* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMDeviceEvent* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMDeviceEvent* This);
  HRESULT(STDMETHODCALLTYPE* OnDeviceChanged)(IZKUMDeviceEvent* This,
      TDeviceEventType changeStatus, IUnknown* pDeviceData);
  HRESULT(STDMETHODCALLTYPE* UnAdvise)(IZKUMDeviceEvent* This);
} IZKUMDeviceEventVtbl;
struct IZKUMDeviceEvent {
  CONST_VTBL IZKUMDeviceEventVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMDeviceEvent_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMDeviceEvent_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMDeviceEvent_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMDeviceEvent_OnDeviceChanged(This, changeStatus, pDeviceData) ((This)->lpVtbl->OnDeviceChanged(This, changeStatus, pDeviceData))
#define IZKUMDeviceEvent_UnAdvise(This) ((This)->lpVtbl->UnAdvise(This))
#endif

/* Kinds of nodes. */
typedef enum _TUsbDeviceType {
  KUDTUnknown = 0,
  KUDTRoot = 1,
  KUDTHostController = 2,
  KUDTHub = 3,
  KUDTHubPort = 4,
  KUDTPortDevice = 5,
  KUDTInfoDevice = 6,
  KUDTInterfaceDevice = 7
} TUsbDeviceType;

/* Every node of the tree. */
typedef struct IZKUMUsbTreeNodeVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMUsbTreeNode* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMUsbTreeNode* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMUsbTreeNode* This);
  HRESULT(STDMETHODCALLTYPE* get_InstanceId)(IZKUMUsbTreeNode* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_Type)(IZKUMUsbTreeNode* This, TUsbDeviceType* pType);
  /* The node that comes back owns its record: its last Release takes the record out of the tree,
   * until a build finds the next change. Walk down from the root instead. E_POINTER for the root. */
  HRESULT(STDMETHODCALLTYPE* get_Parent)(IZKUMUsbTreeNode* This,
      IZKUMUsbTreeNode** ppIUsbTreeNode);
  HRESULT(STDMETHODCALLTYPE* get_Childs)(IZKUMUsbTreeNode* This,
      IZKUMUsbTreeNodeEnumerator** ppNodeEnum);
  /* The nodes of a kind in the subtree, this node among them, parents before their children. */
  HRESULT(STDMETHODCALLTYPE* get_InSubtreeDevicesOfType)(IZKUMUsbTreeNode* This,
      TUsbDeviceType nType, IZKUMUsbTreeNodeEnumerator** ppDevicesOfTypeEnum);
} IZKUMUsbTreeNodeVtbl;
struct IZKUMUsbTreeNode {
  CONST_VTBL IZKUMUsbTreeNodeVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMUsbTreeNode_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMUsbTreeNode_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMUsbTreeNode_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMUsbTreeNode_get_InstanceId(This, pVal) ((This)->lpVtbl->get_InstanceId(This, pVal))
#define IZKUMUsbTreeNode_get_Type(This, pType) ((This)->lpVtbl->get_Type(This, pType))
#define IZKUMUsbTreeNode_get_Parent(This, ppIUsbTreeNode) ((This)->lpVtbl->get_Parent(This, ppIUsbTreeNode))
#define IZKUMUsbTreeNode_get_Childs(This, ppNodeEnum) ((This)->lpVtbl->get_Childs(This, ppNodeEnum))
#define IZKUMUsbTreeNode_get_InSubtreeDevicesOfType(This, nType, ppDevicesOfTypeEnum) ((This)->lpVtbl->get_InSubtreeDevicesOfType(This, nType, ppDevicesOfTypeEnum))
#endif

/* MoveNext goes before each GetCurrent. `pbSuccess` is not tested for null; it is set to
 * VARIANT_FALSE behind the last node. */
typedef struct IZKUMUsbTreeNodeEnumeratorVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMUsbTreeNodeEnumerator* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMUsbTreeNodeEnumerator* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMUsbTreeNodeEnumerator* This);
  HRESULT(STDMETHODCALLTYPE* MoveNext)(IZKUMUsbTreeNodeEnumerator* This, VARIANT_BOOL* pbSuccess);
  HRESULT(STDMETHODCALLTYPE* GetCurrent)(IZKUMUsbTreeNodeEnumerator* This,
      IZKUMUsbTreeNode** ppIUsbTreeNode);
} IZKUMUsbTreeNodeEnumeratorVtbl;
struct IZKUMUsbTreeNodeEnumerator {
  CONST_VTBL IZKUMUsbTreeNodeEnumeratorVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMUsbTreeNodeEnumerator_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMUsbTreeNodeEnumerator_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMUsbTreeNodeEnumerator_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMUsbTreeNodeEnumerator_MoveNext(This, pbSuccess) ((This)->lpVtbl->MoveNext(This, pbSuccess))
#define IZKUMUsbTreeNodeEnumerator_GetCurrent(This, ppIUsbTreeNode) ((This)->lpVtbl->GetCurrent(This, ppIUsbTreeNode))
#endif

/* Every node offers it. What a node does not have is an empty text, and -1 for the two numbers. */
typedef struct IZKUMUsbDeviceVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMUsbDevice* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMUsbDevice* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMUsbDevice* This);
  HRESULT(STDMETHODCALLTYPE* get_Description)(IZKUMUsbDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_SerialNumber)(IZKUMUsbDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_VendorId)(IZKUMUsbDevice* This, LONG* pVal);
  HRESULT(STDMETHODCALLTYPE* get_ProductId)(IZKUMUsbDevice* This, LONG* pVal);
  HRESULT(STDMETHODCALLTYPE* get_DriverKeyName)(IZKUMUsbDevice* This, BSTR* pVal);
  /* The text dump of the node and all below it; lines end with "\r\n". */
  HRESULT(STDMETHODCALLTYPE* get_ToString)(IZKUMUsbDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_Vendor)(IZKUMUsbDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_Product)(IZKUMUsbDevice* This, BSTR* pVal);
} IZKUMUsbDeviceVtbl;
struct IZKUMUsbDevice {
  CONST_VTBL IZKUMUsbDeviceVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMUsbDevice_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMUsbDevice_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMUsbDevice_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMUsbDevice_get_Description(This, pVal) ((This)->lpVtbl->get_Description(This, pVal))
#define IZKUMUsbDevice_get_SerialNumber(This, pVal) ((This)->lpVtbl->get_SerialNumber(This, pVal))
#define IZKUMUsbDevice_get_VendorId(This, pVal) ((This)->lpVtbl->get_VendorId(This, pVal))
#define IZKUMUsbDevice_get_ProductId(This, pVal) ((This)->lpVtbl->get_ProductId(This, pVal))
#define IZKUMUsbDevice_get_DriverKeyName(This, pVal) ((This)->lpVtbl->get_DriverKeyName(This, pVal))
#define IZKUMUsbDevice_get_ToString(This, pVal) ((This)->lpVtbl->get_ToString(This, pVal))
#define IZKUMUsbDevice_get_Vendor(This, pVal) ((This)->lpVtbl->get_Vendor(This, pVal))
#define IZKUMUsbDevice_get_Product(This, pVal) ((This)->lpVtbl->get_Product(This, pVal))
#endif

typedef struct IZKUMHostControllerVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMHostController* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMHostController* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMHostController* This);
  /* The name under which the controller was opened. */
  HRESULT(STDMETHODCALLTYPE* get_LeafName)(IZKUMHostController* This, BSTR* pVal);
} IZKUMHostControllerVtbl;
struct IZKUMHostController {
  CONST_VTBL IZKUMHostControllerVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMHostController_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMHostController_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMHostController_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMHostController_get_LeafName(This, pVal) ((This)->lpVtbl->get_LeafName(This, pVal))
#endif

typedef struct IZKUMHubDeviceVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMHubDevice* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMHubDevice* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMHubDevice* This);
  HRESULT(STDMETHODCALLTYPE* get_PathName)(IZKUMHubDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_ConnectionName)(IZKUMHubDevice* This, BSTR* pVal);
} IZKUMHubDeviceVtbl;
struct IZKUMHubDevice {
  CONST_VTBL IZKUMHubDeviceVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMHubDevice_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMHubDevice_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMHubDevice_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMHubDevice_get_PathName(This, pVal) ((This)->lpVtbl->get_PathName(This, pVal))
#define IZKUMHubDevice_get_ConnectionName(This, pVal) ((This)->lpVtbl->get_ConnectionName(This, pVal))
#endif

typedef struct IZKUMHubPortVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMHubPort* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMHubPort* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMHubPort* This);
  /* 1 is the first port of a hub. */
  HRESULT(STDMETHODCALLTYPE* get_PortIndex)(IZKUMHubPort* This, LONG* pVal);
} IZKUMHubPortVtbl;
struct IZKUMHubPort {
  CONST_VTBL IZKUMHubPortVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMHubPort_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMHubPort_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMHubPort_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMHubPort_get_PortIndex(This, pVal) ((This)->lpVtbl->get_PortIndex(This, pVal))
#endif

typedef struct IZKUMPortDeviceVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMPortDevice* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMPortDevice* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMPortDevice* This);
  HRESULT(STDMETHODCALLTYPE* get_Product)(IZKUMPortDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_Manufacturer1)(IZKUMPortDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_Speed)(IZKUMPortDevice* This, ULONG* pVal);
  HRESULT(STDMETHODCALLTYPE* get_NumberInterfaces)(IZKUMPortDevice* This, BYTE* pVal);
  /* One IZKUMInterfaceDescr for each interface descriptor. Keep the port device as long as the
   * collection is in use, and ask again only when done with it. */
  HRESULT(STDMETHODCALLTYPE* get_InterfaceDescriptors)(IZKUMPortDevice* This,
      IEnumVARIANT** ppIIiterfaceDescr);
  /* Searches below `pNode`, that node first. S_FALSE when there is none: `ppNodeOfType` is then
   * left as it was. When `pNode` is itself of that kind it is handed back without a new reference. */
  HRESULT(STDMETHODCALLTYPE* get_FirstChildOfType)(IZKUMPortDevice* This, IZKUMUsbTreeNode* pNode,
      TUsbDeviceType nType, IZKUMUsbTreeNode** ppNodeOfType);
} IZKUMPortDeviceVtbl;
struct IZKUMPortDevice {
  CONST_VTBL IZKUMPortDeviceVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMPortDevice_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMPortDevice_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMPortDevice_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMPortDevice_get_Product(This, pVal) ((This)->lpVtbl->get_Product(This, pVal))
#define IZKUMPortDevice_get_Manufacturer1(This, pVal) ((This)->lpVtbl->get_Manufacturer1(This, pVal))
#define IZKUMPortDevice_get_Speed(This, pVal) ((This)->lpVtbl->get_Speed(This, pVal))
#define IZKUMPortDevice_get_NumberInterfaces(This, pVal) ((This)->lpVtbl->get_NumberInterfaces(This, pVal))
#define IZKUMPortDevice_get_InterfaceDescriptors(This, ppIIiterfaceDescr) ((This)->lpVtbl->get_InterfaceDescriptors(This, ppIIiterfaceDescr))
#define IZKUMPortDevice_get_FirstChildOfType(This, pNode, nType, ppNodeOfType) ((This)->lpVtbl->get_FirstChildOfType(This, pNode, nType, ppNodeOfType))
#endif

typedef struct IZKUMInterfaceDescrVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMInterfaceDescr* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMInterfaceDescr* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMInterfaceDescr* This);
  HRESULT(STDMETHODCALLTYPE* get_InterfaceClass)(IZKUMInterfaceDescr* This, BYTE* pVal);
  HRESULT(STDMETHODCALLTYPE* get_InterfaceSubClass)(IZKUMInterfaceDescr* This, BYTE* pVal);
  HRESULT(STDMETHODCALLTYPE* get_InterfaceProtocol)(IZKUMInterfaceDescr* This, BYTE* pVal);
} IZKUMInterfaceDescrVtbl;
struct IZKUMInterfaceDescr {
  CONST_VTBL IZKUMInterfaceDescrVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMInterfaceDescr_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMInterfaceDescr_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMInterfaceDescr_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMInterfaceDescr_get_InterfaceClass(This, pVal) ((This)->lpVtbl->get_InterfaceClass(This, pVal))
#define IZKUMInterfaceDescr_get_InterfaceSubClass(This, pVal) ((This)->lpVtbl->get_InterfaceSubClass(This, pVal))
#define IZKUMInterfaceDescr_get_InterfaceProtocol(This, pVal) ((This)->lpVtbl->get_InterfaceProtocol(This, pVal))
#endif

/* Device-manager data. A port device offers that of its own device node, and answers E_FAIL when it
 * has none. */
typedef struct IZKUMInfoDeviceVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMInfoDevice* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMInfoDevice* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMInfoDevice* This);
  HRESULT(STDMETHODCALLTYPE* get_Service)(IZKUMInfoDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_FriendlyName)(IZKUMInfoDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_Location)(IZKUMInfoDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_Manufacturer)(IZKUMInfoDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_HardwareId)(IZKUMInfoDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_PhysicalName)(IZKUMInfoDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_DevClass)(IZKUMInfoDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_EnumName)(IZKUMInfoDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_ClassGuid)(IZKUMInfoDevice* This, GUID* pVal);
} IZKUMInfoDeviceVtbl;
struct IZKUMInfoDevice {
  CONST_VTBL IZKUMInfoDeviceVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMInfoDevice_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMInfoDevice_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMInfoDevice_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMInfoDevice_get_Service(This, pVal) ((This)->lpVtbl->get_Service(This, pVal))
#define IZKUMInfoDevice_get_FriendlyName(This, pVal) ((This)->lpVtbl->get_FriendlyName(This, pVal))
#define IZKUMInfoDevice_get_Location(This, pVal) ((This)->lpVtbl->get_Location(This, pVal))
#define IZKUMInfoDevice_get_Manufacturer(This, pVal) ((This)->lpVtbl->get_Manufacturer(This, pVal))
#define IZKUMInfoDevice_get_HardwareId(This, pVal) ((This)->lpVtbl->get_HardwareId(This, pVal))
#define IZKUMInfoDevice_get_PhysicalName(This, pVal) ((This)->lpVtbl->get_PhysicalName(This, pVal))
#define IZKUMInfoDevice_get_DevClass(This, pVal) ((This)->lpVtbl->get_DevClass(This, pVal))
#define IZKUMInfoDevice_get_EnumName(This, pVal) ((This)->lpVtbl->get_EnumName(This, pVal))
#define IZKUMInfoDevice_get_ClassGuid(This, pVal) ((This)->lpVtbl->get_ClassGuid(This, pVal))
#endif

/* A disk or volume below a USB device. VendorId and ProductId are the texts of its storage
 * descriptor here, not numbers. */
typedef struct IZKUMInterfaceDeviceVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMInterfaceDevice* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMInterfaceDevice* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMInterfaceDevice* This);
  HRESULT(STDMETHODCALLTYPE* get_VolumeName)(IZKUMInterfaceDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_VendorId)(IZKUMInterfaceDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_ProductId)(IZKUMInterfaceDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_ProductRev)(IZKUMInterfaceDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_DevicePath)(IZKUMInterfaceDevice* This, BSTR* pVal);
  HRESULT(STDMETHODCALLTYPE* get_MountPoint)(IZKUMInterfaceDevice* This, BSTR* pVal);
  /* One VT_BSTR for each mount point. Keep the node as long as the collection is in use, and ask
   * again only when done with it. */
  HRESULT(STDMETHODCALLTYPE* get_MountPoints)(IZKUMInterfaceDevice* This,
      IEnumVARIANT** ppIUsbTreeNode);
} IZKUMInterfaceDeviceVtbl;
struct IZKUMInterfaceDevice {
  CONST_VTBL IZKUMInterfaceDeviceVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMInterfaceDevice_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMInterfaceDevice_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMInterfaceDevice_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMInterfaceDevice_get_VolumeName(This, pVal) ((This)->lpVtbl->get_VolumeName(This, pVal))
#define IZKUMInterfaceDevice_get_VendorId(This, pVal) ((This)->lpVtbl->get_VendorId(This, pVal))
#define IZKUMInterfaceDevice_get_ProductId(This, pVal) ((This)->lpVtbl->get_ProductId(This, pVal))
#define IZKUMInterfaceDevice_get_ProductRev(This, pVal) ((This)->lpVtbl->get_ProductRev(This, pVal))
#define IZKUMInterfaceDevice_get_DevicePath(This, pVal) ((This)->lpVtbl->get_DevicePath(This, pVal))
#define IZKUMInterfaceDevice_get_MountPoint(This, pVal) ((This)->lpVtbl->get_MountPoint(This, pVal))
#define IZKUMInterfaceDevice_get_MountPoints(This, ppIUsbTreeNode) ((This)->lpVtbl->get_MountPoints(This, ppIUsbTreeNode))
#endif

/* The tree. The queries never build: without an event notifier in the process the tree is empty and
 * RootNode answers E_POINTER. */
typedef struct IZKUMUsbTreeVtbl {
  HRESULT(STDMETHODCALLTYPE* QueryInterface)(IZKUMUsbTree* This, REFIID riid, void** ppvObject);
  ULONG(STDMETHODCALLTYPE* AddRef)(IZKUMUsbTree* This);
  ULONG(STDMETHODCALLTYPE* Release)(IZKUMUsbTree* This);
  HRESULT(STDMETHODCALLTYPE* get_RootNode)(IZKUMUsbTree* This, IZKUMUsbTreeNode** ppIUsbTreeNode);
  /* 0xFFFFFFFF finds the devices whose id is not known. */
  HRESULT(STDMETHODCALLTYPE* get_PortDevicesWithVendorId)(IZKUMUsbTree* This, ULONG nVendorId,
      IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum);
  HRESULT(STDMETHODCALLTYPE* get_VendorProductDevices)(IZKUMUsbTree* This, ULONG nVendorId,
      ULONG nProductId, IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum);
  HRESULT(STDMETHODCALLTYPE* get_PortDevicesWithVolume)(IZKUMUsbTree* This,
      IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum);
} IZKUMUsbTreeVtbl;
struct IZKUMUsbTree {
  CONST_VTBL IZKUMUsbTreeVtbl* lpVtbl;
};
#ifdef COBJMACROS
#define IZKUMUsbTree_QueryInterface(This, riid, ppvObject) ((This)->lpVtbl->QueryInterface(This, riid, ppvObject))
#define IZKUMUsbTree_AddRef(This) ((This)->lpVtbl->AddRef(This))
#define IZKUMUsbTree_Release(This) ((This)->lpVtbl->Release(This))
#define IZKUMUsbTree_get_RootNode(This, ppIUsbTreeNode) ((This)->lpVtbl->get_RootNode(This, ppIUsbTreeNode))
#define IZKUMUsbTree_get_PortDevicesWithVendorId(This, nVendorId, ppPortDevicesEnum) ((This)->lpVtbl->get_PortDevicesWithVendorId(This, nVendorId, ppPortDevicesEnum))
#define IZKUMUsbTree_get_VendorProductDevices(This, nVendorId, nProductId, ppPortDevicesEnum) ((This)->lpVtbl->get_VendorProductDevices(This, nVendorId, nProductId, ppPortDevicesEnum))
#define IZKUMUsbTree_get_PortDevicesWithVolume(This, ppPortDevicesEnum) ((This)->lpVtbl->get_PortDevicesWithVolume(This, ppPortDevicesEnum))
#endif

#endif
