#include "records/usb_port_info.h"

#include <algorithm>
#include <atomic>
#include <utility>

namespace KelvoUHW {

namespace {

constinit std::atomic<std::size_t> g_nLive = 0;
constinit std::atomic<std::size_t> g_nKept = 0;
// The kept records hang from here, so that they are seen as kept and not as lost memory.
constinit std::atomic<ConnectionRecord*> g_pKept = nullptr;

}  // namespace

ConnectionRecord::ConnectionRecord() noexcept : platform::ConnectionInformationEx{} { ++g_nLive; }
ConnectionRecord::~ConnectionRecord() { --g_nLive; }

void ConnectionRecord::KeepForProcessLife(std::unique_ptr<ConnectionRecord> record) noexcept {
  if (!record) return;
  ConnectionRecord* const kept = record.release();
  // Records are only ever added, so a plain exchange of the head needs no lock.
  kept->m_pNextKept = g_pKept;
  while (!g_pKept.compare_exchange_weak(kept->m_pNextKept, kept)) {
  }
  ++g_nKept;
}

std::size_t ConnectionRecord::LiveCount() noexcept { return g_nLive; }
std::size_t ConnectionRecord::KeptCount() noexcept { return g_nKept; }

StringDescriptorNode::~StringDescriptorNode() {
  std::unique_ptr<StringDescriptorNode> rest = std::move(Next);
  while (rest) rest = std::move(rest->Next);
}

std::u16string StringDescriptorNode::Text() const {
  const auto& bytes = StringDescriptor;
  if (bytes.empty()) return {};
  const std::size_t length = std::min<std::size_t>(bytes[0], bytes.size());
  std::u16string text;
  for (std::size_t offset = 2; offset + 1 < length; offset += 2) {
    text += static_cast<char16_t>(bytes[offset] | bytes[offset + 1] << 8);
  }
  return text;
}

const StringDescriptorNode* FindStringDescriptor(const StringDescriptorNode* head,
                                                 std::uint8_t index) noexcept {
  // In a descriptor, index 0 says that there is no string; the list may hold the language table
  // there.
  if (index == 0) return nullptr;
  while (head && head->DescriptorIndex != index) head = head->Next.get();
  return head;
}

}  // namespace KelvoUHW
