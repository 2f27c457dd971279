// Objects of the component: a tree with a node of each kind, calls whose outcome is a text, what a test leaves behind.
#pragma once

#include <gtest/gtest.h>

#include <concepts>
#include <cstdint>
#include <cstring>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "bench/object_reader.h"
#include "com/com_error.h"
#include "com/com_ptr.h"
#include "com/module_lock.h"
#include "com/node_object.h"
#include "com/zkusb_monitor.h"
#include "platform/com_controls.h"
#include "platform/text.h"
#include "records/info_device.h"
#include "records/interface_device.h"
#include "records/port_device.h"
#include "records/records.h"

namespace KelvoUHW {

// Fails a test that leaves objects or texts behind.
class ComObjects : public testing::Test {
 protected:
  ~ComObjects() override {
    EXPECT_EQ(ModuleLockCount(), m_objects) << "objects";
    EXPECT_EQ(platform::controls::CountBstrs().alive, m_texts) << "texts";
  }

 private:
  const std::int32_t m_objects = ModuleLockCount();
  const std::int64_t m_texts = platform::controls::CountBstrs().alive;
};

// What out pointers hold before a call.
template <class T>
T* Mark() {
  return reinterpret_cast<T*>(std::uintptr_t{0xA5A5A5A5});
}

inline ULONG References(IUnknown* object) {
  object->AddRef();
  return object->Release();
}

inline std::string CodeName(HRESULT code) {
  static const std::pair<HRESULT, const char*> names[] = {{S_OK, "S_OK"},
                                                          {S_FALSE, "S_FALSE"},
                                                          {E_POINTER, "E_POINTER"},
                                                          {E_FAIL, "E_FAIL"},
                                                          {E_INVALIDARG, "E_INVALIDARG"},
                                                          {E_OUTOFMEMORY, "E_OUTOFMEMORY"},
                                                          {E_NOTIMPL, "E_NOTIMPL"},
                                                          {E_NOINTERFACE, "E_NOINTERFACE"}};
  for (const auto& [known, name] : names) {
    if (known == code) return name;
  }
  return platform::ToUtf8(platform::Hex(static_cast<std::uint32_t>(code), 8));
}

// The code that a call returns or raises.
template <class Call>
std::string CodeOf(Call call) {
  try {
    return CodeName(call());
  } catch (const ComError& error) {
    return "raised " + CodeName(error.Code());
  }
}

template <class Getter>
struct GetterTraits;
template <class I, class V>
struct GetterTraits<HRESULT (STDMETHODCALLTYPE I::*)(V*)> {
  using Interface = I;
  using Value = V;
};

// A property as a function of whatever object offers it.
template <auto Getter, class Value = typename GetterTraits<decltype(Getter)>::Value>
HRESULT Read(IUnknown* object, Value* out) {
  const auto asked = ComPtr<IUnknown>(object).As<typename GetterTraits<decltype(Getter)>::Interface>();
  return asked ? (asked.Get()->*Getter)(out) : E_NOINTERFACE;
}

// "CODE text", "CODE null" or "CODE untouched"; the code alone where no out pointer is given to `getter`.
template <class Getter>
std::string TextOf(Getter getter, bool giveOut = true) {
  BSTR text = Mark<OLECHAR>();
  const std::string code = CodeOf([&] { return getter(giveOut ? &text : nullptr); });
  if (!giveOut) return code;
  if (text == Mark<OLECHAR>()) return code + " untouched";
  const std::string outcome = text ? platform::ToUtf8(platform::BstrText(text)) : "null";
  SysFreeString(text);
  return code + " " + outcome;
}
// The same of a property.
using TextProperty = HRESULT (*)(IUnknown* object, BSTR* out);
inline std::string TextOf(TextProperty property, IUnknown* object, bool giveOut = true) {
  return TextOf([&](BSTR* out) { return property(object, out); }, giveOut);
}

// "CODE value"; of a GUID its first number.
template <auto Getter, class Value = typename GetterTraits<decltype(Getter)>::Value>
std::string NumberOf(IUnknown* object, bool giveOut = true) {
  Value value{};
  std::memset(static_cast<void*>(&value), 0x5A, sizeof value);
  const std::string code = CodeOf([&] { return Read<Getter>(object, giveOut ? &value : nullptr); });
  if (!giveOut) return code;
  if constexpr (std::same_as<Value, GUID>) {
    return code + " " + std::to_string(value.Data1);
  } else {
    return code + " " + std::to_string(value);
  }
}

inline ComPtr<IZKUMUsbTreeNode> Wrap(const NodePtr& node) {
  ComPtr<IZKUMUsbTreeNode> object;
  EXPECT_EQ(CreateNodeObject(node, object.Put()), S_OK);
  return object;
}

inline std::string InstanceId(IUnknown* node) { return TextOf(&Read<&IZKUMUsbTreeNode::get_InstanceId>, node); }

// The instance ids of a list, in order: "a b c".
inline std::string WalkIds(IZKUMUsbTreeNodeEnumerator* list) {
  std::string ids;
  testing_support::ForEachNode(*list, [&](HRESULT result, const ComPtr<IZKUMUsbTreeNode>& node) {
    EXPECT_EQ(result, S_OK);
    if (node) ids += (ids.empty() ? "" : " ") + InstanceId(node.Get()).substr(sizeof "S_OK");
  });
  return ids;
}

// What steps on a COM enumerator bring, "CODE..., CODE...": n2 asks next(enumerator, 2, true), n2! with false; s2 skips
// two, r starts again, c goes on with a clone, which does not notice what the first one does.
template <class Enumerator, class Next>
std::string Play(ComPtr<Enumerator>& list, const std::string& steps, Next next) {
  std::string outcome;
  std::istringstream words(steps);
  for (std::string step; words >> step;) {
    const auto count = static_cast<ULONG>(step.size() > 1 ? std::stoul(step.substr(1)) : 0);
    outcome += outcome.empty() ? "" : ", ";
    if (step[0] == 'n') outcome += next(list.Get(), count, step.back() != '!');
    if (step[0] == 's') outcome += CodeName(list->Skip(count));
    if (step[0] == 'r') outcome += CodeName(list->Reset());
    if (step[0] == 'c') {
      ComPtr<Enumerator> clone;
      outcome += CodeName(list->Clone(clone.Put()));
      list->Skip(9);
      list = clone;
    }
  }
  EXPECT_EQ(list->Clone(nullptr), E_POINTER);
  EXPECT_EQ(list->Next(1, nullptr, nullptr), E_POINTER);
  return outcome;
}

// A record with an id and children.
template <class Record, class... Args>
RingPtr<Record> MakeNode(const std::u16string& id, const std::vector<NodePtr>& childs = {}, Args&&... args) {
  auto record = MakeRecord<Record>(std::forward<Args>(args)...);
  record->m_strDevInstId = id;
  for (const NodePtr& child : childs) AddChild(child, record.Get());
  return record;
}

// A tree with a node of each kind. Each text of a node is KIND.PROPERTY, such as "hub.PathName".
struct SampleTree {
  SampleTree();

