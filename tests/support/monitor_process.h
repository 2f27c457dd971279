// A simulated process for tests of the monitor, and a target that event threads can call.
#pragma once

#include <atomic>
#include <cstring>
#include <functional>
#include <vector>

#include "com/module_lock.h"
#include "monitor/process_state.h"
#include "platform/device_broadcast.h"
#include "platform/system.h"
#include "platform/text.h"
#include "simulation/desktop/simulated_desktop.h"
#include "tests/support/launch.h"

namespace KelvoUHW {

using platform::simulated::ClockMode;
using platform::simulated::DesktopCall;
using platform::simulated::DeviceBroadcast;
using platform::simulated::SimulatedDesktop;

// From its start to its end, which every test of the monitor has to come to without a misuse.
class MonitorProcess {
 public:
  explicit MonitorProcess(ClockMode mode = ClockMode::Virtual) : desktop(mode) {
    ForgetMonitorState();
    platform::SetCurrentSystem({.threads = &desktop, .desktop = &desktop});
  }
  ~MonitorProcess() {
    desktop.EndProcess();
    for (const std::u16string& misuse : desktop.Misuses()) ADD_FAILURE() << platform::ToUtf8(misuse);
    EXPECT_EQ(desktop.Counts().threads, 0u);
    EXPECT_EQ(desktop.Counts().localBuffers, 0u);
    ForgetMonitorState();
    platform::SetCurrentSystem({});
  }

  void Launch(std::function<void()> body) { testing_support::Launch(desktop, std::move(body)); }

  SimulatedDesktop desktop;
};

// Remembers each call without a lock of its own: the notification lock lets one thread in at a time. Read when no event
// thread runs.
class RecordingTarget final : public IZKUMPrivateNotifier {
 public:
  struct Call {
    std::uint64_t at = 0;
    ULONG delay = 0;
    BYTE fire = 0;
    bool apartment = false;  // in the multithreaded one
    friend bool operator==(const Call&, const Call&) = default;
  };

  explicit RecordingTarget(SimulatedDesktop& desktop) : m_desktop(desktop) {}
  ~RecordingTarget() { EXPECT_EQ(m_references, 1) << "references of others"; }

  const std::vector<Call>& Calls() const { return m_calls; }
  std::int32_t References() const { return m_references; }
  std::function<void()> onCall;  // inside each call

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID, void** object) override {
    *object = nullptr;
    return E_NOINTERFACE;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(++m_references); }
  ULONG STDMETHODCALLTYPE Release() override {
    EXPECT_NE(g_pNotifyTarget, this) << "could still be called while it was let go";
    return static_cast<ULONG>(--m_references);
  }
  HRESULT STDMETHODCALLTYPE NotifyDeviceChange(ULONG delay, BYTE fire) override {
    // A thread that is in it already is told so.
    const HRESULT entered = CoInitializeEx(nullptr, COINIT_MULTITHREADED);
    if (SUCCEEDED(entered)) CoUninitialize();
    m_calls.push_back({m_desktop.Now(), delay, fire, entered == S_FALSE});
    if (onCall) onCall();
    return S_OK;
  }

 private:
  SimulatedDesktop& m_desktop;
  std::atomic<std::int32_t> m_references = 1;
  std::vector<Call> m_calls;
};

inline constexpr char16_t kWatchedPath[] =
    u"\\\\?\\USB#VID_05AC&PID_1291#0a1b2c#{a5dcbf10-6530-11d2-901f-00c04fb951ed}";

// A broadcast with a name, cut to `bytes` where that is not 0; its size field says what is left.
inline DeviceBroadcast NamedBroadcast(std::uint32_t event, std::uint32_t type, const std::u16string& name,
                                      std::size_t bytes = 0) {
  DeviceBroadcast broadcast = platform::simulated::InterfaceBroadcast(event, {}, name);
  if (bytes != 0) broadcast.record.resize(bytes);
  broadcast.record.shrink_to_fit();  // so that reading behind it is found out
  const auto size = static_cast<std::uint32_t>(broadcast.record.size());
  std::memcpy(broadcast.record.data(), &size, sizeof size);
  if (broadcast.record.size() >= 8) std::memcpy(broadcast.record.data() + 4, &type, sizeof type);
  return broadcast;
}

inline platform::LParam RecordOf(const DeviceBroadcast& broadcast) {
  return broadcast.record.empty() ? 0 : reinterpret_cast<platform::LParam>(broadcast.record.data());
}

}  // namespace KelvoUHW
