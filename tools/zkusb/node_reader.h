// Reads nodes through the interfaces of the component.
#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "com/zkusb_monitor.h"
#include "tools/zkusb/node_view.h"

namespace zkusb {

// The one place where the commands touch node objects. The parent is never asked for: whoever
// releases it takes the record out of the tree that is still in use, and all there is to know about
// a node's place follows from the way down to it. Throws ComponentError, and std::runtime_error for
// a tree of more levels than any PC has.
NodeView ReadNode(IZKUMUsbTreeNode& node);
// The same without what lies more than `levels` below it.
NodeView ReadTop(IZKUMUsbTreeNode& node, int levels);

// Called with the instance id and the port path of each device on a port below a root, in the order
// of the tree. Much less is read than for views.
using PlaceHandler = std::function<void(std::u16string id, std::u16string portPath)>;
void ReadPlaces(IZKUMUsbTreeNode& root, const PlaceHandler& handler);

// Calls with the node's own text with all below it, which is valid during the call.
void ReadDump(IZKUMUsbTreeNode& node, const std::function<void(std::u16string_view)>& handler);

}  // namespace zkusb
