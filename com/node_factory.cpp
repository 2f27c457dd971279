#include "com/interface_device_node.h"
#include "com/node_object.h"
#include "com/port_device_node.h"
#include "com/typed_nodes.h"
#include "records/record_lock.h"

namespace KelvoUHW {

namespace {

template <class Class>
HRESULT Wrap(const NodePtr& node, IZKUMUsbTreeNode** out) noexcept {
  ComObject<Class>* object = nullptr;
  const HRESULT result = ComObject<Class>::Create(object);
  if (FAILED(result)) return result;
  object->SetImpl(node);
  *out = object;
  return S_OK;
}

}  // namespace

HRESULT CreateNodeObject(const NodePtr& node, IZKUMUsbTreeNode** out) noexcept {
  if (out) *out = nullptr;
  const RecordReadLock lock;  // the record may be destroyed at any other moment
  if (!node || out == nullptr) return E_POINTER;
  switch (node->m_nType) {
    case KUDTHostController:
      return Wrap<CZKUMHostController>(node, out);
    case KUDTHub:
      return Wrap<CZKUMHubDevice>(node, out);
    case KUDTHubPort:
      return Wrap<CZKUMHubPort>(node, out);
    case KUDTPortDevice:
      return Wrap<CZKUMPortDevice>(node, out);
    case KUDTInfoDevice:
      return Wrap<CZKUMInfoDevice>(node, out);
    case KUDTInterfaceDevice:
      return Wrap<CZKUMInterfaceDevice>(node, out);
    case KUDTUnknown:
    case KUDTRoot:
      break;
  }
  return Wrap<CZKUMUsbTreeNode>(node, out);
}

}  // namespace KelvoUHW
