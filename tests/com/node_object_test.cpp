// The properties of node objects: each one's value, and what it answers without out pointer, record or memory.
#include "com/node_object.h"

#include <map>

#include "tests/support/com_objects.h"

namespace KelvoUHW {
namespace {

// What a text property answers where it cannot give its text; null: no such case.
struct TextRules {
  const char *firstFails, *secondFails, *nullOutFirstFails;  // the text's first, second allocation
  const char *noRecord, *noRecordNullOut;
};
constexpr char kRaised[] = "raised E_OUTOFMEMORY null", kNoMemory[] = "E_OUTOFMEMORY null";
// The text is made before the out pointer is looked at, the record is asked for before both.
constexpr TextRules kBase = {kRaised, kNoMemory, "raised E_OUTOFMEMORY", "E_FAIL null", "E_FAIL"};
// No object without record has these interfaces, but its record may be destroyed.
constexpr TextRules kTyped = {kRaised, kNoMemory, "raised E_OUTOFMEMORY", "E_POINTER null", nullptr};
constexpr TextRules kManaged = {kRaised, kNoMemory, "raised E_OUTOFMEMORY", "E_FAIL null", nullptr};
// Nothing is read for a null out pointer.
constexpr TextRules kSerialNumber = {kRaised, kNoMemory, "E_POINTER", "E_FAIL null", "E_POINTER"};
// Out of memory is not noticed.
constexpr TextRules kUntested = {"S_OK null", nullptr, "E_POINTER", "E_POINTER null", "E_POINTER"};

struct TextRow {
  const char* name;
  TextProperty property, bySlot;   // bySlot: the method in its published place
  std::vector<const char*> kinds;  // of the sample tree
  TextRules rules;
  const char* source;  // whose text it is, where not the object's own
};

// Calls what stands in a place of the table that an interface pointer points at.
template <auto Getter, std::size_t Slot>
HRESULT ReadSlot(IUnknown* object, BSTR* out) {
  const auto asked = ComPtr<IUnknown>(object).As<typename GetterTraits<decltype(Getter)>::Interface>();
  const auto* table = *reinterpret_cast<void* const* const*>(asked.Get());
  return reinterpret_cast<HRESULT(STDMETHODCALLTYPE*)(IUnknown*, BSTR*)>(table[Slot])(asked.Get(), out);
}
template <auto Getter, std::size_t Slot>
TextRow Row(const char* name, const std::vector<const char*>& kinds, const TextRules& rules,
            const char* source = nullptr) {
  return {name, &Read<Getter>, &ReadSlot<Getter, Slot>, kinds, rules, source};
}

const std::vector<const char*> kNoDevice = {"root", "plain", "controller", "hub", "port", "info", "disk"};
const std::vector<const char*> kAll = {"device", "root", "plain", "controller", "hub", "port", "info", "disk"};
const std::vector<const char*> kInfo = {"info", "device"};
const TextRow kTexts[] = {Row<&IZKUMUsbTreeNode::get_InstanceId, 3>("InstanceId", kAll, kBase),
                          Row<&IZKUMUsbDevice::get_Description, 3>("Description", kAll, kBase),
                          Row<&IZKUMUsbDevice::get_SerialNumber, 4>("SerialNumber", kAll, kSerialNumber),
                          Row<&IZKUMUsbDevice::get_DriverKeyName, 7>("DriverKeyName", kAll, kBase),
                          Row<&IZKUMUsbDevice::get_Vendor, 9>("Vendor", kAll, kUntested),
                          Row<&IZKUMUsbDevice::get_Product, 10>("Product", kNoDevice, kUntested),
                          Row<&IZKUMUsbDevice::get_Product, 10>("Product", {"device"}, kTyped),
                          Row<&IZKUMPortDevice::get_Product, 3>("Product", {"device"}, kTyped),
                          Row<&IZKUMPortDevice::get_Manufacturer1, 4>("Manufacturer1", {"device"}, kTyped),
                          Row<&IZKUMHostController::get_LeafName, 3>("LeafName", {"controller"}, kTyped),
                          Row<&IZKUMHubDevice::get_PathName, 3>("PathName", {"hub"}, kTyped),
                          Row<&IZKUMHubDevice::get_ConnectionName, 4>("ConnectionName", {"hub"}, kTyped),
                          // A port device shows those of its device-manager node.
                          Row<&IZKUMInfoDevice::get_Service, 3>("Service", kInfo, kManaged, "info"),
                          Row<&IZKUMInfoDevice::get_FriendlyName, 4>("FriendlyName", kInfo, kManaged, "info"),
                          Row<&IZKUMInfoDevice::get_Location, 5>("Location", kInfo, kManaged, "info"),
                          Row<&IZKUMInfoDevice::get_Manufacturer, 6>("Manufacturer", kInfo, kManaged, "info"),
                          Row<&IZKUMInfoDevice::get_HardwareId, 7>("HardwareId", kInfo, kManaged, "info"),
                          Row<&IZKUMInfoDevice::get_PhysicalName, 8>("PhysicalName", kInfo, kManaged, "info"),
                          Row<&IZKUMInfoDevice::get_DevClass, 9>("DevClass", kInfo, kManaged, "info"),
                          Row<&IZKUMInfoDevice::get_EnumName, 10>("EnumName", kInfo, kManaged, "info"),
                          Row<&IZKUMInterfaceDevice::get_VolumeName, 3>("VolumeName", {"disk"}, kTyped),
                          Row<&IZKUMInterfaceDevice::get_VendorId, 4>("VendorId", {"disk"}, kTyped),
                          Row<&IZKUMInterfaceDevice::get_ProductId, 5>("ProductId", {"disk"}, kTyped),
                          Row<&IZKUMInterfaceDevice::get_ProductRev, 6>("ProductRev", {"disk"}, kTyped),
                          Row<&IZKUMInterfaceDevice::get_DevicePath, 7>("DevicePath", {"disk"}, kTyped),
                          Row<&IZKUMInterfaceDevice::get_MountPoint, 8>("MountPoint", {"disk"}, kTyped)};

// Reads the text, and once for each of its rules but those without record.
void CheckText(TextProperty property, IUnknown* object, const TextRules& rules, const std::string& text) {
  const std::string success = "S_OK " + text;
  const ULONG references = References(object);
  EXPECT_EQ(TextOf(property, object), success);
  EXPECT_EQ(TextOf(property, object, false), "E_POINTER");
  const struct {
    std::uint64_t allocation;
    bool giveOut;
    const char* expected;
  } faults[] = {{1, true, rules.firstFails}, {2, true, rules.secondFails}, {1, false, rules.nullOutFirstFails}};
  for (const auto& fault : faults) {
    const platform::controls::FailingBstr failing(fault.allocation);
    EXPECT_EQ(TextOf(property, object, fault.giveOut), fault.expected ? fault.expected : success);
  }
  EXPECT_EQ(References(object), references);
}

class NodeObject : public ComObjects {
 protected:
  NodeObject() {
    for (const NodePtr& node : sample.Nodes()) objects.emplace(SampleTree::NameOf(node->m_nType), Wrap(node));
    ComObject<CZKUMUsbTreeNode>* created = nullptr;
    EXPECT_EQ(ComObject<CZKUMUsbTreeNode>::Create(created), S_OK);
    empty = ComPtr<IZKUMUsbTreeNode>::Attach(created);
  }

