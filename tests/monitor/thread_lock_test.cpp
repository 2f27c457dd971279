#include "monitor/thread_lock.h"

#include "tests/support/monitor_process.h"

namespace KelvoUHW {
namespace {

// Another thread's attempts, at the moments it got the lock; it gives it back at once.
std::vector<std::uint64_t> Taken(MonitorProcess& process, CThreadLock& lock, std::vector<std::uint32_t> holds,
                                 std::size_t waiting = 1) {
  std::vector<std::uint64_t> taken;
  lock.Lock();
  for (std::size_t i = 0; i < waiting; ++i) {
    process.Launch([&] {
      const ThreadLockGuard guard(lock);
      taken.push_back(process.desktop.Now());
    });
  }
  for (const std::uint32_t hold : holds) process.desktop.RunFor(hold);
  lock.Unlock();
  process.desktop.Settle();
  return taken;
}

TEST(ThreadLock, IsAskedForEvery50Milliseconds) {
  const struct {
    std::uint32_t held;
    std::size_t waiting;
    std::vector<std::uint64_t> taken;
  } kCases[] = {{0, 1, {50}}, {49, 1, {50}}, {50, 1, {100}}, {120, 1, {150}}, {120, 3, {150, 150, 150}}};
  for (const auto& test : kCases) {
    MonitorProcess process;
    CThreadLock lock;
    const auto expected = test.held == 0 ? std::vector<std::uint64_t>{0} : test.taken;
    EXPECT_EQ(
        Taken(process, lock, test.held == 0 ? std::vector<std::uint32_t>{} : std::vector{test.held}, test.waiting),
        expected)
        << test.held;
    for (const auto& sleep : process.desktop.Sleeps()) EXPECT_EQ(sleep.milliseconds, 50u);
    EXPECT_EQ(process.desktop.Sleeps().size(), expected[0] / 50 * test.waiting);
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
  bool left = false;
  {
    MonitorProcess process;
    lock.Lock();
    process.Launch([&] {
      struct Leaves {
        bool& left;
        ~Leaves() { left = true; }
      } const leaves{left};
      const ThreadLockGuard guard(lock);
      taken = true;
    });
    process.desktop.RunFor(75);
  }
  EXPECT_TRUE(left);
  EXPECT_FALSE(taken);
}

}  // namespace
}  // namespace KelvoUHW
