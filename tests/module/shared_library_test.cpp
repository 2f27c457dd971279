// The module as a client has it: a shared library that is loaded through COM. This program does not contain it.
#include <dlfcn.h>
#include <gmock/gmock.h>

#include <chrono>
#include <cstdlib>
#include <iostream>

#include "com/private_interfaces.h"
#include "tests/support/client_process.h"
#include "tests/support/counting_sink.h"
#include "tests/support/registry_lines.h"

namespace {

using KelvoUHW::ClockMode;
using KelvoUHW::ComPtr;
using platform::simulated::InterfaceBroadcast;
using platform::simulated::VolumeBroadcast;
using testing_support::CountingSink;
using testing_support::Lines;
using testing_support::LinesOf;

const std::u16string kModule = platform::FromUtf8(ZKUSB_MODULE);

// Whether the module is part of this process.
bool Mapped() {
  void* const handle = dlopen(ZKUSB_MODULE, RTLD_NOW | RTLD_NOLOAD);
  if (handle != nullptr) dlclose(handle);
  return handle != nullptr;
}

// With one gadget, and the module registered or not.
struct Client : KelvoUHW::ClientProcess {
  explicit Client(bool registered = true, ClockMode mode = ClockMode::Virtual)
      : ClientProcess({KelvoUHW::Gadget(u"1", 1)}, kModule, mode) {
    if (registered) {
      EXPECT_EQ(Register(), S_OK);
    }
  }
};

CLSID ClassOf(const char16_t* progId, HRESULT expected = S_OK) {
  CLSID clsid{1, 0, 0, {}};
  EXPECT_EQ(CLSIDFromProgID(progId, &clsid), expected);
  return clsid;
}

TEST(SharedLibrary, InstallWritesNothing) {
  void* const library = dlopen(ZKUSB_MODULE, RTLD_NOW);
  ASSERT_NE(library, nullptr);
  const auto install = reinterpret_cast<HRESULT (*)(BOOL, const OLECHAR*)>(dlsym(library, "DllInstall"));
  ASSERT_NE(install, nullptr);
  for (const bool registered : {false, true}) {
    const Client client(registered);
    const Lines before = LinesOf(client.registry);
    EXPECT_EQ(before.empty(), !registered);
    for (const BOOL flag : {TRUE, FALSE}) {
      for (const char16_t* line : {static_cast<const char16_t*>(nullptr), u"user"}) {
        EXPECT_EQ(install(flag, line), S_OK);
        EXPECT_EQ(LinesOf(client.registry), before);
      }
    }
  }
  dlclose(library);
  EXPECT_FALSE(Mapped());
}

TEST(SharedLibrary, IsFoundThroughItsRegistrationAlone) {
  Client client(false);
  const auto refused = [] {
    EXPECT_FALSE(Client::Create<IUnknown>(CLSID_ZKUMUsbTree, REGDB_E_CLASSNOTREG));
    EXPECT_FALSE(Client::Create<IUnknown>(CLSID_ZKUMEventNotifier, REGDB_E_CLASSNOTREG));
    EXPECT_EQ(ClassOf(u"KelvoUsbMonitor.UsbTree", CO_E_CLASSSTRING), GUID_NULL);
    EXPECT_FALSE(Mapped());
  };
  refused();
  ASSERT_EQ(client.Register(), S_OK);
  EXPECT_FALSE(Mapped()) << "loaded for the call only";
  EXPECT_EQ(ClassOf(u"KelvoUsbMonitor.EventNotifier"), CLSID_ZKUMEventNotifier);
  EXPECT_EQ(ClassOf(u"KelvoUsbMonitor.EventNotifier.1"), CLSID_ZKUMEventNotifier);
  for (const CLSID& clsid :
       {CLSID_ZKUMUsbTree, ClassOf(u"KelvoUsbMonitor.UsbTree"), ClassOf(u"KelvoUsbMonitor.UsbTree.1")}) {
    EXPECT_EQ(Client::RootOf(Client::Create<IZKUMUsbTree>(clsid)), E_POINTER) << "no build, no tree";
  }
  CoFreeUnusedLibraries();
  ASSERT_EQ(platform::UnregisterServerModule(kModule), S_OK);
  refused();
}

TEST(SharedLibrary, IsUnmappedWheneverNothingOfItIsLeft) {
  constexpr int kCycles = 200;
  const Client client;
  for (int cycle = 0; cycle < kCycles && !HasFailure(); ++cycle) {
    SCOPED_TRACE(cycle);
    ASSERT_FALSE(Mapped());
    ComPtr<IZKUMUsbTree> tree = Client::Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree);
    ASSERT_TRUE(tree && Mapped());
    EXPECT_EQ(Client::RootOf(tree), E_POINTER) << "a tree of the cycle before";
    EXPECT_EQ(tree.As<IBuildUsbTree>()->BuildTree(), S_OK);
    ComPtr<IZKUMUsbTreeNode> root;
    ComPtr<IZKUMUsbTreeNodeEnumerator> nodes;
    EXPECT_EQ(tree->get_RootNode(root.Put()), S_OK);
    EXPECT_EQ(tree->get_PortDevicesWithVendorId(0x0781, nodes.Put()), S_OK);
    VARIANT_BOOL more = VARIANT_FALSE;
    EXPECT_EQ(nodes->MoveNext(&more), S_OK);
    EXPECT_EQ(more, VARIANT_TRUE);
    // Each of them alone keeps it.
    tree.Reset();
    CoFreeUnusedLibraries();
    root.Reset();
    CoFreeUnusedLibraries();
    ASSERT_TRUE(Mapped());
    nodes.Reset();
    CoFreeUnusedLibraries();
  }
  EXPECT_FALSE(Mapped());
}

