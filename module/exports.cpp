// The five names that the module exports, and what runs when it is loaded and unloaded.
#include "com/manual_lifetime.h"
#include "module/module.h"
#include "platform/com.h"
#include "platform/process_end.h"

namespace {

// Neither made nor destroyed by the language: loading and unloading do that, in their own order.
constinit KelvoUHW::ManualLifetime<KelvoUHW::CZKUsbMonitorModule> g_module;

bool OnLoad() noexcept { return g_module.Make().Initialized(); }

void OnUnload() noexcept {
  if (!g_module) return;
  g_module->Unload();
  g_module.Destroy();
}

}  // namespace

#ifdef _WIN32
#define ZKUSB_EXPORT extern "C"
extern "C" BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID processEnds) {
  if (reason == DLL_PROCESS_ATTACH) {
    platform::SetModuleInstance(instance);
    return OnLoad() ? TRUE : FALSE;
  }
  if (reason == DLL_THREAD_DETACH) platform::ForgetThread();
  // When the process ends its other threads are gone already, whatever they held: nothing is done.
  if (reason == DLL_PROCESS_DETACH && processEnds == nullptr) {
    OnUnload();
    platform::ForgetAllThreads();
  }
  return TRUE;
}
#else
#define ZKUSB_EXPORT extern "C" __attribute__((visibility("default")))
namespace {
// A shared library cannot refuse to load: one that could not initialise answers E_UNEXPECTED.
__attribute__((constructor)) void LoadModule() { OnLoad(); }
__attribute__((destructor)) void UnloadModule() {
  if (!platform::ProcessEnds()) OnUnload();
}
}  // namespace
#endif

ZKUSB_EXPORT HRESULT STDAPICALLTYPE DllCanUnloadNow() { return g_module->CanUnloadNow(); }

ZKUSB_EXPORT HRESULT STDAPICALLTYPE DllGetClassObject(REFCLSID clsid, REFIID iid, void** out) {
  return g_module->GetClassObject(clsid, iid, out);
}

// Nothing is done with either argument. This is deliberate.
ZKUSB_EXPORT HRESULT STDAPICALLTYPE DllInstall(BOOL, const OLECHAR*) { return S_OK; }

ZKUSB_EXPORT HRESULT STDAPICALLTYPE DllRegisterServer() { return g_module->RegisterServer(); }

ZKUSB_EXPORT HRESULT STDAPICALLTYPE DllUnregisterServer() { return g_module->UnregisterServer(); }
