#include "records/ring_ptr.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <random>
#include <set>
#include <thread>
#include <vector>

#include "tests/support/rendezvous.h"

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

// Pointers that are copied, moved, swapped and reset at random, also onto themselves, against the
// plain addresses of their records.
TEST(Ring, HoldsAllPointersToARecordAndTheLastOneDeletesIt) {
  std::mt19937 random(3);
  std::array<Ptr, 6> pointers;
  std::array<Base*, 6> model{};
  for (int step = 0; step < 20'000; ++step) {
    const std::size_t to = random() % 6, from = random() % 6, what = random() % 6;
    Ptr &target = pointers[to], &source = pointers[from];
    if (what == 0) target = MakeRecord<Derived>();
    if (what == 1) target = source;
    if (what == 2) target = std::move(source);
    if (what == 3) target.Swap(source);
    if (what == 4) target.Reset();
    if (what == 5) target = source.StaticCast<Derived>();  // pointers of both types share a ring
    Base* const before = std::exchange(model[to], what == 0 ? target.Get() : what == 4 ? nullptr : model[from]);
    if (what == 2 && to != from) model[from] = nullptr;
    if (what == 3) model[from] = before;
    for (std::size_t i = 0; i < pointers.size(); ++i) {
      ASSERT_EQ(pointers[i].Get(), model[i]) << step;
      ASSERT_EQ(pointers[i].RingSize(), model[i] ? std::ranges::count(model, model[i]) : 0) << step;
    }
    std::set<Base*> alive(model.begin(), model.end());
    alive.erase(nullptr);
    ASSERT_EQ(g_nDerived, static_cast<int>(alive.size())) << step;  // deleted through the base, each once
  }
  pointers = {};
  EXPECT_EQ(g_nBases + g_nDerived, 0);
  Cached record;
  { const RingPtr<Cached> first(&record), second = first; }
  EXPECT_TRUE(record.Destroyed);
}

TEST(Ring, ListsOfMembersMayGrowAndOneMayListItself) {
  std::vector<Ptr> grown(1, MakeRecord<Base>());
  for (std::size_t i = 2; i <= 1000; ++i) grown.push_back(grown[i / 2 - 1]);
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
  testing_support::Rendezvous start(3);  // a thread that ran alone would show nothing
  const auto copyAndRelease = [&] {
    start.ArriveAndWait();
    for (int i = 0; i < 100'000; ++i) Ptr(shared).Reset();
  };
  std::atomic<bool> done = false;
  std::thread other(copyAndRelease), assigning([&] {
    start.ArriveAndWait();
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