// With a notifier the module stays in the process, so each of these has a process to itself.
class SharedLibraryDeathTest : public testing::Test {
 protected:
  SharedLibraryDeathTest() { GTEST_FLAG_SET(death_test_style, "threadsafe"); }
};

constexpr int kOwnCode = 42;
[[noreturn]] void EndWithOwnCode() { std::exit(testing::Test::HasFailure() ? 1 : kOwnCode); }

struct AdvisedClient : Client {
  explicit AdvisedClient(ClockMode mode) : Client(true, mode) {
    EXPECT_EQ(notifier->FindConnectionPoint(DIID_IZKDeviceEventCallBack, point.Put()), S_OK);
    EXPECT_EQ(point->Advise(&sink, &cookie), S_OK);
  }

  CountingSink sink;
  ComPtr<IConnectionPointContainer> notifier = Client::Create<IConnectionPointContainer>(CLSID_ZKUMEventNotifier);
  ComPtr<IConnectionPoint> point;
  DWORD cookie = 0;
};

[[noreturn]] void StaysMapped() {
  AdvisedClient client(ClockMode::Virtual);
  EXPECT_EQ(Client::RootOf(Client::Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree)), S_OK) << "not the notifier's tree";
  EXPECT_EQ(client.sink.Events(), 1u) << "the gadget that was there";

  // More closings than openings: a client can unload it no more than the system.
  CoFreeUnusedLibraries();
  void* const handle = dlopen(ZKUSB_MODULE, RTLD_NOW);
  for (int closings = 0; closings < 3; ++closings) dlclose(handle);
  EXPECT_TRUE(Mapped());

  EXPECT_EQ(client.pc.Apply({0, u"", KelvoUHW::Unplug{KelvoUHW::UsbId(u"1")}}), u"");
  EXPECT_EQ(client.desktop.Broadcast(VolumeBroadcast(platform::kDBT_DEVICEREMOVECOMPLETE, u'E', 0)), 1u);
  client.desktop.Settle();
  EXPECT_EQ(client.sink.Events(), 2u);
  EXPECT_EQ(client.point->Unadvise(client.cookie), S_OK);
  EXPECT_EQ(client.sink.References(), 1);
  client.point.Reset();
  client.notifier.Reset();
  EndWithOwnCode();
}

TEST_F(SharedLibraryDeathTest, StaysMappedWithANotifier) {
  EXPECT_EXIT(StaysMapped(), testing::ExitedWithCode(kOwnCode), "");
}

std::int64_t Milliseconds() {
  return std::chrono::steady_clock::now().time_since_epoch() / std::chrono::milliseconds(1);
}

// Prints when it begins to end.
[[noreturn]] void EndsAmidAnEvent() {
  AdvisedClient client(ClockMode::Real);
  const std::u16string watched = u"\\\\?\\USB#VID_05AC&PID_1291#0#{a5dcbf10-6530-11d2-901f-00c04fb951ed}";
  // The window may be there later than the notifier, and is not registered then: it is sent to.
  while (client.desktop.Windows().empty()) client.desktop.RunFor(1);
  const auto removal = InterfaceBroadcast(platform::kDBT_DEVICEREMOVECOMPLETE, {}, watched);
  const std::size_t threads = client.desktop.Counts().threads;
  EXPECT_TRUE(client.desktop.SendToWindow(client.desktop.Windows()[0].handle, platform::kWM_DEVICECHANGE,
                                          platform::kDBT_DEVICEREMOVECOMPLETE,
                                          reinterpret_cast<platform::LParam>(removal.record.data())));
  EXPECT_EQ(client.desktop.Counts().threads, threads + 1) << "no event thread";
  client.desktop.RunFor(100);
  EXPECT_EQ(client.desktop.Counts().threads, threads + 1) << "it does not wait";
  std::cerr << "ends at " << Milliseconds() << std::endl;
  EndWithOwnCode();
}

TEST_F(SharedLibraryDeathTest, EndsAtOnceThoughAnEventThreadSleeps) {
  const auto sinceItBegan = [](const std::string& text) {
    const std::size_t at = text.find("ends at ");
    return at == text.npos ? -1 : Milliseconds() - std::stoll(text.substr(at + 8));
  };
  EXPECT_EXIT(EndsAmidAnEvent(), testing::ExitedWithCode(kOwnCode),
              testing::ResultOf(sinceItBegan, testing::AllOf(testing::Ge(0), testing::Lt(1000))));
}

}  // namespace
