#include <cstring>
#include <utility>

#include "platform/setup_api.h"
#include "simulation/desktop/desktop_state.h"

namespace platform::simulated {
namespace {

// The windows a message goes to, one entry a message.
std::vector<WindowHandle> Recipients(const DeviceBroadcast& broadcast,
                                     const std::map<WindowHandle, Window>& windows,
                                     const std::map<NotificationHandle, RegistrationFacts>& all) {
  std::vector<WindowHandle> recipients;
  DEV_BROADCAST_DEVICEINTERFACE_W record;
  const bool isInterface = broadcast.record.size() >= sizeof record && [&] {
    std::memcpy(&record, broadcast.record.data(), sizeof record);
    return record.dbcc_devicetype == kDBT_DEVTYP_DEVICEINTERFACE;
  }();
  if (isInterface) {
    for (const auto& [handle, registration] : all) {
      if ((registration.flags & kDEVICE_NOTIFY_ALL_INTERFACE_CLASSES) != 0 ||
          registration.filter.dbcc_classguid == record.dbcc_classguid) {
        recipients.push_back(registration.window);
      }
    }
  } else {
    for (const auto& [handle, window] : windows) {
      if (window.facts.creation.hwndParent == 0) recipients.push_back(handle);
    }
  }
  return recipients;
}

}  // namespace

std::size_t SimulatedDesktop::Broadcast(const DeviceBroadcast& broadcast) {
  auto lock = m_state->Guard();
  std::size_t answered = 0;
  for (const WindowHandle window :
       Recipients(broadcast, m_state->windows, m_state->registrations)) {
    // A copy of exactly its size for each window, so that reading behind it is found out.
    std::vector<std::byte> record = broadcast.record;
    const auto lParam = record.empty() ? 0 : reinterpret_cast<LParam>(record.data());
    if (m_state->Send(lock, {window, kWM_DEVICECHANGE, broadcast.event, lParam})) ++answered;
  }
  return answered;
}

Status SimulatedDesktop::RegisterDeviceNotificationW(WindowHandle recipient, const void* filter,
                                                     std::uint32_t flags,
                                                     NotificationHandle& notification) noexcept {
  notification = 0;
  auto lock = m_state->Guard();
  if (const Status ordered = m_state->Begin(lock, DesktopCall::RegisterDeviceNotificationW);
      !ordered) {
    return ordered;
  }
  constexpr std::uint32_t kKnown =
      kDEVICE_NOTIFY_WINDOW_HANDLE | kDEVICE_NOTIFY_ALL_INTERFACE_CLASSES;
  if (recipient == 0 || filter == nullptr || (flags & ~kKnown) != 0) {
    return Status::Failure(kERROR_INVALID_PARAMETER);
  }
  if (m_state->Find(recipient) == nullptr) return Status::Failure(kERROR_INVALID_WINDOW_HANDLE);
  DEV_BROADCAST_HDR header;
  std::memcpy(&header, filter, sizeof header);
  RegistrationFacts facts{recipient, flags, {}};
  if (header.dbch_size < sizeof facts.filter ||
      header.dbch_devicetype != kDBT_DEVTYP_DEVICEINTERFACE) {
    return Status::Failure(kERROR_INVALID_PARAMETER);
  }
  std::memcpy(&facts.filter, filter, sizeof facts.filter);
  notification = m_state->lastRegistration += 4;
  m_state->registrations.emplace(notification, facts);
  return Status::Success();
}

Status SimulatedDesktop::UnregisterDeviceNotification(NotificationHandle notification) noexcept {
  const auto lock = m_state->Guard();
  if (m_state->registrations.erase(notification) != 0) return Status::Success();
  m_state->misuses.emplace_back(u"end of a device notification that is not registered");
  return Status::Failure(kERROR_INVALID_HANDLE);
}

}  // namespace platform::simulated