  SampleTree sample;
  std::map<std::string, ComPtr<IZKUMUsbTreeNode>> objects;
  ComPtr<IZKUMUsbTreeNode> empty;  // without record
};

TEST_F(NodeObject, TextsAndWhatIsAnsweredInTheirPlace) {
  for (const TextRow& row : kTexts) {
    for (const char* kind : row.kinds) {
      SCOPED_TRACE(std::string(kind) + "." + row.name);
      const std::string source = row.source ? row.source : kind;
      CheckText(row.property, objects[kind].Get(), row.rules, source + "." + row.name);
      EXPECT_EQ(TextOf(row.bySlot, objects[kind].Get()), "S_OK " + source + "." + row.name);
    }
    if (row.rules.noRecordNullOut == nullptr) continue;
    EXPECT_EQ(TextOf(row.property, empty.Get()), row.rules.noRecord) << row.name;
    EXPECT_EQ(TextOf(row.property, empty.Get(), false), row.rules.noRecordNullOut) << row.name;
  }
}

TEST_F(NodeObject, DumpsAreThoseOfTheRecords) {
  for (const NodePtr& node : sample.Nodes()) {
    std::u16string dump;
    node->ToString(dump, u"");
    CheckText(&Read<&IZKUMUsbDevice::get_ToString>, Wrap(node).Get(), kBase, platform::ToUtf8(dump));
  }
  EXPECT_EQ(TextOf(&Read<&IZKUMUsbDevice::get_ToString>, empty.Get()), "E_FAIL null");
  EXPECT_EQ(TextOf(&Read<&IZKUMUsbDevice::get_ToString>, empty.Get(), false), "E_FAIL");
}

TEST_F(NodeObject, NumbersAndWhatIsAnsweredInTheirPlace) {
  using Number = std::string (*)(IUnknown*, bool);
  constexpr Number kType = &NumberOf<&IZKUMUsbTreeNode::get_Type>;
  constexpr Number kVendor = &NumberOf<&IZKUMUsbDevice::get_VendorId>;
  constexpr Number kProduct = &NumberOf<&IZKUMUsbDevice::get_ProductId>;
  constexpr Number kGuid = &NumberOf<&IZKUMInfoDevice::get_ClassGuid>;
  const std::string untouched = " 1515870810";
  const struct {
    Number read;
    const char *kind, *value, *nullOut;
    const char *noRecord, *noRecordNullOut;  // the codes then; null: there is always one
  } rows[] = {
      {kType, "root", "S_OK 1", "E_POINTER", "E_INVALIDARG", "E_INVALIDARG"},
      {kType, "disk", "S_OK 7", "E_POINTER", nullptr, nullptr},
      {kVendor, "root", "S_OK -1", "E_POINTER", "E_POINTER", "E_POINTER"},
      {kVendor, "device", "S_OK 4660", "E_POINTER", nullptr, nullptr},
      {kProduct, "hub", "S_OK -1", "E_POINTER", "E_POINTER", "E_POINTER"},
      {kProduct, "device", "S_OK -2147483648", "E_POINTER", nullptr, nullptr},
      {&NumberOf<&IZKUMHubPort::get_PortIndex>, "port", "S_OK 7", "E_INVALIDARG", nullptr, nullptr},
      {&NumberOf<&IZKUMPortDevice::get_Speed>, "device", "S_OK 0", "E_INVALIDARG", nullptr, nullptr},
      {&NumberOf<&IZKUMPortDevice::get_NumberInterfaces>, "device", "S_OK 0", "E_INVALIDARG", nullptr, nullptr},
      {kGuid, "info", "S_OK 4711", "E_INVALIDARG", nullptr, nullptr},
      {kGuid, "device", "S_OK 4711", "E_INVALIDARG", nullptr, nullptr},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(&row - rows);
    IUnknown* object = objects[row.kind].Get();
    EXPECT_EQ(row.read(object, true), row.value);
    EXPECT_EQ(row.read(object, false), row.nullOut);
    if (row.noRecord == nullptr) continue;
    EXPECT_EQ(row.read(empty.Get(), true), row.noRecord + untouched);
    EXPECT_EQ(row.read(empty.Get(), false), row.noRecordNullOut);
  }
}

// The object of a Parent that is let go takes the record from all others.
TEST_F(NodeObject, WhatIsAnsweredWhenTheRecordIsDestroyed) {
  std::vector<CZKUMUsbTreeNodeImpl*> records;
  for (const NodePtr& node : sample.Nodes()) records.push_back(node.Get());
  for (CZKUMUsbTreeNodeImpl* record : records) {
    const auto child = MakeRecord<CZKUMUsbTreeNodeImpl>();
    child->m_pParent = record;
    ComPtr<IZKUMUsbTreeNode> parent;
    ASSERT_EQ(Wrap(child)->get_Parent(parent.Put()), S_OK);
  }
  EXPECT_FALSE(sample.root || sample.plain || sample.device || sample.info || sample.disk);
  for (const TextRow& row : kTexts) {
    for (const char* kind : row.kinds) {
      EXPECT_EQ(TextOf(row.property, objects[kind].Get()), row.rules.noRecord) << kind << "." << row.name;
    }
  }
  for (const auto& [kind, object] : objects) {
    EXPECT_EQ(TextOf(&Read<&IZKUMUsbDevice::get_ToString>, object.Get()), "E_FAIL null") << kind;
    EXPECT_EQ(NumberOf<&IZKUMUsbTreeNode::get_Type>(object.Get()), "E_INVALIDARG 1515870810") << kind;
    EXPECT_EQ(NumberOf<&IZKUMUsbDevice::get_VendorId>(object.Get()), "E_POINTER 1515870810") << kind;
    EXPECT_EQ(NumberOf<&IZKUMUsbDevice::get_ProductId>(object.Get()), "E_POINTER 1515870810") << kind;
  }
  for (const char* kind : {"info", "device"}) {
    EXPECT_EQ(NumberOf<&IZKUMInfoDevice::get_ClassGuid>(objects[kind].Get()), "E_FAIL 0") << kind;
  }
  ComPtr<IEnumVARIANT> list;
  EXPECT_EQ(objects["disk"].As<IZKUMInterfaceDevice>()->get_MountPoints(list.Put()), E_POINTER);
}

TEST_F(NodeObject, PortDeviceWithoutDeviceManagerNodeFailsItsPropertiesOnly) {
  sample.device->m_infoDevice.Reset();
  IUnknown* object = objects["device"].Get();
  int properties = 0;
  for (const TextRow& row : kTexts) {
    if (row.source == nullptr) continue;
    EXPECT_EQ(TextOf(row.property, object), "E_FAIL null") << row.name;
    EXPECT_EQ(TextOf(row.property, object, false), "E_FAIL") << row.name;
    ++properties;
  }
  EXPECT_EQ(properties, 8);
  EXPECT_EQ(NumberOf<&IZKUMInfoDevice::get_ClassGuid>(object), "E_FAIL 0");
  EXPECT_EQ(TextOf(&Read<&IZKUMPortDevice::get_Product>, object), "S_OK device.Product");
}

// Texts end where a reader of zero-terminated texts would end them.
TEST_F(NodeObject, TextsEndAtTheirFirstZero) {
  using namespace std::string_literals;
  sample.hub->m_strPathName = u"a\0b"s;
  sample.hub->m_strVendor = u"\0b"s;
  EXPECT_EQ(TextOf(&Read<&IZKUMHubDevice::get_PathName>, objects["hub"].Get()), "S_OK a");
  EXPECT_EQ(TextOf(&Read<&IZKUMUsbDevice::get_Vendor>, objects["hub"].Get()), "S_OK ");
  sample.disk->MountPoints.clear();
  EXPECT_EQ(TextOf(&Read<&IZKUMInterfaceDevice::get_MountPoint>, objects["disk"].Get()), "S_OK ");
}

}  // namespace
}  // namespace KelvoUHW
