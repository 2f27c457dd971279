// The properties of node objects: each one's value, and what it answers without out pointer, record or memory.
#include "com/node_object.h"

#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

#include "tests/support/com_objects.h"

namespace KelvoUHW {
namespace {

using platform::native::FailingBstr;

// What a text property answers where it cannot give its text; null: no such case.
struct TextRules {
  const char* nullOut;
  const char* firstFails;  // the text's first allocation
  const char* secondFails;
  const char* nullOutFirstFails;
  const char* noRecord;
  const char* noRecordNullOut;
};
// The text is made before the out pointer is looked at, the record is asked for before both.
constexpr TextRules kBase = {
    "E_POINTER", "raised E_OUTOFMEMORY null", "E_OUTOFMEMORY null", "raised E_OUTOFMEMORY", "E_FAIL null", "E_FAIL"};
// The typed record is not tested.
constexpr TextRules kTyped = {
    "E_POINTER", "raised E_OUTOFMEMORY null", "E_OUTOFMEMORY null", "raised E_OUTOFMEMORY", nullptr, nullptr};
// Nothing is read for a null out pointer.
constexpr TextRules kSerialNumber = {
    "E_POINTER", "raised E_OUTOFMEMORY null", "E_OUTOFMEMORY null", "E_POINTER", "E_FAIL null", "E_POINTER"};
// Out of memory is not noticed.
constexpr TextRules kUntested = {"E_POINTER", "S_OK null", nullptr, "E_POINTER", "E_POINTER null", "E_POINTER"};

struct TextRow {
  const char* name;
  TextProperty property;
  std::vector<const char*> kinds;  // of the sample tree
  TextRules rules;
  const char* source = nullptr;  // whose text it is, where not the object's own
};

std::vector<TextRow> TextRows() {
  const std::vector<const char*> all = {"root", "plain", "controller", "hub", "port", "device", "info", "disk"};
  const std::vector<const char*> noDevice = {"root", "plain", "controller", "hub", "port", "info", "disk"};
  return {{"InstanceId", &Read<&IZKUMUsbTreeNode::get_InstanceId>, all, kBase},
          {"Description", &Read<&IZKUMUsbDevice::get_Description>, all, kBase},
          {"SerialNumber", &Read<&IZKUMUsbDevice::get_SerialNumber>, all, kSerialNumber},
          {"DriverKeyName", &Read<&IZKUMUsbDevice::get_DriverKeyName>, all, kBase},
          {"Vendor", &Read<&IZKUMUsbDevice::get_Vendor>, all, kUntested},
          {"Product", &Read<&IZKUMUsbDevice::get_Product>, noDevice, kUntested},
          {"Product", &Read<&IZKUMUsbDevice::get_Product>, {"device"}, kTyped},
          {"Product", &Read<&IZKUMPortDevice::get_Product>, {"device"}, kTyped},
          {"Manufacturer1", &Read<&IZKUMPortDevice::get_Manufacturer1>, {"device"}, kTyped},
          {"LeafName", &Read<&IZKUMHostController::get_LeafName>, {"controller"}, kTyped},
          {"PathName", &Read<&IZKUMHubDevice::get_PathName>, {"hub"}, kTyped},
          {"ConnectionName", &Read<&IZKUMHubDevice::get_ConnectionName>, {"hub"}, kTyped},
          // A port device shows those of its device-manager node.
          {"Service", &Read<&IZKUMInfoDevice::get_Service>, {"info", "device"}, kTyped, "info"},
          {"FriendlyName", &Read<&IZKUMInfoDevice::get_FriendlyName>, {"info", "device"}, kTyped, "info"},
          {"Location", &Read<&IZKUMInfoDevice::get_Location>, {"info", "device"}, kTyped, "info"},
          {"Manufacturer", &Read<&IZKUMInfoDevice::get_Manufacturer>, {"info", "device"}, kTyped, "info"},
          {"HardwareId", &Read<&IZKUMInfoDevice::get_HardwareId>, {"info", "device"}, kTyped, "info"},
          {"PhysicalName", &Read<&IZKUMInfoDevice::get_PhysicalName>, {"info", "device"}, kTyped, "info"},
          {"DevClass", &Read<&IZKUMInfoDevice::get_DevClass>, {"info", "device"}, kTyped, "info"},
          {"EnumName", &Read<&IZKUMInfoDevice::get_EnumName>, {"info", "device"}, kTyped, "info"},
          {"VolumeName", &Read<&IZKUMInterfaceDevice::get_VolumeName>, {"disk"}, kTyped},
          {"VendorId", &Read<&IZKUMInterfaceDevice::get_VendorId>, {"disk"}, kTyped},
          {"ProductId", &Read<&IZKUMInterfaceDevice::get_ProductId>, {"disk"}, kTyped},
          {"ProductRev", &Read<&IZKUMInterfaceDevice::get_ProductRev>, {"disk"}, kTyped},
          {"DevicePath", &Read<&IZKUMInterfaceDevice::get_DevicePath>, {"disk"}, kTyped},
          {"MountPoint", &Read<&IZKUMInterfaceDevice::get_MountPoint>, {"disk"}, kTyped}};
}

class NodeObject : public ComObjects {
 protected:
  NodeObject() {
    for (const NodePtr& node : sample.Nodes()) {
      const std::u16string& id = node->m_strDevInstId;
      objects.emplace(platform::ToUtf8(id.substr(0, id.find(u'.'))), Wrap(node));
    }
    ComObject<CZKUMUsbTreeNode>* created = nullptr;
    EXPECT_EQ(ComObject<CZKUMUsbTreeNode>::Create(created), S_OK);
    empty = ComPtr<IZKUMUsbTreeNode>::Attach(created);
  }

