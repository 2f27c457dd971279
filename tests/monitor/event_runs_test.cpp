// Runs of the notifier over whole PCs: what sinks hear of what happened.
#include <gtest/gtest.h>

#include "tests/support/notifier_process.h"
#include "tests/support/plugs.h"
#include "tests/support/test_sink.h"

namespace KelvoUHW {
namespace {

using EventRuns = ComObjects;

// A PC with a stick S1 and a card reader CR, and a notifier over its own tree.
struct Pc {
  Pc() {
    process.Do(Stick(u"S1", 1, u'E'));
    process.Do(CardReader(u"CR", 2));
    process.UseOwnTreeClass();
    process.Start();
  }

  TestSink::Log log;
  TestSink a{log, "A"};
  TestSink b{log, "B"};
  NotifierProcess process{BarePc()};
};

// What each of the two was told, where that is the same: "1 S2, 0 S2"; otherwise the whole log.
std::string OfBoth(TestSink::Log& log) {
  std::string text;
  for (std::size_t i = 0; i + 1 < log.size(); i += 2) {
    if (log[i].substr(1) != log[i + 1].substr(1) || log[i][0] != 'A' || log[i + 1][0] != 'B') return Taken(log);
    text += (text.empty() ? "" : ", ") + log[i].substr(2);
  }
  if (log.size() % 2 != 0) return Taken(log);
  log.clear();
  return text;
}

// A sink advises another from inside a call, with devices in lists 1 and 2: S1 went and S2 came before the run. The
// nested build refills the lists and replaces the tree; the run goes on with what it found itself.
TEST_F(EventRuns, AdvisingAnotherInsideACall) {
  const struct {
    const char* what;
    std::vector<Change> meanwhile;
    const char* toB;    // inside its advise
    const char* after;  // the next run, on a PC that did not change any more
  } kCases[] = {
      {"unchanged PC", {}, "B 0 CR, B 0 S2", "1 CR, 1 S2, 0 CR, 0 S2"},
      {"a stick plugged in", {Stick(u"S3", 4, u'G')}, "B 0 CR, B 0 S2, B 0 S3", "1 CR, 1 S2, 1 S3, 0 CR, 0 S2, 0 S3"},
      {"a stick plugged in, and that of the run pulled",
       {Stick(u"S3", 4, u'G'), Unplug{UsbId(u"S2")}},
       "B 0 CR, B 0 S3",
       "1 CR, 1 S3, 0 CR, 0 S3"},
      {"everything pulled", {Unplug{UsbId(u"S2")}, Unplug{UsbId(u"CR")}}, "", ""},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    Pc pc;
    pc.process.Advise(pc.a);
    EXPECT_EQ(Taken(pc.log), "A 0 S1, A 0 CR");
    pc.process.Do(Unplug{UsbId(u"S1")});
    pc.process.Do(Stick(u"S2", 3, u'F'));
    std::vector<ComPtr<IUnknown>> kept;
    pc.a.keeps = &kept;
    pc.a.onEvent = [&] {
      pc.a.onEvent = {};
      for (const Change& change : test.meanwhile) pc.process.Do(change);
      pc.process.Advise(pc.b);
      ComPtr<IZKUMUsbTree> tree;
      EXPECT_EQ(CoCreateInstance(CLSID_ZKUMUsbTree, nullptr, CLSCTX_INPROC_SERVER, platform::IidOf<IZKUMUsbTree>(),
                                 tree.PutVoid()),
                S_OK);
      ComPtr<IZKUMUsbTreeNode> root;
      EXPECT_EQ(tree->get_RootNode(root.Put()), S_OK);
      return S_OK;
    };
    EXPECT_EQ(pc.process.Notify(), S_OK);
    const std::string toB = test.toB;
    EXPECT_EQ(Taken(pc.log), "A 1 S2, " + toB + (toB.empty() ? "" : ", ") +
                                 "B 1 S2, A 0 CR, B 0 CR, A 0 S2, B 0 S2, A 2 S1, B 2 S1, "
                                 "A 3 CR, B 3 CR, A 3 CR, B 3 CR");
    // Both the advise and the run settled what was found, after which nothing counts as known: the next run tells of
    // all that is there as attached. It is meant so.
    EXPECT_EQ(pc.process.Notify(), S_OK);
    EXPECT_EQ(OfBoth(pc.log), test.after);
    EXPECT_EQ(pc.process.Notify(), S_OK);
    EXPECT_EQ(Taken(pc.log), "");
    pc.a.keeps = nullptr;
    // Nodes answer for themselves when their trees are gone.
    ASSERT_GE(kept.size(), 6u);
    EXPECT_EQ(InstanceId(kept[0].Get()), "S_OK " + platform::ToUtf8(UsbId(u"S2")));
    EXPECT_EQ(InstanceId(kept[3].Get()), "S_OK " + platform::ToUtf8(UsbId(u"S1")));
    for (const DWORD cookie : {1u, 2u}) EXPECT_EQ(pc.process.point->Unadvise(cookie), S_OK);
  }
}

// What an advise finds is settled: the new sink is told, the others never hear that it came, or that it went.
TEST_F(EventRuns, OthersMissWhatANewSinkLearns) {
  Pc pc;
  pc.process.Advise(pc.a);
  pc.log.clear();
  pc.process.Do(Unplug{UsbId(u"S1")});
  pc.process.Do(Stick(u"S2", 3, u'F'));
  pc.process.Advise(pc.b);
  EXPECT_EQ(Taken(pc.log), "B 0 CR, B 0 S2");
  EXPECT_EQ(pc.process.Notify(), S_OK);
  EXPECT_EQ(Taken(pc.log), "");
  // It is among what the next change tells of as connected and as modified.
  pc.process.Do(Stick(u"S3", 4, u'G'));
  EXPECT_EQ(pc.process.Notify(), S_OK);
  EXPECT_EQ(OfBoth(pc.log), "1 S3, 0 CR, 0 S2, 0 S3, 3 S2, 3 CR, 3 CR");
  for (const DWORD cookie : {1u, 2u}) EXPECT_EQ(pc.process.point->Unadvise(cookie), S_OK);
}

// On an unchanged PC a new sink is told what the last change left connected, and nobody else is called.
TEST_F(EventRuns, ANewSinkIsToldOnAnUnchangedPc) {
  Pc pc;
  pc.process.Advise(pc.a);
  EXPECT_EQ(Taken(pc.log), "A 0 S1, A 0 CR");
  for (int round = 0; round < 3; ++round) {
    pc.process.Advise(pc.b);
    EXPECT_EQ(Taken(pc.log), "B 0 S1, B 0 CR");
    EXPECT_EQ(pc.process.Notify(), S_OK);
    EXPECT_EQ(Taken(pc.log), "");
    EXPECT_EQ(pc.process.point->Unadvise(2), S_OK);
  }
  EXPECT_EQ(pc.process.point->Unadvise(1), S_OK);
}

// A reader whose card is taken out counts as removed with it, and comes back with the next run. It is meant so.
TEST_F(EventRuns, ReaderGoesWithItsCardAndComesBack) {
  Pc pc;
  pc.process.Advise(pc.a);
  pc.log.clear();
  const struct {
    const char* what;
    std::vector<Change> changes;
    const char* log;
  } kSteps[] = {
      {"card put in", {Volume(DiskId(u"CR", 0), u'K')}, "A 0 S1, A 0 CR, A 3 S1, A 3 CR, A 3 CR"},
      {"nothing", {}, ""},
      {"card taken out", {Unplug{VolumeId(DiskId(u"CR", 0))}}, "A 0 S1, A 2 CR, A 3 S1"},
      {"back", {}, "A 1 CR, A 0 S1, A 0 CR, A 3 S1"},
      {"nothing more", {}, ""},
      {"a device on a hub",
       {ExternalHub(u"HUB", 3), Stick(u"S2", 1, u'F', UsbId(u"HUB"))},
       "A 1 S2, A 0 S1, A 0 CR, A 0 S2, A 3 S1, A 3 CR, A 3 CR"},
  };
  for (const auto& step : kSteps) {
    for (const Change& change : step.changes) pc.process.Do(change);
    EXPECT_EQ(pc.process.Notify(), S_OK);
    EXPECT_EQ(Taken(pc.log), step.log) << step.what;
  }
  EXPECT_EQ(pc.process.point->Unadvise(1), S_OK);
}

}  // namespace
}  // namespace KelvoUHW
