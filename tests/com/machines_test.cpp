// What clients see of whole PCs: every property of every node, the queries, trees that were replaced.
#include <filesystem>
#include <set>

#include "bench/object_reader.h"
#include "platform/text.h"
#include "platform/usb_ioctl.h"
#include "records/info_device.h"
#include "records/interface_device.h"
#include "records/port_device.h"
#include "records/records.h"
#include "simulation/machine/machine_file.h"
#include "tests/support/tree_desk.h"
#include "tree/tree_builder.h"

namespace KelvoUHW {
namespace {

using platform::ToUtf8;
using testing_support::ForEachNode;
using testing_support::InstanceIdOf;
using testing_support::WalkChilds;
using Node = ComPtr<IZKUMUsbTreeNode>;
using Nodes = ComPtr<IZKUMUsbTreeNodeEnumerator>;
using Ids = std::vector<std::string>;  // "kind: instance id"

constexpr char kFolder[] = ZKUSB_SOURCE_DIR "/machines/";
constexpr const char* kMachines[] = {"asus-b560", "dell-precision", "hp-cardreader", "vmware-win7"};

platform::simulated::Machine Load(const std::string& name) {
  return platform::simulated::LoadMachine(kFolder + name + ".json");
}

// Properties as lines of text, whoever tells them.
class Facts {
 public:
  void operator()(const char* name, HRESULT result, std::u16string_view value) { Add(name, result, ToUtf8(value)); }
  void operator()(const char* name, HRESULT result, std::int64_t value) { Add(name, result, std::to_string(value)); }
  // A name, its value, the next name, its value, ...
  template <class Value, class... More>
  void All(HRESULT result, const char* name, const Value& value, const More&... more) {
    (*this)(name, result, value);
    if constexpr (sizeof...(more) != 0) All(result, more...);
  }
  const std::string& Text() const { return m_text; }