  static void CheckText(TextProperty property, IUnknown* object, const TextRules& rules, const std::string& text) {
    const std::string success = "S_OK " + text;
    const ULONG references = References(object);
    EXPECT_EQ(TextOf(property, object), success);
    EXPECT_EQ(TextOf(property, object, false), rules.nullOut);
    const struct {
      std::uint64_t allocation;
      bool giveOut;
      const char* expected;
    } faults[] = {{1, true, rules.firstFails}, {2, true, rules.secondFails}, {1, false, rules.nullOutFirstFails}};
    for (const auto& fault : faults) {
      const FailingBstr failing(fault.allocation);
      EXPECT_EQ(TextOf(property, object, fault.giveOut), fault.expected ? fault.expected : success);
    }
    EXPECT_EQ(References(object), references);
  }

  SampleTree sample;
  std::map<std::string, ComPtr<IZKUMUsbTreeNode>> objects;
  ComPtr<IZKUMUsbTreeNode> empty;  // without record
};

TEST_F(NodeObject, TextsAndWhatIsAnsweredInTheirPlace) {
  for (const TextRow& row : TextRows()) {
    for (const char* kind : row.kinds) {
      SCOPED_TRACE(std::string(kind) + "." + row.name);
      const std::string source = row.source ? row.source : kind;
      CheckText(row.property, objects[kind].Get(), row.rules, source + "." + row.name);
    }
    if (row.rules.noRecord == nullptr) continue;
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
  const struct {
    const char* name;
    std::string (*read)(IUnknown*, bool);
    const char* kind;
    const char* value;
    const char* nullOut;
    const char* noRecord;
    const char* noRecordNullOut;
  } rows[] = {
      {"Type", &NumberOf<&IZKUMUsbTreeNode::get_Type>, "plain", "S_OK 0", "E_POINTER", "E_INVALIDARG 1515870810",
       "E_INVALIDARG"},
      {"Type", &NumberOf<&IZKUMUsbTreeNode::get_Type>, "root", "S_OK 1", "E_POINTER", nullptr, nullptr},
      {"Type", &NumberOf<&IZKUMUsbTreeNode::get_Type>, "disk", "S_OK 7", "E_POINTER", nullptr, nullptr},
      {"VendorId", &NumberOf<&IZKUMUsbDevice::get_VendorId>, "root", "S_OK -1", "E_POINTER", "E_POINTER 1515870810",
       "E_POINTER"},
      {"VendorId", &NumberOf<&IZKUMUsbDevice::get_VendorId>, "device", "S_OK 4660", "E_POINTER", nullptr, nullptr},
      {"ProductId", &NumberOf<&IZKUMUsbDevice::get_ProductId>, "hub", "S_OK -1", "E_POINTER", "E_POINTER 1515870810",
       "E_POINTER"},
      {"ProductId", &NumberOf<&IZKUMUsbDevice::get_ProductId>, "device", "S_OK -2147483648", "E_POINTER", nullptr,
       nullptr},
      {"PortIndex", &NumberOf<&IZKUMHubPort::get_PortIndex>, "port", "S_OK 7", "E_INVALIDARG", nullptr, nullptr},
      {"Speed", &NumberOf<&IZKUMPortDevice::get_Speed>, "device", "S_OK 0", "E_INVALIDARG", nullptr, nullptr},
      {"NumberInterfaces", &NumberOf<&IZKUMPortDevice::get_NumberInterfaces>, "device", "S_OK 0", "E_INVALIDARG",
       nullptr, nullptr},
      {"ClassGuid", &NumberOf<&IZKUMInfoDevice::get_ClassGuid>, "info", "S_OK 4711", "E_INVALIDARG", nullptr, nullptr},
      {"ClassGuid", &NumberOf<&IZKUMInfoDevice::get_ClassGuid>, "device", "S_OK 4711", "E_INVALIDARG", nullptr,
       nullptr},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(std::string(row.kind) + "." + row.name);
    IUnknown* object = objects[row.kind].Get();
    const ULONG references = References(object);
    EXPECT_EQ(row.read(object, true), row.value);
    EXPECT_EQ(row.read(object, false), row.nullOut);
    EXPECT_EQ(References(object), references);
    if (row.noRecord == nullptr) continue;
    EXPECT_EQ(row.read(empty.Get(), true), row.noRecord);
    EXPECT_EQ(row.read(empty.Get(), false), row.noRecordNullOut);
  }
}

TEST_F(NodeObject, PortDeviceWithoutDeviceManagerNodeFailsItsPropertiesOnly) {
  sample.device->m_infoDevice.Reset();
  IUnknown* object = objects["device"].Get();
  int properties = 0;
  for (const TextRow& row : TextRows()) {
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
