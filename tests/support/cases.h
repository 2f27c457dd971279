#pragma once

#include <cstdlib>
#include <string_view>

// Long tests check one thing over many cases. `./test`, which one waits for, takes a part of the cases, the same each
// time; `./test all` sets ZKUSB_TESTS=all and takes every one.
namespace testing_support {

inline bool EveryCase() {
  const char* tests = std::getenv("ZKUSB_TESTS");
  return tests != nullptr && std::string_view(tests) == "all";
}

// How many cases to take, or the distance from one case to the next: the first where all are taken.
template <class Number>
Number Cases(Number every, Number some) {
  return EveryCase() ? every : some;
}

}  // namespace testing_support
