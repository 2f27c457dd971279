/* A C program as it uses the header. */
#define COBJMACROS
#include <zkusb_monitor_c.h>

int main(void) {
  IZKUMUsbTree* tree = NULL;
  IZKUMUsbTreeNode* root = NULL;
  const HRESULT made =
      CoCreateInstance(&CLSID_ZKUMUsbTree, NULL, CLSCTX_INPROC_SERVER, &IID_IZKUMUsbTree, (void**)&tree);
  if (FAILED(made)) return 1;
  return IZKUMUsbTree_get_RootNode(tree, &root) == E_POINTER && IZKUMUsbTree_Release(tree) == 0 ? 0 : 1;
}
