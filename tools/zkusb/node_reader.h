// Reads nodes through the interfaces of the component.
#pragma once

#include <string>

#include "com/zkusb_monitor.h"
#include "tools/zkusb/node_view.h"

namespace zkusb {

// The one place where the commands touch node objects. The parent is never asked for: whoever
// releases it takes the record out of the tree that is still in use, and all there is to know about
// a node's place follows from the way down to it. Throws ComponentError, and std::runtime_error for
// a tree of more levels than any PC has.
NodeView ReadNode(IZKUMUsbTreeNode& node);
// The node's own text with all below it.
std::u16string ReadDump(IZKUMUsbTreeNode& node);

}  // namespace zkusb
