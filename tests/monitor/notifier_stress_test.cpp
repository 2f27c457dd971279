// Clients that come and go while broadcasts arrive, on the real clock. Made for the thread sanitizer.
#include <array>
#include <atomic>
#include <chrono>
#include <thread>

#include "monitor/usb_event_receiver.h"
#include "tests/support/cases.h"
#include "tests/support/counting_sink.h"
#include "tests/support/module_process.h"

namespace KelvoUHW {
namespace {

using platform::simulated::VolumeBroadcast;

constexpr int kClients = 4;
constexpr std::uint32_t kEventThreadsAtOnce = 24;

struct Seen {
  std::array<std::atomic<int>, 4> events{};  // by kind
  std::atomic<int> fromInside = 0;           // advises by sinks
  std::atomic<int> left = 0;                 // sinks that unadvised themselves
  std::atomic<int> alive = 0;
  std::atomic<int> inside = 0;  // threads that call sinks just now
};

// Calls of sinks on this thread, one from inside another: the notifier calls them on one thread at a time.
thread_local int t_depth = 0;

class BusySink final : public testing_support::Callable {
 public:
  BusySink(Seen& seen, IConnectionPoint& point) : m_seen(seen), m_point(point) { ++m_seen.alive; }

  // Advises a new one, which the caller shares with the notifier.
  static ComPtr<BusySink> Advised(Seen& seen, IConnectionPoint& point) {
    auto sink = ComPtr<BusySink>::Attach(new BusySink(seen, point));
    DWORD cookie = 0;
    EXPECT_EQ(point.Advise(sink.Get(), &cookie), S_OK);
    sink->m_cookie = cookie;
    return sink;
  }
  // A cookie is given back once: the next sink may have the same one.
  bool Leave() {
    const DWORD cookie = m_cookie.exchange(0);
    if (cookie == 0) return false;
    EXPECT_EQ(m_point.Unadvise(cookie), S_OK);
    return true;
  }

  ULONG STDMETHODCALLTYPE Release() override {
    const ULONG left = Callable::Release();
    if (left == 0) delete this;
    return left;
  }
  HRESULT STDMETHODCALLTYPE Invoke(DISPID, REFIID, LCID, WORD, DISPPARAMS* parameters, VARIANT*, EXCEPINFO*,
                                   UINT*) override {
    if (++t_depth == 1) ++m_seen.inside;
    EXPECT_EQ(m_seen.inside, 1) << "two threads inside";
    const int number = ++m_seen.events.at(static_cast<std::size_t>(parameters->rgvarg[1].lVal));
    const auto node = ComPtr<IUnknown>(parameters->rgvarg[0].punkVal).As<IZKUMUsbTreeNode>();
    BSTR id = nullptr;
    // Empty for a device that went while the build looked at it.
    EXPECT_TRUE(node && node->get_InstanceId(&id) == S_OK && id != nullptr);
    SysFreeString(id);
    if (t_depth == 1 && number % 16 == 0) {
      ++m_seen.fromInside;
      Advised(m_seen, m_point)->Leave();
    } else if (t_depth == 1 && number % 4 == 2) {
      m_seen.left += Leave() ? 1 : 0;
    }
    if (--t_depth == 0) --m_seen.inside;
    return S_OK;
  }

 private:
  ~BusySink() { --m_seen.alive; }

  Seen& m_seen;
  IConnectionPoint& m_point;
  std::atomic<DWORD> m_cookie = 0;  // 0 before the advise has returned, and after it was given back
};

using NotifierStress = ComObjects;

TEST_F(NotifierStress, ClientsComeAndGoWhileBroadcastsArrive) {
  const int broadcasts = testing_support::Cases(1000, 250);
  Seen seen;
  {
    ModuleProcess process(ClockMode::Real);
    process.Do({Stick(u"S1", 1, u'E')});
    process.Start();
    std::atomic<bool> done = false;
    std::vector<std::thread> clients;
    for (int i = 0; i < kClients; ++i) {
      clients.emplace_back([&, i] {
        EXPECT_TRUE(SUCCEEDED(CoInitializeEx(nullptr, COINIT_MULTITHREADED)));
        while (!done) {
          const ComPtr<BusySink> sink = BusySink::Advised(seen, *process.point.Get());
          std::this_thread::sleep_for(std::chrono::milliseconds(20 + 20 * i));
          ComPtr<IEnumConnections> list;
          EXPECT_EQ(process.point->EnumConnections(list.Put()), S_OK);
          sink->Leave();
        }
        CoUninitialize();
      });
    }
    // Every second one after a change, which the next build meets.
    for (int number = 0; number < broadcasts; ++number) {
      if (number % 4 == 0) process.Do({Stick(u"S2", 2, u'F')});
      if (number % 4 == 2) process.Do({Unplug{UsbId(u"S2")}});
      const std::uint32_t event = number % 4 < 2 ? platform::kDBT_DEVICEARRIVAL : platform::kDBT_DEVICEREMOVECOMPLETE;
      EXPECT_EQ(process.desktop.Broadcast(VolumeBroadcast(event, u'F', 0)), 1u);
      while (g_nEventThreads > kEventThreadsAtOnce) std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    done = true;
    for (std::thread& client : clients) client.join();
    process.desktop.Settle();
    EXPECT_EQ(process.desktop.Calls(DesktopCall::StartThread) - 1, static_cast<std::uint64_t>(broadcasts));
    EXPECT_EQ(g_pActiveReceiver.load()->m_nBusy, 0);
  }
  EXPECT_EQ(seen.alive, 0) << "a sink was left behind";
  for (const std::atomic<int>& count : seen.events) EXPECT_GE(count, broadcasts / 20);
  EXPECT_GE(seen.fromInside, broadcasts / 50);
  EXPECT_GE(seen.left, broadcasts / 200);
}

}  // namespace
}  // namespace KelvoUHW
