// What a build costs on a PC: the prices of its platform calls added up.
#pragma once

#include "bench/metered_host.h"

namespace bench {

// Prices of calls on real PCs in microseconds. A hub answers a request in 44 to 260 us, by what it
// is and what hangs on it; the other prices are typical. What only reads the memory of another
// process costs as much as a property.
struct Prices {
  double request;
  double open = 20;
  double deviceSet = 5;
  double deviceManager = 5;
  double volume = 20;  // the mount manager opens the volume for most questions
  double close = 5;
};
inline constexpr Prices kQuickHubs{.request = 44};
inline constexpr Prices kSlowHubs{.request = 260};

inline double PriceOf(const Cost& cost, const Prices& prices) noexcept {
  const std::array<double, kCallKinds> each{prices.open,          prices.request, prices.deviceSet,
                                            prices.deviceManager, prices.volume,  prices.close};
  double sum = 0;
  for (std::size_t kind = 0; kind < kCallKinds; ++kind) {
    sum += each[kind] * static_cast<double>(cost.CallsOf(static_cast<CallKind>(kind)));
  }
  return sum;
}

inline std::uint64_t AllCalls(const Cost& cost) noexcept {
  std::uint64_t sum = 0;
  for (std::size_t kind = 0; kind < kCallKinds; ++kind)
    sum += cost.CallsOf(static_cast<CallKind>(kind));
  return sum;
}

}  // namespace bench
