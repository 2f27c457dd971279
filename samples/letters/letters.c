/* Prints each drive letter of a USB device with its vendor, product and serial number, in C. */
#define COBJMACROS
#include "zkusb_monitor_c.h"

#include <stdio.h>

/* The first Advise builds the tree, so there has to be a sink. This one only counts: an object of the program's own. */
static LONG g_events;

static HRESULT STDMETHODCALLTYPE Sink_QueryInterface(IDispatch* This, REFIID iid, void** object) {
  if (!IsEqualGUID(iid, &IID_IUnknown) && !IsEqualGUID(iid, &IID_IDispatch) &&
      !IsEqualGUID(iid, &DIID_IZKDeviceEventCallBack)) {
    *object = NULL;
    return E_NOINTERFACE;
  }
  *object = This;
  return S_OK;
}
/* It lives as long as the program. */
static ULONG STDMETHODCALLTYPE Sink_AddRef(IDispatch* This) { return (void)This, 2; }
static ULONG STDMETHODCALLTYPE Sink_Release(IDispatch* This) { return (void)This, 1; }
static HRESULT STDMETHODCALLTYPE Sink_GetTypeInfoCount(IDispatch* This, UINT* count) {
  (void)This;
  *count = 0;
  return S_OK;
}
static HRESULT STDMETHODCALLTYPE Sink_GetTypeInfo(IDispatch* This, UINT index, LCID locale, ITypeInfo** info) {
  return (void)This, (void)index, (void)locale, (void)info, E_NOTIMPL;
}
static HRESULT STDMETHODCALLTYPE Sink_GetIDsOfNames(IDispatch* This, REFIID iid, LPOLESTR* names, UINT count,
                                                    LCID locale, DISPID* ids) {
  return (void)This, (void)iid, (void)names, (void)count, (void)locale, (void)ids, E_NOTIMPL;
}
/* parameters->rgvarg[0] is the device (VT_UNKNOWN), rgvarg[1] the kind of event (VT_I4). */
static HRESULT STDMETHODCALLTYPE Sink_Invoke(IDispatch* This, DISPID member, REFIID iid, LCID locale, WORD flags,
                                             DISPPARAMS* parameters, VARIANT* result, EXCEPINFO* exception,
                                             UINT* argument) {
  (void)This, (void)iid, (void)locale, (void)flags, (void)result, (void)exception, (void)argument;
  if (member == 1 && parameters->cArgs == 2) InterlockedIncrement(&g_events);
  return S_OK;
}
static IDispatchVtbl g_sinkMethods = {Sink_QueryInterface, Sink_AddRef,        Sink_Release, Sink_GetTypeInfoCount,
                                      Sink_GetTypeInfo,    Sink_GetIDsOfNames, Sink_Invoke};
static IDispatch g_sink = {&g_sinkMethods};

static void PrintText(const char* before, HRESULT read, BSTR* text) {
  char utf8[1024] = "";
  if (SUCCEEDED(read) && *text) WideCharToMultiByte(CP_UTF8, 0, *text, -1, utf8, sizeof utf8, NULL, NULL);
  utf8[sizeof utf8 - 1] = 0;
  printf("%s%s", before, utf8);
  SysFreeString(*text);
}

/* One line for each mount point of a disk or volume. */
static void PrintMountPoints(IZKUMUsbDevice* device, IZKUMInterfaceDevice* disk) {
  IEnumVARIANT* points = NULL;
  VARIANT point;
  if (FAILED(IZKUMInterfaceDevice_get_MountPoints(disk, &points))) return;
  VariantInit(&point);
  while (IEnumVARIANT_Next(points, 1, &point, NULL) == S_OK) {
    BSTR letter = SysAllocString(point.bstrVal), vendor = NULL, product = NULL, serial = NULL;
    PrintText("", S_OK, &letter);
    PrintText(" ", IZKUMInterfaceDevice_get_VendorId(disk, &vendor), &vendor);
    PrintText(", ", IZKUMInterfaceDevice_get_ProductId(disk, &product), &product);
    PrintText(", ", IZKUMUsbDevice_get_SerialNumber(device, &serial), &serial);
    puts("");
    VariantClear(&point);
  }
  IEnumVARIANT_Release(points);
}

