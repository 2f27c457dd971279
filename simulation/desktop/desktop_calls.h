// Faults and delays of single calls to a simulated desktop.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <vector>

namespace platform::simulated {

enum class DesktopCall : std::uint8_t {
  StartThread,
  PinModule,
  GetModuleHandleW,
  LoadCursorW,
  GetStockObject,
  RegisterClassW,
  CreateWindowExW,
  GetMessageW,
  RegisterDeviceNotificationW,
  FormatMessageW,
  Sleep,
};
inline constexpr std::size_t kDesktopCalls = static_cast<std::size_t>(DesktopCall::Sleep) + 1;

// What happens to the n-th call of an operation, counted from 1 and from the process's start: first
// it takes that long (StartThread and the calls that cannot block take no time), then it fails with
// that code, where one is given, without having done anything.
struct CallOrder {
  DesktopCall call;
  std::uint64_t nth = 1;
  std::optional<std::uint32_t> error = std::nullopt;
  std::uint32_t delayMilliseconds = 0;
};

// Counts calls and finds what was ordered for them. Not thread-safe: the process's lock guards it.
class CallOrders {
 public:
  void Add(const CallOrder& order) { m_orders.push_back(order); }
  // Counts one call more; its order, an empty one where there is none.
  CallOrder Next(DesktopCall call) {
    const std::uint64_t nth = ++m_counts[static_cast<std::size_t>(call)];
    for (const CallOrder& order : m_orders) {
      if (order.call == call && order.nth == nth) return order;
    }
    return {call};
  }
  std::uint64_t Count(DesktopCall call) const { return m_counts[static_cast<std::size_t>(call)]; }

 private:
  std::array<std::uint64_t, kDesktopCalls> m_counts{};
  std::vector<CallOrder> m_orders;
};

}  // namespace platform::simulated
