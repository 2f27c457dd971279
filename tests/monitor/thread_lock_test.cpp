#include "monitor/thread_lock.h"

#include "tests/support/monitor_process.h"

namespace KelvoUHW {
namespace {

TEST(ThreadLock, IsAskedForEvery50Milliseconds) {
  // How long it is held, how many wait, when they have it.
  const std::tuple<std::uint32_t, std::size_t, std::uint64_t> kCases[] = {{49, 1, 50}, {50, 1, 100}, {120, 3, 150}};
  for (const auto& [held, waiting, expected] : kCases) {
    MonitorProcess process;
    CThreadLock lock;
    std::vector<std::uint64_t> taken;
    lock.Lock();
    for (std::size_t i = 0; i < waiting; ++i) {
      process.Launch([&] {
        const ThreadLockGuard guard(lock);
        taken.push_back(process.desktop.Now());
      });
    }
    process.desktop.RunFor(held);
    lock.Unlock();
    process.desktop.Settle();
    EXPECT_EQ(taken, std::vector(waiting, expected));
    EXPECT_EQ(process.desktop.Sleeps().size(), expected / 50 * waiting);
  }
}

TEST(ThreadLock, CountsItsOwnerAndIgnoresOthers) {
  MonitorProcess process;
  CThreadLock lock;
  lock.Unlock();  // free already: nothing
  lock.Lock();
  lock.Lock();
  std::uint64_t taken = 0;
  process.Launch([&] {
    lock.Unlock();  // another thread's: nothing
    const ThreadLockGuard guard(lock);
    const ThreadLockGuard again(lock);
    taken = process.desktop.Now();
  });
  process.desktop.RunFor(60);
  lock.Unlock();
  process.desktop.RunFor(60);
  EXPECT_EQ(taken, 0u) << "given back too early";
  lock.Unlock();
  process.desktop.Settle();
  EXPECT_EQ(taken, 150u);
  // Given back by both guards of the other thread.
  lock.Lock();
  EXPECT_EQ(process.desktop.Now(), 150u);
  lock.Unlock();
}

TEST(ThreadLock, LetsAThreadGoWhenTheProcessEnds) {
  CThreadLock lock;
  bool taken = false;
  {
    MonitorProcess process;  // whose end wants no thread left
    lock.Lock();
    process.Launch([&] {
      const ThreadLockGuard guard(lock);
      taken = true;
    });
    process.desktop.RunFor(75);
  }
  EXPECT_FALSE(taken);
}

}  // namespace
}  // namespace KelvoUHW
