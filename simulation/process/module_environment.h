// Where the module lies and which locale each thread has, on a simulated PC.
#pragma once

#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <thread>

#include "platform/module_environment.h"

namespace platform::simulated {

// Thread-safe.
class SimulatedModuleEnvironment final : public ModuleEnvironment {
 public:
  static constexpr std::uint32_t kStartLocale = 0x409;  // of every thread

  explicit SimulatedModuleEnvironment(std::u16string modulePath);

  // An empty path is one that the system cannot tell: kERROR_FILE_NOT_FOUND.
  Status ModuleFileName(char16_t* path, std::uint32_t pathChars,
                        std::uint32_t& length) noexcept override;
  std::uint32_t ThreadLocale() noexcept override;
  Status SetThreadLocale(std::uint32_t locale) noexcept override;

 private:
  const std::u16string m_modulePath;
  std::mutex m_mutex;
  std::map<std::thread::id, std::uint32_t> m_locales;
};

}  // namespace platform::simulated
