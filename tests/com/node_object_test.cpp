// The properties of node objects: each one's value, and what it answers without out pointer, record or memory.
#include "com/node_object.h"

#include <gtest/gtest.h>

#include <map>
#include <string>

#include "tests/support/com_objects.h"
#include "tests/support/text_properties.h"

namespace KelvoUHW {
namespace {

class NodeObject : public ComObjects {
 protected:
  NodeObject() {
    for (const NodePtr& node : sample.Nodes()) {
      objects.emplace(SampleTree::NameOf(node->m_nType), Wrap(node));
    }
    ComObject<CZKUMUsbTreeNode>* created = nullptr;
    EXPECT_EQ(ComObject<CZKUMUsbTreeNode>::Create(created), S_OK);
    empty = ComPtr<IZKUMUsbTreeNode>::Attach(created);
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