  RingPtr<CZKUMInterfaceDeviceImpl> disk = MakeNode<CZKUMInterfaceDeviceImpl>(u"disk");
  InfoDevicePtr info = MakeNode<CZKUMInfoDeviceImpl>(u"info", {disk});
  RingPtr<CZKUMPortDeviceImpl> device =
      MakeNode<CZKUMPortDeviceImpl>(u"device", {info}, 5u, nullptr, nullptr, nullptr, u"", u"", u"");
  RingPtr<CZKUMHubPortImpl> port = MakeNode<CZKUMHubPortImpl>(u"port", {device}, 7u);
  RingPtr<CZKUMHubDeviceImpl> hub = MakeNode<CZKUMHubDeviceImpl>(u"hub", {port});
  RingPtr<CZKUMHostControllerImpl> controller = MakeNode<CZKUMHostControllerImpl>(u"controller", {hub});
  RingPtr<CZKUMUsbTreeNodeImpl> plain = MakeNode<CZKUMUsbTreeNodeImpl>(u"plain");
  RingPtr<CZKUMUsbTreeRootImpl> root = MakeNode<CZKUMUsbTreeRootImpl>(u"root", {controller, plain});

  // The name of the node of a kind.
  static const char* NameOf(TUsbDeviceType kind) {
    static constexpr const char* names[] = {"plain", "root", "controller", "hub", "port", "device", "info", "disk"};
    return names[kind];
  }
  std::vector<NodePtr> Nodes() const { return {root, plain, controller, hub, port, device, info, disk}; }
};

inline SampleTree::SampleTree() {
  for (const NodePtr& node : Nodes()) {
    const std::u16string kind = node->m_strDevInstId;
    node->m_strDevInstId = kind + u".InstanceId";
    node->m_strDeviceDescr = kind + u".Description";
    node->m_strSerialNumber = kind + u".SerialNumber";
    node->m_strDriverKeyName = kind + u".DriverKeyName";
    node->m_strVendor = kind + u".Vendor";
    node->m_strProduct = kind + u".Product";
  }
  controller->m_strLeafName = u"controller.LeafName";
  hub->m_strPathName = u"hub.PathName";
  hub->m_strConnectionName = u"hub.ConnectionName";
  device->m_strProduct = u"what the device manager says";
  device->m_strUsbProduct = u"device.Product";
  device->m_strUsbManufacturer = u"device.Manufacturer1";
  device->m_nVendorId = 0x1234;
  device->m_nProductId = 0x80000000;
  device->m_infoDevice = info;
  info->Service = u"info.Service";
  info->FriendlyName = u"info.FriendlyName";
  info->Location = u"info.Location";
  info->Manufacturer = u"info.Manufacturer";
  info->HardwareId = u"info.HardwareId";
  info->PhysicalName = u"info.PhysicalName";
  info->DevClass = u"info.DevClass";
  info->EnumName = u"info.EnumName";
  info->ClassGuid.Data1 = 4711;
  disk->VolumeName = u"disk.VolumeName";
  disk->StorageVendorId = u"disk.VendorId";
  disk->StorageProductId = u"disk.ProductId";
  disk->ProductRev = u"disk.ProductRev";
  disk->MountPoints = {u"disk.MountPoint", u"E:\\", u""};
  const std::u16string path = u"disk.DevicePath";
  std::vector<std::uint8_t> detail(sizeof(std::uint32_t) + (path.size() + 1) * sizeof(char16_t));
  std::memcpy(detail.data() + sizeof(std::uint32_t), path.data(), path.size() * sizeof(char16_t));
  disk->Detail = InterfaceDetail(std::move(detail));
}

}  // namespace KelvoUHW
