#include <algorithm>

#include "tests/tools/client.h"

namespace zkusb {
namespace {

Args Sorted(Args lines) {
  std::ranges::sort(lines);
  return lines;
}

// Text and JSON say the same, and what is removed and what is left is what was written.
TEST(RegistrationCommands, PrintWhatIsWrittenRemovedAndLeft) {
#ifdef _WIN32
  GTEST_SKIP() << "would register for the whole machine";
#endif
  const Args written = Lines(Output({"register"}));
  EXPECT_EQ(JsonOutput({"register"}).at("written").get<Args>(), written);
  for (const char* line :
       {"HKEY_CLASSES_ROOT\\CLSID\\{34349D2D-14C6-414B-9771-A7BD2A7C7180}  (default) = \"ZKUMUsbTree Class\"",
        "HKEY_CLASSES_ROOT\\AppID\\ZKUsbMonitor.DLL"}) {
    EXPECT_THAT(written, testing::Contains(line));
  }
  Args removed, left;
  for (const std::string& line : Lines(Output({"unregister"}))) {
    ASSERT_TRUE(line.starts_with("removed  HKEY_") || line.starts_with("left     HKEY_")) << line;
    (line.starts_with("removed") ? removed : left).push_back(line.substr(9));
  }
  const Json json = JsonOutput({"unregister"});
  EXPECT_EQ(json.at("removed").get<Args>(), removed);
  EXPECT_EQ(json.at("left").get<Args>(), left);
  EXPECT_THAT(left, testing::ElementsAre("HKEY_CLASSES_ROOT\\AppID", "HKEY_CLASSES_ROOT\\CLSID",
                                         "HKEY_CLASSES_ROOT\\Interface", "HKEY_CLASSES_ROOT\\TypeLib"));
  Args both = removed;
  both.insert(both.end(), left.begin(), left.end());
  EXPECT_EQ(Sorted(both), Sorted(written));
}

}  // namespace
}  // namespace zkusb
