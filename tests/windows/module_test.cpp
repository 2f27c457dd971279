// The module as the system's COM, registry and windows have it. The tests of this program run in the order in which
// they stand: from the first notifier on the module stays in the process.
#include <windows.h>

#include <dbt.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <filesystem>
#include <fstream>
#include <functional>
#include <mutex>
#include <nlohmann/json.hpp>
#include <thread>

#include "bench/object_reader.h"
#include "com/com_ptr.h"
#include "com/private_interfaces.h"
#include "com/zkusb_monitor.h"
#include "platform/device_broadcast.h"
#include "platform/registry_key.h"
#include "platform/system.h"
#include "platform/text.h"
#include "platform/windows/server_classes.h"
#include "tests/support/program.h"
#include "tests/windows/module_files.h"
#include "tools/zkusb/event_sink.h"

namespace {

using KelvoUHW::ComPtr;
using namespace std::chrono_literals;

constexpr char16_t kTreeProgId[] = u"KelvoUsbMonitor.UsbTree";
constexpr char16_t kNotifierProgId[] = u"KelvoUsbMonitor.EventNotifier";

// "no key", "no value" or the text.
std::string Read(const std::u16string& path, const char16_t* name) {
  platform::RegistryKey key(*platform::CurrentSystem().registry);
  std::u16string text;
  if (!key.Open(platform::kHKEY_CLASSES_ROOT, path.c_str())) return "no key";
  return key.Text(name, text) ? platform::ToUtf8(text) : "no value";
}

struct Entry {
  std::u16string key;
  const char16_t* name;
  std::string text;
};

// Keys and values of every kind: which there are is tested with the registration itself.
std::vector<Entry> Entries(const std::u16string& modulePath) {
  const std::string module = platform::ToUtf8(modulePath);
  const std::u16string library = u"TypeLib\\{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}\\1.0";
  const std::u16string tree = u"CLSID\\{34349D2D-14C6-414B-9771-A7BD2A7C7180}";
  return {
      {u"AppID\\{A0C53575-7F3D-4FF2-B5A7-BFA873492510}", u"", "ZKUsbMonitor"},
      {u"AppID\\ZKUsbMonitor.DLL", u"AppID", "{A0C53575-7F3D-4FF2-B5A7-BFA873492510}"},
      {library, u"", "ZKUsbMonitor 1.0 Type Library"},
      {library + (sizeof(void*) == 8 ? u"\\0\\win64" : u"\\0\\win32"), u"", module},
      {library + (sizeof(void*) == 8 ? u"\\0\\win32" : u"\\0\\win64"), u"", "no key"},
      {u"Interface\\{8080AF8D-857A-45C4-8296-AB1301ADFA28}", u"", "IZKUMUsbTreeNode"},
      {u"Interface\\{8080AF8D-857A-45C4-8296-AB1301ADFA28}\\TypeLib", u"", "{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}"},
      {u"KelvoUsbMonitor.UsbTree\\CurVer", u"", "KelvoUsbMonitor.UsbTree.1"},
      {tree, u"", "ZKUMUsbTree Class"},
      {tree + u"\\Programmable", u"", "no value"},
      {tree + u"\\InprocServer32", u"", module},
      {tree + u"\\InprocServer32", u"ThreadingModel", "Free"},
      {u"CLSID\\{1D7E7A5B-648D-4236-8604-8F5F3C82433A}\\InprocServer32", u"", module},
  };
}

void ExpectRegistered(const std::u16string& modulePath) {
  for (const Entry& entry : Entries(modulePath)) {
    EXPECT_EQ(Read(entry.key, entry.name), entry.text) << platform::ToUtf8(entry.key);
  }
}

TEST(WindowsModule, RegistersAndUnregisters) {
  EXPECT_EQ(platform::RegisterServerModule(Module()), S_OK);
  ExpectRegistered(Module());
  EXPECT_EQ(platform::UnregisterServerModule(Module()), S_OK);
  for (const Entry& entry : Entries(Module())) {
    EXPECT_EQ(Read(entry.key, entry.name), "no key") << platform::ToUtf8(entry.key);
  }
  EXPECT_EQ(Read(u"AppID", u"nothing"), "no value");  // the keys themselves are everybody's
  EXPECT_EQ(Read(u"CLSID", u"nothing"), "no value");
  // The type library is not registered any more, which is a failure.
  EXPECT_LT(platform::UnregisterServerModule(Module()), 0);
  EXPECT_EQ(platform::RegisterServerModule(u"Z:\\no\\such\\file.dll"), CO_E_DLLNOTFOUND);
}

TEST(WindowsModule, IsRegisteredByTheSystemsOwnProgram) {
  const auto regsvr32 = [](std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), "/s");
    arguments.push_back(platform::ToUtf8(Module()));
    return RunProgram("regsvr32.exe", arguments).code;
  };
  // There is no registration for one user: asked for one, it registers for all.
  for (const std::vector<std::string>& options : {std::vector<std::string>(), {"/i:user"}}) {
    EXPECT_EQ(regsvr32(options), 0) << options.size();
    ExpectRegistered(Module());
    EXPECT_EQ(regsvr32({"/u"}), 0);
    EXPECT_EQ(Read(kTreeProgId, u""), "no key");
  }
}

