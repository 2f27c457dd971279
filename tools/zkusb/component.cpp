#include "tools/zkusb/component.h"

#include <utility>

#include "platform/text.h"
#include "tools/zkusb/node_reader.h"

namespace zkusb {

using KelvoUHW::ComPtr;

namespace {

std::string CodeText(HRESULT code) {
  return "0x" + platform::ToUtf8(platform::Hex(static_cast<std::uint32_t>(code), 8));
}

template <class Interface>
ComPtr<Interface> CreateObject(const CLSID& clsid, const char* name) {
  ComPtr<Interface> object;
  Check(CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, platform::IidOf<Interface>(),
                         object.PutVoid()),
        name);
  return object;
}

ComPtr<IZKUMUsbTreeNode> RootNode(IZKUMUsbTree& tree) {
  ComPtr<IZKUMUsbTreeNode> root;
  const HRESULT result = tree.get_RootNode(root.Put());
  if (result != E_POINTER) Check(result, "RootNode");
  return root;
}

ComPtr<IZKUMUsbTree> CreateTree() {
  return CreateObject<IZKUMUsbTree>(CLSID_ZKUMUsbTree, "creating ZKUMUsbTree");
}

}  // namespace

ComPtr<IZKUMUsbTreeNode> CurrentRoot() { return RootNode(*CreateTree().Get()); }

ComponentError::ComponentError(const std::string& call, HRESULT code)
    : std::runtime_error(call + " failed with " + CodeText(code)) {}

void Check(HRESULT result, const char* call) {
  if (FAILED(result)) throw ComponentError(call, result);
}

Apartment::Apartment() {
  Check(CoInitializeEx(nullptr, COINIT_MULTITHREADED), "entering the multithreaded apartment");
}

Component::Component(EventSink::Handler handler) {
  m_notifier =
      CreateObject<IZKUMEventNotifier>(CLSID_ZKUMEventNotifier, "creating ZKUMEventNotifier");
  m_tree = CreateTree();
  const auto container = m_notifier.As<IConnectionPointContainer>();
  if (!container) throw ComponentError("asking for the connection points", E_NOINTERFACE);
  Check(container->FindConnectionPoint(DIID_IZKDeviceEventCallBack, m_point.Put()),
        "FindConnectionPoint");
  const ComPtr<IUnknown> sink = EventSink::Create(std::move(handler));
  const HRESULT advised = m_point->Advise(sink.Get(), &m_cookie);
  if (SUCCEEDED(advised)) return;
  // A failed first report leaves the sink advised.
  if (m_cookie != 0) m_point->Unadvise(m_cookie);
  throw ComponentError("Advise", advised);
}

Component::~Component() { m_point->Unadvise(m_cookie); }

std::optional<NodeView> Component::Root() const {
  const ComPtr<IZKUMUsbTreeNode> root = RootNode(*m_tree.Get());
  if (!root) return std::nullopt;
  return ReadNode(*root.Get());
}

std::optional<NodeView> Component::Top() const {
  const ComPtr<IZKUMUsbTreeNode> root = RootNode(*m_tree.Get());
  if (!root) return std::nullopt;
  return ReadTop(*root.Get(), 2);
}

void Component::Dump(const std::function<void(std::u16string_view)>& handler) const {
  const ComPtr<IZKUMUsbTreeNode> root = RootNode(*m_tree.Get());
  if (!root) return handler({});
  ReadDump(*root.Get(), handler);
}

}  // namespace zkusb
