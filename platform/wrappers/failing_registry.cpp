#include "platform/wrappers/failing_registry.h"

namespace platform::wrappers {

void FailingRegistry::SetPlan(const RegistryFailurePlan& plan) {
  const std::lock_guard lock(m_mutex);
  m_plan = plan;
  m_calls = 0;
}

std::uint64_t FailingRegistry::Calls() const {
  const std::lock_guard lock(m_mutex);
  return m_calls;
}

Status FailingRegistry::BeforeCall() noexcept {
  const std::lock_guard lock(m_mutex);
  ++m_calls;
  if (m_plan.onwards ? m_calls < m_plan.call : m_calls != m_plan.call) return Status::Success();
  return Status::Failure(m_plan.error);
}

Status FailingRegistry::CreateKey(RegistryKeyHandle parent, const char16_t* path,
                                  std::uint32_t access, RegistryKeyHandle& key,
                                  std::uint32_t& disposition) noexcept {
  key = kNoRegistryKey;
  const Status status = BeforeCall();
  return status ? m_base.CreateKey(parent, path, access, key, disposition) : status;
}

Status FailingRegistry::OpenKey(RegistryKeyHandle parent, const char16_t* path,
                                std::uint32_t access, RegistryKeyHandle& key) noexcept {
  key = kNoRegistryKey;
  const Status status = BeforeCall();
  return status ? m_base.OpenKey(parent, path, access, key) : status;
}

Status FailingRegistry::SetValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t type,
                                 const void* data, std::uint32_t dataBytes) noexcept {
  const Status status = BeforeCall();
  return status ? m_base.SetValue(key, name, type, data, dataBytes) : status;
}

Status FailingRegistry::QueryValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t* type,
                                   void* data, std::uint32_t& dataBytes) noexcept {
  const Status status = BeforeCall();
  return status ? m_base.QueryValue(key, name, type, data, dataBytes) : status;
}

Status FailingRegistry::EnumKey(RegistryKeyHandle key, std::uint32_t index, char16_t* name,
                                std::uint32_t& nameChars) noexcept {
  const Status status = BeforeCall();
  return status ? m_base.EnumKey(key, index, name, nameChars) : status;
}

Status FailingRegistry::DeleteKey(RegistryKeyHandle parent, const char16_t* path) noexcept {
  const Status status = BeforeCall();
  return status ? m_base.DeleteKey(parent, path) : status;
}

Status FailingRegistry::DeleteValue(RegistryKeyHandle key, const char16_t* name) noexcept {
  const Status status = BeforeCall();
  return status ? m_base.DeleteValue(key, name) : status;
}

}  // namespace platform::wrappers
