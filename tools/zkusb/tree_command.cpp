#include <utility>

#include "platform/text.h"
#include "platform/usb_ioctl.h"
#include "tools/zkusb/commands.h"
#include "tools/zkusb/device_facts.h"
#include "tools/zkusb/device_texts.h"
#include "tools/zkusb/json_document.h"
#include "tools/zkusb/text_tree.h"

namespace zkusb {

namespace {

template <class Integer>
std::u16string Number(Integer value) {
  return platform::Decimal(static_cast<std::int32_t>(value));
}

// The text with a blank behind, or nothing.
std::u16string WithBlank(const std::u16string& text) { return text.empty() ? text : text + u" "; }

std::u16string SpeedText(std::uint32_t speed) {
  switch (speed) {
    case platform::UsbLowSpeed:
      return u"low speed";
    case platform::UsbFullSpeed:
      return u"full speed";
    case platform::UsbHighSpeed:
      return u"high speed";
    default:
      return u"speed " + Number(speed);
  }
}

std::u16string OnMountPoints(const std::vector<std::u16string>& mountPoints) {
  return mountPoints.empty() ? std::u16string() : u" on " + MountPointsText(mountPoints);
}

TextTree DiskLine(const Disk& disk) {
  TextTree line{u"Disk ", disk.name, OnMountPoints(disk.mountPoints), {}};
  for (const StorageView* volume : disk.volumes) {
    line.below.push_back({u"Volume ", volume->VolumeName, OnMountPoints(volume->MountPoints), {}});
  }
  return line;
}

// `head` says where the device is.
TextTree DeviceLine(const std::u16string& head, const NodeView& device) {
  TextTree line{head + WithBlank(IdText(device)), NamesText(device), {}, {}};
  if (line.middle.empty()) line.middle = u"unknown device";
  const std::vector<std::u16string> mountPoints = MountPointsOf(device);
  if (!mountPoints.empty()) line.tail = u"  [" + MountPointsText(mountPoints) + u"]";
  for (const Disk& disk : DisksOf(device)) line.below.push_back(DiskLine(disk));
  return line;
}

TextTree PortLine(const NodeView& port);

void AddPortLines(const NodeView& hub, TextTree& line) {
  std::vector<std::int32_t> empty;
  for (const NodeView& port : hub.Childs) {
    if (port.Childs.empty()) {
      empty.push_back(port.PortIndex);
    } else {
      line.below.push_back(PortLine(port));
    }
  }
  if (empty.empty()) return;
  std::u16string ranges;
  for (std::size_t first = 0; first < empty.size();) {
    std::size_t last = first;
    while (last + 1 < empty.size() && empty[last + 1] == empty[last] + 1) ++last;
    if (first != 0) ranges += u", ";
    ranges += Number(empty[first]);
    if (last != first) ranges.append(u"-").append(Number(empty[last]));
    first = last + 1;
  }
  line.below.push_back({empty.size() == 1 ? u"Port " : u"Ports ", ranges, u": empty", {}});
}

TextTree HubLine(const std::u16string& head, const NodeView& hub) {
  std::u16string name = VendorText(hub);
  if (name.empty()) name = Tidied(hub.Description);
  TextTree line{head + u"hub " + WithBlank(IdText(hub)),
                std::move(name),
                u", " + Number(hub.Childs.size()) + u" ports",
                {}};
  AddPortLines(hub, line);
  return line;
}

TextTree PortLine(const NodeView& port) {
  std::u16string head = u"Port " + Number(port.PortIndex) + u": ";
  const NodeView& child = port.Childs.front();
  if (child.Type == KUDTHub) return HubLine(head, child);
  return DeviceLine(head + SpeedText(child.Speed) + u"  ", child);
}

TextTree ControllerLine(const NodeView& controller) {
  const std::u16string description = Tidied(controller.Description);
  TextTree line{{}, description.empty() ? controller.InstanceId : description, {}, {}};
  for (const NodeView& hub : controller.Childs) {
    TextTree& below = line.below.emplace_back();
    below.head = u"Root hub, " + Number(hub.Childs.size()) + u" ports";
    AddPortLines(hub, below);
  }
  return line;
}

// A storage controller of the device manager. It has neither hubs nor ports: what stands at their
// places are levels of the device manager.
TextTree StorageControllerLine(const NodeView& controller,
                               const std::vector<PlacedDevice>& devices) {
  TextTree line{{}, controller.InstanceId, u" (not USB)", {}};
  for (const PlacedDevice& placed : devices) {
    line.below.push_back(DeviceLine({}, *placed.device));
  }
  return line;
}

// Into an object that is open.
void WriteNode(const NodeView& node, Place& place, JsonDocument& document) {
  const bool isPort = node.Type == KUDTHubPort;
  if (isPort) place.ports.push_back(node.PortIndex);
  document.Members(NodeJson(node, place));
  document.BeginArray("Childs");
  for (const NodeView& child : node.Childs) {
    document.BeginElement();
    WriteNode(child, place, document);
    document.End();
  }
  document.End();
  if (isPort) place.ports.pop_back();
}

}  // namespace

void WriteTree(const NodeView& root, JsonDocument& document) {
  document.Members(NodeJson(root, {}));
  document.BeginArray("Childs");
  Place place;
  for (const NodeView& controller : root.Childs) {
    ++place.controller;
    document.BeginElement();
    WriteNode(controller, place, document);
    document.End();
  }
  document.End();
}

void PrintDump(const Component* component, bool json, Writer& out) {
  const auto print = [&](std::u16string_view text) {
    if (!json) return out.Verbatim(text);
    JsonDocument document("dump", out);
    document.Text("ToString", text);
    document.Finish();
  };
  if (component) {
    component->Dump(print);
  } else {
    print({});
  }
}

void PrintTree(const NodeView& root, bool json, Writer& out) {
  if (json) {
    JsonDocument document("tree", out);
    document.BeginObject("RootNode");
    WriteTree(root, document);
    document.Finish();
    return;
  }
  TextTree tree{u"USB tree", {}, {}, {}};
  std::vector<TextTree> others;
  for (const NodeView& controller : root.Childs) {
    if (IsUsbController(controller)) {
      tree.below.push_back(ControllerLine(controller));
      continue;
    }
    // A storage controller is worth a line only for devices below it, which events may name as if
    // they were on a port. The internal disks of most PCs are no such devices.
    NodeView top;
    top.Childs.push_back(controller);
    const std::vector<PlacedDevice> devices = PortDevices(top);
    if (!devices.empty()) others.push_back(StorageControllerLine(controller, devices));
  }
  for (TextTree& line : others) tree.below.push_back(std::move(line));
  PrintTextTree(tree, out);
}

}  // namespace zkusb
