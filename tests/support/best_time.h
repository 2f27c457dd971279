// Time that work takes, for comparing one amount of it with another within one run.
#pragma once

#include <algorithm>
#include <chrono>

namespace testing_support {

// The shortest of three: what else the machine does only makes it longer.
template <class Work>
std::chrono::steady_clock::duration BestOfThree(Work work) {
  auto least = std::chrono::steady_clock::duration::max();
  for (int i = 0; i < 3; ++i) {
    const auto begun = std::chrono::steady_clock::now();
    work();
    least = std::min(least, std::chrono::steady_clock::now() - begun);
  }
  return least;
}

}  // namespace testing_support
