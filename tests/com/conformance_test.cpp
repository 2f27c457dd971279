// What COM asks of every object: interfaces, one identity, exact reference counts, methods in their published slots.
#include <array>
#include <bit>
#include <functional>
#include <sstream>

#include "tests/support/com_objects.h"
#include "tests/support/desk_pc.h"
#include "tests/support/golden.h"
#include "tests/support/tree_desk.h"

namespace KelvoUHW {
namespace {

using Interfaces = std::vector<std::pair<std::string, IID>>;

// The identifiers as they are published, and not those of the header: that of IUnknown first, nobody's last.
Interfaces ReadInterfaces() {
  std::istringstream file(testing_support::Golden("interface-ids"));
  Interfaces read;
  for (std::string iid, name; file >> iid && std::getline(file >> std::ws, name);) {
    read.emplace_back(name, platform::ToSystemGuid(ParseGuidText(platform::FromUtf8(iid).c_str())));
  }
  EXPECT_EQ(read.size(), 22u);
  return read;
}

// The names of the interfaces that a pointer answers for; the pointers go to `found`.
std::string Answers(IUnknown* pointer, IUnknown* identity, std::vector<ComPtr<IUnknown>>* found) {
  static const Interfaces interfaces = ReadInterfaces();
  std::string names;
  for (const auto& [name, iid] : interfaces) {
    const ULONG before = References(pointer);
    void* out = Mark<void>();
    const HRESULT result = pointer->QueryInterface(iid, &out);
    EXPECT_EQ(References(pointer), before + (result == S_OK ? 1 : 0)) << name;
    if (result == S_OK) {
      auto answered = ComPtr<IUnknown>::Attach(static_cast<IUnknown*>(out));
      EXPECT_TRUE(iid != interfaces[0].second || answered.Get() == identity);
      names += (names.empty() ? "" : " ") + name;
      if (found) found->push_back(std::move(answered));
    } else {
      EXPECT_EQ(result, E_NOINTERFACE) << name;
      EXPECT_EQ(out, nullptr) << name;
    }
    EXPECT_EQ(pointer->QueryInterface(iid, nullptr), E_POINTER) << name;
  }
  return names;
}

class Conformance : public ComObjects {
 protected:
  Conformance() {
    desk.Do(Stick(u"S1", 1, u'E'));
    EXPECT_EQ(desk.Rebuild(), S_OK);
    sample.device->m_interfaceDescrs.push_back(MakeRecord<InterfaceEntry>());
    device = Wrap(sample.device);
    disk = Wrap(sample.disk);
    EXPECT_EQ(Read<&IZKUMUsbTreeNode::get_Childs>(Wrap(sample.root).Get(), nodes.Put()), S_OK);
    EXPECT_EQ(Read<&IZKUMPortDevice::get_InterfaceDescriptors>(device.Get(), descriptors.Put()), S_OK);
    EXPECT_EQ(Read<&IZKUMInterfaceDevice::get_MountPoints>(disk.Get(), mountPoints.Put()), S_OK);
    VARIANT element{};
    EXPECT_EQ(descriptors->Next(1, &element, nullptr), S_OK);
    EXPECT_EQ(descriptors->Reset(), S_OK);
    descriptor = ComPtr<IUnknown>::Attach(element.punkVal);
  }

