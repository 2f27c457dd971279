// The module as the system's COM, registry and windows have it. The tests of this program run in the order in which
// they stand: from the first notifier on the module stays in the process.
#include <windows.h>

#include <dbt.h>
#include <gtest/gtest.h>

#include <condition_variable>
#include <filesystem>
#include <fstream>
#include <functional>
#include <mutex>
#include <nlohmann/json.hpp>
#include <thread>

#include "com/com_ptr.h"
#include "com/zkusb_monitor.h"
#include "platform/device_broadcast.h"
#include "platform/registry_key.h"
#include "platform/system.h"
#include "platform/text.h"
#include "platform/windows/server_classes.h"
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

std::vector<Entry> Entries(const std::u16string& modulePath) {
  const std::string module = platform::ToUtf8(modulePath);
  const std::u16string library = u"TypeLib\\{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}\\1.0";
  std::vector<Entry> entries = {
      {u"AppID\\{A0C53575-7F3D-4FF2-B5A7-BFA873492510}", u"", "ZKUsbMonitor"},
      {u"AppID\\ZKUsbMonitor.DLL", u"AppID", "{A0C53575-7F3D-4FF2-B5A7-BFA873492510}"},
      {library, u"", "ZKUsbMonitor 1.0 Type Library"},
      {library + u"\\0\\win32", u"", module},
      {u"Interface\\{8080AF8D-857A-45C4-8296-AB1301ADFA28}", u"", "IZKUMUsbTreeNode"},
      {u"Interface\\{8080AF8D-857A-45C4-8296-AB1301ADFA28}\\TypeLib", u"", "{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}"},
  };
  const struct {
    std::u16string progId, clsid;
    std::string description;
  } classes[] = {
      {kTreeProgId, u"{34349D2D-14C6-414B-9771-A7BD2A7C7180}", "ZKUMUsbTree Class"},
      {kNotifierProgId, u"{1D7E7A5B-648D-4236-8604-8F5F3C82433A}", "ZKUMEventNotifier Class"},
  };
  for (const auto& [progId, clsid, description] : classes) {
    const std::u16string key = u"CLSID\\" + clsid;
    const std::string versioned = platform::ToUtf8(progId) + ".1";
    const std::vector<Entry> own = {
        {progId + u".1", u"", description},
        {progId + u".1\\CLSID", u"", platform::ToUtf8(clsid)},
        {progId, u"", description},
        {progId + u"\\CLSID", u"", platform::ToUtf8(clsid)},
        {progId + u"\\CurVer", u"", versioned},
        {key, u"", description},
        {key + u"\\ProgID", u"", versioned},
        {key + u"\\VersionIndependentProgID", u"", platform::ToUtf8(progId)},
        {key + u"\\Programmable", u"", "no value"},
        {key + u"\\InprocServer32", u"", module},
        {key + u"\\InprocServer32", u"ThreadingModel", "Free"},
        {key + u"\\TypeLib", u"", "{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}"},
    };
    entries.insert(entries.end(), own.begin(), own.end());
  }
  return entries;
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
  const auto regsvr32 = [](const std::u16string& option) {
    std::u16string command = u"regsvr32 /s " + option + u"\"" + Module() + u"\"";
    STARTUPINFOW startup{};
    startup.cb = sizeof startup;
    PROCESS_INFORMATION process{};
    if (!CreateProcessW(nullptr, platform::ToSystemText(command.data()), nullptr, nullptr, FALSE, 0, nullptr, nullptr,
                        &startup, &process)) {
      return DWORD{999};
    }
    DWORD code = 998;
    WaitForSingleObject(process.hProcess, 60000);
    GetExitCodeProcess(process.hProcess, &code);
    CloseHandle(process.hThread);
    CloseHandle(process.hProcess);
    return code;
  };
  EXPECT_EQ(regsvr32(u""), 0u);
  ExpectRegistered(Module());
  EXPECT_EQ(regsvr32(u"/u "), 0u);
  EXPECT_EQ(Read(kTreeProgId, u""), "no key");
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
  InApartment(COINIT_MULTITHREADED, [] {
    {
      const auto tree = Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree, kTreeProgId);
      ASSERT_TRUE(tree);
      const auto same = Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree);
      EXPECT_EQ(same.Get(), tree.Get());
      ComPtr<IZKUMUsbTreeNode> root;
      EXPECT_EQ(tree->get_RootNode(root.Put()), E_POINTER);
      CoFreeUnusedLibrariesEx(0, 0);
      EXPECT_TRUE(IsLoaded());
    }
    CoFreeUnusedLibrariesEx(0, 0);
    CoFreeUnusedLibrariesEx(0, 0);
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
      m_changed.notify_all();
    });
  }
  std::size_t Count(TDeviceEventType kind, LONG vendor = 0) {
    const std::lock_guard lock(m_mutex);
    return CountLocked(kind, vendor);
  }
  bool WaitFor(TDeviceEventType kind, LONG vendor) {
    std::unique_lock lock(m_mutex);
    return m_changed.wait_for(lock, 20s, [&] { return CountLocked(kind, vendor) != 0; });
  }

 private:
  std::size_t CountLocked(TDeviceEventType kind, LONG vendor) const {
    std::size_t count = 0;
    for (const auto& [toldKind, toldVendor] : m_told)
      count += toldKind == kind && (vendor == 0 || vendor == toldVendor);
    return count;
  }
  std::mutex m_mutex;
  std::condition_variable m_changed;
  std::vector<std::pair<TDeviceEventType, LONG>> m_told;
};

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
HWND Receiver() {
  for (int i = 0; i < 1500 && FindReceiver() == nullptr; ++i) std::this_thread::sleep_for(20ms);
  return FindReceiver();
}

