#include "monitor/sink_slots.h"

#include <algorithm>
#include <mutex>
#include <utility>

namespace KelvoUHW {

HRESULT SinkSlots::Add(ComPtr<IUnknown>& sink, DWORD& cookie) noexcept {
  const std::lock_guard lock(m_lock);
  const auto free = std::find(m_slots.begin(), m_slots.end(), nullptr);
  const std::size_t index = static_cast<std::size_t>(free - m_slots.begin());
  if (free == m_slots.end()) {
    try {
      m_slots.resize(m_slots.empty() ? kFirstSlots : 2 * m_slots.size(), nullptr);
    } catch (...) {
      return CONNECT_E_ADVISELIMIT;
    }
    m_nSlots = static_cast<LONG>(m_slots.size());
  }
  m_slots[index] = sink.Detach();
  cookie = static_cast<DWORD>(index + 1);
  return S_OK;
}

ComPtr<IUnknown> SinkSlots::Take(DWORD cookie) noexcept {
  const std::lock_guard lock(m_lock);
  if (cookie == 0 || cookie > m_slots.size()) return {};
  return ComPtr<IUnknown>::Attach(std::exchange(m_slots[cookie - 1], nullptr));
}

ComPtr<IUnknown> SinkSlots::At(LONG index) const noexcept {
  const std::lock_guard lock(m_lock);
  return ComPtr<IUnknown>(m_slots[static_cast<std::size_t>(index)]);
}

std::vector<SinkSlots::Connection> SinkSlots::Occupied() const {
  const std::lock_guard lock(m_lock);
  std::vector<Connection> connections;
  for (std::size_t index = 0; index < m_slots.size(); ++index) {
    if (m_slots[index] == nullptr) continue;
    connections.push_back({ComPtr<IUnknown>(m_slots[index]), static_cast<DWORD>(index + 1)});
  }
  return connections;
}

}  // namespace KelvoUHW
