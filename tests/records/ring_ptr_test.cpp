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

struct Shared : RecordRings {
  ~Shared() { --alive; }
  static void Destroy(Shared* record) noexcept {
    record->LetAllGo();
    delete record;
  }
  const int number = ++made;
  static inline int made = 0, alive = 0;
};

// Pointers at random in rings of their own or not, against a model that says for each which record it holds and in
// which ring. The first ring of a record that is left takes the record from all others.
TEST(Ring, TheFirstOfSeveralRingsThatIsLeftDestroysTheRecord) {
  std::mt19937 random(5);
  std::array<RingPtr<Shared>, 8> pointers;
  struct Place {
    int record = 0, ring = 0;  // 0: none
    bool operator==(const Place&) const = default;
  };
  std::array<Place, 8> model{};
  int rings = 0, destroyedByOthers = 0;
  for (int step = 0; step < 20'000; ++step) {
    const std::size_t to = random() % 8, from = random() % 8, what = random() % 7;
    RingPtr<Shared>&target = pointers[to], &source = pointers[from];
    Place set = model[from];
    const Place before = model[to];
    if (what == 0) ++Shared::alive, target = MakeRecord<Shared>(), set = {Shared::made, ++rings};
    if (what == 1) target = source;
    if (what == 2) target = std::move(source);
    if (what == 3) target.Swap(source);
    if (what == 4) target.Reset(), set = {};
    if (what == 5 && source) {
      target = RingPtr<Shared>::InARingOfItsOwn(source.Get());
      set.ring = ++rings;
    }
    if (what == 5 && model[from].record == 0) set = before;
    if (what == 6) target = RingPtr<Shared>(source), target.Swap(target);
    model[to] = set;
    if (what == 2 && to != from) model[from] = {};
    if (what == 3) model[from] = before;
    // What the overwritten pointer let go of last takes the others along.
    if (before.record != 0 && std::ranges::count(model, before) == 0) {
      for (Place& place : model) {
        if (place.record == before.record) place = {}, ++destroyedByOthers;
      }
    }
    for (std::size_t i = 0; i < pointers.size(); ++i) {
      ASSERT_EQ(pointers[i] ? pointers[i]->number : 0, model[i].record) << step;
      ASSERT_EQ(pointers[i].RingSize(), model[i].record ? std::ranges::count(model, model[i]) : 0) << step;
    }
    std::set<int> alive;
    for (const Place& place : model) alive.insert(place.record);
    ASSERT_EQ(Shared::alive, static_cast<int>(alive.size() - alive.count(0))) << step;
  }
  EXPECT_GE(destroyedByOthers, 300);
  // One that gives up without destroying leaves the others theirs.
  pointers = {};
  ++Shared::alive, pointers[0] = MakeRecord<Shared>();
  pointers[1] = RingPtr<Shared>::InARingOfItsOwn(pointers[0].Get());
  pointers[1].Abandon();
  EXPECT_TRUE(pointers[0] && pointers[0]->IsHeld() && !pointers[1]);
}

}  // namespace
}  // namespace KelvoUHW
