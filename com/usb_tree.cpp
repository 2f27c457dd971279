#include "com/usb_tree.h"

#include <utility>
#include <vector>

#include "com/com_ptr.h"
#include "com/node_enumerator.h"
#include "com/node_object.h"
#include "platform/host.h"
#include "platform/system.h"
#include "records/record_lock.h"

namespace KelvoUHW {

namespace {

bool PassesAll(const CZKUMUsbTreeNodeImpl&) noexcept { return true; }

// The devices on hub ports that pass, in the order of the tree. What lies below one is not looked
// at.
template <class Passes>
std::vector<NodePtr> PortDevices(const NodePtr& root, Passes passes) {
  std::vector<NodePtr> devices;
  std::vector<const NodePtr*> waiting;
  const RecordReadLock lock;
  if (root) waiting.push_back(&root);
  while (!waiting.empty()) {
    const NodePtr& node = *waiting.back();
    waiting.pop_back();
    if (node->m_nType == KUDTPortDevice) {
      if (passes(*node)) devices.push_back(node);
      continue;
    }
    for (auto child = node->m_childs.rbegin(); child != node->m_childs.rend(); ++child) {
      if (*child) waiting.push_back(&*child);
    }
  }
  return devices;
}

// Appends a new object for each device that passes. One that cannot be made is appended all the
// same, as a null pointer: by design, the list tells how many there are.
template <class Passes>
void AppendDevices(const NodePtr& root, VariantVector& items, Passes passes) {
  for (const NodePtr& device : PortDevices(root, passes)) {
    ComPtr<IZKUMUsbTreeNode> object;
    CreateNodeObject(device, object.Put());
    items.push_back(Variant::OfUnknown(object.Detach()));
  }
}

// Whether an interface device lies below. Where no object can be made for the device, it has none.
bool HasVolume(const NodePtr& device) noexcept {
  ComPtr<IZKUMUsbTreeNode> node;
  if (FAILED(CreateNodeObject(device, node.Put()))) return false;
  const ComPtr<IZKUMPortDevice> portDevice = node.As<IZKUMPortDevice>();
  if (!portDevice) return false;
  // The device itself is of another kind, so what is found comes with a reference.
  ComPtr<IZKUMUsbTreeNode> found;
  const HRESULT result =
      portDevice->get_FirstChildOfType(node.Get(), KUDTInterfaceDevice, found.Put());
  return SUCCEEDED(result) && found;
}

}  // namespace

HRESULT CZKUMUsbTree::FinalConstruct() noexcept {
  const platform::System system = platform::CurrentSystem();
  if (system.host == nullptr) return E_FAIL;
  const HRESULT result = Guarded([&] {
    m_pBuilder = std::make_unique<CZKUMUsbTreeBuilder>(*system.host);
    return S_OK;
  });
  return FAILED(result) ? E_FAIL : S_OK;
}

void CZKUMUsbTree::FinalRelease() noexcept { m_pBuilder.reset(); }

CZKUMUsbTree::~CZKUMUsbTree() = default;

// The common frame of the three searches.
template <class Collect>
HRESULT CZKUMUsbTree::Query(IZKUMUsbTreeNodeEnumerator** out, Collect collect) noexcept {
  return Guarded([&] {
    std::unique_ptr<VariantVector> items(new (std::nothrow) VariantVector);
    if (out == nullptr) return E_POINTER;
    *out = nullptr;
    if (!items) return E_POINTER;
    collect(m_pBuilder->Root(), *items);
    return CreateNodeEnumerator(items, out);
  });
}

HRESULT CZKUMUsbTree::get_RootNode(IZKUMUsbTreeNode** ppIUsbTreeNode) noexcept {
  if (ppIUsbTreeNode) *ppIUsbTreeNode = nullptr;
  return CreateNodeObject(m_pBuilder->Root(), ppIUsbTreeNode);
}

HRESULT CZKUMUsbTree::get_PortDevicesWithVendorId(
    ULONG nVendorId, IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) noexcept {
  return Query(ppPortDevicesEnum, [&](const NodePtr& root, VariantVector& items) {
    AppendDevices(root, items, [&](const CZKUMUsbTreeNodeImpl& device) {
      return device.m_nVendorId == nVendorId;
    });
  });
}

HRESULT CZKUMUsbTree::get_VendorProductDevices(
    ULONG nVendorId, ULONG nProductId, IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) noexcept {
  return Query(ppPortDevicesEnum, [&](const NodePtr& root, VariantVector& items) {
    AppendDevices(root, items, [&](const CZKUMUsbTreeNodeImpl& device) {
      return device.m_nVendorId == nVendorId && device.m_nProductId == nProductId;
    });
  });
}

HRESULT CZKUMUsbTree::get_PortDevicesWithVolume(
    IZKUMUsbTreeNodeEnumerator** ppPortDevicesEnum) noexcept {
  return Query(ppPortDevicesEnum, [](const NodePtr& root, VariantVector& items) {
    for (const NodePtr& device : PortDevices(root, PassesAll)) {
      if (!HasVolume(device)) continue;
      ComPtr<IZKUMUsbTreeNode> object;
      CreateNodeObject(device, object.Put());
      if (object) items.push_back(Variant::OfUnknown(object.Detach()));
    }
  });
}

HRESULT CZKUMUsbTree::BuildTree() noexcept {
  return Guarded([&] { return m_pBuilder->Build() ? S_OK : S_FALSE; });
}

HRESULT CZKUMUsbTree::ResetDeviceCache() noexcept {
  m_pBuilder->CommitDeviceCache();
  return S_OK;
}

HRESULT CZKUMUsbTree::GetDeviceList(LONG nList, const DeviceList** ppList) noexcept {
  if (ppList == nullptr) return S_OK;
  *ppList = nList < 0 ? nullptr : m_pBuilder->GetDeviceList(static_cast<std::size_t>(nList));
  return S_OK;
}

}  // namespace KelvoUHW
