// A small PC whose devices come, go and move at random.
#pragma once

#include <optional>
#include <random>

#include "simulation/pc/simulated_pc.h"

namespace testing_support {

// A stick has one disk with one volume or two, a card reader a disk for each slot and a volume for each card; the
// service of what is unreported is one that is never reported.
enum class Kind : std::uint8_t { Mouse, Keyboard, Stick, Composite, Unreported, Hub, CardReader };
inline constexpr std::uint32_t kKinds = 7;

struct Gadget {
  Kind kind = Kind::Mouse;
  std::u16string id;
  std::vector<std::vector<std::u16string>> disks;  // the names of the volumes on each
  bool plugged = false;
};

// The device-manager id of a stick's disk or of a card reader's slot.
std::u16string DiskId(const Gadget& gadget, std::size_t disk);

// One or two controllers of four ports each. The same seed makes the same PC and the same changes.
class RandomPc {
 public:
  explicit RandomPc(std::uint32_t seed);
  // One change, or a pause where there is nothing to change.
  void Change();
  std::uint32_t Below(std::uint32_t bound) { return static_cast<std::uint32_t>(m_random() % bound); }
  platform::simulated::SimulatedPc& Pc() { return *m_pc; }
  // All that ever were plugged in; one that comes back is the same as before.
  const std::vector<Gadget>& Gadgets() const { return m_gadgets; }
  const std::string& Script() const { return m_script; }

 private:
  void AddNewGadget();
  void Plug(Gadget& gadget);
  void Unplug(const Gadget& gadget);
  void ChangeCard(Gadget& gadget);
  void MountOrDismount();
  std::u16string NewVolume();
  void Apply(platform::simulated::Step step, const char* what, std::u16string_view which);
  std::mt19937 m_random;
  std::optional<platform::simulated::SimulatedPc> m_pc;
  std::vector<Gadget> m_gadgets;
  std::uint32_t m_volumes = 0;
  std::string m_script;
};

}  // namespace testing_support
