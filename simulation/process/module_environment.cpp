#include "simulation/process/module_environment.h"

#include <algorithm>
#include <utility>

namespace platform::simulated {

SimulatedModuleEnvironment::SimulatedModuleEnvironment(std::u16string modulePath)
    : m_modulePath(std::move(modulePath)) {}

Status SimulatedModuleEnvironment::ModuleFileName(char16_t* path, std::uint32_t pathChars,
                                                  std::uint32_t& length) noexcept {
  length = 0;
  if (m_modulePath.empty()) return Status::Failure(kERROR_FILE_NOT_FOUND);
  if (path == nullptr || pathChars == 0) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
  const std::size_t chars = std::min<std::size_t>(m_modulePath.size(), pathChars - 1);
  std::copy_n(m_modulePath.data(), chars, path);
  path[chars] = u'\0';
  length = chars < m_modulePath.size() ? pathChars : static_cast<std::uint32_t>(chars);
  return Status::Success();
}

std::uint32_t SimulatedModuleEnvironment::ThreadLocale() noexcept {
  const std::lock_guard lock(m_mutex);
  return m_locales.try_emplace(std::this_thread::get_id(), kStartLocale).first->second;
}

Status SimulatedModuleEnvironment::SetThreadLocale(std::uint32_t locale) noexcept {
  const std::lock_guard lock(m_mutex);
  m_locales[std::this_thread::get_id()] = locale;
  return Status::Success();
}

}  // namespace platform::simulated
