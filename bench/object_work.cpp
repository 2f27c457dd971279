#include "bench/object_work.h"

#include <stdexcept>
#include <string>

#include "bench/allocation_count.h"
#include "bench/object_reader.h"
#include "com/usb_tree.h"
#include "platform/com_controls.h"
#include "platform/system.h"

namespace bench {

namespace {

using KelvoUHW::ComPtr;
using NodeList = ComPtr<IZKUMUsbTreeNodeEnumerator>;

// Of every stick that a generated PC has.
constexpr ULONG kStickVendor = 0x0781;
constexpr ULONG kStickProduct = 0x5580;

void Expect(HRESULT result) {
  if (result != S_OK) throw std::logic_error("a call failed with " + std::to_string(result));
}

}  // namespace

const char* NameOf(ObjectWork work) noexcept {
  static constexpr const char* kNames[] = {"read",   "dump",    "subtree",
                                           "vendor", "product", "volume"};
  return kNames[static_cast<std::size_t>(work)];
}

ObjectWorkload::ObjectWorkload(platform::simulated::GeneratedShape shape, std::size_t devices)
    : m_pc(GenerateMachine(shape, devices)) {
  platform::SetCurrentSystem({.host = &m_pc});
  KelvoUHW::ComObject<KelvoUHW::CZKUMUsbTree>* created = nullptr;
  Expect(KelvoUHW::ComObject<KelvoUHW::CZKUMUsbTree>::Create(created));
  m_tree = ComPtr<IZKUMUsbTree>::Attach(created);
  Expect(created->BuildTree());
  m_nodes = ReadAll();
}

ObjectWorkload::~ObjectWorkload() {
  m_tree.Reset();
  platform::SetCurrentSystem({});
}

ObjectCost ObjectWorkload::CostOf(ObjectWork work) const {
  const std::uint64_t allocations = AllocationCount();
  const std::int64_t texts = platform::controls::CountBstrs().allocated;
  const std::size_t brought = Run(work);
  return {.nodes = static_cast<double>(m_nodes),
          .brought = static_cast<double>(brought),
          .allocations = static_cast<double>(AllocationCount() - allocations),
          .texts = static_cast<double>(platform::controls::CountBstrs().allocated - texts)};
}

ComPtr<IZKUMUsbTreeNode> ObjectWorkload::Root() const {
  ComPtr<IZKUMUsbTreeNode> root;
  Expect(m_tree->get_RootNode(root.Put()));
  return root;
}

std::size_t ObjectWorkload::ReadAll() const {
  return testing_support::WalkChilds(Root(), [](const ComPtr<IZKUMUsbTreeNode>& node) {
    testing_support::ReadProperties(node, [](const char*, HRESULT result, const auto&) {
      // A port device that the device manager does not know has no data of the device manager.
      if (result != E_FAIL) Expect(result);
    });
  });
}

// As a client gets it: nothing but the component's own work.
void ObjectWorkload::Dump() const {
  BSTR text = nullptr;
  const HRESULT result = Root().As<IZKUMUsbDevice>()->get_ToString(&text);
  const KelvoUHW::Variant owner = KelvoUHW::Variant::OfBstr(text);
  Expect(result);
  if (SysStringLen(text) == 0) throw std::logic_error("no dump");
}

std::size_t ObjectWorkload::Run(ObjectWork work) const {
  NodeList list;
  switch (work) {
    case ObjectWork::Read:
      return ReadAll();
    case ObjectWork::Dump:
      Dump();
      return m_nodes;
    case ObjectWork::Subtree:
      Expect(Root()->get_InSubtreeDevicesOfType(KUDTInterfaceDevice, list.Put()));
      break;
    case ObjectWork::Vendor:
      Expect(m_tree->get_PortDevicesWithVendorId(kStickVendor, list.Put()));
      break;
    case ObjectWork::Product:
      Expect(m_tree->get_VendorProductDevices(kStickVendor, kStickProduct, list.Put()));
      break;
    case ObjectWork::Volume:
      Expect(m_tree->get_PortDevicesWithVolume(list.Put()));
      break;
  }
  std::size_t found = 0;
  testing_support::ForEachNode(*list.Get(), [&](HRESULT result, const ComPtr<IZKUMUsbTreeNode>&) {
    found += result == S_OK;
  });
  if (found == 0) throw std::logic_error(std::string(NameOf(work)) + ": nothing found");
  return found;
}

}  // namespace bench
