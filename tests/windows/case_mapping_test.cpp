// Lowering and raising of characters, which is the system's own here.
#include "platform/text.h"

#include <windows.h>

#include <gtest/gtest.h>

namespace platform {
namespace {

TEST(Case, IsTheSystems) {
  for (unsigned unit = 1; unit < 0x10000; ++unit) {
    wchar_t lower[] = {static_cast<wchar_t>(unit), 0}, upper[] = {static_cast<wchar_t>(unit), 0};
    ASSERT_TRUE(CharLowerBuffW(lower, 1) == 1 && CharUpperBuffW(upper, 1) == 1);
    ASSERT_EQ(ToLower(static_cast<char16_t>(unit)), lower[0]) << std::hex << unit;
    ASSERT_EQ(ToUpper(static_cast<char16_t>(unit)), upper[0]) << std::hex << unit;
  }
  EXPECT_EQ(ToLower(u'\x10A0'), u'\x2D00') << "a pair that the other builds do not know";
}

}  // namespace
}  // namespace platform
