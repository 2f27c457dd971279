// Helpers for C++ programs that use ZKUsbMonitor, C++11 and later; link ole32, oleaut32 and uuid. Nothing here is
// needed to use the component: it is what every program would write. Nothing here asks for Parent.
//
// A program with a window needs Watcher alone, and never meets an apartment. All else is for the multithreaded
// apartment.
#ifndef ZKUSB_MONITOR_HELPERS_H
#define ZKUSB_MONITOR_HELPERS_H

#include <algorithm>
#include <cstddef>
#include <functional>
#include <initializer_list>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "zkusb_monitor.h"

namespace zkum {

// An owned reference. One Ptr belongs to one thread at a time.
template <class Interface>
class Ptr {
 public:
  Ptr() noexcept {}
  explicit Ptr(Interface* pointer) noexcept : m_p(pointer) {
    if (m_p) m_p->AddRef();
  }
  Ptr(const Ptr& other) noexcept : Ptr(other.m_p) {}
  Ptr(Ptr&& other) noexcept { std::swap(m_p, other.m_p); }
  ~Ptr() {
    if (m_p) m_p->Release();
  }
  Ptr& operator=(Ptr other) noexcept {
    std::swap(m_p, other.m_p);
    return *this;
  }
  Interface* Get() const noexcept { return m_p; }
  Interface* operator->() const noexcept { return m_p; }
  explicit operator bool() const noexcept { return m_p != nullptr; }
  // For out parameters: lets go of what is held first.
  Interface** Put() noexcept {
    *this = Ptr();
    return &m_p;
  }
  // The object under another interface; empty when it has none.
  template <class Other>
  Ptr<Other> As() const noexcept {
    Ptr<Other> other;
    if (m_p) m_p->QueryInterface(__uuidof(Other), reinterpret_cast<void**>(other.Put()));
    return other;
  }

 private:
  Interface* m_p = nullptr;
};

// A BSTR in and out: freed with its owner.
class Bstr {
 public:
  Bstr() noexcept {}
  explicit Bstr(const std::wstring& text) : m_text(SysAllocStringLen(text.data(), static_cast<UINT>(text.size()))) {}
  Bstr(const Bstr&) = delete;
  Bstr& operator=(const Bstr&) = delete;
  ~Bstr() { SysFreeString(m_text); }
  BSTR Get() const noexcept { return m_text; }
  BSTR* Put() noexcept {
    SysFreeString(m_text);
    m_text = nullptr;
    return &m_text;
  }
  std::wstring Text() const { return m_text ? std::wstring(m_text, SysStringLen(m_text)) : std::wstring(); }

