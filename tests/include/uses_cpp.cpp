// A C++ program as it uses the header, from C++11 on: identifiers by type, the system's own smart pointers.
#include <zkusb_monitor.h>
#ifdef __MINGW32__
#include <comdef.h>

_COM_SMARTPTR_TYPEDEF(IZKUMUsbTree, __uuidof(IZKUMUsbTree));
#endif

static_assert(sizeof(TDeviceEventType) == 4 && sizeof(TUsbDeviceType) == 4, "as the type library has them");
static_assert(KDeviceModified == 3 && KUDTInterfaceDevice == 7, "the last of their kind");

bool SameIdentifiers() {
  return IsEqualGUID(__uuidof(IZKUMUsbTree), IID_IZKUMUsbTree) &&
         IsEqualGUID(__uuidof(ZKUMUsbTree), CLSID_ZKUMUsbTree) &&
         IsEqualGUID(__uuidof(IZKDeviceEventCallBack), DIID_IZKDeviceEventCallBack);
}

int main() {
  IZKUMUsbTree* tree = nullptr;
  const HRESULT made = CoCreateInstance(__uuidof(ZKUMUsbTree), nullptr, CLSCTX_INPROC_SERVER, IID_PPV_ARGS(&tree));
  if (FAILED(made)) return 1;
#ifdef __MINGW32__
  const IZKUMUsbTreePtr owned(tree, false);
#endif
  IZKUMUsbTreeNode* root = nullptr;
  return tree->get_RootNode(&root) == E_POINTER && SameIdentifiers() ? 0 : 1;
}
