// The road of one event, from registration to the last sink, over COM alone: this program knows the component as any
// client does, and loads it from where it was registered.
#include "simulation/desktop/play_on_desktop.h"
#include "tests/support/client_process.h"
#include "tests/support/test_sink.h"

namespace KelvoUHW {
namespace {

using platform::simulated::BroadcastTime;

// The class of the interface that every USB device has.
constexpr platform::Guid kUsbDeviceInterface{
    0xA5DCBF10, 0x6530, 0x11D2, {0x90, 0x1F, 0x00, 0xC0, 0x4F, 0xB9, 0x51, 0xED}};

// A device of the three whose interfaces are watched: no volume, one interface.
Plug Phone(const Text& serial, std::uint32_t port, const Text& product = u"1291") {
  const Text id = u"USB\\VID_05AC&PID_" + product + u"\\" + serial;
  Plug plug;
  AddNode(plug, id, kRootHubId, u"WPD", u"WUDFRd");
  AddPort(plug, id, kRootHubId, port);
  plug.fragment.interfaces.push_back(
      {kUsbDeviceInterface, u"\\\\?\\" + platform::Replaced(id, u'\\', u'#') + u"#" + GuidText(kUsbDeviceInterface),
       id});
  return plug;
}

struct Client : ClientProcess {
  Client() : ClientProcess({Stick(u"S1", 1, u'E'), CardReader(u"CR", 2)}) {
    EXPECT_EQ(CoInitializeEx(nullptr, COINIT_MULTITHREADED), S_OK);
  }
  ~Client() {
    point.Reset();
    CoUninitialize();
  }
  void Advise(IUnknown& sink, DWORD expected) {
    DWORD cookie = 0;
    EXPECT_EQ(point->Advise(&sink, &cookie), S_OK);
    EXPECT_EQ(cookie, expected);
  }
  // The change, what the system tells of it, and what follows within the time.
  void Play(const Change& change, std::uint32_t milliseconds = 0, BroadcastTime told = BroadcastTime::After) {
    EXPECT_EQ(platform::simulated::PlayStep(pc, desktop, {0, u"", change, told}), u"");
    desktop.RunFor(milliseconds);
  }

  ComPtr<IConnectionPoint> point;
};

// One process, and so one test: the component stays in this one.
TEST(EventRoad, FromRegistrationToUnadvise) {
  TestSink::Log log;
  TestSink a(log, "A");
  TestSink b(log, "B");
  Client client;
  platform::simulated::SimulatedDesktop& desktop = client.desktop;

  // Registered, created: there is a window, and no tree yet.
  EXPECT_FALSE(client.Create<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier, REGDB_E_CLASSNOTREG));
  ASSERT_EQ(client.Register(), S_OK);
  const auto tree = client.Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree);
  EXPECT_EQ(desktop.Counts().threads, 0u);
  const auto notifier = client.Create<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier);
  ASSERT_TRUE(tree && notifier);
  EXPECT_EQ(desktop.Counts(), (platform::simulated::DesktopCounts{1, 1, 1, 1, 0}));
  EXPECT_EQ(client.RootOf(tree), E_POINTER);

  // Advised: the tree is there, and what is connected is told inside the call, to that sink only.
  const auto container = notifier.As<IConnectionPointContainer>();
  ASSERT_EQ(container->FindConnectionPoint(DIID_IZKDeviceEventCallBack, client.point.Put()), S_OK);
  std::uint32_t caller = 0;
  a.onEvent = [&] {
    caller = desktop.CurrentThreadId();
    return S_OK;
  };
  client.Advise(a, 1);
  EXPECT_EQ(Taken(log), "A 0 S1, A 0 CR");
  EXPECT_EQ(caller, desktop.CurrentThreadId());
  EXPECT_EQ(client.RootOf(tree), S_OK);
  client.Advise(b, 2);
  EXPECT_EQ(Taken(log), "B 0 S1, B 0 CR");

  // S1 goes and S2 comes, of which the system tells at once: 1, 0, 2, 3, each device to both sinks in turn.
  client.Play(Unplug{UsbId(u"S1")}, 0, BroadcastTime::None);
  EXPECT_EQ(Taken(log), "");
  const std::uint64_t plugged = desktop.Now();
  client.Play(Stick(u"S2", 3, u'F'));
  EXPECT_EQ(desktop.Now(), plugged);
  EXPECT_EQ(Taken(log),
            "A 1 S2, B 1 S2, A 0 CR, B 0 CR, A 0 S2, B 0 S2, A 2 S1, B 2 S1, A 3 CR, B 3 CR, A 3 CR, B 3 CR");
  EXPECT_NE(caller, desktop.CurrentThreadId()) << "an event thread";

  // B is gone by now and hears nothing.
  EXPECT_EQ(client.point->Unadvise(2), S_OK);
  EXPECT_EQ(client.point->Unadvise(2), CONNECT_E_NOCONNECTION);
  // A watched device: told at once when it comes, and three seconds late when it goes.
  client.Play(Phone(u"P1", 4));
  EXPECT_EQ(Taken(log), "A 1 P1, A 0 CR, A 0 S2, A 0 P1, A 3 S2, A 3 CR, A 3 CR");
  client.Play(Unplug{u"USB\\VID_05AC&PID_1291\\P1"}, 2999);
  EXPECT_EQ(Taken(log), "");
  desktop.RunFor(1);
  EXPECT_EQ(Taken(log), "A 0 CR, A 0 S2, A 2 P1, A 3 S2, A 3 CR, A 3 CR");

  // A volume at once. Any other device without one is told of by the next volume that comes or goes.
  client.Play(Unplug{UsbId(u"S2")});
  EXPECT_EQ(Taken(log), "A 0 CR, A 2 S2, A 3 CR, A 3 CR");
  client.Play(Phone(u"P2", 5, u"1293"), 5000);
  EXPECT_EQ(Taken(log), "");
  client.Play(Stick(u"S3", 1, u'G'));
  EXPECT_EQ(Taken(log), "A 1 P2, A 1 S3, A 0 CR, A 0 P2, A 0 S3, A 3 CR, A 3 CR");

  // After the last sink went nobody is called; the next one is told what came meanwhile.
  EXPECT_EQ(client.point->Unadvise(1), S_OK);
  client.Play(Unplug{UsbId(u"S3")}, 5000);
  EXPECT_EQ(Taken(log), "");
  client.Advise(b, 1);
  EXPECT_EQ(Taken(log), "B 0 CR, B 0 P2");
  EXPECT_EQ(client.point->Unadvise(1), S_OK);
  EXPECT_EQ(desktop.Counts(), (platform::simulated::DesktopCounts{1, 1, 1, 1, 0}));
}

}  // namespace
}  // namespace KelvoUHW
