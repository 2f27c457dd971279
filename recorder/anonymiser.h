// Removes what identifies a person or an installation from a recorded PC.
#pragma once

#include <optional>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "recorder/replacements.h"
#include "simulation/machine/machine.h"

namespace recorder {

// How many different texts of each kind were replaced.
struct ReplacedCounts {
  std::size_t serialNumbers = 0;
  std::size_t ids = 0;  // volume GUIDs, and others that stand for one installation
  std::size_t volumeSerialNumbers = 0;
  std::size_t bluetoothAddresses = 0;
  std::size_t folderNames = 0;
  std::size_t nameWords = 0;  // of names that people gave
};

// Replaces what could lead to a person or to one thing of theirs: serial numbers of devices and
// disks, GUIDs and serial numbers of volumes, other ids that stand for one installation, Bluetooth
// addresses, names of folders, and names that people give (to phones, headsets, printers). What
// tells a make or a place stays: vendor and product ids, classes, ports, instance ids that Windows
// makes.
//
// Equal stays equal, in one machine and in all that one object is given, whatever the case; ids and
// paths keep their length and shape, so they go on naming each other. One thread at a time.
class Anonymiser {
 public:
  void Anonymise(platform::simulated::Machine& machine);
  // What was replaced so far.
  ReplacedCounts Counts() const noexcept;
  // The same in a sentence for people.
  Text Report() const;

 private:
  using Machine = platform::simulated::Machine;

  void Collect(const Machine& machine);
  void CollectDevice(const platform::simulated::Device& device);
  void CollectInstance(std::u16string_view instance);
  void CollectGuids(std::u16string_view text);
  void CollectAddresses(std::u16string_view text);
  void CollectSignature(std::u16string_view text);
  void CollectSerial(std::u16string_view serial);
  void Replace(Machine& machine);
  void ReplaceText(Text& text) const;
  void ReplaceText(std::string& bytes) const;
  void ReplaceName(std::optional<Text>& name);
  void ReplaceFolders(Text& path);
  std::uint32_t SerialOf(std::uint32_t volumeSerial);

  Replacements m_texts;                // wherever they occur
  Replacements m_instances;            // too short for that: where an id or a path has its instance
  Replacements m_names;                // words of names
  Replacements m_folders;              // single names of folders
  Replacements m_signatures;           // of disks, within longer words
  std::unordered_set<Text> m_classes;  // GUIDs that are no secret, lowered
  std::unordered_map<std::uint32_t, std::uint32_t> m_volumeSerials;
  std::size_t m_serials = 0;
  std::size_t m_guids = 0;
  std::size_t m_addresses = 0;
};

}  // namespace recorder
