// What the module asks about itself and the thread it runs on. What host.h says about its
// operations holds here too.
#pragma once

#include <cstdint>

#include "platform/host.h"

namespace platform {

class ModuleEnvironment {
 public:
  // GetModuleFileNameW of the component's own module. A path that does not fit is cut off, with its
  // terminator inside the buffer, and still a success: `length` is `pathChars` then. Otherwise
  // `length` counts the characters without the terminator.
  virtual Status ModuleFileName(char16_t* path, std::uint32_t pathChars,
                                std::uint32_t& length) noexcept = 0;
  // GetThreadLocale and SetThreadLocale, of the calling thread.
  virtual std::uint32_t ThreadLocale() noexcept = 0;
  virtual Status SetThreadLocale(std::uint32_t locale) noexcept = 0;

 protected:
  ~ModuleEnvironment() = default;
};

}  // namespace platform
