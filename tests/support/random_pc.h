// A small PC whose devices come, go and move at random.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "platform/simulated/machine.h"
#include "platform/simulated/simulated_pc.h"

namespace testing_support {

enum class Kind : std::uint8_t {
  Mouse,
  Keyboard,
  Stick,  // one disk with one volume or two
  Composite,
  Unreported,  // its service is one that is never reported
  Hub,
  CardReader,  // a disk for each slot, a volume for each card
};
inline constexpr std::uint32_t kKinds = 7;

struct Gadget {
  Kind kind = Kind::Mouse;
  std::u16string id;
  std::vector<std::vector<std::u16string>> disks;  // the names of the volumes on each
};

// One or two controllers of four ports each. The same seed makes the same PC and the same changes.
class RandomPc {
 public:
  explicit RandomPc(std::uint32_t seed);

  platform::simulated::SimulatedPc& Pc() { return *m_pc; }
  std::uint32_t Below(std::uint32_t bound) {
    return static_cast<std::uint32_t>(m_random() % bound);
  }

  // A random change, and what it was. One that finds nothing to change is a pause.
  std::string Change();

  // What is plugged in, or has been: ids come back when a device does.
  const std::vector<Gadget>& Plugged() const { return m_plugged; }
  const Gadget* Find(const std::u16string& id) const;

 private:
  std::string PlugNew();
  std::string PlugAgain();
  std::string Unplug(std::size_t index);
  std::string Move();
  std::string ChangeCard();
  std::string MountOrDismount();
  bool Plug(Gadget gadget);
  void Apply(platform::simulated::Step step);
  std::u16string NewVolume();

  std::mt19937 m_random;
  std::optional<platform::simulated::SimulatedPc> m_pc;
  std::vector<Gadget> m_plugged;
  std::vector<Gadget> m_away;
  std::uint32_t m_serials = 0;
  std::uint32_t m_volumes = 0;
};

// The device-manager id of a card reader's slot or a stick's disk.
std::u16string DiskId(const Gadget& gadget, std::size_t disk);

}  // namespace testing_support
