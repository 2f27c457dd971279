// What a client is not told, sentence by sentence as docs/contract.md has it: whole PCs, runs of the notifier, and what
// the nodes of the events and of the tree then say.
#include <algorithm>

#include "bench/object_reader.h"
#include "platform/wrappers/intercepting_host.h"
#include "tests/support/notifier_scene.h"

namespace KelvoUHW::untold {
namespace {

using platform::simulated::Dismount;
using platform::simulated::Mount;
using Untold = ComObjects;

constexpr char16_t kVolumeE[] = u"\\\\?\\Volume{of E:}\\";

// "E:\" of all mount points below a node; "-" for none.
std::string Letters(const ComPtr<IZKUMUsbTreeNode>& node) {
  std::string letters;
  if (!node) return "no node";
  testing_support::WalkChilds(node, [&](const ComPtr<IZKUMUsbTreeNode>& below) {
    if (const auto disk = below.As<IZKUMInterfaceDevice>()) {
      testing_support::ForEachElement(*disk.Get(), &IZKUMInterfaceDevice::get_MountPoints, [&](const Variant& element) {
        letters += platform::ToUtf8(platform::BstrText(element.bstrVal));
      });
    }
  });
  return letters.empty() ? "-" : letters;
}

// A PC with a stick S1 on E:, and a sink that has been told of it.
struct Pc : NotifierScene {
  Pc() : NotifierScene({Stick(u"S1", 1, u'E'), CardReader(u"CR", 2)}) {
    Advise(a);
    EXPECT_EQ(Taken(log), "A 0 S1, A 0 CR");
  }
  // What a run tells, each event with the letters that its node names.
  std::string Run(const std::vector<Change>& changes) {
    Do(changes);
    std::vector<ComPtr<IUnknown>> nodes;
    a.keeps = &nodes;
    EXPECT_EQ(Notify(), S_OK);
    a.keeps = nullptr;
    std::string told;
    for (std::size_t i = 0; i < nodes.size(); ++i) {
      told += (i == 0 ? "" : ", ") + log.at(i) + " " + Letters(nodes[i].As<IZKUMUsbTreeNode>());
    }
    log.clear();
    return told;
  }
  // What the tree says now.
  std::string InTree() {
    ComPtr<IZKUMUsbTreeNode> root;
    EXPECT_EQ(Make<IZKUMUsbTree>(CLSID_ZKUMUsbTree)->get_RootNode(root.Put()), S_OK);
    return Letters(root);
  }
};

// Each run names the letters that the device had. A stick without its volume counts as gone, though its socket is not
// empty; pulling it out then is no news. When the volume comes back, the run after that one tells of the stick.
TEST_F(Untold, ThatADiskWhoseVolumeWentFirstIsStillThere) {
  constexpr char kGone[] = "A 0 CR -, A 2 S1 E:\\, A 3 CR -, A 3 CR -";
  const std::vector<std::pair<std::vector<Change>, const char*>> kStories[] = {
      {{{Unplug{UsbId(u"S1")}}, kGone}, {{}, ""}},
      {{{Unplug{VolumeId(DiskId(u"S1"))}}, kGone}, {{}, ""}, {{}, ""}, {{Unplug{UsbId(u"S1")}}, ""}},
      {{{Unplug{VolumeId(DiskId(u"S1"))}}, kGone},
       {{Volume(DiskId(u"S1"), u'E')}, "A 0 CR -, A 3 CR -, A 3 CR -"},
       {{}, "A 1 S1 E:\\, A 0 CR -, A 0 S1 E:\\, A 3 CR -, A 3 CR -"},
       {{}, ""}},
      {{{Unplug{VolumeId(DiskId(u"S1"))}}, kGone},
       {{Gadget(u"G", 3)}, "A 1 G -, A 0 CR -, A 0 G -, A 3 CR -, A 3 CR -"},
       {{}, ""}},
  };
  for (const auto& story : kStories) {
    Pc pc;
    for (const auto& [changes, told] : story) EXPECT_EQ(pc.Run(changes), told);
  }
}

TEST_F(Untold, ADriveLetterThatChanges) {
  Pc pc;
  EXPECT_EQ(pc.Run({Dismount{kVolumeE, u"E:\\"}, Mount{kVolumeE, u"X:\\"}}), "");
  EXPECT_EQ(pc.InTree(), "E:\\");
  EXPECT_EQ(pc.Run({Gadget(u"G", 3)}), "A 1 G -, A 0 S1 X:\\, A 0 CR -, A 0 G -, A 3 S1 X:\\, A 3 CR -, A 3 CR -");
  EXPECT_EQ(pc.InTree(), "X:\\");
}

// Something happens to the PC while a build reads it: between the hubs and what the device manager lists.
struct Meanwhile final : platform::wrappers::InterceptingHost {
  using InterceptingHost::InterceptingHost;
  platform::Status BeforeCall(const platform::wrappers::HostCall& call) noexcept override {
    const bool listed = call.operation == platform::wrappers::Operation::GetClassDevs && ++lists == 3;
    if (listed && happens) std::exchange(happens, nullptr)();
    return {};
  }
  int lists = 0;  // of this build
  std::function<void()> happens;
};

// The device node of one that comes back is the one it had, so it is not new; that of one that came is told later.
TEST_F(Untold, ADeviceThatIsResetWhileABuildReads) {
  const struct {
    const char* what;
    std::vector<Change> before, meanwhile;
    const char *told, *after;  // by the run whose build it was, and by the next one that finds a change
  } kCases[] = {
      {"reset",
       {Gadget(u"G", 4), Unplug{UsbId(u"M")}},
       {Gadget(u"M", 2)},
       "A 1 G, A 0 S1, A 0 G, A 2 M, A 3 S1",
       "A 1 N, A 0 S1, A 0 G, A 0 M, A 0 N, A 3 S1"},
      {"moved",
       {Gadget(u"G", 4), Unplug{UsbId(u"M")}},
       {Gadget(u"M", 3)},
       "A 1 G, A 0 S1, A 0 G, A 2 M, A 3 S1",
       "A 1 N, A 0 S1, A 0 G, A 0 M, A 0 N, A 3 S1"},
      {"came",
       {Gadget(u"G", 4)},
       {Gadget(u"L", 3)},
       "A 1 G, A 0 S1, A 0 M, A 0 G, A 3 S1",
       "A 1 N, A 1 L, A 0 S1, A 0 M, A 0 G, A 0 L, A 0 N, A 3 S1"},
      {"went",
       {Gadget(u"G", 4)},
       {Unplug{UsbId(u"M")}},
       "A 1 G, A 0 S1, A 0 G, A 2 M, A 3 S1",
       "A 1 N, A 0 S1, A 0 G, A 0 N, A 2 M, A 3 S1"},
  };
  for (const auto& test : kCases) {
    SCOPED_TRACE(test.what);
    TestSink::Log log;
    TestSink a(log, "A");
    ModuleProcess process;
    Meanwhile host(process.pc);
    platform::SetCurrentSystem({.host = &host, .threads = &process.desktop, .desktop = &process.desktop});
    process.Do({Stick(u"S1", 1, u'E'), Gadget(u"M", 2)});
    process.Start();
    const DWORD cookie = process.Advise(a);
    EXPECT_EQ(Taken(log), "A 0 S1, A 0 M");
    process.Do(test.before);
    host.lists = 0;
    host.happens = [&] { process.Do(test.meanwhile); };
    EXPECT_EQ(process.Notify(), S_OK);
    EXPECT_FALSE(host.happens);
    EXPECT_EQ(Taken(log), test.told);
    process.Do({Gadget(u"N", 5)});
    EXPECT_EQ(process.Notify(), S_OK);
    EXPECT_EQ(Taken(log), test.after);
    EXPECT_EQ(process.point->Unadvise(cookie), S_OK);
  }
}

// Broadcasts as they come when a device without a volume is plugged in, and when the PC wakes; then a volume's, which
// is the only thing that counts.
TEST_F(Untold, ADeviceWithoutAVolumeAndAWakeUp) {
  constexpr std::uint32_t kWM_POWERBROADCAST = 0x218, kDBT_DEVNODES_CHANGED = 7;
  Pc pc;
  pc.Do({Gadget(u"G", 3)});
  const auto settled = [&] {
    pc.desktop.Settle();
    return Taken(pc.log);
  };
  pc.desktop.Broadcast(platform::simulated::InterfaceBroadcast(
      platform::kDBT_DEVICEARRIVAL, platform::GUID_DEVINTERFACE_DISK, u"\\\\?\\USB#VID_046D&PID_C077#1#{x}"));
  pc.desktop.Broadcast({kDBT_DEVNODES_CHANGED, {}});
  EXPECT_EQ(settled(), "");
  const platform::WindowHandle window = pc.desktop.Windows().at(0).handle;
  for (const platform::WParam wakeUp : {0x12u, 0x7u, 0x6u}) {
    EXPECT_TRUE(pc.desktop.SendToWindow(window, kWM_POWERBROADCAST, wakeUp, 0));
  }
  EXPECT_EQ(settled(), "");
  // What to do: a sink that is advised now has the tree built, and is told.
  DWORD cookie = 0;
  EXPECT_EQ(pc.point->Advise(&pc.b, &cookie), S_OK);
  EXPECT_EQ(settled(), "B 0 S1, B 0 CR, B 0 G");
  EXPECT_EQ(pc.point->Unadvise(cookie), S_OK);
  pc.Do({Gadget(u"G2", 4)});
  pc.desktop.Broadcast(platform::simulated::VolumeBroadcast(platform::kDBT_DEVICEARRIVAL, u'Q', 0));
  EXPECT_EQ(settled(), "A 1 G2, A 0 S1, A 0 CR, A 0 G, A 0 G2, A 3 S1, A 3 CR, A 3 CR");
}

}  // namespace
}  // namespace KelvoUHW::untold
