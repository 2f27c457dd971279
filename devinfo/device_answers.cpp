#include "devinfo/device_answers.h"

#include <algorithm>
#include <new>

#include "platform/text.h"

namespace KelvoUHW {

void DeviceAnswers::Forget() noexcept {
  m_index = {};
  // Neither clear() nor an assigned {} would give memory back.
  std::vector<Node>().swap(m_nodes);
  std::vector<Property>().swap(m_properties);
  std::u16string().swap(m_texts);
}

const DeviceAnswers::Node* DeviceAnswers::Find(platform::DevInst node) const noexcept {
  if (m_lastFound >= m_nodes.size() || m_nodes[m_lastFound].node != node) {
    m_lastFound = m_index.First(platform::HashOf(node),
                                [&](Entry each) { return m_nodes[each].node == node; });
  }
  return m_lastFound == kNone ? nullptr : &m_nodes[m_lastFound];
}

DeviceAnswers::Node& DeviceAnswers::FindOrAdd(platform::DevInst node) {
  const std::size_t hash = platform::HashOf(node);
  const auto isNode = [&](Entry each) { return m_nodes[each].node == node; };
  if (const Entry entry = m_index.First(hash, isNode); entry != kNone) return m_nodes[entry];
  m_nodes.push_back({.node = node});
  try {
    m_index.Add(hash, static_cast<Entry>(m_nodes.size() - 1), isNode);
  } catch (const std::bad_alloc&) {
    m_nodes.pop_back();
    throw;
  }
  return m_nodes.back();
}

platform::Status DeviceAnswers::LocateRootDevNode(platform::DevInst& node) noexcept {
  return m_base.LocateRootDevNode(node);
}

platform::Status DeviceAnswers::GetParent(platform::DevInst node,
                                          platform::DevInst& parent) noexcept {
  if (const Node* known = Find(node); known != nullptr && known->hasParent) {
    parent = known->parent;
    return platform::Status::Success();
  }
  return AskParent(node, parent);
}

platform::Status DeviceAnswers::AskParent(platform::DevInst node,
                                          platform::DevInst& parent) noexcept {
  const platform::Status status = m_base.GetParent(node, parent);
  if (status) {
    // No memory to remember an answer is no reason to lose it.
    try {
      Node& known = FindOrAdd(node);
      known.parent = parent;
      known.hasParent = true;
    } catch (const std::bad_alloc&) {
    }
  }
  return status;
}

platform::Status DeviceAnswers::GetChild(platform::DevInst node,
                                         platform::DevInst& child) noexcept {
  return m_base.GetChild(node, child);
}

platform::Status DeviceAnswers::GetSibling(platform::DevInst node,
                                           platform::DevInst& sibling) noexcept {
  return m_base.GetSibling(node, sibling);
}

platform::Status DeviceAnswers::GetDeviceId(platform::DevInst node, char16_t* buffer,
                                            std::uint32_t bufferChars) noexcept {
  if (const Node* known = Find(node);
      known != nullptr && known->idOffset != kNone && known->idChars < bufferChars) {
    buffer[m_texts.copy(buffer, known->idChars, known->idOffset)] = u'\0';
    return platform::Status::Success();
  }
  const platform::Status status = m_base.GetDeviceId(node, buffer, bufferChars);
  if (status) {
    try {
      const std::u16string_view id = platform::UpToZero({buffer, bufferChars});
      Node& known = FindOrAdd(node);
      const auto offset = static_cast<std::uint32_t>(m_texts.size());
      m_texts.append(id);
      known.idOffset = offset;
      known.idChars = static_cast<std::uint32_t>(id.size());
    } catch (const std::bad_alloc&) {
    }
  }
  return status;
}

platform::Status DeviceAnswers::GetDevNodeRegistryProperty(platform::DevInst node,
                                                           std::uint32_t property,
                                                           std::uint32_t* type, void* buffer,
                                                           std::uint32_t& bytes) noexcept {
  return m_base.GetDevNodeRegistryProperty(node, property, type, buffer, bytes);
}

bool DeviceAnswers::FindProperty(platform::DevInst node, std::uint32_t property,
                                 PropertyAnswer& answer) const noexcept {
  const Node* known = Find(node);
  Entry entry = known != nullptr ? known->firstProperty : kNone;
  while (entry != kNone && m_properties[entry].property != property) {
    entry = m_properties[entry].next;
  }
  if (entry == kNone) return false;
  const Property& kept = m_properties[entry];
  const std::size_t chars = (kept.bytes + std::size_t{1}) / sizeof(char16_t);
  answer = {kept.has, kept.type, kept.bytes,
            std::u16string_view(m_texts).substr(kept.offset, chars)};
  return true;
}

void DeviceAnswers::KeepProperty(platform::DevInst node, std::uint32_t property,
                                 const PropertyAnswer& answer) {
  Node& known = FindOrAdd(node);
  const auto offset = static_cast<std::uint32_t>(m_texts.size());
  m_texts.append(answer.chars);
  m_properties.push_back(
      {property, answer.type, offset, answer.bytes, answer.has, known.firstProperty});
  known.firstProperty = static_cast<Entry>(m_properties.size() - 1);
}

}  // namespace KelvoUHW
