// Watcher: the PC's USB devices and their events for a C++ program, C++11 and later, that need not know what an
// apartment is; link ole32, oleaut32, user32 and uuid. A program with a window uses this alone.
#ifndef ZKUSB_MONITOR_WATCHER_H
#define ZKUSB_MONITOR_WATCHER_H

#include <process.h>

#include <deque>
#include <memory>

#include "zkusb_monitor_helpers.h"

namespace zkum {

// Uses the manifest beside the program, ZKUsbMonitor.Assembly.manifest, while it lives: with it, objects are created
// from the DLL that lies there, registered or not. Without the file nothing changes.
class UseManifestBesideProgram {
 public:
  UseManifestBesideProgram() {
    std::wstring path(MAX_PATH, L'\0');
    DWORD size = 0;
    while ((size = GetModuleFileNameW(nullptr, &path[0], static_cast<DWORD>(path.size()))) == path.size()) {
      path.resize(2 * path.size());
    }
    path.resize(size);
    path.resize(path.find_last_of(L"\\/") + 1);
    path += L"ZKUsbMonitor.Assembly.manifest";
    ACTCTXW context = ACTCTXW();
    context.cbSize = sizeof context;
    context.lpSource = path.c_str();
    m_context = CreateActCtxW(&context);
    if (m_context != INVALID_HANDLE_VALUE) m_active = ActivateActCtx(m_context, &m_cookie) != FALSE;
  }
  UseManifestBesideProgram(const UseManifestBesideProgram&) = delete;
  UseManifestBesideProgram& operator=(const UseManifestBesideProgram&) = delete;
  ~UseManifestBesideProgram() {
    if (m_active) DeactivateActCtx(0, m_cookie);
    if (m_context != INVALID_HANDLE_VALUE) ReleaseActCtx(m_context);
  }

 private:
  HANDLE m_context = INVALID_HANDLE_VALUE;
  ULONG_PTR m_cookie = 0;
  bool m_active = false;
};

struct Event {
  TDeviceEventType kind;
  Device device;
};

// Watches the PC's USB devices as long as it lives, from a thread of its own in the multithreaded apartment: so the
// program's threads may be in any apartment, or in none. It is made, used and destroyed by one thread of the program.
//
// The first events, "connected", come before the constructor returns, for each device that is there; all others when
// something happens. docs/contract.md says when which. In a single-threaded apartment the constructor, Run, Devices and
// the destructor let other objects of that apartment be called while they wait.
class Watcher {
 public:
  using Function = std::function<void(const Event&)>;

  // `told` is called on threads of the component, one at a time. It must not wait for the thread that owns the watcher:
  // the destructor waits for a call that is under way.
  explicit Watcher(Function told) : m_shared(std::make_shared<Shared>(std::move(told), nullptr, 0)) { Start(); }

  // Posts `message` to `window` for each event; the window takes them with Next until there is none.
  Watcher(HWND window, UINT message) : m_shared(std::make_shared<Shared>(Function(), window, message)) { Start(); }

  Watcher(const Watcher&) = delete;
  Watcher& operator=(const Watcher&) = delete;
  // No event is told after it.
  ~Watcher() {
    {
      const Lock lock(m_shared->calls);
      m_shared->closed = true;
    }
    if (m_thread) {
      SetEvent(m_end);
      WaitFor(m_thread);
      CloseHandle(m_thread);
    }
    if (m_end) CloseHandle(m_end);
    if (m_started) CloseHandle(m_started);
  }

  // S_OK, or why there are no events: REGDB_E_CLASSNOTREG when the component is neither registered nor beside the
  // program.
  HRESULT Error() const noexcept { return m_error; }

