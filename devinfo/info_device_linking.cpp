#include "devinfo/info_device_linking.h"

#include <vector>

#include "platform/flat_index.h"
#include "platform/text.h"

namespace KelvoUHW {

namespace {

using platform::FlatIndex;
using Entry = FlatIndex::Entry;

// A record of the set, which has the pointer, and the number of its parent. By number; null for one
// that was erased.
struct Link {
  const InfoDevicePtr* child = nullptr;
  Entry parent = FlatIndex::kNone;
};

std::vector<Link> FindParents(const InfoDeviceSet& records) {
  std::vector<Link> links(records.NumbersEnd());
  for (Entry number = 0; number < links.size(); ++number) {
    Link& link = links[number];
    link.child = records.WithNumber(number);
    if (link.child == nullptr) continue;
    link.parent = records.NumberByInstanceId((*link.child)->m_strDevInstIdParent);
  }
  return links;
}

// By number, whether the record is an ancestor of itself. Each has one parent at most, so one walk
// upwards from each record not yet seen meets every circle once.
std::vector<bool> FindCircles(const std::vector<Link>& links) {
  std::vector<bool> onCircle(links.size());
  std::vector<Entry> seenFrom(links.size(), FlatIndex::kNone);  // the record the walk started at
  for (Entry start = 0; start < links.size(); ++start) {
    Entry at = start;
    while (at != FlatIndex::kNone && seenFrom[at] == FlatIndex::kNone) {
      seenFrom[at] = start;
      at = links[at].parent;
    }
    if (at == FlatIndex::kNone || seenFrom[at] != start) continue;
    for (; !onCircle[at]; at = links[at].parent) onCircle[at] = true;
  }
  return onCircle;
}

// AddChild for many children of one parent: compares a new child only with those of the same
// instance id, which all that are the same node have.
class ChildAdder {
 public:
  explicit ChildAdder(std::size_t parents) : m_known(parents) {}

  // `place` tells the parent from the others.
  void Add(const NodePtr& child, CZKUMUsbTreeNodeImpl& parent, Entry place) {
    // Most parents have a child or two, which are compared sooner than entered.
    constexpr std::size_t kFewChildren = 4;
    if (parent.m_childs.size() < kFewChildren) return AddChild(child, &parent);
    if (!m_known[place]) {
      m_known[place] = true;
      for (const NodePtr& present : parent.m_childs) {
        if (present) Remember(*present, place);
      }
    }
    const auto same = [&](Entry entry) { return IsOf(entry, place, child->m_strDevInstId); };
    for (Entry entry = m_byId.First(HashOf(place, child->m_strDevInstId), same);
         entry != FlatIndex::kNone; entry = m_byId.Next(entry)) {
      if (m_children[entry].child->IsSameNode(*child)) return;
    }
    parent.m_childs.push_back(child);
    child->m_pParent = &parent;
    Remember(*child, place);
  }

 private:
  struct Child {
    Entry parent;
    const CZKUMUsbTreeNodeImpl* child;
  };

  static std::size_t HashOf(Entry parent, std::u16string_view id) noexcept {
    return platform::HashOf(parent) ^ platform::HashOf(id);
  }
  bool IsOf(Entry entry, Entry parent, std::u16string_view id) const noexcept {
    return m_children[entry].parent == parent &&
           platform::SameText(m_children[entry].child->m_strDevInstId, id);
  }
  void Remember(const CZKUMUsbTreeNodeImpl& child, Entry parent) {
    m_children.push_back({parent, &child});
    m_byId.Add(HashOf(parent, child.m_strDevInstId), static_cast<Entry>(m_children.size() - 1),
               [&](Entry entry) { return IsOf(entry, parent, child.m_strDevInstId); });
  }

  std::vector<bool> m_known;  // parents whose children are in the index
  std::vector<Child> m_children;
  FlatIndex m_byId;
};

}  // namespace

void LinkToParents(const InfoDeviceSet& records) {
  const std::vector<Link> links = FindParents(records);
  const std::vector<bool> onCircle = FindCircles(links);
  ChildAdder adder(links.size());
  for (Entry place = 0; place < links.size(); ++place) {
    const Link& link = links[place];
    if (link.parent == FlatIndex::kNone || onCircle[place]) continue;
    adder.Add(*link.child, **links[link.parent].child, link.parent);
  }
}

}  // namespace KelvoUHW