TEST(WindowsModule, InstallWritesNothing) {
  const HMODULE module = LoadLibraryW(platform::ToSystemText(Module().c_str()));
  ASSERT_NE(module, nullptr);
  const auto install = reinterpret_cast<HRESULT(STDAPICALLTYPE*)(BOOL, LPCWSTR)>(
      reinterpret_cast<void*>(GetProcAddress(module, "DllInstall")));
  ASSERT_NE(install, nullptr);
  for (const wchar_t* line : {static_cast<const wchar_t*>(nullptr), L"user"}) {
    for (const BOOL flag : {TRUE, FALSE}) EXPECT_EQ(install(flag, line), S_OK);
  }
  for (const Entry& entry : Entries(Module())) EXPECT_EQ(Read(entry.key, entry.name), "no key");
  EXPECT_TRUE(FreeLibrary(module));
  EXPECT_EQ(GetModuleHandleW(L"ZKUsbMonitor.dll"), nullptr);
}

// What the tests below use: the simulated module, registered for all programs, over a PC into which a stick is plugged
// without a message.
class Client : public testing::Test {
 protected:
  static void SetUpTestSuite() {
    std::ifstream file(ZKUSB_SOURCE_DIR "/machines/scripts/stick-comes-and-goes.json");
    nlohmann::json script = nlohmann::json::parse(file);
    nlohmann::json plug;
    for (nlohmann::json& step : script.at("steps")) {
      if (plug.is_null() && step.contains("plug")) plug = step;
    }
    plug["at"] = kPluggedAt;
    plug["broadcast"] = "none";
    s_script = std::filesystem::temp_directory_path() / "zkusb-module-test.json";
    std::ofstream(s_script) << nlohmann::json{{"steps", {plug}}}.dump();
    platform::windows::SetEnvironmentText(u"ZKUSB_MACHINE",
                                          platform::FromUtf8(ZKUSB_SOURCE_DIR "/machines/dell-precision.json"));
    ASSERT_EQ(platform::RegisterServerModule(SimulatedModule()), S_OK);
  }
  static void TearDownTestSuite() {
    EXPECT_EQ(platform::UnregisterServerModule(SimulatedModule()), S_OK);
    std::filesystem::remove(s_script);
  }

  static constexpr int kPluggedAt = 300;
  static inline std::filesystem::path s_script;
};

// On a thread of its own, in that kind of apartment.
void InApartment(DWORD model, const std::function<void()>& body) {
  std::thread([&] {
    ASSERT_EQ(CoInitializeEx(nullptr, model), S_OK);
    body();
    CoUninitialize();
  }).join();
}

// By class id or by ProgID.
template <class Interface>
ComPtr<Interface> Create(const CLSID& clsid, const char16_t* progId = nullptr) {
  CLSID found = clsid;
  if (progId) {
    EXPECT_EQ(CLSIDFromProgID(platform::ToSystemText(progId), &found), S_OK);
    EXPECT_TRUE(found == clsid);
  }
  ComPtr<Interface> object;
  EXPECT_EQ(CoCreateInstance(found, nullptr, CLSCTX_INPROC_SERVER, platform::IidOf<Interface>(), object.PutVoid()),
            S_OK);
  return object;
}

bool IsLoaded() { return GetModuleHandleW(L"ZKUsbMonitorSimulated.dll") != nullptr; }

