#include "module/module.h"

#include <atomic>
#include <mutex>

#include "com/module_lock.h"
#include "com/usb_tree.h"
#include "com/zkusb_monitor.h"
#include "module/registration.h"
#include "module/server_description.h"
#include "module/singleton.h"
#include "monitor/event_notifier.h"
#include "monitor/process_state.h"
#include "platform/system.h"
#include "platform/text.h"

namespace KelvoUHW {

namespace {

constinit std::atomic<CZKUsbMonitorModule*> g_pModule = nullptr;

using TreeClass = CComSingletonExClassFactory<CZKUMUsbTree, IUnknown>;
using NotifierClass = CComSingletonExClassFactory<CZKUMEventNotifier, IUnknown>;

constexpr platform::Guid kAppId{
    0xA0C53575, 0x7F3D, 0x4FF2, {0xB5, 0xA7, 0xBF, 0xA8, 0x73, 0x49, 0x25, 0x10}};

constexpr CLSID kStdGlobalInterfaceTable{0x00000323, 0, 0, {0xC0, 0, 0, 0, 0, 0, 0, 0x46}};
constexpr IID kIGlobalInterfaceTable{0x00000146, 0, 0, {0xC0, 0, 0, 0, 0, 0, 0, 0x46}};

template <class ClassFactory>
HRESULT MakeClassObject(IUnknown*& out) noexcept {
  CachedComObject<ClassFactory>* created = nullptr;
  const HRESULT result = CachedComObject<ClassFactory>::Create(created);
  if (SUCCEEDED(result)) out = created;
  return result;
}

struct ClassEntry {
  const CLSID& clsid;
  HRESULT (*make)(IUnknown*& out) noexcept;
};
constexpr std::array<ClassEntry, 2> kObjectMap{
    {{CLSID_ZKUMUsbTree, MakeClassObject<TreeClass>},
     {CLSID_ZKUMEventNotifier, MakeClassObject<NotifierClass>}}};

// An instance that a client still holds needs the lock for its last release.
template <class ClassFactory>
void DeleteLock() noexcept {
  if (ClassFactory::State::s_pInstance == nullptr) ClassFactory::State::Delete();
}

// Registers the module or takes that back. E_UNEXPECTED where the system has nothing to register
// with.
HRESULT Register(CZKUsbMonitorModule& module, decltype(RegisterServer)& work) noexcept {
  const platform::System system = platform::CurrentSystem();
  if (!system.registry || !system.typeLibraries || !system.environment) return E_UNEXPECTED;
  return Guarded([&] {
    std::vector<Replacement> common;
    module.AddCommonRGSReplacements(common);
    return work(ModuleDescription(), common,
                {*system.registry, *system.typeLibraries, *system.environment});
  });
}

}  // namespace

CZKUsbMonitorModule* CurrentModule() noexcept { return g_pModule; }

CZKUsbMonitorModule::CZKUsbMonitorModule() noexcept {
  m_initialized = SUCCEEDED(m_section.Initialize()) && SUCCEEDED(TreeClass::State::Initialize()) &&
                  SUCCEEDED(NotifierClass::State::Initialize());
  if (!m_initialized) {
    TreeClass::State::Delete();
    NotifierClass::State::Delete();
  }
  g_pModule = this;
}

CZKUsbMonitorModule::~CZKUsbMonitorModule() {
  CZKUsbMonitorModule* self = this;
  g_pModule.compare_exchange_strong(self, nullptr);
}

LONG CZKUsbMonitorModule::Lock() noexcept { return LockModule(); }
LONG CZKUsbMonitorModule::Unlock() noexcept { return UnlockModule(); }
LONG CZKUsbMonitorModule::GetLockCount() noexcept { return ModuleLockCount(); }

HRESULT CZKUsbMonitorModule::GetGlobalInterfaceTable(IUnknown** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  if (!m_initialized) return E_UNEXPECTED;
  const std::lock_guard lock(m_section);
  if (!m_globalInterfaceTable) {
    const HRESULT result =
        CoCreateInstance(kStdGlobalInterfaceTable, nullptr, CLSCTX_INPROC_SERVER,
                         kIGlobalInterfaceTable, m_globalInterfaceTable.PutVoid());
    if (FAILED(result)) return result;
  }
  *out = ComPtr<IUnknown>(m_globalInterfaceTable).Detach();
  return S_OK;
}

void CZKUsbMonitorModule::AddCommonRGSReplacements(std::vector<Replacement>& replacements) {
  replacements.push_back({u"APPID", platform::GuidText(kAppId)});
}

HRESULT CZKUsbMonitorModule::CanUnloadNow() noexcept {
  return GetLockCount() == 0 ? S_OK : S_FALSE;
}

HRESULT CZKUsbMonitorModule::ClassObject(std::size_t index, IUnknown*& out) noexcept {
  const std::lock_guard lock(m_section);
  IUnknown*& cached = m_classObjects[index];
  HRESULT result = S_OK;
  if (cached == nullptr) result = kObjectMap[index].make(cached);
  out = cached;
  return result;
}

HRESULT CZKUsbMonitorModule::GetClassObject(REFCLSID clsid, REFIID iid, void** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = nullptr;
  if (!m_initialized) return E_UNEXPECTED;
  for (std::size_t index = 0; index < kObjectMap.size(); ++index) {
    if (kObjectMap[index].clsid != clsid) continue;
    IUnknown* classObject = nullptr;
    const HRESULT result = ClassObject(index, classObject);
    return FAILED(result) ? result : classObject->QueryInterface(iid, out);
  }
  return CLASS_E_CLASSNOTAVAILABLE;
}

HRESULT CZKUsbMonitorModule::RegisterServer() noexcept {
  return Register(*this, KelvoUHW::RegisterServer);
}

HRESULT CZKUsbMonitorModule::UnregisterServer() noexcept {
  return Register(*this, KelvoUHW::UnregisterServer);
}

void CZKUsbMonitorModule::Unload() noexcept {
  if (!m_initialized) return;
  m_initialized = false;
  if (platform::CurrentSystem().threads != nullptr) StopReceiving();
  ReleaseNotifyTarget();
  for (IUnknown*& classObject : m_classObjects) {
    if (IUnknown* released = std::exchange(classObject, nullptr)) released->Release();
  }
  m_globalInterfaceTable.Reset();
  DeleteLock<NotifierClass>();
  DeleteLock<TreeClass>();
}

}  // namespace KelvoUHW