  TreeDesk desk{BarePc()};
  SampleTree sample;
  ComPtr<IUnknown> descriptor;
  ComPtr<IZKUMUsbTreeNode> device, disk;
  ComPtr<IZKUMUsbTreeNodeEnumerator> nodes;
  ComPtr<IEnumVARIANT> descriptors, mountPoints;
};

TEST_F(Conformance, EveryObjectAnswersForItsInterfacesFromEachOfThem) {
  const std::string node = "IUnknown IZKUMUsbTreeNode IZKUMUsbDevice";
  const std::pair<ComPtr<IUnknown>, std::string> rows[] = {
      {Wrap(sample.root).As<IUnknown>(), node},
      {Wrap(sample.plain).As<IUnknown>(), node},
      {Wrap(sample.controller).As<IUnknown>(), node + " IZKUMHostController"},
      {Wrap(sample.hub).As<IUnknown>(), node + " IZKUMHubDevice"},
      {Wrap(sample.port).As<IUnknown>(), node + " IZKUMHubPort"},
      {device.As<IUnknown>(), node + " IZKUMPortDevice IZKUMInfoDevice"},
      {Wrap(sample.info).As<IUnknown>(), node + " IZKUMInfoDevice"},
      {disk.As<IUnknown>(), node + " IZKUMInterfaceDevice"},
      {nodes.As<IUnknown>(), "IUnknown IZKUMUsbTreeNodeEnumerator"},
      {descriptor, "IUnknown IZKUMInterfaceDescr"},
      {descriptors.As<IUnknown>(), "IUnknown IEnumVARIANT"},
      {mountPoints.As<IUnknown>(), "IUnknown IEnumVARIANT"},
      {desk.tree.As<IUnknown>(), "IUnknown IZKUMUsbTree IBuildUsbTree"},
  };
  for (const auto& [object, expected] : rows) {
    SCOPED_TRACE(expected);
    const auto identity = object.As<IUnknown>();
    std::vector<ComPtr<IUnknown>> found;
    EXPECT_EQ(Answers(object.Get(), identity.Get(), &found), expected);
    for (const auto& pointer : found) EXPECT_EQ(Answers(pointer.Get(), identity.Get(), nullptr), expected);
  }
}

// The out pointer of any interface.
struct AnyOut {
  IUnknown** out;
  template <class Interface>
  operator Interface**() const {
    return reinterpret_cast<Interface**>(out);
  }
};

TEST_F(Conformance, WhatIsHandedOutCarriesOneReferenceOfTheCallers) {
  IZKUMUsbTree* const query = desk.tree.Get();
  const auto port = device.As<IZKUMPortDevice>();
  const auto volume = disk.As<IZKUMInterfaceDevice>();
  VARIANT_BOOL more = VARIANT_FALSE;
  ASSERT_EQ(nodes->MoveNext(&more), S_OK);
  const struct {
    const char* what;
    IUnknown* callee;
    std::function<HRESULT(AnyOut)> call;
    ULONG references = 1;
  } rows[] = {
      {"Childs", device.Get(), [&](AnyOut out) { return device->get_Childs(out); }},
      {"InSubtreeDevicesOfType", device.Get(),
       [&](AnyOut out) { return device->get_InSubtreeDevicesOfType(KUDTPortDevice, out); }},
      {"FirstChildOfType", device.Get(),
       [&](AnyOut out) { return port->get_FirstChildOfType(device.Get(), KUDTInterfaceDevice, out); }},
      {"InterfaceDescriptors", device.Get(), [&](AnyOut out) { return port->get_InterfaceDescriptors(out); }},
      {"MountPoints", disk.Get(), [&](AnyOut out) { return volume->get_MountPoints(out); }},
      {"GetCurrent", nodes.Get(), [&](AnyOut out) { return nodes->GetCurrent(out); },
       2},  // the list has one of its own
      {"Clone", descriptors.Get(), [&](AnyOut out) { return descriptors->Clone(out); }},
      {"RootNode", query, [&](AnyOut out) { return query->get_RootNode(out); }},
      {"PortDevicesWithVendorId", query, [&](AnyOut out) { return query->get_PortDevicesWithVendorId(0x0781, out); }},
      {"VendorProductDevices", query, [&](AnyOut out) { return query->get_VendorProductDevices(0x0781, 0x5567, out); }},
      {"PortDevicesWithVolume", query, [&](AnyOut out) { return query->get_PortDevicesWithVolume(out); }},
  };
  for (const auto& row : rows) {
    const ULONG before = References(row.callee);
    IUnknown* out = Mark<IUnknown>();
    EXPECT_EQ(row.call({&out}), S_OK) << row.what;
    ASSERT_NE(out, Mark<IUnknown>()) << row.what;
    EXPECT_EQ(References(out), row.references) << row.what;
    EXPECT_EQ(References(row.callee), before) << row.what;
    out->Release();
    EXPECT_EQ(row.call({nullptr}), E_POINTER) << row.what;
    EXPECT_EQ(References(row.callee), before) << row.what;
  }
}

// A method by its place in the table that an interface pointer points at.
template <class... Args>
HRESULT CallSlot(IUnknown* object, std::size_t slot, Args... args) {
  using Method = HRESULT(STDMETHODCALLTYPE*)(IUnknown*, Args...);
  const auto* table = *reinterpret_cast<void* const* const*>(object);
  return reinterpret_cast<Method>(table[slot])(object, args...);
}
// The same of a method that is C++'s own, which on 32-bit Windows takes its object in a register.
template <class... Args>
void CallOwnSlot(IUnknown* object, std::size_t slot, Args... args) {
  using Method = void (IUnknown::*)(Args...);
  const auto* table = *reinterpret_cast<void* const* const*>(object);
  // In the ABI of these builds a pointer to a method is its address and what to add to the object.
  const std::array<std::uintptr_t, 2> words{reinterpret_cast<std::uintptr_t>(table[slot]), 0};
  (object->*std::bit_cast<Method>(words))(args...);
}
constexpr std::size_t kFirstSlot = 3;  // behind QueryInterface, AddRef and Release

TEST_F(Conformance, NodeMethodsAreFollowedByDestructorAndSetImpl) {
  const std::int32_t objects = ModuleLockCount();
  ComObject<CZKUMUsbTreeNode>* created = nullptr;
  ASSERT_EQ(ComObject<CZKUMUsbTreeNode>::Create(created), S_OK);
  IZKUMUsbTreeNode* const node = created;
  // The destructor takes two slots here; the second one deletes.
  constexpr std::size_t kDeletingDestructor = kFirstSlot + 6, kSetImpl = kFirstSlot + 7;
  const NodePtr record = sample.root;
  CallOwnSlot(node, kSetImpl, &record);

  TUsbDeviceType type = KUDTUnknown;
  EXPECT_EQ(CallSlot(node, kFirstSlot + 1, &type), S_OK);
  EXPECT_EQ(type, KUDTRoot);
  IZKUMUsbTreeNode* parent = Mark<IZKUMUsbTreeNode>();
  EXPECT_EQ(CallSlot(node, kFirstSlot + 2, &parent), E_POINTER);
  EXPECT_EQ(parent, nullptr);
  ComPtr<IZKUMUsbTreeNodeEnumerator> list;
  EXPECT_EQ(CallSlot(node, kFirstSlot + 3, list.Put()), S_OK);
  EXPECT_EQ(WalkIds(list.Get()), "controller.InstanceId plain.InstanceId");
  EXPECT_EQ(CallSlot(node, kFirstSlot + 4, KUDTRoot, list.Put()), S_OK);
  EXPECT_EQ(WalkIds(list.Get()), "root.InstanceId");

  list.Reset();
  const std::size_t ring = record.RingSize();
  CallOwnSlot(node, kDeletingDestructor);
  EXPECT_EQ(ModuleLockCount(), objects);
  EXPECT_EQ(record.RingSize(), ring - 1);
}

}  // namespace
}  // namespace KelvoUHW
