// Runs of the notifier over whole PCs: what sinks hear of what happened.
#include "tests/support/notifier_scene.h"

namespace KelvoUHW {
namespace {

using EventRuns = ComObjects;

// A PC with a stick S1 and a card reader CR, and a notifier over its own tree, which has told A of them.
struct Pc : NotifierScene {
  Pc() : NotifierScene({Stick(u"S1", 1, u'E'), CardReader(u"CR", 2)}) {
    Advise(a);
    EXPECT_EQ(Taken(log), "A 0 S1, A 0 CR");
  }
};

// A sink advises another from inside a call, with devices in lists 1 and 2: S1 went and S2 came before the run. The
// nested build refills the lists and replaces the tree; the run goes on with what it found itself.
TEST_F(EventRuns, AdvisingAnotherInsideACall) {
  const struct {
    const char* what;
    std::vector<Change> meanwhile;
    const char *toB, *after;  // inside its advise; in the next run, on a PC that did not change any more
  } kCases[] = {
      {"unchanged PC", {}, "B 0 CR, B 0 S2, ", "A 1 CR, A 1 S2, A 0 CR, A 0 S2"},
      {"a stick plugged in, and that of the run pulled",
       {Stick(u"S3", 4, u'G'), Unplug{UsbId(u"S2")}},
       "B 0 CR, B 0 S3, ",
       "A 1 CR, A 1 S3, A 0 CR, A 0 S3"},
      {"everything pulled", {Unplug{UsbId(u"S2")}, Unplug{UsbId(u"CR")}}, "", ""},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    Pc pc;
    pc.Do({Unplug{UsbId(u"S1")}, Stick(u"S2", 3, u'F')});
    std::vector<ComPtr<IUnknown>> kept;
    pc.a.keeps = &kept;
    pc.a.onEvent = [&] {
      pc.a.onEvent = {};
      pc.Do(test.meanwhile);
      pc.Advise(pc.b);
      return S_OK;
    };
    EXPECT_EQ(pc.Notify(), S_OK);
    EXPECT_EQ(Taken(pc.log), "A 1 S2, " + std::string(test.toB) +
                                 "B 1 S2, A 0 CR, B 0 CR, A 0 S2, B 0 S2, A 2 S1, B 2 S1, "
                                 "A 3 CR, B 3 CR, A 3 CR, B 3 CR");
    pc.a.keeps = nullptr;
    EXPECT_EQ(pc.point->Unadvise(2), S_OK);
    // Both the advise and the run settled what was found, after which nothing counts as known: the next run tells of
    // all that is there as attached. This is deliberate.
    for (const char* told : {test.after, ""}) {
      EXPECT_EQ(pc.Notify(), S_OK);
      EXPECT_EQ(Taken(pc.log), told);
    }
    // Nodes answer for themselves when their trees are gone.
    ASSERT_GE(kept.size(), 6u);
    EXPECT_EQ(InstanceId(kept[0].Get()), "S_OK " + platform::ToUtf8(UsbId(u"S2")));
    EXPECT_EQ(InstanceId(kept[3].Get()), "S_OK " + platform::ToUtf8(UsbId(u"S1")));
  }
}

TEST_F(EventRuns, TellEachSinkWhatItIsMeantToHear) {
  enum Act { kRun, kAdviseB, kUnadviseB };
  struct Step {
    std::vector<Change> changes;
    Act act;
    const char* log;
  };
  const std::pair<const char*, std::vector<Step>> kCases[] = {
      {"what an advise finds is settled: others never hear that it came or went, only of what is connected later",
       {{{Unplug{UsbId(u"S1")}, Stick(u"S2", 3, u'F')}, kAdviseB, "B 0 CR, B 0 S2"},
        {{}, kRun, ""},
        {{Stick(u"S3", 4, u'G')},
         kRun,
         "A 1 S3, B 1 S3, A 0 CR, B 0 CR, A 0 S2, B 0 S2, A 0 S3, B 0 S3, A 3 S2, B 3 S2, A 3 CR, B 3 CR, A 3 CR, "
         "B 3 CR"}}},
      {"on an unchanged PC a new sink is told what the last change left connected, and nobody else is called",
       {{{}, kAdviseB, "B 0 S1, B 0 CR"}, {{}, kRun, ""}, {{}, kUnadviseB, ""}, {{}, kAdviseB, "B 0 S1, B 0 CR"}}},
      {"a reader whose card is taken out counts as removed with it, and comes back with the next run: by design",
       {{{Volume(DiskId(u"CR", 0), u'K')}, kRun, "A 0 S1, A 0 CR, A 3 S1, A 3 CR, A 3 CR"},
        {{}, kRun, ""},
        {{Unplug{VolumeId(DiskId(u"CR", 0))}}, kRun, "A 0 S1, A 2 CR, A 3 S1"},
        {{}, kRun, "A 1 CR, A 0 S1, A 0 CR, A 3 S1"},
        {{}, kRun, ""},
        {{ExternalHub(u"HUB", 3), Stick(u"S2", 1, u'F', UsbId(u"HUB"))},
         kRun,
         "A 1 S2, A 0 S1, A 0 CR, A 0 S2, A 3 S1, A 3 CR, A 3 CR"}}},
  };
  for (const auto& [what, steps] : kCases) {
    Pc pc;
    for (const Step& step : steps) {
      pc.Do(step.changes);
      DWORD cookie = 0;
      EXPECT_EQ(step.act == kRun       ? pc.Notify()
                : step.act == kAdviseB ? pc.point->Advise(&pc.b, &cookie)
                                       : pc.point->Unadvise(2),
                S_OK);
      EXPECT_EQ(Taken(pc.log), step.log) << what;
    }
  }
}

}  // namespace
}  // namespace KelvoUHW
