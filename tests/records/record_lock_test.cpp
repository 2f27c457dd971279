#include "records/record_lock.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <optional>
#include <thread>

#include "records/node.h"
#include "tests/support/rendezvous.h"

namespace KelvoUHW {
namespace {

// Its destructor lasts long enough for whoever does not wait for it to come first.
struct SlowRecord final : CZKUMUsbTreeNodeImpl {
  SlowRecord(testing_support::Rendezvous& rendezvous, std::atomic<bool>& destroyed)
      : begun(rendezvous), done(destroyed) {}
  ~SlowRecord() override {
    begun.ArriveAndWait();
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    done = true;
  }
  testing_support::Rendezvous& begun;
  std::atomic<bool>& done;
};

template <class Lock>
bool WaitsForADestructor() {
  testing_support::Rendezvous begun(2);
  std::atomic<bool> done = false;
  NodePtr record = MakeRecord<SlowRecord>(begun, done);
  std::thread deleting([&] { record.Reset(); });
  begun.ArriveAndWait();
  bool waited = false;
  {
    const Lock lock;
    waited = done;
  }
  deleting.join();
  return waited;
}

// Whoever joins records, and whoever follows a link to a parent, meets none that is being deleted.
TEST(RecordLock, NobodyComesInWhileARecordIsDeleted) {
  EXPECT_TRUE(WaitsForADestructor<RecordWriteLock>());
  EXPECT_TRUE(WaitsForADestructor<RecordReadLock>());
}

TEST(RecordLock, ADeletionWaitsForReadersAndWriters) {
  const auto waits = [](auto makeLock) {
    testing_support::Rendezvous begun(2);
    std::atomic<bool> letGo = false, tooEarly = false;
    struct Watched final : CZKUMUsbTreeNodeImpl {
      Watched(const std::atomic<bool>& over, std::atomic<bool>& early) : letGo(over), tooEarly(early) {}
      ~Watched() override { tooEarly = !letGo; }
      const std::atomic<bool>& letGo;
      std::atomic<bool>& tooEarly;
    };
    NodePtr record = MakeRecord<Watched>(letGo, tooEarly);
    std::thread deleting([&] {
      begun.ArriveAndWait();
      record.Reset();
    });
    {
      const auto lock = makeLock();
      begun.ArriveAndWait();
      std::this_thread::sleep_for(std::chrono::milliseconds(50));
      letGo = true;
    }
    deleting.join();
    return !tooEarly;
  };
  EXPECT_TRUE(waits([] { return RecordReadLock(); }));
  EXPECT_TRUE(waits([] { return RecordWriteLock(); }));
}

// What nobody else holds goes at once; what others hold stays for whoever uses records without a lock.
TEST(RecordLock, RecordsInUseOutliveTheObjectOfTheirParent) {
  NodePtr shared = MakeRecord<CZKUMUsbTreeNodeImpl>(), alone = MakeRecord<CZKUMUsbTreeNodeImpl>();
  const NodePtr child = MakeRecord<CZKUMUsbTreeNodeImpl>(), other = MakeRecord<CZKUMUsbTreeNodeImpl>();
  AddChild(child, shared.Get());
  AddChild(other, alone.Get());
  {
    const RecordsInUse outer;
    {
      const RecordsInUse inner;
      NodePtr::InARingOfItsOwn(shared.Get()).Reset();
      alone.Reset();
      EXPECT_EQ(other->m_pParent, nullptr);
    }
    ASSERT_TRUE(shared);
    EXPECT_EQ(child->m_pParent, shared.Get());
    // It is about to be deleted, so nobody takes it up any more.
    EXPECT_FALSE(NodePtr::InARingOfItsOwn(shared.Get()));
  }
  EXPECT_FALSE(shared);
  EXPECT_EQ(child->m_pParent, nullptr);
}

// A deletion that waits for readers meets a build that began meanwhile.
TEST(RecordLock, RecordsInUseOutliveADeletionThatHasToWait) {
  NodePtr shared = MakeRecord<CZKUMUsbTreeNodeImpl>();
  NodePtr own = NodePtr::InARingOfItsOwn(shared.Get());
  std::optional<RecordReadLock> reading(std::in_place);
  std::thread deleting([&] { own.Reset(); });
  std::this_thread::sleep_for(std::chrono::milliseconds(50));  // until it waits
  {
    const RecordsInUse build;
    reading.reset();
    deleting.join();
    EXPECT_TRUE(shared);
  }
  EXPECT_FALSE(shared);
}

}  // namespace
}  // namespace KelvoUHW