  // All devices on the PC's ports as they are now.
  std::vector<Device> Devices() {
    std::vector<Device> devices;
    Run([&devices](IZKUMUsbTree* tree) {
      Ptr<IZKUMUsbTreeNode> root;
      if (FAILED(tree->get_RootNode(root.Put()))) return;  // a PC without USB
      const std::map<std::wstring, std::wstring> paths = PortPaths(root);
      for (const Ptr<IZKUMUsbTreeNode>& node : Subtree(root, KUDTPortDevice)) {
        devices.push_back(ReadDevice(node));
        const auto path = paths.find(devices.back().instanceId);
        if (path != paths.end()) devices.back().portPath = path->second;
      }
    });
    return devices;
  }

  // Calls `use` with the tree, in the multithreaded apartment, and returns when it is done: what else a program wants
  // to know. Not called when Error is a failure. What it throws ends it.
  void Run(const std::function<void(IZKUMUsbTree*)>& use) {
    if (FAILED(m_error)) return;
    Job job{&use, m_tree.Get()};
    HANDLE thread = reinterpret_cast<HANDLE>(_beginthreadex(nullptr, 0, &Job::Thread, &job, 0, nullptr));
    if (thread == nullptr) return;
    WaitFor(thread);
    CloseHandle(thread);
  }

  // The next event that was posted; false when there is none.
  bool Next(Event& event) {
    const Lock lock(m_shared->queueLock);
    if (m_shared->queue.empty()) return false;
    event = std::move(m_shared->queue.front());
    m_shared->queue.pop_front();
    return true;
  }

 private:
  struct Section {
    Section() { InitializeCriticalSection(&section); }
    ~Section() { DeleteCriticalSection(&section); }
    Section(const Section&) = delete;
    Section& operator=(const Section&) = delete;
    CRITICAL_SECTION section;
  };
  struct Lock {
    explicit Lock(Section& locked) : section(locked) { EnterCriticalSection(&section.section); }
    ~Lock() { LeaveCriticalSection(&section.section); }
    Lock(const Lock&) = delete;
    Lock& operator=(const Lock&) = delete;
    Section& section;
  };
  struct Job {
    const std::function<void(IZKUMUsbTree*)>* use;
    IZKUMUsbTree* tree;
    static unsigned __stdcall Thread(void* argument) {
      const Job& job = *static_cast<const Job*>(argument);
      if (FAILED(CoInitializeEx(nullptr, COINIT_MULTITHREADED))) return 1;
      try {
        (*job.use)(job.tree);
      } catch (...) {  // no thread of the program's own, so nobody could catch it
      }
      CoUninitialize();
      return 0;
    }
  };

  // What the sink shares with the watcher: a call may outlive it by a moment.
  struct Shared {
    Shared(Function f, HWND w, UINT m) : told(std::move(f)), window(w), message(m) {}

    void Tell(TDeviceEventType kind, const Ptr<IZKUMUsbTreeNode>& node) {
      const Lock lock(calls);
      if (closed) return;
      Event event{kind, ReadDevice(node)};
      event.device.portPath = PathOf(kind, event.device.instanceId);
      if (told) return told(event);
      {
        const Lock queueing(queueLock);
        queue.push_back(std::move(event));
      }
      PostMessageW(window, message, 0, 0);
    }

    // One walk tells all paths; a device that is gone is not in the tree any more, and its path is remembered.
    std::wstring PathOf(TDeviceEventType kind, const std::wstring& id) {
      auto known = paths.find(id);
      Ptr<IZKUMUsbTreeNode> root;
      if (kind != KDeviceRemoved && (kind == KDeviceAttached || known == paths.end()) && tree &&
          SUCCEEDED(tree->get_RootNode(root.Put()))) {
        for (const auto& path : PortPaths(root)) paths[path.first] = path.second;
        known = paths.find(id);
      }
      const std::wstring path = known == paths.end() ? std::wstring() : known->second;
      if (kind == KDeviceRemoved && known != paths.end()) paths.erase(known);
      return path;
    }

