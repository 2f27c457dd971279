#include "monitor/event_notifier.h"

#include <array>
#include <cstdio>
#include <utility>

#include "com/node_object.h"
#include "monitor/process_state.h"
#include "monitor/thread_lock.h"
#include "records/record_lock.h"

using KelvoUHW::ComPtr;
using KelvoUHW::Guarded;
using KelvoUHW::NodePtr;

namespace {

// The lists in the order in which they are fired: what was attached before what is connected. This
// is deliberate.
constexpr std::array<TDeviceEventType, 4> kFiringOrder{KDeviceAttached, KDeviceConnected,
                                                       KDeviceRemoved, KDeviceModified};

bool SitsOnHubPort(const NodePtr& node) noexcept {
  const KelvoUHW::RecordReadLock lock;
  if (!node) return false;
  const KelvoUHW::CZKUMUsbTreeNodeImpl* parent = node->m_pParent;
  return parent != nullptr && parent->m_nType == KUDTHubPort;
}

// Counts a notification run for as long as it lasts.
class BusyCount {
 public:
  explicit BusyCount(std::atomic<std::int32_t>& count) noexcept : m_count(count) { ++m_count; }
  ~BusyCount() { --m_count; }
  BusyCount(const BusyCount&) = delete;
  BusyCount& operator=(const BusyCount&) = delete;

 private:
  std::atomic<std::int32_t>& m_count;
};

}  // namespace

CZKUMEventNotifier::CZKUMEventNotifier() : CProxy_IZKUMDeviceEvent(m_section) {}
CZKUMEventNotifier::~CZKUMEventNotifier() = default;

HRESULT CZKUMEventNotifier::FinalConstruct() noexcept {
  return Guarded([&] {
    ComPtr<IZKUMUsbTree> tree;
    HRESULT result = CoCreateInstance(CLSID_ZKUMUsbTree, nullptr, CLSCTX_INPROC_SERVER,
                                      platform::IidOf<IZKUMUsbTree>(), tree.PutVoid());
    if (FAILED(result)) return result;
    result = tree->QueryInterface(platform::IidOf<IBuildUsbTree>(), m_pBuildTree.PutVoid());
    ComPtr<IZKUMPrivateNotifier> target;
    if (SUCCEEDED(result)) {
      IZKUMEventNotifier* self = this;
      result = self->QueryInterface(platform::IidOf<IZKUMPrivateNotifier>(), target.PutVoid());
    }
    // Started also without a target, and whether it could be started is nobody's business: both are
    // deliberate.
    m_receiver.Start(target.Get());
    return result;
  });
}

void CZKUMEventNotifier::FinalRelease() noexcept { m_pBuildTree.Reset(); }

HRESULT CZKUMEventNotifier::InterfaceSupportsErrorInfo(REFIID riid) noexcept {
  return riid == platform::IidOf<IZKUMEventNotifier>() ? S_OK : S_FALSE;
}

HRESULT CZKUMEventNotifier::EnumConnectionPoints(IEnumConnectionPoints** ppEnum) noexcept {
  return KelvoUHW::EnumerateConnectionPoint(ConnectionPoint(), ppEnum);
}

HRESULT CZKUMEventNotifier::FindConnectionPoint(REFIID riid, IConnectionPoint** ppCP) noexcept {
  if (ppCP == nullptr) return E_POINTER;
  *ppCP = nullptr;
  if (riid != DIID_IZKDeviceEventCallBack) return CONNECT_E_NOCONNECTION;
  *ppCP = ConnectionPoint();
  (*ppCP)->AddRef();
  return S_OK;
}

HRESULT CZKUMEventNotifier::AdviseAndTell(IUnknown* sink, DWORD* pdwCookie) {
  if (sink == nullptr || pdwCookie == nullptr) return E_POINTER;
  ComPtr<IUnknown> unknown;
  HRESULT result = sink->QueryInterface(platform::IidOf<IUnknown>(), unknown.PutVoid());
  if (FAILED(result)) return result;
  IUnknown* slot = nullptr;
  result = AdviseSink(unknown.Get(), pdwCookie, slot);
  if (FAILED(result)) return result;
  // Asked a second time; what counts as the filter is the pointer in the slot, since a sink may
  // answer with another one each time.
  ComPtr<IUnknown> callback;
  result = unknown->QueryInterface(DIID_IZKDeviceEventCallBack, callback.PutVoid());
  return FAILED(result) ? result : SendConnectedDevices(slot);
}

HRESULT CZKUMEventNotifier::SendConnectedDevices(IUnknown* sink) {
  const KelvoUHW::ThreadLockGuard lock(KelvoUHW::g_notifyLock);
  if (!m_pBuildTree || sink == nullptr) return E_FAIL;
  // A build that found no change is as good: the sink is told what the last published one found.
  if (const HRESULT built = m_pBuildTree->BuildTree(); FAILED(built)) return built;
  HRESULT result = S_OK;
  const FireList devices = CopyDeviceList(KDeviceConnected, result);
  if (FAILED(result)) return result;
  FireDeviceList(KDeviceConnected, devices, sink);
  m_pBuildTree->ResetDeviceCache();
  return result;
}

HRESULT CZKUMEventNotifier::NotifyDeviceChange(ULONG, BYTE bFire) noexcept {
  return Guarded([&] {
    const KelvoUHW::ThreadLockGuard lock(KelvoUHW::g_notifyLock);
    if (!m_pBuildTree) return E_FAIL;
    const BusyCount busy(m_receiver.m_nBusy);
    const HRESULT built = m_pBuildTree->BuildTree();
    if (SUCCEEDED(built) && built != S_FALSE && bFire != 0) {
      std::array<FireList, kFiringOrder.size()> lists;
      HRESULT ignored = S_OK;
      for (std::size_t i = 0; i < kFiringOrder.size(); ++i) {
        lists[i] = CopyDeviceList(kFiringOrder[i], ignored);
      }
      for (std::size_t i = 0; i < kFiringOrder.size(); ++i) {
        FireDeviceList(kFiringOrder[i], lists[i], nullptr);
      }
    }
    return m_pBuildTree->ResetDeviceCache();
  });
}

// Only devices that sit directly on a hub port are reported.
CZKUMEventNotifier::FireList CZKUMEventNotifier::CopyDeviceList(LONG number,
                                                                HRESULT& result) const {
  FireList copy;
  const KelvoUHW::DeviceList* list = nullptr;
  result = m_pBuildTree->GetDeviceList(number, &list);
  if (FAILED(result) || list == nullptr) {
    result = E_FAIL;
    return copy;
  }
  for (const NodePtr& device : *list) {
    if (SitsOnHubPort(device)) copy.push_back(device);
  }
  return copy;
}

void CZKUMEventNotifier::FireDeviceList(TDeviceEventType kind, const FireList& devices,
                                        const IUnknown* filter) {
  for (const NodePtr& device : devices) FireDeviceEvent(kind, device, filter);
}

HRESULT CZKUMEventNotifier::FireDeviceEvent(TDeviceEventType kind, const NodePtr& device,
                                            const IUnknown* filter) noexcept {
  try {
    ComPtr<IZKUMUsbTreeNode> node;
    const HRESULT created = KelvoUHW::CreateNodeObject(device, node.Put());
    if (FAILED(created)) throw KelvoUHW::ComError(created);
    const ComPtr<IUnknown> data = node.As<IUnknown>();
    return Fire_OnDeviceChanged(kind, data.Get(), filter);
  } catch (...) {
    // Nothing ends, whatever the text says, and the next device is fired. This is deliberate.
    std::printf("Error caught\t-\tterminating");
    return S_FALSE;
  }
}