 private:
  BSTR m_text = nullptr;
};

// A text property of an object, which may be missing: Read(device, &IZKUMUsbDevice::get_Vendor). Empty when it fails.
template <class Interface>
std::wstring Read(const Ptr<Interface>& object, HRESULT (STDMETHODCALLTYPE Interface::*property)(BSTR*)) {
  Bstr text;
  return object && SUCCEEDED((object.Get()->*property)(text.Put())) ? text.Text() : std::wstring();
}

// A number; `otherwise` when it fails.
template <class Interface, class Number>
Number Read(const Ptr<Interface>& object, HRESULT (STDMETHODCALLTYPE Interface::*property)(Number*), Number otherwise) {
  Number value = otherwise;
  return object && SUCCEEDED((object.Get()->*property)(&value)) ? value : otherwise;
}

inline std::string Utf8(const std::wstring& text) {
  const int size = static_cast<int>(text.size());
  const int bytes = WideCharToMultiByte(CP_UTF8, 0, text.data(), size, nullptr, 0, nullptr, nullptr);
  std::string result(static_cast<std::size_t>(bytes), '\0');
  if (bytes != 0) WideCharToMultiByte(CP_UTF8, 0, text.data(), size, &result[0], bytes, nullptr, nullptr);
  return result;
}

inline const char* EventName(TDeviceEventType kind) noexcept {
  static const char* const kNames[] = {"connected", "attached", "removed", "modified"};
  return kind >= 0 && kind < 4 ? kNames[kind] : "unknown";
}

inline const char* TypeName(TUsbDeviceType type) noexcept {
  static const char* const kNames[] = {"unknown",  "root",        "host controller", "hub",
                                       "hub port", "port device", "info device",     "interface device"};
  return type >= 0 && type < 8 ? kNames[type] : "unknown";
}

// Of IZKUMPortDevice::Speed. The component reports no more than full speed: docs/properties.md says why.
inline const char* SpeedName(ULONG speed) noexcept {
  static const char* const kNames[] = {"low", "full", "high", "super"};
  return speed < 4 ? kNames[speed] : "unknown";
}

// All nodes of an enumerator, which may be missing, in its order.
inline std::vector<Ptr<IZKUMUsbTreeNode>> Nodes(const Ptr<IZKUMUsbTreeNodeEnumerator>& list) {
  std::vector<Ptr<IZKUMUsbTreeNode>> nodes;
  VARIANT_BOOL more = VARIANT_FALSE;
  while (list && SUCCEEDED(list->MoveNext(&more)) && more != VARIANT_FALSE) {
    Ptr<IZKUMUsbTreeNode> node;
    if (SUCCEEDED(list->GetCurrent(node.Put())) && node) nodes.push_back(std::move(node));
  }
  return nodes;
}

// for (const auto& child : Children(node)) ...
inline std::vector<Ptr<IZKUMUsbTreeNode>> Children(const Ptr<IZKUMUsbTreeNode>& node) {
  Ptr<IZKUMUsbTreeNodeEnumerator> list;
  if (node) node->get_Childs(list.Put());
  return Nodes(list);
}

// The nodes of a kind below a node, that node among them.
inline std::vector<Ptr<IZKUMUsbTreeNode>> Subtree(const Ptr<IZKUMUsbTreeNode>& node, TUsbDeviceType type) {
  Ptr<IZKUMUsbTreeNodeEnumerator> list;
  if (node) node->get_InSubtreeDevicesOfType(type, list.Put());
  return Nodes(list);
}

inline TUsbDeviceType TypeOf(const Ptr<IZKUMUsbTreeNode>& node) {
  return Read(node, &IZKUMUsbTreeNode::get_Type, KUDTUnknown);
}

// The place of each hub and device below `root` by its instance id: the number of its controller, then the ports down
// to it, "2-1.4". It stays as long as the device stays in its socket and no controller comes or goes.
inline std::map<std::wstring, std::wstring> PortPaths(const Ptr<IZKUMUsbTreeNode>& root) {
  std::map<std::wstring, std::wstring> paths;
  std::vector<std::pair<Ptr<IZKUMUsbTreeNode>, std::wstring>> left;
  int controllers = 0;
  for (const Ptr<IZKUMUsbTreeNode>& controller : Children(root)) {
    left.emplace_back(controller, std::to_wstring(++controllers));
  }
  while (!left.empty()) {
    const Ptr<IZKUMUsbTreeNode> node = left.back().first;
    std::wstring path = left.back().second;
    left.pop_back();
    const TUsbDeviceType type = TypeOf(node);
    if (type == KUDTHubPort) {
      // Port 0 is what the device manager's storage controllers have instead of ports.
      const LONG port = Read(node.As<IZKUMHubPort>(), &IZKUMHubPort::get_PortIndex, LONG(0));
      if (port != 0) path += (path.find(L'-') == std::wstring::npos ? L"-" : L".") + std::to_wstring(port);
    } else if (type == KUDTHub || type == KUDTPortDevice) {
      const std::wstring id = Read(node, &IZKUMUsbTreeNode::get_InstanceId);
      if (!id.empty()) paths.emplace(id, path);
      if (type == KUDTPortDevice) continue;  // below are the device manager's nodes
    }
    for (const Ptr<IZKUMUsbTreeNode>& child : Children(node)) left.emplace_back(child, path);
  }
  return paths;
}

// A device as values, which any thread may keep.
struct Device {
  std::wstring instanceId;
  std::wstring vendor, product;  // as the device or its disk names them, else product is what Windows calls it
  std::wstring serial;           // empty when the device has none: Windows makes one up then, with an ampersand in it
  LONG vendorId = -1, productId = -1;
  ULONG speed = 0;
  bool storage = false;                   // it has a disk or a volume
  std::vector<std::wstring> mountPoints;  // "F:\", or a folder
  std::wstring portPath;                  // "2-1.4"; empty when it is not known
  // "F:", or "F:, G:"
  std::wstring Letters() const {
    std::wstring text;
    for (const std::wstring& point : mountPoints) {
      text += (text.empty() ? L"" : L", ") + point.substr(0, point.find_last_not_of(L'\\') + 1);
    }
    return text;
  }
};

// What a node of a device says. Without port path.
inline Device ReadDevice(const Ptr<IZKUMUsbTreeNode>& node) {
  Device read;
  const Ptr<IZKUMUsbDevice> device = node.As<IZKUMUsbDevice>();
  const Ptr<IZKUMPortDevice> port = node.As<IZKUMPortDevice>();
  std::wstring diskVendor, diskProduct;
  const auto firstOf = [](std::initializer_list<std::wstring> texts) {
    for (const std::wstring& text : texts) {
      const std::size_t start = text.find_first_not_of(L' ');
      if (start != std::wstring::npos) return text.substr(start, text.find_last_not_of(L' ') + 1 - start);
    }
    return std::wstring();
  };
  read.instanceId = Read(node, &IZKUMUsbTreeNode::get_InstanceId);
  read.serial = Read(device, &IZKUMUsbDevice::get_SerialNumber);
  if (read.serial.find(L'&') != std::wstring::npos) read.serial.clear();
  read.vendorId = Read(device, &IZKUMUsbDevice::get_VendorId, LONG(-1));
  read.productId = Read(device, &IZKUMUsbDevice::get_ProductId, LONG(-1));
  read.speed = Read(port, &IZKUMPortDevice::get_Speed, ULONG(0));
  for (const Ptr<IZKUMUsbTreeNode>& disk : Subtree(node, KUDTInterfaceDevice)) {
    read.storage = true;
    const Ptr<IZKUMInterfaceDevice> storage = disk.As<IZKUMInterfaceDevice>();
    diskVendor = firstOf({diskVendor, Read(storage, &IZKUMInterfaceDevice::get_VendorId)});
    diskProduct = firstOf({diskProduct, Read(storage, &IZKUMInterfaceDevice::get_ProductId)});
    Ptr<IEnumVARIANT> points;
    if (storage) storage->get_MountPoints(points.Put());
    VARIANT point;
    VariantInit(&point);
    while (points && points->Next(1, &point, nullptr) == S_OK) {
      const std::wstring text = point.vt == VT_BSTR && point.bstrVal ? point.bstrVal : L"";
      VariantClear(&point);
      if (!text.empty() &&
          std::find(read.mountPoints.begin(), read.mountPoints.end(), text) == read.mountPoints.end()) {
        read.mountPoints.push_back(text);
      }
    }
  }
  // A device tells its names itself, or its disk does; most others leave theirs to Windows.
  read.vendor = firstOf({Read(port, &IZKUMPortDevice::get_Manufacturer1), diskVendor});
  read.product =
      firstOf({Read(port, &IZKUMPortDevice::get_Product), diskProduct, Read(device, &IZKUMUsbDevice::get_Description)});
  return read;
}

// The sink of a function: Advise it. It is called with the kind and the node, on the thread that fires; what it throws
// ends that call with E_FAIL.
class Sink final : public IDispatch {
 public:
  using Function = std::function<void(TDeviceEventType, const Ptr<IZKUMUsbTreeNode>&)>;
  explicit Sink(Function function) : m_function(std::move(function)) {}

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** object) override {
    if (object == nullptr) return E_POINTER;
    const bool known = IsEqualGUID(iid, __uuidof(IUnknown)) || IsEqualGUID(iid, __uuidof(IDispatch)) ||
                       IsEqualGUID(iid, __uuidof(IZKDeviceEventCallBack));
    *object = known ? static_cast<IDispatch*>(this) : nullptr;
    if (known) AddRef();
    return known ? S_OK : E_NOINTERFACE;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return static_cast<ULONG>(InterlockedIncrement(&m_references)); }
  ULONG STDMETHODCALLTYPE Release() override {
    const LONG left = InterlockedDecrement(&m_references);
    if (left == 0) delete this;
    return static_cast<ULONG>(left);
  }
  HRESULT STDMETHODCALLTYPE GetTypeInfoCount(UINT* count) override {
    if (count == nullptr) return E_POINTER;
    *count = 0;
    return S_OK;
  }
  HRESULT STDMETHODCALLTYPE GetTypeInfo(UINT, LCID, ITypeInfo**) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE Invoke(DISPID member, REFIID, LCID, WORD, DISPPARAMS* parameters, VARIANT*, EXCEPINFO*,
                                   UINT*) override {
    if (member != 1) return DISP_E_MEMBERNOTFOUND;
    if (parameters == nullptr || parameters->cArgs != 2) return DISP_E_BADPARAMCOUNT;
    // The last argument stands first.
    const VARIANT& device = parameters->rgvarg[0];
    const VARIANT& kind = parameters->rgvarg[1];
    if (device.vt != VT_UNKNOWN || device.punkVal == nullptr || kind.vt != VT_I4) return DISP_E_TYPEMISMATCH;
    try {
      const auto node = Ptr<IUnknown>(device.punkVal).As<IZKUMUsbTreeNode>();
      if (!node) return E_NOINTERFACE;
      m_function(static_cast<TDeviceEventType>(kind.lVal), node);
      return S_OK;
    } catch (...) {
      return E_FAIL;
    }
  }

 private:
  virtual ~Sink() {}

  LONG m_references = 0;
  const Function m_function;
};

inline Ptr<IUnknown> MakeSink(Sink::Function function) { return Ptr<IUnknown>(new Sink(std::move(function))); }

}  // namespace zkum

#endif
