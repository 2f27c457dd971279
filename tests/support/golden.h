// Expected texts that stand in files.
#pragma once

#include <gtest/gtest.h>

#include <fstream>
#include <iterator>
#include <string>

namespace testing_support {

// The file, byte for byte.
inline std::string Golden(const std::string& name) {
  std::ifstream stream(ZKUSB_SOURCE_DIR "/tests/golden/" + name + ".txt", std::ios::binary);
  EXPECT_TRUE(stream) << name;
  return {std::istreambuf_iterator<char>(stream), {}};
}

}  // namespace testing_support
