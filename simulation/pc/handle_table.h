// The handles of a simulated PC: what is open, who opened it, what was closed wrongly.
#pragma once

#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <variant>
#include <vector>

#include "platform/host.h"
#include "simulation/pc/simulated_pc.h"

namespace platform::simulated {

struct SetContents;

enum class FileKind : std::uint8_t { Controller, Hub, Interface, Drive };

struct OpenFile {
  FileKind kind;
  Text key;           // the name lowered, as the index knows it
  bool gone = false;  // what was opened has been unplugged; stays so when its twin comes back
};
struct OpenSet {
  std::shared_ptr<const SetContents> contents;
};
struct OpenImageList {};
struct VolumeSearch {
  std::vector<Text> names;
  std::size_t next = 0;
};
struct MountPointSearch {
  std::vector<Text> folders;
  std::size_t next = 0;
};
using OpenObject = std::variant<OpenFile, OpenSet, OpenImageList, VolumeSearch, MountPointSearch>;

// Handles are handed out once and never again, whatever their kind, so that a late use of a closed
// one is always found out; what it was is remembered of the latest handles only, or a long run
// would fill the memory. Not thread-safe: the PC's lock guards it.
class HandleTable {
 public:
  // `name` says what was opened; it outlives the object, for the report of a second close.
  std::intptr_t Open(OpenObject object, const Text& name);

  // The open object of that kind, or null. Stays valid until that object is closed.
  template <class Object>
  Object* Find(std::intptr_t handle) {
    const auto found = m_open.find(handle);
    return found == m_open.end() ? nullptr : std::get_if<Object>(&found->second.object);
  }

  // Refuses, and remembers, a handle that is not open or is of another kind.
  template <class Object>
  Status Close(std::intptr_t handle) {
    if (Find<Object>(handle) == nullptr)
      return Refuse(handle, KindName(OpenObject(Object{}).index()));
    m_open.erase(handle);
    return Status::Success();
  }

  template <class Visitor>
  void ForEachFile(Visitor visit) {
    for (auto& [handle, open] : m_open) {
      if (auto* file = std::get_if<OpenFile>(&open.object)) visit(*file);
    }
  }

  OpenCounts Counts() const;
  std::vector<Text> OpenNames() const;
  const std::vector<Text>& Misuses() const { return m_misuses; }

 private:
  static std::u16string_view KindName(std::size_t kind);
  Status Refuse(std::intptr_t handle, std::u16string_view closedAs);

  struct Slot {
    std::uint32_t kind;  // index into OpenObject
    std::uint32_t name;  // index into m_names
  };
  struct OpenEntry {
    OpenObject object;
    std::uint32_t name;
  };
  static constexpr std::size_t kRemembered = 4096;

  bool WasHandedOut(std::intptr_t handle) const;
  Text Describe(std::size_t kind, std::uint32_t name) const;
  Text DescribeClosed(std::intptr_t handle) const;

  std::uint64_t m_handedOut = 0;
  std::deque<Slot> m_slots;   // of the latest handles, closed ones too
  std::vector<Text> m_names;  // each name once: a long run opens the same few over and over
  std::unordered_map<Text, std::uint32_t> m_nameNumbers;
  std::map<std::intptr_t, OpenEntry> m_open;
  std::vector<Text> m_misuses;
};

}  // namespace platform::simulated
