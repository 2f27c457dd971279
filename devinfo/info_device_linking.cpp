#include "devinfo/info_device_linking.h"

#include <string_view>
#include <unordered_map>
#include <unordered_set>
#include <utility>
#include <vector>

namespace KelvoUHW {

namespace {

using Record = const CZKUMUsbTreeNodeImpl*;

struct Link {
  InfoDevicePtr child;
  InfoDevicePtr parent;  // empty where the set has none
};

std::vector<Link> FindParents(const InfoDeviceSet& records) {
  std::vector<Link> links;
  links.reserve(records.size());
  for (const InfoDevicePtr& child : records) {
    links.push_back({child, records.FindByInstanceId(child->m_strDevInstIdParent)});
  }
  return links;
}

// The records that are ancestors of themselves. Each has one parent at most, so one walk upwards
// from each record not yet seen meets every circle once.
std::unordered_set<Record> FindCircles(const std::vector<Link>& links) {
  std::unordered_map<Record, Record> parentOf;
  for (const Link& link : links) parentOf.emplace(link.child.Get(), link.parent.Get());

  std::unordered_set<Record> onCircle;
  std::unordered_map<Record, Record> seenFrom;  // by the record the walk started at
  for (const Link& link : links) {
    const Record start = link.child.Get();
    Record at = start;
    while (at != nullptr && seenFrom.try_emplace(at, start).second) at = parentOf.at(at);
    if (at == nullptr || seenFrom.at(at) != start) continue;
    while (onCircle.insert(at).second) at = parentOf.at(at);
  }
  return onCircle;
}

// AddChild for many children of one parent: compares a new child only with those of the same
// instance id, which all that are the same node have.
class ChildAdder {
 public:
  void Add(const NodePtr& child, CZKUMUsbTreeNodeImpl& parent) {
    const auto [known, fresh] = m_childrenOf.try_emplace(&parent);
    ById& children = known->second;
    if (fresh) {
      for (const NodePtr& present : parent.m_childs) {
        children.emplace(present->m_strDevInstId, present.Get());
      }
    }
    const auto [first, last] = children.equal_range(child->m_strDevInstId);
    for (auto present = first; present != last; ++present) {
      if (present->second->IsSameNode(*child)) return;
    }
    children.emplace(child->m_strDevInstId, child.Get());
    parent.m_childs.push_back(child);
    child->m_pParent = &parent;
  }

 private:
  // The texts are the children's own, and the parents keep those alive.
  using ById = std::unordered_multimap<std::u16string_view, Record>;
  std::unordered_map<Record, ById> m_childrenOf;
};

}  // namespace

void LinkToParents(const InfoDeviceSet& records) {
  const std::vector<Link> links = FindParents(records);
  const std::unordered_set<Record> onCircle = FindCircles(links);
  ChildAdder adder;
  for (const Link& link : links) {
    if (link.parent && !onCircle.contains(link.child.Get())) adder.Add(link.child, *link.parent);
  }
}

}  // namespace KelvoUHW
