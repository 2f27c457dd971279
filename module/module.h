// The module, that is the DLL as COM sees it: the class objects of its two classes, the count of
// locks that keep it loaded, registration, and the order in which an unload destroys things. The
// five exported functions are in exports.cpp.
#pragma once

#include <array>
#include <vector>

#include "com/com_ptr.h"
#include "module/registrar.h"
#include "platform/com.h"
#include "platform/critical_section.h"

namespace KelvoUHW {

// One object for as long as the module is loaded; it publishes itself. Every method may be called
// from every thread, registration and Unload excepted.
class CZKUsbMonitorModule {
 public:
  // Makes the module's lock and those of the two classes; see Initialized.
  CZKUsbMonitorModule() noexcept;
  CZKUsbMonitorModule(const CZKUsbMonitorModule&) = delete;
  CZKUsbMonitorModule& operator=(const CZKUsbMonitorModule&) = delete;

  // The virtual operations, in this order.
  virtual ~CZKUsbMonitorModule();
  virtual LONG Lock() noexcept;
  virtual LONG Unlock() noexcept;
  virtual LONG GetLockCount() noexcept;
  // The process's global interface table, created when first asked for and kept. Nobody asks. The
  // caller owns the reference.
  virtual HRESULT GetGlobalInterfaceTable(IUnknown** out) noexcept;
  // What every registration script is given besides its own replacements. Throws std::bad_alloc.
  virtual void AddCommonRGSReplacements(std::vector<Replacement>& replacements);

  // False when a lock could not be made: the module then refuses to load.
  bool Initialized() const noexcept { return m_initialized; }

  // What the five exports do.
  HRESULT CanUnloadNow() noexcept;
  HRESULT GetClassObject(REFCLSID clsid, REFIID iid, void** out) noexcept;
  HRESULT RegisterServer() noexcept;
  HRESULT UnregisterServer() noexcept;

  // The end of the module, in the one order that is safe: no more broadcasts and no event threads,
  // the notifier's reference to itself, the class objects, the locks of the classes. Not with a
  // sink of this thread being called; nothing of the module may be used by other threads from here
  // on. An instance that a client still holds stays alive. The second time it does nothing.
  void Unload() noexcept;

 private:
  // The classes in the order in which they are searched.
  static constexpr std::size_t kClasses = 2;

  HRESULT ClassObject(std::size_t index, IUnknown*& out) noexcept;

  platform::CriticalSection m_section;
  bool m_initialized = false;
  std::array<IUnknown*, kClasses> m_classObjects{};  // owning
  ComPtr<IUnknown> m_globalInterfaceTable;
};

// The object that was constructed last and is still there; null without one.
CZKUsbMonitorModule* CurrentModule() noexcept;

}  // namespace KelvoUHW
