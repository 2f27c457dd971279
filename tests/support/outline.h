// Records as text: their dumps, those that are kept as files, and a tree with one line a node.
#pragma once

#include <gtest/gtest.h>

#include <fstream>

#include "platform/text.h"
#include "records/port_device.h"
#include "records/records.h"
#include "tests/support/golden.h"

namespace KelvoUHW {

inline std::string DumpOf(const CZKUMUsbTreeNodeImpl& node, const char16_t* indent = u"") {
  std::u16string out;
  node.ToString(out, indent);
  return platform::ToUtf8(out);
}

using testing_support::Golden;

// Depth in dots, kind, what tells the node apart, and where it hangs by its own account.
inline std::string OutlineOf(const NodePtr& node, const std::string& dots = "") {
  const std::string id = platform::ToUtf8(node->m_strDevInstId);
  const std::string quoted = id + " '" + platform::ToUtf8(node->m_strDeviceDescr) + "'";
  std::string out = dots + id;
  if (node->m_nType == KUDTHostController) out = dots + "controller " + id;
  if (node->m_nType == KUDTHub) out = dots + "hub " + quoted;
  if (node->m_nType == KUDTHubPort) {
    const auto port = node.StaticCast<CZKUMHubPortImpl>();
    out = dots + "port " + std::to_string(port->m_nPortIndex) + " status " + std::to_string(port->m_nStatus) + " " + id;
  }
  if (node->m_nType == KUDTPortDevice) {
    out = dots + "device " + quoted + " " + platform::ToUtf8(node->m_strDriverKeyName) + " speed " +
          std::to_string(node.StaticCast<CZKUMPortDeviceImpl>()->Speed());
  }
  if (!node->m_strDevInstIdParent.empty()) out += " < " + platform::ToUtf8(node->m_strDevInstIdParent);
  out += "\n";
  for (const NodePtr& child : node->m_childs) {
    EXPECT_EQ(child->m_pParent, node.Get());
    out += OutlineOf(child, dots + ".");
  }
  return out;
}

}  // namespace KelvoUHW
