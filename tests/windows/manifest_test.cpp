// Programs that use the component without registering it: the module over a simulated PC and its manifest lie beside
// this program, which knows the headers for other programs alone. A stick is plugged in four seconds after the first
// notifier.
#include <zkusb_monitor_watcher.h>
// Behind windows.h, on which it builds.
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <mutex>
#include <optional>
#include <thread>

namespace {

constexpr DWORD kPatience = 20000;
constexpr wchar_t kStick[] = L"USB\\VID_0951&PID_1666\\60A44C413FD1B2A1C9A60135";
constexpr ULONG kSanDisk = 0x0781;

template <class Condition>
bool WaitUntil(Condition condition) {
  for (const ULONGLONG end = GetTickCount64() + kPatience; GetTickCount64() < end && !condition();) Sleep(10);
  return condition();
}

void Pump() {
  MSG message;
  while (PeekMessageW(&message, nullptr, 0, 0, PM_REMOVE)) DispatchMessageW(&message);
}

// Every key that a registration would write. Where proxies are made the system may have registered the type library by
// itself: that is taken back, so that nothing but the manifest can help.
std::vector<std::wstring> LeftInTheRegistry() {
  const auto text = [](const GUID& id) {
    wchar_t digits[39];
    StringFromGUID2(id, digits, 39);
    return std::wstring(digits);
  };
  std::vector<std::wstring> keys = {L"TypeLib\\" + text(LIBID_ZKUsbMonitorLib)}, left;
  for (const GUID& id : {CLSID_ZKUMEventNotifier, CLSID_ZKUMUsbTree}) keys.push_back(L"CLSID\\" + text(id));
  for (const wchar_t* progId : {L"KelvoUsbMonitor.UsbTree", L"KelvoUsbMonitor.EventNotifier"}) {
    keys.push_back(progId);
    keys.push_back(progId + std::wstring(L".1"));
  }
  for (const GUID& id : {DIID_IZKDeviceEventCallBack, IID_IZKUMEventNotifier, IID_IZKUMDeviceEvent,
                         IID_IZKUMUsbTreeNode, IID_IZKUMUsbTreeNodeEnumerator, IID_IZKUMUsbDevice,
                         IID_IZKUMHostController, IID_IZKUMHubDevice, IID_IZKUMHubPort, IID_IZKUMPortDevice,
                         IID_IZKUMInterfaceDescr, IID_IZKUMInfoDevice, IID_IZKUMInterfaceDevice, IID_IZKUMUsbTree}) {
    keys.push_back(L"Interface\\" + text(id));
  }
  for (const std::wstring& key : keys) {
    RegDeleteTreeW(HKEY_CLASSES_ROOT, key.c_str());
    HKEY opened = nullptr;
    if (RegOpenKeyExW(HKEY_CLASSES_ROOT, key.c_str(), 0, KEY_READ, &opened) != ERROR_SUCCESS) continue;
    RegCloseKey(opened);
    left.push_back(key);
  }
  return left;
}

// What the raw interfaces show in an apartment.
struct Client {
  explicit Client(DWORD model) : entered(CoInitializeEx(nullptr, model)) {
    const zkum::UseManifestBesideProgram manifest;
    EXPECT_EQ(CoCreateInstance(CLSID_ZKUMEventNotifier, nullptr, CLSCTX_INPROC_SERVER, IID_PPV_ARGS(notifier.Put())),
              S_OK);
    EXPECT_EQ(CoCreateInstance(CLSID_ZKUMUsbTree, nullptr, CLSCTX_INPROC_SERVER, IID_PPV_ARGS(tree.Put())), S_OK);
  }
  ~Client() {
    tree = {};
    notifier = {};
    if (SUCCEEDED(entered)) CoUninitialize();
  }
  zkum::Ptr<IConnectionPoint> Point() const {
    zkum::Ptr<IConnectionPoint> point;
    const auto container = notifier.As<IConnectionPointContainer>();
    if (container) container->FindConnectionPoint(DIID_IZKDeviceEventCallBack, point.Put());
    return point;
  }
  zkum::Ptr<IZKUMUsbTreeNode> Root() const {
    zkum::Ptr<IZKUMUsbTreeNode> root;
    tree->get_RootNode(root.Put());
    return root;
  }
  // Of the methods whose parameters have no direction: how many nodes each brings.
  std::vector<std::size_t> Undirected() const {
    zkum::Ptr<IZKUMUsbTreeNodeEnumerator> volumes, sticks;
    EXPECT_EQ(tree->get_PortDevicesWithVolume(volumes.Put()), S_OK);
    EXPECT_EQ(tree->get_PortDevicesWithVendorId(kSanDisk, sticks.Put()), S_OK);
    const auto found = zkum::Nodes(sticks);
    EXPECT_EQ(found.size(), 1u);
    zkum::Ptr<IZKUMUsbTreeNode> disk;
    if (const auto stick = found.empty() ? zkum::Ptr<IZKUMPortDevice>() : found[0].As<IZKUMPortDevice>()) {
      EXPECT_EQ(stick->get_FirstChildOfType(found[0].Get(), KUDTInterfaceDevice, disk.Put()), S_OK);
    }
    return {zkum::Subtree(Root(), KUDTPortDevice).size(), zkum::Nodes(volumes).size(), disk ? 1u : 0u};
  }
  const HRESULT entered;
  zkum::Ptr<IZKUMEventNotifier> notifier;
  zkum::Ptr<IZKUMUsbTree> tree;
};

// What a sink was told, and on which threads.
struct Told {
  zkum::Ptr<IUnknown> Sink() {
    return zkum::MakeSink([this](TDeviceEventType kind, const zkum::Ptr<IZKUMUsbTreeNode>& node) {
      const std::wstring id = zkum::Read(node, &IZKUMUsbTreeNode::get_InstanceId);
      const std::lock_guard<std::mutex> lock(mutex);
      events.emplace_back(kind, id);
      threads.push_back(GetCurrentThreadId());
    });
  }
  std::ptrdiff_t Count(TDeviceEventType kind) {
    const std::lock_guard<std::mutex> lock(mutex);
    return std::count_if(events.begin(), events.end(), [&](const auto& event) { return event.first == kind; });
  }
  std::mutex mutex;
  std::vector<std::pair<TDeviceEventType, std::wstring>> events;
  std::vector<DWORD> threads;
};

TEST(Manifest, StandsInForTheRegistration) {
  ASSERT_EQ(LeftInTheRegistry(), std::vector<std::wstring>());
  ASSERT_EQ(CoInitializeEx(nullptr, COINIT_MULTITHREADED), S_OK);
  zkum::Ptr<IZKUMUsbTree> tree;
  EXPECT_EQ(CoCreateInstance(CLSID_ZKUMUsbTree, nullptr, CLSCTX_INPROC_SERVER, IID_PPV_ARGS(tree.Put())),
            REGDB_E_CLASSNOTREG);
  CLSID found;
  EXPECT_NE(CLSIDFromProgID(L"KelvoUsbMonitor.UsbTree", &found), S_OK);
  const zkum::UseManifestBesideProgram manifest;
  for (const auto& [progId, clsid] : {std::pair(L"KelvoUsbMonitor.UsbTree", CLSID_ZKUMUsbTree),
                                      std::pair(L"KelvoUsbMonitor.UsbTree.1", CLSID_ZKUMUsbTree),
                                      std::pair(L"KelvoUsbMonitor.EventNotifier", CLSID_ZKUMEventNotifier),
                                      std::pair(L"KelvoUsbMonitor.EventNotifier.1", CLSID_ZKUMEventNotifier)}) {
    // The identifier that comes is one of the system's own for that class; it has one class object.
    zkum::Ptr<IClassFactory> byName, byId;
    EXPECT_EQ(CLSIDFromProgID(progId, &found), S_OK);
    EXPECT_EQ(CoGetClassObject(found, CLSCTX_INPROC_SERVER, nullptr, IID_PPV_ARGS(byName.Put())), S_OK);
    EXPECT_EQ(CoGetClassObject(clsid, CLSCTX_INPROC_SERVER, nullptr, IID_PPV_ARGS(byId.Put())), S_OK);
    EXPECT_TRUE(byId);
    EXPECT_EQ(byName.Get(), byId.Get());
  }
  CoUninitialize();
}

// One story, for the script is played once in a process.
TEST(Manifest, ServesBothApartmentsAndAWatcher) {
  // In the single-threaded apartment, without a message being taken: the first events come inside Advise, on this
  // thread.
  Client window(COINIT_APARTMENTTHREADED);
  ASSERT_TRUE(window.notifier && window.tree);
  const auto point = window.Point();
  ASSERT_TRUE(point);
  Told inWindow;
  DWORD cookie = 0;
  const auto sink = inWindow.Sink();
  ASSERT_EQ(point->Advise(sink.Get(), &cookie), S_OK);
  EXPECT_EQ(inWindow.Count(KDeviceConnected), 3);
  // Through the proxy properties come, and what has no direction does not. It is published and deliberate.
  ASSERT_TRUE(window.Root());
  EXPECT_EQ(zkum::TypeOf(window.Root()), KUDTRoot);
  EXPECT_EQ(window.Undirected(), (std::vector<std::size_t>{0, 0, 0}));

  // A watcher that the same thread makes has none of this. Its function is called on other threads.
  std::mutex mutex;
  std::optional<zkum::Device> attached;
  std::atomic<int> connected = 0;
  std::atomic<bool> here = false;
  const DWORD self = GetCurrentThreadId();
  std::optional<zkum::Watcher> watcher;
  watcher.emplace([&](const zkum::Event& event) {
    if (GetCurrentThreadId() == self) here = true;
    if (event.kind == KDeviceConnected) ++connected;
    const std::lock_guard<std::mutex> lock(mutex);
    if (event.kind == KDeviceAttached) attached = event.device;
  });
  ASSERT_EQ(watcher->Error(), S_OK);
  EXPECT_EQ(connected, 3);
  std::vector<std::wstring> devices;
  for (const zkum::Device& device : watcher->Devices()) devices.push_back(device.portPath + L" " + device.Letters());
  std::sort(devices.begin(), devices.end());
  EXPECT_EQ(devices, (std::vector<std::wstring>{L"1-3 D:", L"2-1.4 ", L"2-1.5 "}));

  // The stick comes while no message is taken: the first sink hears nothing, and holds up the one behind it.
  Sleep(6000);
  EXPECT_EQ(inWindow.Count(KDeviceAttached), 0);
  {
    const std::lock_guard<std::mutex> lock(mutex);
    EXPECT_FALSE(attached);
  }
  // A watcher made now has to wait for the end of that call, which only this thread can take: it takes it meanwhile.
  EXPECT_EQ(zkum::Watcher([](const zkum::Event&) {}).Error(), S_OK);
  EXPECT_EQ(inWindow.Count(KDeviceAttached), 1);
  EXPECT_TRUE(WaitUntil([&] {
    Pump();
    const std::lock_guard<std::mutex> lock(mutex);
    return attached.has_value();
  }));
  EXPECT_EQ(inWindow.Count(KDeviceAttached), 1);
  EXPECT_EQ(std::count(inWindow.threads.begin(), inWindow.threads.end(), self),
            static_cast<std::ptrdiff_t>(inWindow.threads.size()))
      << "on the window's own thread";
  EXPECT_FALSE(here);
  ASSERT_TRUE(attached);
  EXPECT_EQ(attached->instanceId, kStick);
  EXPECT_EQ(attached->vendor + L"|" + attached->product + L"|" + attached->serial + L"|" + attached->Letters() + L"|" +
                attached->portPath,
            L"Kingston|DataTraveler 3.0|60A44C413FD1B2A1C9A60135|F:|1-2");

  // Once it is unadvised, nobody is held up any more.
  EXPECT_EQ(point->Unadvise(cookie), S_OK);
  watcher.reset();

  std::vector<std::size_t> direct;
  std::atomic<bool> done = false;
  std::thread reader([&] {
    direct = Client(COINIT_MULTITHREADED).Undirected();
    done = true;
  });
  // Meanwhile the object of this thread's sink may be let go of by another.
  EXPECT_TRUE(WaitUntil([&] {
    Pump();
    return done.load();
  }));
  reader.join();
  EXPECT_EQ(direct, (std::vector<std::size_t>{4, 2, 1}));
}

TEST(Watcher, PostsToAWindowAndEndsWithEventsUnderWay) {
  const HWND window = CreateWindowExW(0, L"STATIC", nullptr, 0, 0, 0, 0, 0, HWND_MESSAGE, nullptr, nullptr, nullptr);
  ASSERT_NE(window, nullptr);
  {
    zkum::Watcher watcher(window, WM_APP);
    ASSERT_EQ(watcher.Error(), S_OK);
    int posted = 0, taken = 0;
    MSG message;
    while (PeekMessageW(&message, window, WM_APP, WM_APP, PM_REMOVE)) ++posted;
    zkum::Event event{};
    while (watcher.Next(event)) {
      ++taken;
      EXPECT_EQ(event.kind, KDeviceConnected);
      EXPECT_FALSE(event.device.portPath.empty());
    }
    EXPECT_EQ(posted, 4);
    EXPECT_EQ(taken, posted);
  }
  // Many come and go, each with its first events untaken.
  for (int round = 0; round < 20; ++round) {
    zkum::Watcher watcher(window, WM_APP);
    EXPECT_EQ(watcher.Error(), S_OK);
  }
  DestroyWindow(window);
}

TEST(Helpers, NamesAndTexts) {
  EXPECT_STREQ(zkum::EventName(KDeviceRemoved), "removed");
  EXPECT_STREQ(zkum::EventName(static_cast<TDeviceEventType>(4)), "unknown");
  EXPECT_STREQ(zkum::TypeName(KUDTInterfaceDevice), "interface device");
  EXPECT_STREQ(zkum::TypeName(static_cast<TUsbDeviceType>(-1)), "unknown");
  EXPECT_STREQ(zkum::SpeedName(1), "full");
  EXPECT_STREQ(zkum::SpeedName(4), "unknown");
  EXPECT_EQ(zkum::Utf8(L"G\u00e4\u20ac"), "G\xC3\xA4\xE2\x82\xAC");
  EXPECT_EQ(zkum::Utf8(L""), "");
  zkum::Device device;
  device.mountPoints = {L"F:\\", L"C:\\folder\\"};
  EXPECT_EQ(device.Letters(), L"F:, C:\\folder");
  EXPECT_EQ(zkum::Bstr(std::wstring(L"a\0b", 3)).Text(), std::wstring(L"a\0b", 3));
  EXPECT_EQ(zkum::Read(zkum::Ptr<IZKUMUsbDevice>(), &IZKUMUsbDevice::get_Vendor), L"");
  EXPECT_TRUE(zkum::Children({}).empty());
  EXPECT_TRUE(zkum::PortPaths({}).empty());
}

}  // namespace
