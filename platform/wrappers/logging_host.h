// Writes down the calls that reach a host.
#pragma once

#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "platform/wrappers/intercepting_host.h"

namespace platform::wrappers {

// One text a call, in the order in which the calls end: the operation, the handle as # and its
// number (the first handle that any call gives out is #1), the text handed in, request codes and
// properties as 0x and hexadecimal digits, indexes in brackets, then the sizes that are not zero
// and how it ended, such as
//   OpenDevice \\.\HCD0 = #1
//   DeviceControl #1 0x220424 in 6 out 6
//   CloseDevice #2 ! 6
// A device-manager node is shown by its number as it is, as a handle that no call gave out is, with
// no # before it. Thread-safe.
class LoggingHost final : public InterceptingHost {
 public:
  using InterceptingHost::InterceptingHost;

  std::vector<std::u16string> Log() const;
  // Empties the log; handles keep their numbers.
  void Clear();

 private:
  Status BeforeCall(const HostCall& call) noexcept override;
  void AfterCall(const HostCall& call, const Status& status,
                 const std::intptr_t* opened) noexcept override;
  std::u16string HandleText(std::intptr_t handle) const;

  mutable std::mutex m_mutex;
  std::vector<std::u16string> m_log;
  std::map<std::intptr_t, std::int32_t> m_numbers;
  std::int32_t m_given = 0;
};

}  // namespace platform::wrappers
