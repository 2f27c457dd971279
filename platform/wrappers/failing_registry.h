// Fails chosen calls to a registry.
#pragma once

#include <cstdint>
#include <limits>
#include <mutex>

#include "platform/registry.h"

namespace platform::wrappers {

struct RegistryFailurePlan {
  static constexpr std::uint64_t kNever = std::numeric_limits<std::uint64_t>::max();

  std::uint64_t call = kNever;  // the first call to fail, counted from 1
  bool onwards = false;         // that call and all after it; else that one alone
  std::uint32_t error = kERROR_ACCESS_DENIED;
};

// Closing a key never fails and is not counted. A call that fails does nothing else. Thread-safe.
class FailingRegistry final : public Registry {
 public:
  explicit FailingRegistry(Registry& base, const RegistryFailurePlan& plan = {}) noexcept
      : m_base(base), m_plan(plan) {}

  // Starts counting anew under that plan.
  void SetPlan(const RegistryFailurePlan& plan);
  // The calls counted since the plan was set.
  std::uint64_t Calls() const;

  Status CreateKey(RegistryKeyHandle parent, const char16_t* path, std::uint32_t access,
                   RegistryKeyHandle& key, std::uint32_t& disposition) noexcept override;
  Status OpenKey(RegistryKeyHandle parent, const char16_t* path, std::uint32_t access,
                 RegistryKeyHandle& key) noexcept override;
  Status SetValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t type, const void* data,
                  std::uint32_t dataBytes) noexcept override;
  Status QueryValue(RegistryKeyHandle key, const char16_t* name, std::uint32_t* type, void* data,
                    std::uint32_t& dataBytes) noexcept override;
  Status EnumKey(RegistryKeyHandle key, std::uint32_t index, char16_t* name,
                 std::uint32_t& nameChars) noexcept override;
  Status DeleteKey(RegistryKeyHandle parent, const char16_t* path) noexcept override;
  Status DeleteValue(RegistryKeyHandle key, const char16_t* name) noexcept override;
  Status CloseKey(RegistryKeyHandle key) noexcept override { return m_base.CloseKey(key); }

 private:
  Status BeforeCall() noexcept;

  Registry& m_base;
  mutable std::mutex m_mutex;
  RegistryFailurePlan m_plan;
  std::uint64_t m_calls = 0;
};

}  // namespace platform::wrappers
