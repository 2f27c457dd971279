// A C++ program as it uses the header, from C++11 on: identifiers by type, and the smart pointers that compilers bring.
#include <zkusb_monitor.h>

#include "compilers/atlcomcli.h"
#ifdef __MINGW32__
#include <comdef.h>
#include <wrl/client.h>

_COM_SMARTPTR_TYPEDEF(IZKUMUsbTree, __uuidof(IZKUMUsbTree));
using Microsoft::WRL::ComPtr;
#endif

static_assert(sizeof(TDeviceEventType) == 4 && sizeof(TUsbDeviceType) == 4, "as the type library has them");
static_assert(KDeviceModified == 3 && KUDTInterfaceDevice == 7, "the last of their kind");

bool SameIdentifiers() {
  return IsEqualGUID(__uuidof(IZKUMUsbTree), IID_IZKUMUsbTree) &&
         IsEqualGUID(__uuidof(ZKUMUsbTree), CLSID_ZKUMUsbTree) &&
         IsEqualGUID(__uuidof(IZKDeviceEventCallBack), DIID_IZKDeviceEventCallBack);
}

// Whether a node is a port device, asked through each of them.
bool IsPortDevice(IZKUMUsbTreeNode* node) {
  CComPtr<IZKUMUsbTree> tree;
  if (FAILED(tree.CoCreateInstance(__uuidof(ZKUMUsbTree)))) return false;
  CComPtr<IZKUMUsbTreeNode> root;
  CComPtr<IZKUMPortDevice> device;
  if (FAILED(tree->get_RootNode(&root)) || FAILED(root.QueryInterface(&device))) return false;
#ifdef __MINGW32__
  ComPtr<IZKUMUsbTreeNode> held(node);
  ComPtr<IZKUMPortDevice> port;
  ComPtr<IUnknown> unknown(held);
  if (FAILED(held.As(&port)) || FAILED(unknown.As(&held))) return false;
  ComPtr<IZKUMEventNotifier> notifier;
  return SUCCEEDED(
      CoCreateInstance(__uuidof(ZKUMEventNotifier), nullptr, CLSCTX_INPROC_SERVER, IID_PPV_ARGS(&notifier)));
#else
  return CComPtr<IZKUMUsbTreeNode>(node).QueryInterface(&device) == 0;
#endif
}

int main() {
  IZKUMUsbTree* tree = nullptr;
  const HRESULT made = CoCreateInstance(__uuidof(ZKUMUsbTree), nullptr, CLSCTX_INPROC_SERVER, IID_PPV_ARGS(&tree));
  if (FAILED(made)) return 1;
#ifdef __MINGW32__
  const IZKUMUsbTreePtr owned(tree, false);
#endif
  IZKUMUsbTreeNode* root = nullptr;
  return tree->get_RootNode(&root) == E_POINTER && SameIdentifiers() && !IsPortDevice(root) ? 0 : 1;
}