 private:
  void Add(const char* name, HRESULT result, const std::string& value) {
    m_text.append(name).append(result == S_OK ? "=" : " fails=").append(value).append("\n");
  }
  std::string m_text;
};

void DescribeInfo(const CZKUMInfoDeviceImpl* info, Facts& facts) {
  static const CZKUMInfoDeviceImpl kNone;
  const HRESULT result = info ? S_OK : E_FAIL;
  const CZKUMInfoDeviceImpl& record = info ? *info : kNone;
  facts.All(result, "Service", record.Service, "FriendlyName", record.FriendlyName, "Location", record.Location,
            "Manufacturer", record.Manufacturer, "HardwareId", record.HardwareId, "PhysicalName", record.PhysicalName,
            "DevClass", record.DevClass, "EnumName", record.EnumName, "ClassGuid",
            platform::GuidText(record.ClassGuid));
}

void DescribePortDevice(const CZKUMPortDeviceImpl& record, Facts& facts) {
  facts.All(S_OK, "Product", record.m_strUsbProduct, "Manufacturer1", record.m_strUsbManufacturer, "Speed",
            record.Speed(), "NumberInterfaces", record.NumberInterfaces());
  for (const InterfaceEntryPtr& entry : record.m_interfaceDescrs) {
    facts.All(S_OK, "InterfaceClass", entry->Descriptor.at(5), "InterfaceSubClass", entry->Descriptor.at(6),
              "InterfaceProtocol", entry->Descriptor.at(7));
  }
  facts("InterfaceDescriptors", S_OK, u"");
  DescribeInfo(static_cast<const CZKUMInfoDeviceImpl*>(record.m_infoDevice.Get()), facts);
}

void DescribeInterfaceDevice(const CZKUMInterfaceDeviceImpl& record, Facts& facts) {
  facts.All(S_OK, "VolumeName", record.VolumeName, "VendorId", record.StorageVendorId, "ProductId",
            record.StorageProductId, "ProductRev", record.ProductRev, "DevicePath", record.DevicePath(), "MountPoint",
            record.MountPoint());
  for (const std::u16string& mountPoint : record.MountPoints) facts("one of MountPoints", S_OK, mountPoint);
  facts("MountPoints", S_OK, u"");
}

std::string Describe(const NodePtr& node) {
  Facts facts;
  const TUsbDeviceType kind = node->m_nType;
  const auto device = kind == KUDTPortDevice ? node.StaticCast<CZKUMPortDeviceImpl>() : nullptr;
  facts.All(S_OK, "InstanceId", node->m_strDevInstId, "Type", kind, "Description", node->m_strDeviceDescr,
            "SerialNumber", node->m_strSerialNumber, "VendorId", static_cast<std::int32_t>(node->m_nVendorId),
            "ProductId", static_cast<std::int32_t>(node->m_nProductId), "DriverKeyName", node->m_strDriverKeyName,
            "Vendor", node->m_strVendor, "Product", device ? device->m_strUsbProduct : node->m_strProduct);
  if (kind == KUDTHostController) {
    facts("LeafName", S_OK, node.StaticCast<CZKUMHostControllerImpl>()->m_strLeafName);
  } else if (kind == KUDTHub) {
    const auto hub = node.StaticCast<CZKUMHubDeviceImpl>();
    facts.All(S_OK, "PathName", hub->m_strPathName, "ConnectionName", hub->m_strConnectionName);
  } else if (kind == KUDTHubPort) {
    facts("PortIndex", S_OK, node.StaticCast<CZKUMHubPortImpl>()->m_nPortIndex);
  } else if (kind == KUDTPortDevice) {
    DescribePortDevice(*device, facts);
  } else if (kind == KUDTInfoDevice) {
    DescribeInfo(node.StaticCast<CZKUMInfoDeviceImpl>().Get(), facts);
  } else if (kind == KUDTInterfaceDevice) {
    DescribeInterfaceDevice(*node.StaticCast<CZKUMInterfaceDeviceImpl>(), facts);
  }
  std::u16string dump;
  node->ToString(dump, u"");
  facts("ToString", S_OK, dump);
  return facts.Text();
}

// All but ToString.
std::string Properties(const Node& node) {
  Facts facts;
  testing_support::ReadProperties(node, [&](auto... property) { facts(property...); });
  return facts.Text();
}

std::string Describe(const Node& node) {
  return Properties(node) + "ToString=" + ToUtf8(testing_support::DumpOf(node)) + "\n";
}

std::string IdText(std::int64_t kind, const std::u16string& id) { return std::to_string(kind) + ": " + ToUtf8(id); }

Ids IdsOf(const Nodes& nodes) {
  Ids ids;
  ForEachNode(*nodes.Get(), [&](HRESULT result, const Node& node) {
    EXPECT_EQ(result, S_OK);
    TUsbDeviceType kind = KUDTUnknown;
    if (node) node->get_Type(&kind);
    ids.push_back(IdText(kind, InstanceIdOf(node)));
  });
  return ids;
}

// A plain filter over a plain walk.
template <class Passes>
Ids Filtered(const NodePtr& root, Passes passes) {
  Ids ids;
  VisitPreOrder(root, [&](const NodePtr& node) {
    if (passes(node)) ids.push_back(IdText(node->m_nType, node->m_strDevInstId));
    return true;
  });
  return ids;
}

// Compares a subtree seen through the interfaces with its records; returns how many nodes it has.
std::size_t CompareNodes(const Node& root, const NodePtr& model) {
  std::vector<NodePtr> records;
  VisitPreOrder(model, [&](const NodePtr& record) {
    records.push_back(record);
    return true;
  });
  std::size_t next = 0;
  WalkChilds(root, [&](const Node& node) {
    if (next >= records.size()) return;
    const NodePtr& record = records[next++];
    EXPECT_EQ(Describe(node), Describe(record));
    Ids childs;
    for (const NodePtr& child : record->m_childs) childs.push_back(IdText(child->m_nType, child->m_strDevInstId));
    Nodes list;
    EXPECT_EQ(node->get_Childs(list.Put()), S_OK);
    EXPECT_EQ(IdsOf(list), childs);
    for (int kind = KUDTUnknown; kind <= KUDTInterfaceDevice; ++kind) {
      EXPECT_EQ(node->get_InSubtreeDevicesOfType(static_cast<TUsbDeviceType>(kind), list.Put()), S_OK);
      EXPECT_EQ(IdsOf(list), Filtered(record, [&](const NodePtr& below) { return below->m_nType == kind; })) << kind;
    }
  });
  EXPECT_EQ(next, records.size());
  return next;
}

void CompareQueries(IZKUMUsbTree& tree, const NodePtr& model) {
  std::set<std::uint32_t> vendors{0x1234};  // of all nodes, hubs included, and one nobody has
  std::set<std::uint32_t> products{0x1234};
  VisitPreOrder(model, [&](const NodePtr& node) {
    vendors.insert(node->m_nVendorId);
    products.insert(node->m_nProductId);
    return true;
  });
  Nodes list;
  for (const std::uint32_t vendor : vendors) {
    const auto ofVendor = [&](const NodePtr& node) {
      return node->m_nType == KUDTPortDevice && node->m_nVendorId == vendor;
    };
    EXPECT_EQ(tree.get_PortDevicesWithVendorId(vendor, list.Put()), S_OK);
    EXPECT_EQ(IdsOf(list), Filtered(model, ofVendor)) << vendor;
    for (const std::uint32_t product : products) {
      EXPECT_EQ(tree.get_VendorProductDevices(vendor, product, list.Put()), S_OK);
      EXPECT_EQ(IdsOf(list),
                Filtered(model, [&](const NodePtr& node) { return ofVendor(node) && node->m_nProductId == product; }));
    }
  }
  EXPECT_EQ(tree.get_PortDevicesWithVolume(list.Put()), S_OK);
  EXPECT_EQ(IdsOf(list), Filtered(model, [](const NodePtr& node) {
              const auto isVolume = [](const NodePtr& below) { return below->m_nType == KUDTInterfaceDevice; };
              return node->m_nType == KUDTPortDevice && !Filtered(node, isVolume).empty();
            }));
}

TEST(Machines, ClientsSeeWhatTheRecordsHold) {
  std::size_t nodes = 0;
  for (const char* name : kMachines) {
    TreeDesk desk(Load(name));
    ASSERT_EQ(desk.Rebuild(), S_OK) << name;
    // A builder of its own over the same PC makes the same tree of records.
    CZKUMUsbTreeBuilder model(desk.pc);
    ASSERT_TRUE(model.Build());
    nodes += CompareNodes(desk.Root(), model.Root());
    CompareQueries(*desk.tree.Get(), model.Root());
    ASSERT_FALSE(HasFailure()) << name;
  }
  EXPECT_GE(nodes, 200u);
  std::size_t files = 0;
  for (const auto& entry : std::filesystem::directory_iterator(kFolder)) files += entry.path().extension() == ".json";
  EXPECT_EQ(files, std::size(kMachines));
}

// A tree that a client holds when it is replaced: its nodes, what they said, and a list of which the first was taken.
struct HeldTree {
  explicit HeldTree(const Node& root) {
    WalkChilds(root, [&](const Node& node) {
      nodes.push_back(node);
      properties.push_back(Properties(node));
    });
    Nodes whole;
    EXPECT_EQ(root->get_InSubtreeDevicesOfType(KUDTPortDevice, whole.Put()), S_OK);
    rest = IdsOf(whole);
    rest.erase(rest.begin());
    EXPECT_EQ(root->get_InSubtreeDevicesOfType(KUDTPortDevice, list.Put()), S_OK);
    VARIANT_BOOL more = VARIANT_FALSE;
    list->MoveNext(&more);
    EXPECT_EQ(more, VARIANT_TRUE);
  }

