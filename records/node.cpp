#include "records/node.h"

#include <algorithm>
#include <atomic>
#include <utility>

#include "platform/text.h"
#include "records/devnode.h"
#include "records/record_lock.h"

namespace KelvoUHW {

namespace {

// The records of one thread that wait to be deleted.
struct Deletions {
  CZKUMUsbTreeNodeImpl* waiting = nullptr;
  bool running = false;
};
thread_local Deletions t_deletions;

// The records of all threads that are deleted when nobody uses records any more. Uses come and go
// as readers of the record lock, and records are added by its writer.
constinit std::atomic<int> g_nUses = 0;
constinit std::atomic<CZKUMUsbTreeNodeImpl*> g_keptForUses = nullptr;

}  // namespace

// As a reader: a deletion that has begun ends first, and the next one sees the count.
RecordsInUse::RecordsInUse() noexcept {
  const RecordReadLock reading;
  ++g_nUses;
}

RecordsInUse::~RecordsInUse() {
  CZKUMUsbTreeNodeImpl* kept = nullptr;
  {
    const RecordReadLock reading;
    if (--g_nUses == 0) kept = g_keptForUses.exchange(nullptr);
  }
  while (kept) {
    CZKUMUsbTreeNodeImpl* const next = std::exchange(kept->m_pNextToDelete, nullptr);
    CZKUMUsbTreeNodeImpl::Destroy(kept);
    kept = next;
  }
}

void CZKUMUsbTreeNodeImpl::Destroy(CZKUMUsbTreeNodeImpl* record) noexcept {
  record->m_pNextToDelete = std::exchange(t_deletions.waiting, record);
  if (t_deletions.running) return;
  // Whoever reads follows links to records that it does not hold, a build while it joins them and a
  // client on the way to a parent: none may die under it.
  const RecordWriteLock lock;
  t_deletions.running = true;
  while (CZKUMUsbTreeNodeImpl* next = t_deletions.waiting) {
    t_deletions.waiting = next->m_pNextToDelete;
    // Asked with the lock held: a build may have begun while this thread waited for it.
    if (g_nUses > 0 && next->IsHeld()) {
      next->m_pNextToDelete = g_keptForUses.exchange(next);
      continue;
    }
    next->LetAllGo();
    delete next;
  }
  t_deletions.running = false;
}

CZKUMUsbTreeNodeImpl::~CZKUMUsbTreeNodeImpl() {
  for (const NodePtr& child : m_childs) {
    if (child) child->m_pParent.ClearIfNaming(this);
  }
}

bool CZKUMUsbTreeNodeImpl::AcceptNode(const NodePtr&) { return true; }

void CZKUMUsbTreeNodeImpl::ToString(std::u16string& out, std::u16string indent) const {
  struct Level {
    const CZKUMUsbTreeNodeImpl* node;
    std::size_t nextChild;
  };
  std::vector<Level> path;
  path.reserve(8);  // deeper than most: each device record below a port is dumped on its own
  const auto enter = [&](const CZKUMUsbTreeNodeImpl& node) {
    node.OwnLines(out, indent);
    // The number is the constant 0 and not the count of children. Deliberate: readers of dumps
    // depend on the line as it is.
    out += u"childvector size0\r\n";
    path.push_back({&node, 0});
  };
  enter(*this);
  while (!path.empty()) {
    Level& level = path.back();
    if (level.nextChild == level.node->m_childs.size()) {
      out += u"ChildsToString End\r\n";
      path.pop_back();
      if (!path.empty()) indent.resize(indent.size() - kChildIndent.size());
      continue;
    }
    const NodePtr& child = level.node->m_childs[level.nextChild];
    out.append(u"child ");
    out.append(platform::Decimal(static_cast<std::int32_t>(level.nextChild++))).append(u"\r\n");
    if (!child) continue;
    indent += kChildIndent;
    enter(*child);
  }
}

void CZKUMUsbTreeNodeImpl::OwnLines(std::u16string& out, const std::u16string& indent) const {
  BaseToString(out, indent);
}

void CZKUMUsbTreeNodeImpl::BaseToString(std::u16string& out, const std::u16string& indent) const {
  const auto lineUnlessEmpty = [&](std::u16string_view label, const std::u16string& value) {
    if (!value.empty()) AppendLine(out, indent, label, value);
  };
  lineUnlessEmpty(u"DevInstId            : ", m_strDevInstId);
  lineUnlessEmpty(u"driverKeyName : ", m_strDriverKeyName);
  lineUnlessEmpty(u"m_strDevInstIdParent : ", m_strDevInstIdParent);
  lineUnlessEmpty(u"deviceDescr : ", m_strDeviceDescr);
  lineUnlessEmpty(u"serial number        : ", m_strSerialNumber);
  if (m_nVendorId != kUnknownId || m_nProductId != kUnknownId) {
    AppendLineOf(out, indent, u"VendorId; productId: 0x", platform::Hex(m_nVendorId), u"; 0x",
                 platform::Hex(m_nProductId));
  } else if (!m_strVendor.empty() || !m_strProduct.empty()) {
    AppendLineOf(out, indent, u"Vendor; product: ", m_strVendor, u";", m_strProduct);
  }
  const auto lineUnlessZero = [&](std::u16string_view label, platform::DevInst handle) {
    if (handle == 0) return;
    AppendLine(out, indent, label, platform::Decimal(static_cast<std::int32_t>(handle)));
  };
  lineUnlessZero(u"devInstHandle        : ", m_devInstHandle);
  lineUnlessZero(u"devInstHandleParent  : ", m_devInstHandleParent);
}

bool CZKUMUsbTreeNodeImpl::HasChildWithDriverKey(const std::u16string& driverKey) const {
  return std::any_of(m_childs.begin(), m_childs.end(), [&](const NodePtr& child) {
    return child && platform::EqualIgnoringCase(child->m_strDriverKeyName, driverKey);
  });
}

bool CZKUMUsbTreeNodeImpl::IsSameNode(const CZKUMUsbTreeNodeImpl& other) const noexcept {
  using platform::SameText;
  return m_nProductId == other.m_nProductId && SameText(m_strDevInstId, other.m_strDevInstId) &&
         SameText(m_strProduct, other.m_strProduct) &&
         SameText(m_strSerialNumber, other.m_strSerialNumber) &&
         SameText(m_strDeviceDescr, other.m_strDeviceDescr);
}

void AddChild(const NodePtr& child, CZKUMUsbTreeNodeImpl* parent) {
  if (parent == nullptr || !child) return;
  for (const NodePtr& present : parent->m_childs) {
    if (present && present->IsSameNode(*child)) return;
  }
  parent->m_childs.push_back(child);
  child->m_pParent = parent;
}

NodePtr FindByInstanceId(const NodePtr& root, const std::u16string& instanceId) {
  NodePtr found;
  VisitPreOrder(root, [&](const NodePtr& node) {
    if (node->m_strDevInstId != instanceId) return true;
    found = node;
    return false;
  });
  return found;
}

void AppendLine(std::u16string& out, std::u16string_view indent, std::u16string_view label,
                std::u16string_view value) {
  AppendLineOf(out, indent, label, value);
}

}  // namespace KelvoUHW
