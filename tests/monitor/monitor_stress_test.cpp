// Threads side by side on the real clock; what they do is small, so that they meet often.
#include <chrono>
#include <thread>

#include "monitor/usb_event_receiver.h"
#include "tests/support/cases.h"
#include "tests/support/monitor_process.h"
#include "tests/support/rendezvous.h"

namespace KelvoUHW {
namespace {

using platform::simulated::VolumeBroadcast;

constexpr std::uint32_t kAnyArrival = platform::kDBT_DEVICEARRIVAL;

TEST(MonitorStress, FourThreadsShareTheLock) {
  constexpr std::size_t kThreads = 4;
  constexpr std::uint64_t kRounds = 100;
  MonitorProcess process(ClockMode::Real);
  CThreadLock lock;
  int inside = 0;  // guarded by the lock and nothing else
  testing_support::Rendezvous begin(kThreads);
  std::vector<std::thread> threads;
  for (std::size_t i = 0; i < kThreads; ++i) {
    threads.emplace_back([&] {
      begin.ArriveAndWait();
      for (std::uint64_t round = 0; round < kRounds; ++round) {
        const ThreadLockGuard guard(lock);
        EXPECT_EQ(++inside, 1) << "two threads inside";
        lock.Lock();
        lock.Unlock();
        // The first owner keeps the others waiting, however coarse the system's sleeps are.
        std::this_thread::sleep_for(round == 0 ? std::chrono::milliseconds(20) : std::chrono::milliseconds(0));
        --inside;
        lock.Unlock();  // and once more by the guard, which is nothing to the next owner
        std::this_thread::yield();
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  // How many had to is up to the scheduler.
  EXPECT_GE(process.desktop.Calls(DesktopCall::Sleep), 1u) << "nobody had to wait";
}

TEST(MonitorStress, StartsAndTearsDownInFreshProcesses) {
  const std::size_t processes = testing_support::Cases(200u, 40u);
  constexpr std::size_t kBroadcasts = 8;
  std::size_t calls = 0;
  const std::int32_t locks = ModuleLockCount();
  for (std::size_t number = 0; number < processes; ++number) {
    MonitorProcess process(ClockMode::Real);
    RecordingTarget target(process.desktop);
    auto receiver = std::make_unique<CZKUMUsbEventReceiver>();
    receiver->Start(&target);  // whether the window is there in time is a matter of luck on the real clock
    std::thread sender([&] {
      for (std::size_t i = 0; i < kBroadcasts; ++i) {
        process.desktop.Broadcast(VolumeBroadcast(kAnyArrival, u'E', 0));
        process.desktop.Broadcast(NamedBroadcast(kAnyArrival, 5, kWatchedPath));
      }
    });
    // Half of them tear down amid the broadcasts.
    if (number % 2 == 0) sender.join();
    if (number % 4 == 0) StopReceiving();
    receiver.reset();
    if (sender.joinable()) sender.join();
    process.desktop.Settle();
    calls += target.Calls().size();
    EXPECT_EQ(process.desktop.Counts().registrations, 0u);
  }
  EXPECT_EQ(ModuleLockCount(), locks);
  // At least the volumes of the processes that stopped before they tore down.
  EXPECT_GE(calls, processes / 4 * kBroadcasts / 2);
}

}  // namespace
}  // namespace KelvoUHW
