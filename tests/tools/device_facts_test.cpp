#include "tools/zkusb/device_facts.h"

#include <sstream>

#include "tests/tools/client.h"
#include "tools/zkusb/commands.h"

namespace zkusb {
namespace {

NodeView Device(std::int32_t vendor, std::int32_t product, std::uint32_t speed, std::vector<NodeView> below = {}) {
  NodeView node;
  node.Type = KUDTPortDevice;
  node.VendorId = vendor;
  node.ProductId = product;
  node.Speed = speed;
  node.Childs = std::move(below);
  return node;
}

NodeView Info(const char16_t* id, const char16_t* devClass, const char16_t* friendly, const char16_t* description,
              std::vector<NodeView> below = {}) {
  NodeView node;
  node.Type = KUDTInfoDevice;
  node.InstanceId = id;
  node.Description = description;
  node.Info.emplace().DevClass = devClass;
  node.Info->FriendlyName = friendly;
  node.Childs = std::move(below);
  return node;
}

NodeView Storage(const char16_t* id, const char16_t* volume, std::vector<std::u16string> mountPoints,
                 const char16_t* vendor = u"", const char16_t* product = u"") {
  NodeView node;
  node.Type = KUDTInterfaceDevice;
  node.InstanceId = id;
  node.Storage = StorageView{volume, vendor, product, u"", u"", std::move(mountPoints)};
  return node;
}

NodeView OddPc() {
  NodeView root, controller, hub;
  root.Type = KUDTRoot;
  controller.Type = KUDTHostController;
  controller.InstanceId = u"PCI\\1";
  controller.LeafName = u"HCD0";
  hub.Type = KUDTHub;
  std::vector<NodeView> devices = {
      // A volume in its disk's place, a disk whose interface alone names it, and one that nobody names.
      Device(0xF000, 1, 2,
             {Info(u"D1", u"diskdrive", u"", u" Disk  one ", {Storage(u"V1", u"Volume{1}", {u"E:\\", u"C:\\M\\"})}),
              Storage(u"D2", u"", {u"F:\\"}, u"Make ", u" Two"), Storage(u"D3", u"", {})}),
      Device(0x10000, 2, 3, {Info(u"X", u"Other", u"", u"", {Storage(u"V4", u"Volume{4}", {})})}), Device(-1, 3, 1),
      Device(0xF000, -1, 0, {Info(u"D5", u"DiskDrive", u"Friendly", u"Disk five")}), Device(0xF000, 4, 0)};
  devices[2].Manufacturer1 = u"Maker";
  devices[2].SerialNumber = u"5&1";
  devices[4].Info.emplace().FriendlyName = u" Some  friend ";
  devices[4].SerialNumber = u" S1 ";
  for (std::size_t i = 0; i < devices.size(); ++i) {
    NodeView& port = hub.Childs.emplace_back();
    port.Type = KUDTHubPort;
    port.PortIndex = static_cast<std::int32_t>(2 * i + 1);
    port.Childs = {devices[i]};
  }
  controller.Childs = {hub};
  root.Childs = {controller};
  return root;
}

TEST(DeviceFacts, OfDevicesThatNoPcAtHandHas) {
  const NodeView root = OddPc();
  std::ostringstream stream;
  Writer out(stream);
  PrintTree(root, false, out);
  PrintVolumes(root, false, out);
  for (const char16_t* term :
       {u"disk one", u"make two", u"friend", u"5&1", u"s1", u"maker", u"f000:0001", u"1-3", u"e:", u"c:\\m"}) {
    const bool found = PrintFound(root, {{term}, {}, {}}, false, out);
    out.Line(found ? u"--" : u"none");
  }
  std::ifstream file(ZKUSB_SOURCE_DIR "/tests/tools/odd-devices.txt", std::ios::binary);
  EXPECT_EQ(stream.str(), std::string((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>()));
}

}  // namespace
}  // namespace zkusb