  std::vector<Node> nodes;
  std::vector<std::string> properties;
  Nodes list;
  Ids rest;
  int replaced = 0;
};

TEST(Machines, ReplacedTreesGoOnAnswering) {
  const struct {
    const char* machine;
    const char* script;
  } cases[] = {{"dell-precision", "stick-comes-and-goes"},
               {"dell-precision", "usb-hard-disk"},
               {"asus-b560", "hub-with-four-devices"},
               {"hp-cardreader", "card-in-slot"}};
  for (const auto& [machine, script] : cases) {
    const auto start = Load(machine);
    const auto steps = platform::simulated::LoadScript(std::string(kFolder) + "scripts/" + script + ".json", start);
    TreeDesk desk(start);
    std::vector<HeldTree> held;
    // What is owed for parents that were held back comes with the builds behind the last step.
    for (std::size_t step = 0; step < steps.size() + 2; ++step) {
      if (step < steps.size()) {
        ASSERT_EQ(desk.pc.Apply(steps[step]), u"");
      }
      if (desk.Rebuild() != S_OK) continue;
      for (HeldTree& tree : held) ++tree.replaced;
      held.emplace_back(desk.Root());
    }
    ASSERT_FALSE(held.empty()) << script;
    EXPECT_GE(held.front().replaced, 2) << script;
    for (const HeldTree& tree : held) {
      for (std::size_t i = 0; i < tree.nodes.size(); ++i) {
        EXPECT_EQ(Properties(tree.nodes[i]), tree.properties[i])
            << script << ", replaced " << tree.replaced << " times";
      }
      EXPECT_GT(tree.nodes.size(), 20u);
      EXPECT_EQ(IdsOf(tree.list), tree.rest) << script;
    }
  }
}

}  // namespace
}  // namespace KelvoUHW
