#include "tree/tree_index.h"

#include <utility>

#include "platform/text.h"

namespace KelvoUHW {

using platform::FlatIndex;
using platform::HashOf;
using platform::SameText;

TreeIndex::TreeIndex(NodePtr root) : m_root(std::move(root)) { Added(m_root); }

TreeIndex::Entry TreeIndex::First(std::u16string_view instanceId) const noexcept {
  return m_byId.First(HashOf(instanceId), [&](Entry entry) {
    return SameText(m_nodes[entry]->m_strDevInstId, instanceId);
  });
}

NodePtr TreeIndex::Find(const std::u16string& instanceId) const {
  const Entry found = First(instanceId);
  if (found == FlatIndex::kNone) return {};
  if (m_byId.Next(found) == FlatIndex::kNone) return NodePtr::SharedWithOthers(m_nodes[found]);
  // Which of several comes first depends on where they hang by now: the search knows.
  return FindByInstanceId(m_root, instanceId);
}

NodePtr TreeIndex::FindPortDevice(const std::u16string& instanceId) const {
  const auto isPortDevice = [this](Entry entry) {
    return m_nodes[entry]->m_nType == KUDTPortDevice;
  };
  const Entry first = First(instanceId);
  // A volume's device node and interface device carry one id: no need to search which comes first.
  Entry entry = first;
  while (entry != FlatIndex::kNone && !isPortDevice(entry)) entry = m_byId.Next(entry);
  if (entry == FlatIndex::kNone) return {};
  NodePtr node = m_byId.Next(first) == FlatIndex::kNone ? NodePtr::SharedWithOthers(m_nodes[first])
                                                        : FindByInstanceId(m_root, instanceId);
  return node && node->m_nType == KUDTPortDevice ? node : NodePtr();
}

void TreeIndex::Added(const NodePtr& node) {
  VisitPreOrder(node, [this](const NodePtr& each) {
    m_nodes.push_back(each.Get());
    Enter(static_cast<Entry>(m_nodes.size() - 1));
    return true;
  });
}

void TreeIndex::Enter(Entry entry) {
  const std::u16string& id = m_nodes[entry]->m_strDevInstId;
  m_byId.Add(HashOf(id), entry,
             [&](Entry other) { return SameText(m_nodes[other]->m_strDevInstId, id); });
}

void TreeIndex::Renamed(const CZKUMUsbTreeNodeImpl& node, const std::u16string& earlierId) {
  if (earlierId == node.m_strDevInstId) return;
  // Where it stands it stands under its earlier id still.
  const auto hadEarlierId = [&](Entry entry) {
    const CZKUMUsbTreeNodeImpl* each = m_nodes[entry];
    return each == &node || SameText(each->m_strDevInstId, earlierId);
  };
  const std::size_t hash = HashOf(earlierId);
  Entry entry = m_byId.First(hash, hadEarlierId);
  while (entry != FlatIndex::kNone && m_nodes[entry] != &node) entry = m_byId.Next(entry);
  if (entry == FlatIndex::kNone) return;
  m_byId.Remove(hash, entry, hadEarlierId);
  Enter(entry);
}

}  // namespace KelvoUHW
