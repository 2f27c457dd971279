// A recording that is going on; only the recorder's own sources include this.
#pragma once

#include <algorithm>
#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

#include "platform/host.h"
#include "platform/text.h"
#include "simulation/machine/machine.h"
#include "simulation/machine/steps.h"

namespace recorder {

using platform::simulated::Text;

// Far beyond any PC: what a system enumerates without end is left there.
inline constexpr std::uint32_t kMostElements = 200'000;
// No answer of a driver is larger.
inline constexpr std::uint32_t kMostBytes = 1U << 20;
inline constexpr int kMostReads = 8;

struct Recording {
  explicit Recording(platform::Host& pc) : host(pc) {}

  // What the file cannot say, in a sentence.
  void Note(Text text) { machine.notes.push_back(std::move(text)); }

  platform::Host& host;
  platform::simulated::Machine machine;
  std::unordered_map<platform::DevInst, std::size_t> positions;  // in machine.devices
};

// In this order: each needs what those before it have found.
void RecordDevices(Recording& recording);
void RecordInterfaces(Recording& recording);
void RecordControllers(Recording& recording);
void RecordStorage(Recording& recording);
void RecordVolumes(Recording& recording);

// The texts of a list in which each ends with a zero and an empty one ends the list.
inline std::vector<Text> SplitTexts(std::u16string_view list) {
  std::vector<Text> texts;
  while (!platform::UpToZero(list).empty()) {
    const Text& text = texts.emplace_back(platform::UpToZero(list));
    list.remove_prefix(std::min(list.size(), text.size() + 1));
  }
  return texts;
}

}  // namespace recorder
