#include "tree/tree_index.h"

#include <algorithm>
#include <utility>

namespace KelvoUHW {

TreeIndex::TreeIndex(NodePtr root) : m_root(std::move(root)) { Added(m_root); }

NodePtr TreeIndex::Find(const std::u16string& instanceId) const {
  const auto found = m_nodes.find(instanceId);
  if (found == m_nodes.end() || found->second.empty()) return {};
  if (found->second.size() == 1) return found->second.front();
  // Which of several comes first depends on where they hang by now: the search knows.
  return FindByInstanceId(m_root, instanceId);
}

NodePtr TreeIndex::FindPortDevice(const std::u16string& instanceId) const {
  const auto isPortDevice = [](const NodePtr& node) { return node->m_nType == KUDTPortDevice; };
  const auto found = m_nodes.find(instanceId);
  // A volume's device node and interface device carry one id: no need to search which comes first.
  if (found == m_nodes.end() || std::ranges::none_of(found->second, isPortDevice)) return {};
  NodePtr node = Find(instanceId);
  return node && isPortDevice(node) ? node : NodePtr();
}

void TreeIndex::Added(const NodePtr& node) {
  VisitPreOrder(node, [this](const NodePtr& each) {
    m_nodes[each->m_strDevInstId].push_back(each);
    return true;
  });
}

void TreeIndex::Renamed(const CZKUMUsbTreeNodeImpl& node, const std::u16string& earlierId) {
  const auto earlier = m_nodes.find(earlierId);
  if (earlier == m_nodes.end() || earlierId == node.m_strDevInstId) return;
  auto& nodes = earlier->second;
  const auto place = std::find_if(nodes.begin(), nodes.end(),
                                  [&](const NodePtr& each) { return each.Get() == &node; });
  if (place == nodes.end()) return;
  NodePtr renamed = std::move(*place);
  nodes.erase(place);
  m_nodes[node.m_strDevInstId].push_back(std::move(renamed));
}

}  // namespace KelvoUHW
