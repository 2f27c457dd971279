#include "platform/wrappers/logging_host.h"

#include <utility>

#include "platform/text.h"

namespace platform::wrappers {
namespace {

// What the code of the call is, as the log shows it.
std::u16string CodeText(const HostCall& call) {
  switch (call.operation) {
    case Operation::DeviceControl:
    case Operation::GetClassDevs:
    case Operation::GetDeviceRegistryProperty:
    case Operation::GetDevNodeRegistryProperty:
      return u" 0x" + Hex(call.code);
    case Operation::EnumDeviceInfo:
    case Operation::EnumDeviceInterfaces:
      return u" [" + Decimal(static_cast<std::int32_t>(call.code)) + u"]";
    default:
      return {};
  }
}

}  // namespace

std::vector<std::u16string> LoggingHost::Log() const {
  const std::lock_guard lock(m_mutex);
  return m_log;
}

void LoggingHost::Clear() {
  const std::lock_guard lock(m_mutex);
  m_log.clear();
}

Status LoggingHost::BeforeCall(const HostCall&) noexcept { return Status::Success(); }

std::u16string LoggingHost::HandleText(std::intptr_t handle) const {
  const auto known = m_numbers.find(handle);
  if (known != m_numbers.end()) return std::u16string(u"#") += Decimal(known->second);
  return Decimal(static_cast<std::int32_t>(handle));
}

void LoggingHost::AfterCall(const HostCall& call, const Status& status,
                            const std::intptr_t* opened) noexcept {
  const std::lock_guard lock(m_mutex);
  std::u16string text(NameOf(call.operation));
  if (IsConfigurationManager(call.operation)) {
    if (call.handle != 0) text += u" " + Decimal(static_cast<std::int32_t>(call.handle));
  } else if (call.handle != 0) {
    text += u" " + HandleText(call.handle);
  }
  if (call.path != nullptr) text += std::u16string(u" ") + call.path;
  text += CodeText(call);
  if (call.inBytes != 0) text += u" in " + Decimal(static_cast<std::int32_t>(call.inBytes));
  if (call.outSize != 0) text += u" out " + Decimal(static_cast<std::int32_t>(call.outSize));
  if (!status) {
    text += u" ! " + Decimal(static_cast<std::int32_t>(status.error));
  } else if (opened != nullptr) {
    m_numbers.insert_or_assign(*opened, ++m_given);
    text += u" = " + HandleText(*opened);
  }
  m_log.push_back(std::move(text));
}

}  // namespace platform::wrappers
