// Expected texts that stand in files.
#pragma once

#include <gtest/gtest.h>

#include <fstream>
#include <iterator>
#include <string>

namespace testing_support {

// A file of the project, byte for byte.
inline std::string Contents(const std::string& file) {
  std::ifstream stream(ZKUSB_SOURCE_DIR "/" + file, std::ios::binary);
  EXPECT_TRUE(stream) << file;
  return {std::istreambuf_iterator<char>(stream), {}};
}
inline std::string Golden(const std::string& name) { return Contents("tests/golden/" + name + ".txt"); }

}  // namespace testing_support
