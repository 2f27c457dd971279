// The base of all records. A record is the data of one node of the USB tree: controller, hub, port,
// device or volume. A tree of records is a snapshot; clients read it through the objects in com/.
//
// Records are plain data, filled by one thread and read by many once published. They carry no lock.
// Device records (info devices) are the exception: they live on from tree to tree, and each build
// may change their children and parent links, so reading those of a published tree must not overlap
// a build.
#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/host.h"
#include "records/device_types.h"
#include "records/identifiers.h"
#include "records/ring_ptr.h"

namespace KelvoUHW {

class CZKUMUsbTreeNodeImpl;
using NodePtr = RingPtr<CZKUMUsbTreeNodeImpl>;

// A non-owning link to a parent. Reading and writing are atomic: while one thread builds, another
// may release the last reference to an older tree, whose records clear the links that still name
// them.
class ParentLink {
 public:
  operator CZKUMUsbTreeNodeImpl*() const noexcept {
    return m_pNode.load(std::memory_order_acquire);
  }
  CZKUMUsbTreeNodeImpl* operator->() const noexcept { return *this; }
  ParentLink& operator=(CZKUMUsbTreeNodeImpl* node) noexcept {
    m_pNode.store(node, std::memory_order_release);
    return *this;
  }
  void ClearIfNaming(CZKUMUsbTreeNodeImpl* node) noexcept {
    m_pNode.compare_exchange_strong(node, nullptr);
  }

 private:
  std::atomic<CZKUMUsbTreeNodeImpl*> m_pNode = nullptr;
};

// What is added to the indent of a child's dump.
inline constexpr std::u16string_view kChildIndent = u"- ";

// While one lives, no record is destroyed that anybody holds: what the object of a `Parent` gives
// up stays until the last of these has ended. A build reads records between its calls to the
// system, where it holds no lock.
class RecordsInUse {
 public:
  RecordsInUse() noexcept;
  ~RecordsInUse();
  RecordsInUse(const RecordsInUse&) = delete;
  RecordsInUse& operator=(const RecordsInUse&) = delete;
};

// A list of children, and whatever else holds records, may have empty pointers: those to records
// that the object of a `Parent` has destroyed.
class CZKUMUsbTreeNodeImpl : public NodeIdentity, public RecordRings {
 public:
  CZKUMUsbTreeNodeImpl() = default;
  CZKUMUsbTreeNodeImpl(const CZKUMUsbTreeNodeImpl&) = delete;
  CZKUMUsbTreeNodeImpl& operator=(const CZKUMUsbTreeNodeImpl&) = delete;

  // The virtual operations, in this order in every class.

  // Sets the parent link of each child that still names this record to null: device records are
  // shared between successive trees, and a climb must end at null and not in freed memory.
  virtual ~CZKUMUsbTreeNodeImpl();
  // Whether the node is kept when a replaced tree is pruned. Every class answers true.
  virtual bool AcceptNode(const NodePtr& node);
  // Appends the text dump of the node and its subtree. Each line starts with `indent` and ends with
  // "\r\n". A loop over the tree, however deep: what differs between kinds of node is OwnLines.
  virtual void ToString(std::u16string& out, std::u16string indent) const;

  // Deletes a record of which a ring has lost its last pointer; pointers of other rings hold
  // nothing from then on. Records that die with it are deleted one after the other and not inside
  // each other, so a chain of any depth needs no more stack than one record. Waits for readers: the
  // calling thread must not be one (see RecordReadLock).
  static void Destroy(CZKUMUsbTreeNodeImpl* record) noexcept;

  // Whether a child has this driver key, ignoring case.
  bool HasChildWithDriverKey(const std::u16string& driverKey) const;
  // Same instance id, product id, product text, serial number and description, compared exactly.
  // The vendor id is deliberately not compared.
  bool IsSameNode(const CZKUMUsbTreeNodeImpl& other) const noexcept;

  const TUsbDeviceType m_nType = KUDTUnknown;
  // The non-owning link upwards; null for a root and for a node that hangs nowhere.
  ParentLink m_pParent;
  std::vector<NodePtr> m_childs;
  std::u16string m_strDeviceDescr;
  std::u16string m_strDriverKeyName;

 private:
  friend class RecordsInUse;
  CZKUMUsbTreeNodeImpl* m_pNextToDelete = nullptr;

 protected:
  explicit CZKUMUsbTreeNodeImpl(TUsbDeviceType type) noexcept : m_nType(type) {}

  // What the dump shows of the node itself, before its children.
  virtual void OwnLines(std::u16string& out, const std::u16string& indent) const;
  // The lines every kind of node shares.
  void BaseToString(std::u16string& out, const std::u16string& indent) const;
};

// Hangs a node below a parent, unless one of the parent's children is the same node: then nothing
// changes. Without a parent or a child nothing happens.
void AddChild(const NodePtr& child, CZKUMUsbTreeNodeImpl* parent);

// The first node with this instance id (compared exactly), a node before its children and children
// in their order; empty when there is none.
NodePtr FindByInstanceId(const NodePtr& root, const std::u16string& instanceId);

// Calls `visit` with every NodePtr of a tree that holds a record, a node before its children and
// children in their order. `visit` returns whether to go on. Nodes must not be added or removed
// meanwhile.
template <class Visit>
void VisitPreOrder(const NodePtr& root, Visit visit) {
  // Kept on the heap: how deep a tree goes is up to the hardware.
  std::vector<const NodePtr*> waiting;
  if (root) waiting.push_back(&root);
  while (!waiting.empty()) {
    const NodePtr& node = *waiting.back();
    waiting.pop_back();
    if (!visit(node)) return;
    for (auto child = node->m_childs.rbegin(); child != node->m_childs.rend(); ++child) {
      if (*child) waiting.push_back(&*child);
    }
  }
}

// Appends indent + parts + "\r\n". No text is made for it: dumps have many lines.
template <class... Parts>
void AppendLineOf(std::u16string& out, std::u16string_view indent, const Parts&... parts) {
  out.append(indent);
  (out.append(parts), ...);
  out.append(u"\r\n");
}
// Appends indent + label + value + "\r\n", the shape of most lines of a dump.
void AppendLine(std::u16string& out, std::u16string_view indent, std::u16string_view label,
                std::u16string_view value = {});

}  // namespace KelvoUHW