TEST_F(Client, ThatOnlyMadeATreeCanUnloadTheModule) {
  constexpr int kCycles = 20;
  InApartment(COINIT_MULTITHREADED, [] {
    for (int cycle = 0; cycle < kCycles && !HasFailure(); ++cycle) {
      EXPECT_FALSE(IsLoaded()) << cycle;
      auto tree = Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree, kTreeProgId);
      ASSERT_TRUE(tree);
      auto same = Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree);
      EXPECT_EQ(same.Get(), tree.Get());
      ComPtr<IZKUMUsbTreeNode> root;
      EXPECT_EQ(tree->get_RootNode(root.Put()), E_POINTER) << "a tree of the cycle before";
      EXPECT_EQ(tree.As<IBuildUsbTree>()->BuildTree(), S_OK);
      EXPECT_EQ(tree->get_RootNode(root.Put()), S_OK);
      // A node alone keeps it.
      tree.Reset();
      same.Reset();
      CoFreeUnusedLibrariesEx(0, 0);
      EXPECT_TRUE(IsLoaded());
      root.Reset();
      CoFreeUnusedLibrariesEx(0, 0);
      CoFreeUnusedLibrariesEx(0, 0);
    }
    EXPECT_FALSE(IsLoaded());
  });
}

// What a sink was told.
class Events {
 public:
  ComPtr<IUnknown> Sink() {
    return zkusb::EventSink::Create([this](TDeviceEventType kind, IZKUMUsbTreeNode& node) {
      ComPtr<IZKUMUsbDevice> device = ComPtr<IZKUMUsbTreeNode>(&node).As<IZKUMUsbDevice>();
      LONG vendor = 0;
      if (device) device->get_VendorId(&vendor);
      const std::lock_guard lock(m_mutex);
      m_told.push_back({kind, vendor});
    });
  }
  std::size_t Count(TDeviceEventType kind, LONG vendor) {
    const std::lock_guard lock(m_mutex);
    return static_cast<std::size_t>(std::ranges::count(m_told, std::pair(kind, vendor)));
  }
  std::size_t Count(TDeviceEventType kind) {
    const std::lock_guard lock(m_mutex);
    return static_cast<std::size_t>(std::ranges::count(m_told, kind, &std::pair<TDeviceEventType, LONG>::first));
  }

 private:
  std::mutex m_mutex;
  std::vector<std::pair<TDeviceEventType, LONG>> m_told;
};

template <class Condition>
bool WaitUntil(Condition condition) {
  for (int i = 0; i < 1000 && !condition(); ++i) std::this_thread::sleep_for(20ms);
  return condition();
}

// The window that the component makes for this process, on a thread of its own.
HWND FindReceiver() {
  HWND window = nullptr;
  while ((window = FindWindowExW(nullptr, window, L"MsgReceiver", nullptr)) != nullptr) {
    DWORD process = 0;
    GetWindowThreadProcessId(window, &process);
    if (process == GetCurrentProcessId()) break;
  }
  return window;
}

// Of a list, which may be missing; `visit` is called with each node.
std::size_t CountNodes(
    const ComPtr<IZKUMUsbTreeNodeEnumerator>& nodes,
    const std::function<void(const ComPtr<IZKUMUsbTreeNode>&)>& visit = [](const auto&) {}) {
  std::size_t count = 0;
  if (!nodes) return count;
  testing_support::ForEachNode(*nodes.Get(), [&](HRESULT result, const ComPtr<IZKUMUsbTreeNode>& node) {
    EXPECT_EQ(result, S_OK);
    if (node) visit(node);
    ++count;
  });
  return count;
}

