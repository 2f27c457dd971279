// What COM asks of every object: which interfaces it answers for, one identity, exact reference counts, and
// methods in their published slots.
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "tests/support/com_objects.h"
#include "tests/support/desk_pc.h"
#include "tests/support/tree_desk.h"

namespace KelvoUHW {
namespace {

// The identifiers as they are published, and not those of the header.
struct InterfaceRow {
  const char* name;
  const char16_t* iid;
};
const InterfaceRow kInterfaces[] = {{"IUnknown", u"{00000000-0000-0000-C000-000000000046}"},
                                    {"IDispatch", u"{00020400-0000-0000-C000-000000000046}"},
                                    {"IEnumVARIANT", u"{00020404-0000-0000-C000-000000000046}"},
                                    {"ISupportErrorInfo", u"{DF0B3D60-548F-101B-8E65-08002B2BD119}"},
                                    {"IConnectionPointContainer", u"{B196B284-BAB4-101A-B69C-00AA00341D07}"},
                                    {"IZKUMEventNotifier", u"{565B8FB4-EE30-4EE3-9B5B-E285678F1F9D}"},
                                    {"IZKUMDeviceEvent", u"{931F33F5-525B-4613-A5A7-D0E28115DD9A}"},
                                    {"IZKUMUsbTreeNode", u"{8080AF8D-857A-45C4-8296-AB1301ADFA28}"},
                                    {"IZKUMUsbTreeNodeEnumerator", u"{904023D8-3EB6-4079-B062-45C68095682E}"},
                                    {"IZKUMUsbDevice", u"{5B584C94-8FB4-4647-AFE6-879085600DBF}"},
                                    {"IZKUMHostController", u"{DFDABA17-D518-42A6-81DE-C90C8EC32BCF}"},
                                    {"IZKUMHubDevice", u"{92A25D95-3963-45EF-895F-EA42B4DD37AA}"},
                                    {"IZKUMHubPort", u"{A49B9696-751E-4402-A733-3AD46F48A5A0}"},
                                    {"IZKUMPortDevice", u"{E5E8F6BE-7753-4041-880B-16D31F61397E}"},
                                    {"IZKUMInterfaceDescr", u"{D107033F-3A53-4406-AF19-13543470DDB2}"},
                                    {"IZKUMInfoDevice", u"{F089A5D3-01B2-4B44-817B-200F94489BBD}"},
                                    {"IZKUMInterfaceDevice", u"{B67689B6-7C60-465C-A541-9878368A6AE5}"},
                                    {"IZKUMUsbTree", u"{236C9B37-B991-48C2-B14A-340A28638282}"},
                                    {"IZKDeviceEventCallBack", u"{8C4D3DF5-889F-434C-BA1C-22F23FD7CB1B}"},
                                    {"IBuildUsbTree", u"{D3A5B9E2-4C71-4F0A-9E26-81B7C05F3A94}"},
                                    {"IZKUMPrivateNotifier", u"{6E0F2C8B-93D4-4B57-A1E8-5C2D7B90F416}"},
                                    {"one of nobody", u"{12345678-9ABC-DEF0-1234-56789ABCDEF0}"}};

IID IidOfRow(const InterfaceRow& row) { return platform::ToSystemGuid(ParseGuidText(row.iid)); }

// The names of the interfaces that a pointer answers for; the pointers go to `found`.
std::string Answers(IUnknown* pointer, IUnknown* identity, std::vector<ComPtr<IUnknown>>* found) {
  std::string names;
  for (const InterfaceRow& row : kInterfaces) {
    const ULONG before = References(pointer);
    void* out = Mark<void>();
    const HRESULT result = pointer->QueryInterface(IidOfRow(row), &out);
    EXPECT_EQ(References(pointer), before + (result == S_OK ? 1 : 0)) << row.name;
    if (result == S_OK) {
      auto answered = ComPtr<IUnknown>::Attach(static_cast<IUnknown*>(out));
      EXPECT_TRUE(row.iid != kInterfaces[0].iid || answered.Get() == identity);
      names += (names.empty() ? "" : " ") + std::string(row.name);
      if (found) found->push_back(std::move(answered));
    } else {
      EXPECT_EQ(result, E_NOINTERFACE) << row.name;
      EXPECT_EQ(out, nullptr) << row.name;
    }
    EXPECT_EQ(pointer->QueryInterface(IidOfRow(row), nullptr), E_POINTER) << row.name;
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
  const struct {
    ComPtr<IUnknown> object;
    std::string answers;
  } rows[] = {
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
  VARIANT_BOOL more = VARIANT_FALSE;
  ASSERT_EQ(nodes->MoveNext(&more), S_OK);
  const struct {
    const char* what;
    IUnknown* callee;
    std::function<HRESULT(AnyOut)> call;
    ULONG references;  // 2: the list has one of its own
  } rows[] = {
      {"Childs", device.Get(), [&](AnyOut out) { return device->get_Childs(out); }, 1},
      {"InSubtreeDevicesOfType", device.Get(),
       [&](AnyOut out) { return device->get_InSubtreeDevicesOfType(KUDTPortDevice, out); }, 1},
      {"FirstChildOfType", device.Get(),
       [&](AnyOut out) {
         return device.As<IZKUMPortDevice>()->get_FirstChildOfType(device.Get(), KUDTInterfaceDevice, out);
       },
       1},
      {"InterfaceDescriptors", device.Get(),
       [&](AnyOut out) { return device.As<IZKUMPortDevice>()->get_InterfaceDescriptors(out); }, 1},
      {"MountPoints", disk.Get(), [&](AnyOut out) { return disk.As<IZKUMInterfaceDevice>()->get_MountPoints(out); }, 1},
      {"GetCurrent", nodes.Get(), [&](AnyOut out) { return nodes->GetCurrent(out); }, 2},
      {"Clone", descriptors.Get(), [&](AnyOut out) { return descriptors->Clone(out); }, 1},
      {"RootNode", query, [&](AnyOut out) { return query->get_RootNode(out); }, 1},
      {"PortDevicesWithVendorId", query, [&](AnyOut out) { return query->get_PortDevicesWithVendorId(0x0781, out); },
       1},
      {"VendorProductDevices", query, [&](AnyOut out) { return query->get_VendorProductDevices(0x0781, 0x5567, out); },
       1},
      {"PortDevicesWithVolume", query, [&](AnyOut out) { return query->get_PortDevicesWithVolume(out); }, 1},
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
template <class Result = HRESULT, class... Args>
Result CallSlot(IUnknown* object, std::size_t slot, Args... args) {
  using Method = Result (*)(IUnknown*, Args...);
  const auto* table = *reinterpret_cast<void* const* const*>(object);
  return reinterpret_cast<Method>(table[slot])(object, args...);
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
  CallSlot<void>(node, kSetImpl, &record);

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
  CallSlot<void>(node, kDeletingDestructor);
  EXPECT_EQ(ModuleLockCount(), objects);
  EXPECT_EQ(record.RingSize(), ring - 1);
}

}  // namespace
}  // namespace KelvoUHW