    const Function told;
    const HWND window;
    const UINT message;
    Section calls, queueLock;
    bool closed = false;
    Ptr<IZKUMUsbTree> tree;
    std::map<std::wstring, std::wstring> paths;
    std::deque<Event> queue;
  };

  // A thread of the single-threaded apartment takes calls while it waits: a sink of its own may be called meanwhile,
  // and what is waited for waits for the end of that call.
  static void WaitFor(HANDLE handle) {
    DWORD index = 0;
    if (CoWaitForMultipleHandles(0, INFINITE, 1, &handle, &index) != S_OK) WaitForSingleObject(handle, INFINITE);
  }

  void Start() {
    m_end = CreateEventW(nullptr, TRUE, FALSE, nullptr);
    m_started = CreateEventW(nullptr, TRUE, FALSE, nullptr);
    if (m_end && m_started) {
      m_thread = reinterpret_cast<HANDLE>(_beginthreadex(nullptr, 0, &Watcher::Thread, this, 0, nullptr));
    }
    if (m_thread) {
      WaitFor(m_started);
    } else {
      m_error = E_OUTOFMEMORY;
    }
  }

  static unsigned __stdcall Thread(void* argument) {
    static_cast<Watcher*>(argument)->Live();
    return 0;
  }

  void Live() {
    m_error = CoInitializeEx(nullptr, COINIT_MULTITHREADED);
    const bool entered = SUCCEEDED(m_error);
    Ptr<IZKUMEventNotifier> notifier;
    Ptr<IConnectionPoint> point;
    DWORD cookie = 0;
    if (entered) m_error = Connect(notifier, point, cookie);
    SetEvent(m_started);
    WaitForSingleObject(m_end, INFINITE);
    // Also when Advise failed: what is advised then misses its first events alone.
    if (point && cookie != 0) point->Unadvise(cookie);
    {
      const Lock lock(m_shared->calls);
      m_shared->tree = Ptr<IZKUMUsbTree>();
    }
    m_tree = Ptr<IZKUMUsbTree>();
    point = Ptr<IConnectionPoint>();
    notifier = Ptr<IZKUMEventNotifier>();
    if (entered) CoUninitialize();
  }

  HRESULT Connect(Ptr<IZKUMEventNotifier>& notifier, Ptr<IConnectionPoint>& point, DWORD& cookie) {
    {
      const UseManifestBesideProgram manifest;
      HRESULT made = CoCreateInstance(__uuidof(ZKUMEventNotifier), nullptr, CLSCTX_INPROC_SERVER,
                                      __uuidof(IZKUMEventNotifier), reinterpret_cast<void**>(notifier.Put()));
      if (SUCCEEDED(made)) {
        made = CoCreateInstance(__uuidof(ZKUMUsbTree), nullptr, CLSCTX_INPROC_SERVER, __uuidof(IZKUMUsbTree),
                                reinterpret_cast<void**>(m_tree.Put()));
      }
      if (FAILED(made)) return made;
    }
    m_shared->tree = m_tree;
    const auto points = notifier.As<IConnectionPointContainer>();
    if (!points) return E_NOINTERFACE;
    const HRESULT found = points->FindConnectionPoint(__uuidof(IZKDeviceEventCallBack), point.Put());
    if (FAILED(found)) return found;
    const std::shared_ptr<Shared> shared = m_shared;
    const Ptr<IUnknown> sink =
        MakeSink([shared](TDeviceEventType kind, const Ptr<IZKUMUsbTreeNode>& node) { shared->Tell(kind, node); });
    const HRESULT advised = point->Advise(sink.Get(), &cookie);
    return cookie != 0 ? S_OK : advised;
  }

  const std::shared_ptr<Shared> m_shared;
  Ptr<IZKUMUsbTree> m_tree;
  HANDLE m_thread = nullptr, m_end = nullptr, m_started = nullptr;
  HRESULT m_error = S_OK;
};

}  // namespace zkum

#endif