static void PrintDevice(IZKUMUsbTreeNode* node) {
  IZKUMUsbDevice* device = NULL;
  IZKUMUsbTreeNodeEnumerator* disks = NULL;
  VARIANT_BOOL more = VARIANT_FALSE;
  if (FAILED(IZKUMUsbTreeNode_QueryInterface(node, &IID_IZKUMUsbDevice, (void**)&device))) return;
  if (SUCCEEDED(IZKUMUsbTreeNode_get_InSubtreeDevicesOfType(node, KUDTInterfaceDevice, &disks)) && disks) {
    while (SUCCEEDED(IZKUMUsbTreeNodeEnumerator_MoveNext(disks, &more)) && more) {
      IZKUMUsbTreeNode* below = NULL;
      IZKUMInterfaceDevice* disk = NULL;
      if (FAILED(IZKUMUsbTreeNodeEnumerator_GetCurrent(disks, &below))) continue;
      if (SUCCEEDED(IZKUMUsbTreeNode_QueryInterface(below, &IID_IZKUMInterfaceDevice, (void**)&disk))) {
        PrintMountPoints(device, disk);
        IZKUMInterfaceDevice_Release(disk);
      }
      IZKUMUsbTreeNode_Release(below);
    }
    IZKUMUsbTreeNodeEnumerator_Release(disks);
  }
  IZKUMUsbDevice_Release(device);
}

int main(void) {
  IZKUMEventNotifier* notifier = NULL;
  IConnectionPointContainer* points = NULL;
  IConnectionPoint* point = NULL;
  IZKUMUsbTree* tree = NULL;
  IZKUMUsbTreeNodeEnumerator* devices = NULL;
  VARIANT_BOOL more = VARIANT_FALSE;
  DWORD cookie = 0;

  /* The multithreaded apartment: see docs/contract.md. */
  HRESULT result = CoInitializeEx(NULL, COINIT_MULTITHREADED);
  if (SUCCEEDED(result)) {
    result = CoCreateInstance(&CLSID_ZKUMEventNotifier, NULL, CLSCTX_INPROC_SERVER, &IID_IZKUMEventNotifier,
                              (void**)&notifier);
  }
  if (SUCCEEDED(result)) {
    result = CoCreateInstance(&CLSID_ZKUMUsbTree, NULL, CLSCTX_INPROC_SERVER, &IID_IZKUMUsbTree, (void**)&tree);
  }
  if (SUCCEEDED(result)) {
    result = IZKUMEventNotifier_QueryInterface(notifier, &IID_IConnectionPointContainer, (void**)&points);
  }
  if (SUCCEEDED(result)) {
    result = IConnectionPointContainer_FindConnectionPoint(points, &DIID_IZKDeviceEventCallBack, &point);
  }
  if (SUCCEEDED(result)) result = IConnectionPoint_Advise(point, (IUnknown*)&g_sink, &cookie);
  if (SUCCEEDED(result)) result = IZKUMUsbTree_get_PortDevicesWithVolume(tree, &devices);
  if (FAILED(result)) {
    fprintf(stderr, "no tree: 0x%08lX\n", (unsigned long)result);
    return 1;
  }
  while (SUCCEEDED(IZKUMUsbTreeNodeEnumerator_MoveNext(devices, &more)) && more) {
    IZKUMUsbTreeNode* node = NULL;
    if (FAILED(IZKUMUsbTreeNodeEnumerator_GetCurrent(devices, &node))) continue;
    PrintDevice(node);
    IZKUMUsbTreeNode_Release(node);
  }
  printf("%ld USB devices\n", g_events);
  IZKUMUsbTreeNodeEnumerator_Release(devices);
  IConnectionPoint_Unadvise(point, cookie);
  IConnectionPoint_Release(point);
  IConnectionPointContainer_Release(points);
  IZKUMUsbTree_Release(tree);
  IZKUMEventNotifier_Release(notifier);
  CoUninitialize();
  return 0;
}
