#include "tree/ring_ptr.h"

#include <gtest/gtest.h>

#include <atomic>
#include <latch>
#include <thread>
#include <vector>

namespace KelvoUHW {
namespace {

std::atomic<int> g_nBases, g_nDerived;

struct Base {
  Base() { ++g_nBases; }
  virtual ~Base() { --g_nBases; }
  std::vector<RingPtr<Base>> Members;
};
struct Derived : Base {
  Derived() { ++g_nDerived; }
  ~Derived() override { --g_nDerived; }
};
using Ptr = RingPtr<Base>;

struct Cached {
  static void Destroy(Cached* record) noexcept { record->Destroyed = true; }
  bool Destroyed = false;
};

TEST(Ring, LastPointerDeletesOnce) {
  Ptr a = MakeRecord<Base>(), b = a, c = std::move(a), empty, copyOfEmpty = empty;
  EXPECT_EQ(a, nullptr);
  EXPECT_EQ(a.RingSize() + copyOfEmpty.RingSize(), 0u);
  EXPECT_EQ(b, c);
  EXPECT_EQ(c.RingSize(), 2u);
  a = c;
  EXPECT_EQ(b.RingSize(), 3u);
  b = nullptr;
  c = std::move(empty);
  EXPECT_EQ(a.RingSize(), 1u);
  a = MakeRecord<Base>();  // the first record dies here
  EXPECT_EQ(g_nBases, 1);
  a.Reset();
  a.Reset();
  EXPECT_EQ(g_nBases, 0);

  Cached record;
  { const RingPtr<Cached> first(&record), second = first; }
  EXPECT_TRUE(record.Destroyed);
}

TEST(Ring, SwapChangesNothingWithinARingAndExchangesPlacesOfTwo) {
  for (std::size_t members = 1; members <= 3; ++members) {
    std::vector<Ptr> ring(members, MakeRecord<Base>());
    Ptr& self = ring.front();
    Base* const record = self.Get();
    self = *&self;
    self = std::move(*&self);
    self.Swap(self);
    self.Swap(ring.back());
    EXPECT_EQ(self.Get(), record);
    EXPECT_EQ(self.RingSize(), members);
    EXPECT_EQ(ring.back().RingSize(), members);
  }
  Ptr a = MakeRecord<Base>(), a2 = a, b = MakeRecord<Base>(), b2 = b, b3 = b, empty;
  a.Swap(b);
  EXPECT_TRUE(b == a2 && a == b2);
  EXPECT_EQ(a.RingSize(), 3u);
  b.Swap(empty);
  EXPECT_EQ(b.RingSize(), 0u);
  EXPECT_EQ(empty, a2);
  EXPECT_EQ(a2.RingSize(), 2u);
}

TEST(Ring, PointersOfBothTypesShareARing) {
  RingPtr<Derived> derived = MakeRecord<Derived>();
  Ptr base = derived;
  RingPtr<Derived> cast = base.StaticCast<Derived>();
  EXPECT_TRUE(base == derived && cast == derived);
  EXPECT_EQ(cast.RingSize(), 3u);
  Ptr moved = std::move(derived);
  cast.Reset();
  base.Reset();
  EXPECT_EQ(moved.RingSize(), 1u);
  EXPECT_EQ(g_nDerived, 1);
  moved.Reset();  // through the virtual destructor
  EXPECT_EQ(g_nDerived, 0);
  EXPECT_EQ(Ptr().StaticCast<Derived>(), nullptr);
}

TEST(Ring, ListsOfMembersMayGrowAndOneMayListItself) {
  std::vector<Ptr> grown(1, MakeRecord<Base>());
  for (std::size_t i = 2; i <= 1000; ++i) {
    grown.push_back(grown[i / 2 - 1]);
    ASSERT_EQ(grown.front().RingSize(), i);
  }
  grown.erase(grown.begin(), grown.begin() + 10);
  EXPECT_EQ(grown.front().RingSize(), 990u);
  std::vector<Ptr>& list = grown.front()->Members;
  list.assign(3, grown.front());
  grown.clear();
  EXPECT_EQ(g_nBases, 1);  // it lives until its list is taken out
  std::exchange(list, {}).clear();
  EXPECT_EQ(g_nBases, 0);
}

TEST(Ring, ThreadsCopyWhileOneAssigns) {
  Ptr shared = MakeRecord<Derived>();
  std::latch start(3);  // a thread that ran alone would show nothing
  const auto copyAndRelease = [&] {
    start.arrive_and_wait();
    for (int i = 0; i < 100'000; ++i) Ptr(shared).Reset();
  };
  std::atomic<bool> done = false;
  std::thread other(copyAndRelease), assigning([&] {
    start.arrive_and_wait();
    while (!done) shared = MakeRecord<Derived>();
  });
  copyAndRelease();
  other.join();
  done = true;
  assigning.join();
  EXPECT_EQ(shared.RingSize(), 1u);
  EXPECT_EQ(g_nDerived, 1);
}

}  // namespace
}  // namespace KelvoUHW
