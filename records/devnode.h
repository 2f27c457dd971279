// Device-manager nodes by their handle: description, id, parent; and the search by driver key.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/flat_index.h"
#include "platform/host.h"
#include "records/identifiers.h"

namespace KelvoUHW {

// Failures of the system are empty texts and 0; std::bad_alloc is the only exception.

// The description (at most 199 characters), or empty when the handle is 0 or the call fails.
std::u16string GetDeviceDescription(platform::DeviceManager& manager, platform::DevInst node);

// What a freshly reset device record holds in place of a handle.
inline constexpr platform::DevInst kUnknownDevInst = 0xFFFFFFFF;

// The device id (at most 199 characters) with / turned into \, or empty when the handle is 0 or
// unknown or the call fails.
std::u16string GetDeviceId(platform::DeviceManager& manager, platform::DevInst node);

// The two steps of ResolveParentInstanceId, for a caller that has not read the node's own id: only
// when the first one says that the node is a volume below the volume manager, the second needs it.
bool ReadParent(platform::DeviceManager& manager, NodeIdentity& node);
void NameDiskAsParent(NodeIdentity& node);

// Fills m_devInstHandleParent and m_strDevInstIdParent from m_devInstHandle. The parent's handle
// stays as it was where the call fails; its id is read either way. A volume below the volume
// manager (ROOT\VOLMGR\) gets its disk's id instead, taken from its own id.
void ResolveParentInstanceId(platform::DeviceManager& manager, NodeIdentity& node);

// The first node, depth first from the root, whose driver key equals `driverKey` ignoring case; 0
// when none does.
platform::DevInst FindDevNodeByDriverKey(platform::DeviceManager& manager,
                                         const std::u16string& driverKey);

// The same answers from one walk over all nodes, made at the first question. One object serves one
// build: it does not notice what changes afterwards. A walk that broke off at a device that went
// meanwhile is no answer for the devices behind it: it is made again, and once more for each
// further key until one comes to its end, as if every key were searched on its own.
class DriverKeyIndex {
 public:
  explicit DriverKeyIndex(platform::DeviceManager& manager) noexcept : m_manager(manager) {}
  platform::DevInst Find(const std::u16string& driverKey);

 private:
  // A key is its class, "{...}", which most others have too, and what tells it from those.
  struct Node {
    std::uint32_t restBegin, restChars;  // in m_rests
    std::uint32_t keyClass;              // position in m_classes
    platform::DevInst handle;
  };

  void Fill();
  void Add(std::u16string_view key, platform::DevInst node);
  std::uint32_t PlaceOfClass(std::u16string_view keyClass);
  bool IsKeyOf(platform::FlatIndex::Entry entry, std::u16string_view key) const noexcept;

  platform::DeviceManager& m_manager;
  std::vector<Node> m_nodes;              // in the order of the walk
  std::u16string m_rests;                 // lower-cased, one behind the other
  std::vector<std::u16string> m_classes;  // lower-cased
  platform::FlatIndex m_classIndex;
  platform::FlatIndex m_index;
  std::u16string m_lowered;  // the key that is looked for or added
  bool m_complete = false;   // the walk that filled this came to its end
  int m_walks = 0;
};

}  // namespace KelvoUHW
