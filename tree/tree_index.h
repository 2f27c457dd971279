// Nodes of a tree by instance id, answered as the depth-first search would, but without searching.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "platform/flat_index.h"
#include "records/node.h"

namespace KelvoUHW {

// Made for one publication, by one thread. It must be told of every change to the tree, from which
// nothing may be taken meanwhile.
class TreeIndex {
 public:
  explicit TreeIndex(NodePtr root);

  // What FindByInstanceId gives for the tree as it is now.
  NodePtr Find(const std::u16string& instanceId) const;
  // The same where that node is a port device, else empty.
  NodePtr FindPortDevice(const std::u16string& instanceId) const;
  // A node was hung into the tree, with everything below it.
  void Added(const NodePtr& node);
  // A node of the tree has changed its instance id.
  void Renamed(const CZKUMUsbTreeNodeImpl& node, const std::u16string& earlierId);

 private:
  using Entry = platform::FlatIndex::Entry;

  Entry First(std::u16string_view instanceId) const noexcept;
  void Enter(Entry entry);

  NodePtr m_root;
  // The tree holds them. Pointers of its own would touch a neighbour of each one's ring.
  std::vector<CZKUMUsbTreeNodeImpl*> m_nodes;
  platform::FlatIndex m_byId;
};

}  // namespace KelvoUHW
