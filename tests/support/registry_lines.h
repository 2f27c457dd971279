// A simulated registry filled and read in a line each.
#pragma once

#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "platform/registry_key.h"
#include "platform/text.h"
#include "simulation/process/registry.h"

namespace testing_support {

using Lines = std::vector<std::string>;

// What stands in the registry, without the name of the root; keys without values are shown only
// when `keys` is set, as every other key is told by its values.
inline Lines LinesOf(const platform::simulated::SimulatedRegistry& registry, bool keys = true) {
  static const std::string kRoot = "HKEY_CLASSES_ROOT\\";
  Lines lines;
  for (const std::u16string& line : registry.Snapshot()) {
    std::string text = platform::ToUtf8(line);
    if (text.compare(0, kRoot.size(), kRoot) == 0) text.erase(0, kRoot.size());
    if (keys || text.find(" = ") != text.npos) lines.push_back(text);
  }
  return lines;
}

// Writes a key, and a text into it where a name is given ("" is the default value).
inline void Put(platform::Registry& registry, const std::u16string& path, const char16_t* name = nullptr,
                const std::u16string& text = {}) {
  platform::RegistryKey key(registry);
  EXPECT_TRUE(key.Create(platform::kHKEY_CLASSES_ROOT, path.c_str()));
  if (name != nullptr) {
    EXPECT_TRUE(key.SetText(name, text));
  }
}

// Every key that was opened has been closed, and none twice.
inline void ExpectAllClosed(const platform::simulated::SimulatedRegistry& registry) {
  EXPECT_THAT(registry.OpenKeys(), testing::IsEmpty());
  EXPECT_THAT(registry.Misuses(), testing::IsEmpty());
}

}  // namespace testing_support
