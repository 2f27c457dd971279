// Look-ups in a machine: names, numbers and the device tree, each in constant time.
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/flat_index.h"
#include "platform/setup_api.h"
#include "simulation/machine/machine.h"

namespace platform::simulated {

struct GuidOrder {
  bool operator()(const Guid& a, const Guid& b) const noexcept;
};

// The text a GUID is written as, with or without its braces' case; the null GUID where it is none.
Guid GuidOf(const std::optional<Text>& text);

// Device numbers, from 1 in the order in which ids first appear. They belong to the PC, not to one
// state of its machine: an id that comes back gets the number it had.
class DeviceNumbers {
 public:
  DevInst NumberOf(const Text& loweredId);

 private:
  std::unordered_map<Text, DevInst> m_numbers;
};

// What a device-information set holds: a snapshot, shared by all sets of one kind that are taken
// before the machine changes.
struct SetContents {
  struct DeviceElement {
    DevInst number;
    Guid classGuid;
  };
  struct InterfaceElement {
    Guid interfaceClass;
    Text path;
    std::uint32_t device;  // position in `devices`
  };
  std::vector<DeviceElement> devices;
  std::vector<InterfaceElement> interfaces;
  // Positions in `interfaces`, by class, in the order of the file.
  std::map<Guid, std::vector<std::uint32_t>, GuidOrder> byClass;
};

// What the system knows of a device class.
struct ClassInfo {
  bool hasImage = true;
  bool hasDescription = true;
  Text name;  // the class name of a device of the class
};

// Positions by name, in memory of its own. Where a name is entered twice, the first one counts.
class NameTable {
 public:
  static constexpr std::uint32_t kNone = static_cast<std::uint32_t>(-1);

  void Enter(std::u16string_view loweredName, std::uint32_t position);
  std::uint32_t Find(std::u16string_view loweredName) const noexcept;

 private:
  struct Name {
    std::size_t begin;  // in m_texts
    std::size_t length;
    std::uint32_t position;
  };

  std::u16string_view TextOf(FlatIndex::Entry entry) const noexcept;

  std::vector<Name> m_names;
  Text m_texts;
  FlatIndex m_index;
};

// Built over one state of a machine, which must outlive it unchanged. Positions are those in the
// machine's lists. Names are asked for in lower case. Where a program built a machine with one name
// twice, the first one counts. Not thread-safe: the PC's lock guards it.
class MachineIndex {
 public:
  using Position = std::uint32_t;
  static constexpr Position kNone = NameTable::kNone;
  // Stands for the root device where a device's position is meant.
  static constexpr Position kRoot = static_cast<Position>(-2);

  MachineIndex(const Machine& machine, DeviceNumbers& numbers);

  Position Device(const Text& id) const { return m_devices.Find(id); }
  // kRoot for the root device's number, kNone for a number without a present device.
  Position DeviceByNumber(DevInst number) const;
  DevInst NumberOf(Position device) const;
  // kRoot for a device at the top, kNone for the root device and one that shows no parent.
  Position Parent(Position device) const;
  Position FirstChild(Position device) const;
  Position NextSibling(Position device) const;

  Position Controller(const Text& name) const { return m_controllers.Find(name); }
  Position Hub(const Text& name) const { return m_hubs.Find(name); }
  Position Interface(const Text& path) const { return m_interfaces.Find(path); }
  Position Storage(const Text& path) const { return m_storage.Find(path); }
  Position Volume(const Text& name) const { return m_volumes.Find(name); }
  Position VolumeByPath(const Text& path) const { return m_volumePaths.Find(path); }
  Position VolumeByDevice(const Text& id) const { return m_volumeDevices.Find(id); }
  // The drive of a letter in either case.
  Position Drive(char16_t letter) const;

  // Null for a class that no device is of.
  const ClassInfo* Class(const Guid& classGuid) const;

  // All devices, or those of a class; all interfaces, or those of a class, with their devices.
  std::shared_ptr<const SetContents> Devices(const Guid* classGuid) const;
  std::shared_ptr<const SetContents> Interfaces(const Guid* interfaceClass) const;

 private:
  void IndexDevices(DeviceNumbers& numbers);
  void IndexNames();

  struct Links {
    Position parent = kRoot;  // of which it is a child
    bool showsParent = true;
    Position firstChild = kNone;
    Position nextSibling = kNone;
  };

  const Machine& m_machine;
  NameTable m_devices;
  NameTable m_controllers;
  NameTable m_hubs;
  NameTable m_interfaces;
  NameTable m_storage;
  NameTable m_volumes;
  NameTable m_volumePaths;
  NameTable m_volumeDevices;
  std::array<Position, 26> m_drives{};
  std::vector<DevInst> m_numbers;    // by position
  std::vector<Position> m_byNumber;  // numbers count from one
  std::vector<Links> m_links;        // by position
  Position m_rootChild = kNone;
  std::vector<Guid> m_classGuids;  // by position
  std::map<Guid, ClassInfo, GuidOrder> m_classes;

  // Made when first asked for; empty GUID pointer: all classes.
  using Sets = std::map<Guid, std::shared_ptr<const SetContents>, GuidOrder>;
  mutable Sets m_deviceSets;
  mutable Sets m_interfaceSets;
  mutable std::shared_ptr<const SetContents> m_allDevices;
  mutable std::shared_ptr<const SetContents> m_allInterfaces;
};

// The name of an opened drive, "\\.\X:".
bool IsDriveName(std::u16string_view loweredName);
// A drive's root, "X:\".
bool IsDriveRoot(std::u16string_view path);

}  // namespace platform::simulated