// How many nodes the three methods whose parameters carry no direction bring, together with what they answer: those of
// a subtree, those with a volume, and a child.
std::array<std::size_t, 3> CallUndirected(IZKUMUsbTree& tree, IZKUMUsbTreeNode& root) {
  ComPtr<IZKUMUsbTreeNodeEnumerator> devices, volumes, sticks;
  ComPtr<IZKUMUsbTreeNode> child;
  EXPECT_EQ(root.get_InSubtreeDevicesOfType(KUDTPortDevice, devices.Put()), S_OK);
  EXPECT_EQ(tree.get_PortDevicesWithVolume(volumes.Put()), S_OK);
  EXPECT_EQ(tree.get_PortDevicesWithVendorId(0x0781, sticks.Put()), S_OK);
  const std::size_t found = CountNodes(sticks, [&](const ComPtr<IZKUMUsbTreeNode>& stick) {
    const auto device = stick.As<IZKUMPortDevice>();
    ASSERT_TRUE(device);
    EXPECT_EQ(device->get_FirstChildOfType(stick.Get(), KUDTInterfaceDevice, child.Put()), S_OK);
  });
  EXPECT_EQ(found, 1u);
  return {CountNodes(devices), CountNodes(volumes), child ? 1u : 0u};
}

TEST_F(Client, HearsOfDevicesAndReadsTheTreeFromBothApartments) {
  platform::windows::SetEnvironmentText(u"ZKUSB_SCRIPT", s_script.u16string());
  InApartment(COINIT_MULTITHREADED, [] {
    const auto notifier = Create<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier, kNotifierProgId);
    const auto tree = Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree);
    ASSERT_TRUE(notifier && tree);
    ComPtr<IConnectionPoint> point;
    ASSERT_EQ(notifier.As<IConnectionPointContainer>()->FindConnectionPoint(DIID_IZKDeviceEventCallBack, point.Put()),
              S_OK);
    Events events;
    DWORD cookie = 0;
    ASSERT_EQ(point->Advise(events.Sink().Get(), &cookie), S_OK);
    EXPECT_EQ(events.Count(KDeviceConnected), 3u);
    ComPtr<IZKUMUsbTreeNode> root;
    ASSERT_EQ(tree->get_RootNode(root.Put()), S_OK);
    const auto [subtree, volumes, child] = CallUndirected(*tree.Get(), *root.Get());
    EXPECT_EQ(subtree, 3u);
    EXPECT_GT(volumes, 0u);
    EXPECT_EQ(child, 1u);

    // The window hears only what is sent to it.
    ASSERT_TRUE(WaitUntil([] { return FindReceiver() != nullptr; }));
    const HWND window = FindReceiver();
    platform::DEV_BROADCAST_VOLUME volume;
    volume.dbcv_size = sizeof volume;
    volume.dbcv_unitmask = 1 << 5;
    const auto record = reinterpret_cast<LPARAM>(&volume);
    std::this_thread::sleep_for(std::chrono::milliseconds(kPluggedAt) + 1s);
    EXPECT_EQ(events.Count(KDeviceAttached), 0u);
    EXPECT_FALSE(PostMessageW(window, WM_DEVICECHANGE, DBT_DEVICEARRIVAL, record));
    EXPECT_EQ(SendMessageW(window, WM_DEVICECHANGE, DBT_DEVICEARRIVAL, record), 0);
    EXPECT_TRUE(WaitUntil([&] { return events.Count(KDeviceAttached, 0x0951) != 0; }));

    InApartment(COINIT_APARTMENTTHREADED, [&] {
      const auto proxy = Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree, kTreeProgId);
      const auto also = Create<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier);
      ASSERT_TRUE(proxy && also);
      EXPECT_NE(proxy.Get(), tree.Get());
      ComPtr<IZKUMUsbTreeNode> remote;
      ASSERT_EQ(proxy->get_RootNode(remote.Put()), S_OK);
      EXPECT_EQ(testing_support::InstanceIdOf(remote), testing_support::InstanceIdOf(root));
      TUsbDeviceType type = KUDTUnknown;
      EXPECT_EQ(remote->get_Type(&type), S_OK);
      EXPECT_EQ(type, KUDTRoot);
      ComPtr<IZKUMUsbTreeNodeEnumerator> childs;
      ASSERT_EQ(remote->get_Childs(childs.Put()), S_OK);
      EXPECT_GT(CountNodes(childs), 0u);
      // Through a proxy, a parameter without direction brings nothing back. This is published and deliberate.
      EXPECT_EQ(CallUndirected(*proxy.Get(), *remote.Get()), (std::array<std::size_t, 3>{}));
    });
    EXPECT_EQ(point->Unadvise(cookie), S_OK);
  });
  // The window's procedure is the module's.
  CoFreeUnusedLibrariesEx(0, 0);
  EXPECT_TRUE(IsLoaded());
}

}  // namespace
