// What the system has told about the device-manager nodes in one build: no question is asked twice.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/flat_index.h"
#include "platform/host.h"

namespace KelvoUHW {

// A registry property as it was received; `chars` holds `bytes` bytes, an odd one at the end with a
// zero behind it.
struct PropertyAnswer {
  bool has = false;  // false: the device lacks the property
  std::uint32_t type = 0;
  std::uint32_t bytes = 0;
  std::u16string_view chars;
};

// A device manager that asks the system for each parent and each id once, and a store of properties
// that were read. It serves one build over a PC that is taken not to change meanwhile. What
// succeeded is remembered, and that a device lacks a property; any other failure is asked again.
// One thread at a time.
class DeviceAnswers final : public platform::DeviceManager {
 public:
  explicit DeviceAnswers(platform::DeviceManager& base) noexcept : m_base(base) {}

  // A build starts or has ended; memory is given back.
  void Forget() noexcept;

  platform::Status LocateRootDevNode(platform::DevInst& node) noexcept override;
  platform::Status GetParent(platform::DevInst node, platform::DevInst& parent) noexcept override;
  platform::Status GetChild(platform::DevInst node, platform::DevInst& child) noexcept override;
  platform::Status GetSibling(platform::DevInst node, platform::DevInst& sibling) noexcept override;
  platform::Status GetDeviceId(platform::DevInst node, char16_t* buffer,
                               std::uint32_t bufferChars) noexcept override;
  platform::Status GetDevNodeRegistryProperty(platform::DevInst node, std::uint32_t property,
                                              std::uint32_t* type, void* buffer,
                                              std::uint32_t& bytes) noexcept override;

  // Asks the system whatever is known already, and remembers what it says now.
  platform::Status AskParent(platform::DevInst node, platform::DevInst& parent) noexcept;

  // Whether a property (a kSPDRP_ constant) of the node is known. The text of `answer` is valid
  // until the next one is kept.
  bool FindProperty(platform::DevInst node, std::uint32_t property,
                    PropertyAnswer& answer) const noexcept;
  // May throw std::bad_alloc, and has kept nothing then.
  void KeepProperty(platform::DevInst node, std::uint32_t property, const PropertyAnswer& answer);

 private:
  using Entry = platform::FlatIndex::Entry;
  static constexpr Entry kNone = platform::FlatIndex::kNone;
  struct Node {
    platform::DevInst node = 0;
    platform::DevInst parent = 0;
    bool hasParent = false;
    std::uint32_t idOffset = kNone;  // in m_texts
    std::uint32_t idChars = 0;
    Entry firstProperty = kNone;  // in m_properties
  };
  struct Property {
    std::uint32_t property = 0;
    std::uint32_t type = 0;
    std::uint32_t offset = 0;  // in m_texts
    std::uint32_t bytes = 0;
    bool has = false;
    Entry next = kNone;  // of the same node
  };

  const Node* Find(platform::DevInst node) const noexcept;
  Node& FindOrAdd(platform::DevInst node);

  platform::DeviceManager& m_base;
  platform::FlatIndex m_index;
  std::vector<Node> m_nodes;
  std::vector<Property> m_properties;
  std::u16string m_texts;
  // Most questions come in a row about one node.
  mutable Entry m_lastFound = kNone;
};

// A device manager for walks over all nodes: a walk that was disturbed has to find the nodes as
// they are when it is repeated, so nothing is answered from memory, but what it is told of parents
// is kept for the rest of the build.
class FreshDeviceManager final : public platform::DeviceManager {
 public:
  FreshDeviceManager(platform::DeviceManager& base, DeviceAnswers& answers) noexcept
      : m_base(base), m_answers(answers) {}

  platform::Status LocateRootDevNode(platform::DevInst& node) noexcept override {
    return m_base.LocateRootDevNode(node);
  }
  platform::Status GetParent(platform::DevInst node, platform::DevInst& parent) noexcept override {
    return m_answers.AskParent(node, parent);
  }
  platform::Status GetChild(platform::DevInst node, platform::DevInst& child) noexcept override {
    return m_base.GetChild(node, child);
  }
  platform::Status GetSibling(platform::DevInst node,
                              platform::DevInst& sibling) noexcept override {
    return m_base.GetSibling(node, sibling);
  }
  platform::Status GetDeviceId(platform::DevInst node, char16_t* buffer,
                               std::uint32_t bufferChars) noexcept override {
    return m_base.GetDeviceId(node, buffer, bufferChars);
  }
  platform::Status GetDevNodeRegistryProperty(platform::DevInst node, std::uint32_t property,
                                              std::uint32_t* type, void* buffer,
                                              std::uint32_t& bytes) noexcept override {
    return m_base.GetDevNodeRegistryProperty(node, property, type, buffer, bytes);
  }

 private:
  platform::DeviceManager& m_base;
  DeviceAnswers& m_answers;
};

}  // namespace KelvoUHW