std::string InstanceId(IZKUMUsbTreeNode& node) {
  BSTR text = nullptr;
  EXPECT_EQ(node.get_InstanceId(&text), S_OK);
  const std::string result = platform::ToUtf8(platform::BstrText(text));
  SysFreeString(text);
  return result;
}

std::size_t CountNodes(IZKUMUsbTreeNodeEnumerator& nodes) {
  std::size_t count = 0;
  VARIANT_BOOL more = VARIANT_FALSE;
  while (nodes.MoveNext(&more) == S_OK && more != VARIANT_FALSE) {
    ComPtr<IZKUMUsbTreeNode> node;
    EXPECT_EQ(nodes.GetCurrent(node.Put()), S_OK);
    ++count;
  }
  return count;
}

// How many nodes the three methods whose parameters carry no direction bring, together with what they answer.
struct Undirected {
  std::size_t subtree = 0, volumes = 0;
  bool child = false;
};
Undirected CallUndirected(IZKUMUsbTree& tree, IZKUMUsbTreeNode& root) {
  Undirected brought;
  ComPtr<IZKUMUsbTreeNodeEnumerator> devices;
  EXPECT_EQ(root.get_InSubtreeDevicesOfType(KUDTPortDevice, devices.Put()), S_OK);
  if (devices) brought.subtree = CountNodes(*devices.Get());
  ComPtr<IZKUMUsbTreeNodeEnumerator> volumes;
  EXPECT_EQ(tree.get_PortDevicesWithVolume(volumes.Put()), S_OK);
  if (volumes) brought.volumes = CountNodes(*volumes.Get());

  ComPtr<IZKUMUsbTreeNodeEnumerator> stick;
  EXPECT_EQ(tree.get_PortDevicesWithVendorId(0x0781, stick.Put()), S_OK);
  VARIANT_BOOL more = VARIANT_FALSE;
  EXPECT_EQ(stick->MoveNext(&more), S_OK);
  ComPtr<IZKUMUsbTreeNode> node;
  EXPECT_EQ(stick->GetCurrent(node.Put()), S_OK);
  const auto device = node.As<IZKUMPortDevice>();
  ComPtr<IZKUMUsbTreeNode> child;
  if (!device) {
    ADD_FAILURE() << "no port device";
    return brought;
  }
  EXPECT_EQ(device->get_FirstChildOfType(node.Get(), KUDTInterfaceDevice, child.Put()), S_OK);
  brought.child = child.Get() != nullptr;
  return brought;
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
    const Undirected here = CallUndirected(*tree.Get(), *root.Get());
    EXPECT_EQ(here.subtree, 3u);
    EXPECT_GT(here.volumes, 0u);
    EXPECT_TRUE(here.child);

    // The window hears only what is sent to it.
    const HWND window = Receiver();
    ASSERT_NE(window, nullptr);
    platform::DEV_BROADCAST_VOLUME volume;
    volume.dbcv_size = sizeof volume;
    volume.dbcv_unitmask = 1 << 5;
    const auto record = reinterpret_cast<LPARAM>(&volume);
    std::this_thread::sleep_for(std::chrono::milliseconds(kPluggedAt) + 1s);
    EXPECT_EQ(events.Count(KDeviceAttached), 0u);
    EXPECT_FALSE(PostMessageW(window, WM_DEVICECHANGE, DBT_DEVICEARRIVAL, record));
    EXPECT_EQ(SendMessageW(window, WM_DEVICECHANGE, DBT_DEVICEARRIVAL, record), 0);
    EXPECT_TRUE(events.WaitFor(KDeviceAttached, 0x0951));

    InApartment(COINIT_APARTMENTTHREADED, [&] {
      const auto proxy = Create<IZKUMUsbTree>(CLSID_ZKUMUsbTree, kTreeProgId);
      const auto also = Create<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier);
      ASSERT_TRUE(proxy && also);
      EXPECT_NE(proxy.Get(), tree.Get());
      ComPtr<IZKUMUsbTreeNode> remote;
      ASSERT_EQ(proxy->get_RootNode(remote.Put()), S_OK);
      EXPECT_EQ(InstanceId(*remote.Get()), InstanceId(*root.Get()));
      TUsbDeviceType type = KUDTUnknown;
      EXPECT_EQ(remote->get_Type(&type), S_OK);
      EXPECT_EQ(type, KUDTRoot);
      ComPtr<IZKUMUsbTreeNodeEnumerator> childs;
      ASSERT_EQ(remote->get_Childs(childs.Put()), S_OK);
      EXPECT_GT(CountNodes(*childs.Get()), 0u);
      // Through a proxy, a parameter without direction brings nothing back. This is published and meant.
      const Undirected there = CallUndirected(*proxy.Get(), *remote.Get());
      EXPECT_EQ(there.subtree, 0u);
      EXPECT_EQ(there.volumes, 0u);
      EXPECT_FALSE(there.child);
    });
    EXPECT_EQ(point->Unadvise(cookie), S_OK);
  });
  // The window's procedure is the module's.
  CoFreeUnusedLibrariesEx(0, 0);
  EXPECT_TRUE(IsLoaded());
}

}  // namespace
